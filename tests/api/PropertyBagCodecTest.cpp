// Property bags and tag lists read from numbered request arguments.
#include "api/PropertyBagCodec.h"

#include <gtest/gtest.h>

#include "support/TimeZone.h"

#include <cstdlib>
#include <ctime>
#include <string>
#include <vector>

#include "FakeFramework.h"
#include "foundation/Exception.h"
#include "foundation/Status.h"

namespace qel::api::testing {
namespace {

using Log = std::vector<std::wstring>;

ArgumentMap Args(std::initializer_list<std::pair<const wchar_t*, const wchar_t*>> pairs) {
    ArgumentMap map;
    for (auto [k, v] : pairs) map[WString(k)] = WString(v);
    return map;
}

// One property of bag 0 given as type code and text.
ArgumentMap OneProperty(const wchar_t* type, const wchar_t* value, const wchar_t* version = nullptr) {
    ArgumentMap map = Args({{L"NbrTags_0", L"1"}, {L"Tag_0_0", L"2A"}, {L"Type_0_0", type}, {L"Value_0_0", value}});
    if (version) map[WString(L"Version")] = WString(version);
    return map;
}

int32_t Decode(const ArgumentMap& map, FakeBag& bag, uint32_t mode = 0, std::vector<PropertyTag> tags = {}) {
    try {
        DecodePropertyBag(map, &bag, mode, static_cast<uint32_t>(tags.size()), tags.data());
        return 0;
    } catch (long status) {
        return static_cast<int32_t>(status);
    }
}

using qel::testing::TimeZone;

TEST(PropertyBagCodec, ValueTextsByType) {
    TimeZone utc("UTC0");
    struct Case {
        const wchar_t* type;
        const wchar_t* value;
        const wchar_t* version;
        const wchar_t* logged;  // null: the status is kStatusFail
    } cases[] = {
        {L"1", L"-2147483648", nullptr, L"I1 2A -2147483648"},
        {L"2", L" 42abc", nullptr, L"I2 2A 42"},
        {L"3", L"-1", nullptr, L"U 2A 4294967295"},
        {L"4", L"2.5e1", nullptr, L"D 2A 25.000000"},
        {L"4", L"none", nullptr, L"D 2A 0.000000"},
        {L"5", L"{00a1b2c3-0d4e-00f5-06a7-b809cadbec0f}", nullptr, L"G 2A {00A1B2C3-0D4E-00F5-06A7-B809CADBEC0F}"},
        {L"5", L"{00a1b2c3}", nullptr, L"G 2A {00000000-0000-0000-0000-000000000000}"},
        {L"6", L" <as is> ", nullptr, L"S 2A  <as is> "},
        {L"7", L"2011 2 3 4 5 6", nullptr, L"T 2A 0/3379550706"},
        {L"7", L"2011 2 3 4 5 6", L"00010000", L"T 2A 0/3379550706"},
        {L"7", L"2011 2 3 4 5 6", L"", L"T 2A 0/3379550706"},
        {L"7", L"1900 1 1 0 0 0", nullptr, L"T 2A 0/0"},
        {L"7", L"1969 12 31 0 0 0", nullptr, L"T 2A 0/0"},
        {L"7", L"2011 2 3", nullptr, nullptr},
        {L"7", L"0 0 D3A1E480 0", L"00010001", L"T 2A 0/3550602368"},
        {L"7", L"1 2 3 4", L"0x20000", L"T 2A 8589934593/17179869187"},
        {L"7", L"0 0 D3A1E480", L"10001", nullptr},
        {L"8", L"1", nullptr, nullptr},
        {L"0", L"1", nullptr, nullptr},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(::testing::PrintToString(std::wstring(c.type) + L":" + c.value));
        FakeBag bag;
        const int32_t status = Decode(OneProperty(c.type, c.value, c.version), bag);
        if (c.logged) {
            EXPECT_EQ(status, 0);
            EXPECT_EQ(bag.log, Log{c.logged});
        } else {
            EXPECT_EQ(status, fnd::kStatusFail);
            EXPECT_TRUE(bag.log.empty());
        }
        EXPECT_EQ(bag.refs, 0);
    }
}

TEST(PropertyBagCodec, LocalTimesFollowTheProcessTimeZone) {
    TimeZone cet("CET-1");
    FakeBag bag;
    EXPECT_EQ(Decode(OneProperty(L"7", L"2011 2 3 5 5 6"), bag), 0);
    EXPECT_EQ(bag.log, Log{L"T 2A 0/3379550706"});
}

TEST(PropertyBagCodec, TimesNeedTheExtendedBag) {
    FakeBag bag;
    bag.extended = false;
    EXPECT_EQ(Decode(OneProperty(L"7", L"0 0 1 0", L"10001"), bag), fnd::kStatusNoInterface);
    EXPECT_EQ(Decode(OneProperty(L"1", L"3"), bag), 0);
    EXPECT_EQ(bag.log, Log{L"I1 2A 3"});
    EXPECT_EQ(bag.refs, 0);
}

TEST(PropertyBagCodec, CountsAndFilterModes) {
    ArgumentMap ten;
    ten[WString(L"NbrTags_0")] = WString(L"A");
    for (int i = 0; i < 10; ++i) {
        const std::wstring n = std::to_wstring(i);
        ten[WString((L"Tag_0_" + n).c_str())] = WString(std::to_wstring(10 + i).c_str());
        ten[WString((L"Type_0_" + n).c_str())] = WString(L"1");
        ten[WString((L"Value_0_" + n).c_str())] = WString(n.c_str());
    }
    FakeBag all;
    EXPECT_EQ(Decode(ten, all), 0);
    ASSERT_EQ(all.log.size(), 10u);
    EXPECT_EQ(all.log[9], L"I1 19 9");

    // Mode 1 skips listed tags without reading their type or value; any
    // other mode keeps only them.
    ArgumentMap sparse = ten;
    sparse.erase(WString(L"Type_0_5"));
    sparse.erase(WString(L"Value_0_5"));
    FakeBag skipped;
    EXPECT_EQ(Decode(sparse, skipped, 1, {0x15}), 0);
    EXPECT_EQ(skipped.log.size(), 9u);
    FakeBag only;
    EXPECT_EQ(Decode(ten, only, 2, {0x13, 0x17}), 0);
    EXPECT_EQ(only.log, (Log{L"I1 13 3", L"I1 17 7"}));
    FakeBag failsOnMissing;
    EXPECT_EQ(Decode(sparse, failsOnMissing, 0), fnd::kStatusFail);
    EXPECT_EQ(failsOnMissing.log.size(), 5u) << "the properties before the missing one are set";

    FakeBag none;
    EXPECT_EQ(Decode(Args({{L"NbrTags_0", L"0"}, {L"Tag_0_0", L"junk"}}), none), 0);
    EXPECT_TRUE(none.log.empty());
    EXPECT_EQ(Decode(Args({}), none), fnd::kStatusFail);
}

TEST(PropertyBagCodec, FirstFailingSetterStopsTheBag) {
    ArgumentMap map = Args({{L"NbrTags_0", L"3"},
                            {L"Tag_0_0", L"1"}, {L"Type_0_0", L"3"}, {L"Value_0_0", L"1"},
                            {L"Tag_0_1", L"2"}, {L"Type_0_1", L"3"}, {L"Value_0_1", L"2"},
                            {L"Tag_0_2", L"3"}, {L"Type_0_2", L"3"}, {L"Value_0_2", L"3"}});
    FakeBag bag;
    bag.failingTag = 2;
    EXPECT_EQ(Decode(map, bag), bag.failure);
    EXPECT_EQ(bag.log, (Log{L"U 1 1", L"U 2 2"}));
}

TEST(PropertyBagCodec, OutOfRangeNumbersThrowTheConversionError) {
    FakeBag bag;
    EXPECT_THROW(Decode(OneProperty(L"1", L"2147483648"), bag), fnd::exception::UnableToConvert);
    EXPECT_THROW(Decode(OneProperty(L"3", L"4294967296"), bag), fnd::exception::UnableToConvert);
    EXPECT_THROW(Decode(Args({{L"NbrTags_0", L"100000000"}}), bag), fnd::exception::UnableToConvert);
    EXPECT_TRUE(bag.log.empty());
}

TEST(PropertyBagCodec, TagListsAndRequiredArguments) {
    const ArgumentMap map = Args({{L"Tag_0", L"0x1000000"}, {L"Tag_1", L"  ff"}, {L"tag_2", L""}});
    PropertyTag tags[3] = {};
    ReadTagList(map, 3, tags);
    EXPECT_EQ(tags[0], 0x1000000u);
    EXPECT_EQ(tags[1], 0xFFu);
    EXPECT_EQ(tags[2], 0u);
    PropertyTag more[4] = {};
    try {
        ReadTagList(map, 4, more);
        ADD_FAILURE() << "a missing tag must fail";
    } catch (long status) {
        EXPECT_EQ(status, static_cast<long>(fnd::kStatusFail));
    }
    EXPECT_EQ(more[2], 0u);
    EXPECT_EQ(GetRequestVariable(map, L"TAG_1", false)->Length(), 4u);
    EXPECT_EQ(GetRequestVariable(map, L"Tag_9", false), nullptr);
}

}  // namespace
}  // namespace qel::api::testing
