// Property values in their text forms, and local time to absolute time.
#include "xml/PropertyValue.h"

#include <gtest/gtest.h>

#include "support/TimeZone.h"

#include <cstdlib>
#include <ctime>
#include <string>
#include <tuple>

#include "api/FakeFramework.h"
#include "foundation/Exception.h"
#include "foundation/Status.h"

namespace qel::xml {
namespace {

using api::testing::FakeBag;
using api::testing::Std;

using qel::testing::TimeZone;

std::wstring Format(FakeBag& bag, api::PropertyTag tag) {
    for (const auto& p : bag.properties)
        if (p.tag == tag) return Std(FormatPropertyValue(&bag, tag, p.type));
    return L"(none)";
}

TEST(FormatPropertyValue, TextFormByType) {
    FakeBag bag;
    bag.Add(1, api::kTypeInteger1).integer = -1;
    bag.Add(2, api::kTypeInteger2).integer = 2147483647;
    bag.Add(3, api::kTypeUnsigned).unsignedValue = 0xFFFFFFFFu;
    bag.Add(4, api::kTypeDouble).real = 0.5;
    bag.Add(5, api::kTypeDouble).real = -1234.0000006;
    bag.Add(6, api::kTypeGuid);
    bag.Add(7, api::kTypeString).text = std::wstring(L"a<\0b", 4);
    bag.Add(8, api::kTypeTime).time = api::AbsTime{0, 0xE0000000};
    bag.Add(9, api::kTypeTime).time = api::AbsTime{0xFEDCBA9876543210ull, -2};
    const struct {
        api::PropertyTag tag;
        std::wstring text;
    } cases[] = {
        {1, L"-1"},
        {2, L"2147483647"},
        {3, L"4294967295"},
        {4, L"0.500000"},
        {5, L"-1234.000001"},
        {6, L"{00000000-0000-0000-0000-000000000000}"},
        {7, std::wstring(L"a<\0b", 4)},  // unescaped, embedded NUL kept
        {8, L"0 0 E0000000 0"},
        {9, L"76543210 FEDCBA98 FFFFFFFE FFFFFFFF"},
    };
    for (const auto& c : cases) EXPECT_EQ(Format(bag, c.tag), c.text) << c.tag;
    EXPECT_EQ(bag.refs, 0) << "the extended interface is released";
    api::testing::ExpectNoLeaks();
}

TEST(FormatPropertyValue, LongDoublesAreCutTo63Characters) {
    FakeBag bag;
    bag.Add(1, api::kTypeDouble).real = 1e100;
    const std::wstring text = Format(bag, 1);
    EXPECT_EQ(text.size(), 63u);
    EXPECT_EQ(text.substr(0, 5), L"10000");
}

TEST(FormatPropertyValue, LegacyBagsConvertLocalCalendarTime) {
    TimeZone cet("CET-1");
    FakeBag bag;
    bag.extended = false;
    bag.Add(1, api::kTypeTime).fields = api::DateTimeFields{1903, 12, 31, 23, 59, 59};
    bag.Add(2, api::kTypeTime).fields = api::DateTimeFields{2011, 2, 3, 5, 5, 6};
    bag.Add(3, api::kTypeTime).fields = api::DateTimeFields{1970, 1, 1, 1, 0, 0};  // 0 s UTC: rejected
    bag.Add(4, api::kTypeTime).fields = api::DateTimeFields{2011, 1, 34, 5, 5, 6};  // normalised
    EXPECT_EQ(Format(bag, 1), L"0 0 0 0");
    EXPECT_EQ(Format(bag, 2), L"0 0 C96FD9F2 0");
    EXPECT_EQ(Format(bag, 3), L"0 0 0 0");
    EXPECT_EQ(Format(bag, 4), L"0 0 C96FD9F2 0");
    EXPECT_EQ(bag.refs, 0);
}

TEST(FormatPropertyValue, FailuresAreThrownAsStatuses) {
    FakeBag bag;
    bag.Add(1, api::kTypeString).text = L"x";
    bag.Add(2, api::kTypeTime);
    bag.failingTag = 1;
    for (auto [tag, type, status] : {std::tuple{1u, api::PropertyTypeCode{api::kTypeString}, bag.failure},
                                     std::tuple{2u, api::PropertyTypeCode{0}, fnd::kStatusFail},
                                     std::tuple{2u, api::PropertyTypeCode{8}, fnd::kStatusFail}}) {
        try {
            FormatPropertyValue(&bag, tag, type);
            ADD_FAILURE() << "no status thrown for type " << type;
        } catch (long thrown) {
            EXPECT_EQ(thrown, static_cast<long>(status));
        }
    }
    bag.failingTag = 2;
    EXPECT_THROW(FormatPropertyValue(&bag, 2, api::kTypeTime), long);
    EXPECT_EQ(bag.refs, 0);
    api::testing::ExpectNoLeaks();
}

TEST(LocalDateTimeToAbsTime, CountsFrom1904InTheProcessTimeZone) {
    TimeZone utc("UTC0");
    struct tm local {};
    local.tm_year = 111;
    local.tm_mon = 1;
    local.tm_mday = 3;
    local.tm_hour = 4;
    local.tm_min = 5;
    local.tm_sec = 6;
    local.tm_isdst = -1;
    const api::AbsTime t = LocalDateTimeToAbsTime(local);
    EXPECT_EQ(t.seconds, 3379550706);
    EXPECT_EQ(t.fraction, 0u);
    EXPECT_EQ(local.tm_mday, 3) << "the caller's fields are left alone";

    local.tm_year = 70;
    local.tm_mon = 0;
    local.tm_mday = 1;
    local.tm_hour = local.tm_min = local.tm_sec = 0;
    try {
        LocalDateTimeToAbsTime(local);
        ADD_FAILURE() << "the epoch itself is refused";
    } catch (const fnd::exception::OutOfRange& e) {
        EXPECT_STREQ(e.File(), "osdep/LocalDateTimeToAbsTime");
        EXPECT_EQ(e.Line(), 44);
    }
    local.tm_sec = 1;
    EXPECT_EQ(LocalDateTimeToAbsTime(local).seconds, 2082844801);
}

}  // namespace
}  // namespace qel::xml
