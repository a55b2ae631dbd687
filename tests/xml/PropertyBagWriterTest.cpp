// The serializers of property bags, detailed results and URI lists.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "api/FakeFramework.h"
#include "foundation/Status.h"
#include "xml/Serializers.h"

namespace qel::xml {
namespace {

using api::testing::FakeBag;
using api::testing::FakeEnumUris;
using api::testing::Std;
using fnd::WString;

std::wstring WriteBag(FakeBag& bag, std::vector<api::PropertyTag> filter) {
    WString out;
    {
        XmlElement element;
        element.openRoot(&out, L"PropertyBag");
        WritePropertyBag(element, &bag, static_cast<uint32_t>(filter.size()), filter.data());
    }
    EXPECT_EQ(bag.refs, 0);
    EXPECT_EQ(bag.tagEnumerator.refs, 0);
    return Std(out);
}

TEST(WritePropertyBag, FilterEntriesSelectTagsOrWholeGroups) {
    FakeBag bag;
    for (api::PropertyTag tag : {0x2000u, 0x2005u, 0x3005u, 0x2FFFu})
        bag.Add(tag, api::kTypeInteger2).integer = static_cast<int32_t>(tag & 0xF);
    struct Case {
        std::vector<api::PropertyTag> filter;
        std::wstring properties;
    } cases[] = {
        {{}, L"<Property tag='2000' type='2'>0</Property><Property tag='2005' type='2'>5</Property>"
             L"<Property tag='3005' type='2'>5</Property><Property tag='2FFF' type='2'>15</Property>"},
        {{0x2000}, L"<Property tag='2000' type='2'>0</Property><Property tag='2005' type='2'>5</Property>"
                   L"<Property tag='2FFF' type='2'>15</Property>"},
        {{0x2005}, L"<Property tag='2005' type='2'>5</Property>"},
        {{0x3005, 0x2FFF}, L"<Property tag='3005' type='2'>5</Property><Property tag='2FFF' type='2'>15</Property>"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.filter.size());
        EXPECT_EQ(WriteBag(bag, c.filter), L"<PropertyBag>" + c.properties + L"</PropertyBag>");
    }
    EXPECT_EQ(WriteBag(bag, {0x4000}), L"<PropertyBag />");
    FakeBag empty;
    EXPECT_EQ(WriteBag(empty, {}), L"<PropertyBag />");
}

TEST(WritePropertyBag, OnlyStringsAreEscaped) {
    FakeBag bag;
    bag.Add(0x2005, api::kTypeString).text = L"<\x1>";
    bag.Add(0x6, api::kTypeString);
    EXPECT_EQ(WriteBag(bag, {}),
              L"<PropertyBag><Property tag='2005' type='6'>&lt;?&gt;</Property>"
              L"<Property tag='6' type='6' /></PropertyBag>");
    api::testing::ExpectNoLeaks();
}

std::wstring Detailed(const wchar_t* text, const wchar_t* item, WString* report) {
    WString out;
    XmlElement fragment;
    fragment.openRoot(&out, nullptr);
    WriteDetailedResult(text, WString(item), fragment, report);
    return Std(out);
}

TEST(WriteDetailedResult, ReportsReplacedCharactersUnderAnEscapedItemName) {
    WString report(L"<x/>");
    EXPECT_EQ(Detailed(L"\x1<a>\xFFFE", L"//localhost/P/it'<em>&", &report),
              L"<DetailedResult>?&lt;a&gt;?</DetailedResult>");
    EXPECT_EQ(Std(report),
              L"<x/><InvalidChar item='//localhost/P/it&apos;&lt;em&gt;&amp;'  position='0'/>"
              L"<InvalidChar item='//localhost/P/it&apos;&lt;em&gt;&amp;'  position='A'/>");

    EXPECT_EQ(Detailed(nullptr, L"i", &report), L"<DetailedResult></DetailedResult>");
    EXPECT_EQ(Detailed(L"\x1", L"i", nullptr), L"<DetailedResult>?</DetailedResult>");
    WString clean;
    EXPECT_EQ(Detailed(L"fine", L"i", &clean), L"<DetailedResult>fine</DetailedResult>");
    EXPECT_TRUE(clean.IsEmpty());
}

TEST(WriteUriList, OneEscapedUriPerStringAndSelfClosedWhenEmpty) {
    FakeEnumUris uris;
    uris.uris = {L"//localhost/a&b", L"//localhost/\x1"};
    WString out;
    XmlElement fragment;
    fragment.openRoot(&out, nullptr);
    WriteUriList(fragment, &uris);
    WriteUriList(fragment, &uris);  // exhausted now
    EXPECT_EQ(Std(out), L"<URIs><URI>//localhost/a&amp;b</URI><URI>//localhost/?</URI></URIs><URIs />");
    EXPECT_EQ(uris.refs, 0);
    api::testing::ExpectNoLeaks();
}

}  // namespace
}  // namespace qel::xml
