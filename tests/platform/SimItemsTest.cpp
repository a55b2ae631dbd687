// Items of the simulated device as a client finds and reads them: locators,
// search filters, property bags of both kinds, refreshing, and model checks.
#include <gtest/gtest.h>

#include <ctime>

#include "FrameworkTestSupport.h"

namespace qel::sim::test {
namespace {

constexpr int32_t kPointer = static_cast<int32_t>(0x80004003u);
constexpr int32_t kInvalidArg = static_cast<int32_t>(0x80070057u);
constexpr int32_t kBadLocator = static_cast<int32_t>(0x80040372u);
constexpr int32_t kInvalidModel = static_cast<int32_t>(0x8007000Du);

const char kItems[] = R"("items": [
  {"expert": "controller", "name": "System", "uri": "//localhost/controller/System", "alias": "sys",
   "properties": [
     {"tag": "0x0103A000", "type": 3, "value": 4, "readOnly": true},
     {"tag": "0x0103C000", "type": 6, "value": "QX-2040"},
     {"tag": "0x01050000", "type": 1, "value": -5},
     {"tag": "0x01051000", "type": 2, "value": 7},
     {"tag": "0x01052000", "type": 4, "value": 2.5},
     {"tag": "0x01053000", "type": 5, "value": "{5e8b1f3a-07c4-4d92-8a61-3b9c2e7d4f10}"},
     {"tag": "0x01054000", "type": 7, "value": {"seconds": 3600000000, "fraction": 5}},
     {"tag": "0x01055000", "type": 7, "value": "2026-03-14 09:26:53"}]},
  {"expert": "network", "name": "Ethernet0", "uri": "//localhost/network/Ethernet0", "alias": "eth0",
   "properties": [
     {"tag": "0x02001000", "type": 6, "value": "192.168.1.5"},
     {"tag": "0x02004000", "type": 3, "value": 0},
     {"tag": "0x0103A000", "type": 3, "value": 2}]},
  {"expert": "network", "name": "Ethernet1", "uri": "//localhost/network/Ethernet1", "alias": "eth1",
   "properties": [
     {"tag": "0x02001000", "type": 6, "value": "0.0.0.0"},
     {"tag": "0x02004000", "type": 3, "value": 1}]},
  {"expert": "storage", "name": "Clock", "uri": "//localhost/storage/Clock", "legacyBag": true,
   "properties": [
     {"tag": "0x03001000", "type": 7, "value": "2026-03-14 09:26:53"},
     {"tag": "0x03002000", "type": 7, "value": {"seconds": 3600000000}},
     {"tag": "0x03003000", "type": 6, "value": "pool.ntp.org"}]}
])";

const std::wstring kSystem = L"//localhost/controller/System";
const std::wstring kEth0 = L"//localhost/network/Ethernet0";
const std::wstring kEth1 = L"//localhost/network/Ethernet1";
const std::wstring kClock = L"//localhost/storage/Clock";

/// Times are compared in UTC, whatever zone the machine is in.
class SimItems : public SimDevice {
protected:
    void SetUp() override {
        SimDevice::SetUp();
        if (const char* zone = std::getenv("TZ")) savedZone_ = zone;
        setenv("TZ", "UTC0", 1);
        tzset();
        ASSERT_NO_FATAL_FAILURE(WriteModel(ModelWith(kItems)));
        ASSERT_NO_FATAL_FAILURE(Instantiate(framework_));
    }
    void TearDown() override {
        framework_.Reset();
        if (savedZone_)
            setenv("TZ", savedZone_->c_str(), 1);
        else
            unsetenv("TZ");
        tzset();
        SimDevice::TearDown();
    }

    /// The URIs a search for names answers, with its status.
    std::pair<int32_t, std::vector<std::wstring>> Names(const wchar_t* locator) {
        Ref<api::IkrSysEnumUris> uris;
        int32_t status = framework_->SearchForItemNames(locator, uris.Out());
        if (!uris.Get()) return {status, {}};
        return {status, ReadUris(uris.Get())};
    }

    /// The item URIs of the bags a search answers, with its status.
    std::pair<int32_t, std::vector<std::wstring>> Search(const wchar_t* locator, uint32_t mode,
                                                         api::IkrSysPropertyBag* filter) {
        Ref<api::IkrSysEnumPropertyBags> bags;
        int32_t status = framework_->SearchForItemsAndProperties(locator, mode, filter, bags.Out());
        std::vector<std::wstring> uris;
        if (!bags.Get()) return {status, uris};
        api::IkrSysPropertyBag* bag = nullptr;
        while (bags->Next(1, &bag, nullptr) == 0) {
            uris.push_back(ReadBag(bag)[0x01000000]);
            bag->Release();
        }
        return {status, uris};
    }

    Ref<api::IkrSysFramework> framework_;
    std::optional<std::string> savedZone_;
};

TEST_F(SimItems, LocatorsSelectByExpertAndName) {
    using List = std::vector<std::wstring>;
    struct {
        const wchar_t* locator;
        int32_t status;
        List uris;
    } cases[] = {
        {L"//localhost", 0, {kSystem, kEth0, kEth1, kClock}},
        {L"//localhost/", 0, {kSystem, kEth0, kEth1, kClock}},
        {L"//localhost/network", 0, {kEth0, kEth1}},
        {L"//localhost/storage,controller", 0, {kSystem, kClock}},
        {L"//localhost/network/Ethernet1", 0, {kEth1}},
        {L"//localhost/network/Ethernet1,Ethernet0", 0, {kEth0, kEth1}},
        {L"//localhost/network/eth0", 0, {kEth0}},
        {L"//localhost/network,storage/Clock,Ethernet0", 0, {kEth0, kClock}},
        {L"//localhost/network/Clock", 1, {}},
        {L"//localhost/nothing", 1, {}},
        {L"//localhost/controller/system", 1, {}},
        {L"//localhost/a/b/c", kBadLocator, {}},
        {L"//otherhost/network", kBadLocator, {}},
        {nullptr, kPointer, {}},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.locator ? c.locator : L"(null)");
        auto [status, uris] = Names(c.locator);
        EXPECT_EQ(status, c.status);
        EXPECT_EQ(uris, c.uris);
        // The property search selects the same items.
        auto [searchStatus, searched] = Search(c.locator, 0, nullptr);
        EXPECT_EQ(searchStatus, c.status);
        EXPECT_EQ(searched, c.uris);
    }
}

TEST_F(SimItems, BagHoldsTheUriAndEveryPropertyWithItsType) {
    Ref<api::IkrSysPropertyBag> bag;
    ASSERT_EQ(framework_->GetPropertiesOfItem(L"//localhost/controller/System", bag.Out()), 0);
    std::map<api::PropertyTag, std::wstring> expected = {
        {0x01000000, kSystem},
        {0x0103A000, L"4"},
        {0x0103C000, L"QX-2040"},
        {0x01050000, L"-5"},
        {0x01051000, L"7"},
        {0x01052000, L"2.5"},
        {0x01053000, L"{5E8B1F3A-07C4-4D92-8A61-3B9C2E7D4F10}"},
        {0x01054000, L"T3600000000.5"},
        {0x01055000, L"T3856325213.0"},
    };
    EXPECT_EQ(ReadBag(bag.Get()), expected);

    // The URI comes first, then the model's order.
    Ref<api::IkrSysEnumTags> tags;
    ASSERT_EQ(bag->EnumPropertyTags(tags.Out()), 0);
    api::PropertyTag first[3] = {};
    uint32_t fetched = 0;
    EXPECT_EQ(tags->Next(3, first, &fetched), 0);
    EXPECT_EQ(first[0], 0x01000000u);
    EXPECT_EQ(first[1], 0x0103A000u);
    EXPECT_EQ(first[2], 0x0103C000u);

    api::PropertyTypeCode type = 0;
    EXPECT_EQ(bag->GetPropertyType(0x01000000, &type), 0);
    EXPECT_EQ(type, 6u);
}

TEST_F(SimItems, GettersRefuseMissingTagsAndOtherTypes) {
    Ref<api::IkrSysPropertyBag> bag;
    ASSERT_EQ(framework_->GetPropertiesOfItem(L"//localhost/controller/System", bag.Out()), 0);
    int32_t i = 99;
    uint32_t u = 99;
    api::SysString s = reinterpret_cast<api::SysString>(uintptr_t{0x10});
    EXPECT_EQ(bag->GetUnsigned(0x0103C000, &u), kStatusTypeMismatch);
    EXPECT_EQ(u, 0u);
    EXPECT_EQ(bag->GetInteger2(0x01050000, &i), kStatusTypeMismatch);  // an Integer1 is not an Integer2
    EXPECT_EQ(bag->GetInteger1(0x01050000, &i), 0);
    EXPECT_EQ(i, -5);
    EXPECT_EQ(bag->GetString(0x0DEAD000, &s), kStatusNoSuchProperty);
    EXPECT_EQ(s, nullptr);
    EXPECT_EQ(bag->GetString(0x0103C000, nullptr), kPointer);
    api::PropertyTypeCode type = 9;
    EXPECT_EQ(bag->GetPropertyType(0x0DEAD000, &type), kStatusNoSuchProperty);
    EXPECT_EQ(type, 0u);
}

TEST_F(SimItems, TimesComeThroughBothKindsOfBag) {
    // The legacy item's bag has no extended interface: times are calendar fields.
    Ref<api::IkrSysPropertyBag> legacy;
    ASSERT_EQ(framework_->GetPropertiesOfItem(L"//localhost/storage/Clock", legacy.Out()), 0);
    void* ex = reinterpret_cast<void*>(uintptr_t{0x10});
    EXPECT_EQ(legacy->QueryInterface(api::kIID_IkrSysPropertyBagEx, &ex), static_cast<int32_t>(0x80004002u));
    EXPECT_EQ(ex, nullptr);
    std::map<api::PropertyTag, std::wstring> expected = {
        {0x01000000, kClock},
        {0x03001000, L"L2026-03-14 09:26:53"},
        {0x03002000, L"L2018-01-28 16:00:00"},
        {0x03003000, L"pool.ntp.org"},
    };
    EXPECT_EQ(ReadBag(legacy.Get()), expected);

    // The extended bag answers both ways for the same value.
    Ref<api::IkrSysPropertyBag> bag;
    ASSERT_EQ(framework_->GetPropertiesOfItem(L"//localhost/controller/System", bag.Out()), 0);
    api::DateTimeFields fields;
    ASSERT_EQ(bag->GetDateTime(0x01055000, &fields), 0);
    EXPECT_EQ(fields.year, 2026);
    EXPECT_EQ(fields.month, 3);
    EXPECT_EQ(fields.day, 14);
    EXPECT_EQ(fields.hour, 9);
    EXPECT_EQ(fields.minute, 26);
    EXPECT_EQ(fields.second, 53);
}

TEST_F(SimItems, GetPropertiesNeedsExactlyOneItem) {
    struct {
        const wchar_t* locator;
        int32_t status;
    } cases[] = {
        {L"//localhost/network/Ethernet0", 0},
        {L"//localhost/network/eth1", 0},
        {L"//localhost/storage", 0},
        {L"//localhost/network", kStatusAmbiguousItem},
        {L"//localhost", kStatusAmbiguousItem},
        {L"//localhost/network/Ethernet7", kStatusNoSuchItem},
        {L"//remote/network/Ethernet0", kBadLocator},
        {nullptr, kPointer},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.locator ? c.locator : L"(null)");
        auto* sentinel = reinterpret_cast<api::IkrSysPropertyBag*>(uintptr_t{0x10});
        api::IkrSysPropertyBag* bag = sentinel;
        EXPECT_EQ(framework_->GetPropertiesOfItem(c.locator, &bag), c.status);
        if (c.status == 0) {
            ASSERT_NE(bag, sentinel);
            ASSERT_NE(bag, nullptr);
            bag->Release();
        } else {
            EXPECT_EQ(bag, nullptr);
        }
    }
    EXPECT_EQ(framework_->GetPropertiesOfItem(L"//localhost", nullptr), kPointer);
}

TEST_F(SimItems, FilterModesKeepAllOrAnyMatches) {
    Ref<api::IkrSysPropertyBag> filter;
    ASSERT_EQ(framework_->CreatePropertyBag(filter.Out()), 0);
    ASSERT_EQ(filter->SetUnsigned(0x02004000, 1), 0);             // Ethernet1
    ASSERT_EQ(filter->SetString(0x02001000, L"192.168.1.5"), 0);  // Ethernet0
    Ref<api::IkrSysPropertyBag> system;
    ASSERT_EQ(framework_->CreatePropertyBag(system.Out()), 0);
    ASSERT_EQ(system->SetUnsigned(0x0103A000, 4), 0);
    Ref<api::IkrSysPropertyBag> wrongType;
    ASSERT_EQ(framework_->CreatePropertyBag(wrongType.Out()), 0);
    ASSERT_EQ(wrongType->SetInteger1(0x0103A000, 4), 0);
    Ref<api::IkrSysPropertyBag> empty;
    ASSERT_EQ(framework_->CreatePropertyBag(empty.Out()), 0);

    using List = std::vector<std::wstring>;
    struct {
        const char* what;
        const wchar_t* locator;
        uint32_t mode;
        api::IkrSysPropertyBag* filter;
        int32_t status;
        List uris;
    } cases[] = {
        {"mode 0 ignores the filter", L"//localhost/network", 0, filter.Get(), 0, {kEth0, kEth1}},
        {"mode 1 needs every property", L"//localhost", 1, filter.Get(), 1, {}},
        {"mode 2 needs one property", L"//localhost", 2, filter.Get(), 0, {kEth0, kEth1}},
        {"any other mode as 2", L"//localhost", 7, filter.Get(), 0, {kEth0, kEth1}},
        {"mode 1, one property", L"//localhost", 1, system.Get(), 0, {kSystem}},
        {"the locator narrows first", L"//localhost/network", 1, system.Get(), 1, {}},
        {"the type is part of the value", L"//localhost", 1, wrongType.Get(), 1, {}},
        {"mode 1, empty filter keeps all", L"//localhost/network", 1, empty.Get(), 0, {kEth0, kEth1}},
        {"mode 2, empty filter keeps none", L"//localhost/network", 2, empty.Get(), 1, {}},
        {"no filter bag", L"//localhost/storage", 1, nullptr, 0, {kClock}},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.what);
        auto [status, uris] = Search(c.locator, c.mode, c.filter);
        EXPECT_EQ(status, c.status);
        EXPECT_EQ(uris, c.uris);
    }
}

TEST_F(SimItems, SearchBagsAreOfTheItemsKind) {
    Ref<api::IkrSysEnumPropertyBags> bags;
    ASSERT_EQ(framework_->SearchForItemsAndProperties(L"//localhost/storage,controller", 0, nullptr, bags.Out()), 0);
    api::IkrSysPropertyBag* got[3] = {};
    uint32_t fetched = 0;
    EXPECT_EQ(bags->Next(3, got, &fetched), 1);
    ASSERT_EQ(fetched, 2u);
    EXPECT_EQ(got[2], nullptr);
    EXPECT_EQ(ValueText(got[0], 0x01054000), L"T3600000000.5");
    EXPECT_EQ(ValueText(got[1], 0x03002000), L"L2018-01-28 16:00:00");
    got[0]->Release();
    got[1]->Release();
}

TEST_F(SimItems, ForeignFilterBagIsRefused) {
    // A bag from another framework instance is ours too; a made-up object is not.
    struct Foreign final : api::IkrSysPropertyBag {
        int32_t QueryInterface(const api::Guid&, void** out) override { return *out = nullptr, 0x80004002; }
        uint32_t AddRef() override { return 1; }
        uint32_t Release() override { return 1; }
        int32_t EnumPropertyTags(api::IkrSysEnumTags**) override { return -1; }
        int32_t GetPropertyType(api::PropertyTag, api::PropertyTypeCode*) override { return -1; }
        int32_t SetInteger1(api::PropertyTag, int32_t) override { return -1; }
        int32_t SetInteger2(api::PropertyTag, int32_t) override { return -1; }
        int32_t SetUnsigned(api::PropertyTag, uint32_t) override { return -1; }
        int32_t SetDouble(api::PropertyTag, double) override { return -1; }
        int32_t SetGuid(api::PropertyTag, api::Guid) override { return -1; }
        int32_t SetString(api::PropertyTag, const wchar_t*) override { return -1; }
        int32_t GetInteger1(api::PropertyTag, int32_t*) override { return -1; }
        int32_t GetInteger2(api::PropertyTag, int32_t*) override { return -1; }
        int32_t GetUnsigned(api::PropertyTag, uint32_t*) override { return -1; }
        int32_t GetDouble(api::PropertyTag, double*) override { return -1; }
        int32_t GetGuid(api::PropertyTag, api::Guid*) override { return -1; }
        int32_t GetString(api::PropertyTag, api::SysString*) override { return -1; }
        int32_t GetDateTime(api::PropertyTag, api::DateTimeFields*) override { return -1; }
    } foreign;
    Ref<api::IkrSysEnumPropertyBags> bags;
    EXPECT_EQ(framework_->SearchForItemsAndProperties(L"//localhost", 1, &foreign, bags.Out()), kInvalidArg);
    EXPECT_EQ(bags.Get(), nullptr);
    EXPECT_EQ(framework_->PopulateOrRefreshProperties(&foreign, 0, nullptr, 0), kInvalidArg);
}

TEST_F(SimItems, CreatedBagIsEmptyExtendedAndTracksItsSetters) {
    Ref<api::IkrSysPropertyBag> bag;
    ASSERT_EQ(framework_->CreatePropertyBag(bag.Out()), 0);
    EXPECT_TRUE(ReadBag(bag.Get()).empty());
    Ref<api::IkrSysPropertyBagEx> ex;
    ASSERT_EQ(bag->QueryInterface(api::kIID_IkrSysPropertyBagEx, reinterpret_cast<void**>(ex.Out())), 0);
    api::AbsTime time{0xFFFFFFFF00000001ull, -2};
    ASSERT_EQ(ex->SetTimestamp(0x03001000, &time), 0);
    ASSERT_EQ(ex->SetGuid(0x01053000, api::Guid{1, 2, 3, {4, 5, 6, 7, 8, 9, 10, 11}}), 0);
    ASSERT_EQ(ex->SetDouble(0x01052000, -0.125), 0);
    ASSERT_EQ(ex->SetString(0x0103C000, L"a"), 0);
    ASSERT_EQ(ex->SetString(0x0103C000, L"b"), 0);  // replaces
    ASSERT_EQ(ex->SetInteger2(0x01052000, 3), 0);    // replaces with another type
    EXPECT_EQ(ex->SetString(0x0103C000, nullptr), kPointer);
    EXPECT_EQ(ex->SetTimestamp(0x03001000, nullptr), kPointer);
    std::map<api::PropertyTag, std::wstring> expected = {
        {0x03001000, L"T-2.18446744069414584321"},
        {0x01053000, L"{00000001-0002-0003-0405-060708090A0B}"},
        {0x01052000, L"3"},
        {0x0103C000, L"b"},
    };
    EXPECT_EQ(ReadBag(bag.Get()), expected);
    EXPECT_EQ(ex->ResetChangeTracking(), 0);
    // Refreshing needs a bag read from an item.
    api::PropertyTag tag = 0x0103C000;
    EXPECT_EQ(framework_->PopulateOrRefreshProperties(bag.Get(), 1, &tag, 0), kInvalidArg);
}

TEST_F(SimItems, RefreshReadsTheListedTagsAgain) {
    Ref<api::IkrSysPropertyBag> old;
    ASSERT_EQ(framework_->GetPropertiesOfItem(L"//localhost/network/Ethernet0", old.Out()), 0);

    // Another client changes two properties meanwhile.
    Ref<api::IkrSysPropertyBag> change;
    ASSERT_EQ(framework_->CreatePropertyBag(change.Out()), 0);
    ASSERT_EQ(change->SetString(0x01000000, kEth0.c_str()), 0);
    ASSERT_EQ(change->SetString(0x02001000, L"10.0.0.9"), 0);
    ASSERT_EQ(change->SetUnsigned(0x02004000, 1), 0);
    uint32_t restart = 0;
    api::SysString detail = nullptr;
    ASSERT_EQ(framework_->PersistChanges(change.Get(), 0, &restart, &detail), 0);
    Take(detail);

    api::PropertyTag refresh[] = {0x02004000};
    EXPECT_EQ(framework_->PopulateOrRefreshProperties(old.Get(), 1, refresh, 1), 0);
    EXPECT_EQ(ValueText(old.Get(), 0x02004000), L"1");
    EXPECT_EQ(ValueText(old.Get(), 0x02001000), L"192.168.1.5");  // not listed: as read

    // An unknown tag refreshes nothing at all.
    api::PropertyTag bad[] = {0x02001000, 0x0DEAD000};
    EXPECT_EQ(framework_->PopulateOrRefreshProperties(old.Get(), 2, bad, 0), kStatusNoSuchProperty);
    EXPECT_EQ(ValueText(old.Get(), 0x02001000), L"192.168.1.5");
    EXPECT_EQ(framework_->PopulateOrRefreshProperties(old.Get(), 1, nullptr, 0), kPointer);
    EXPECT_EQ(framework_->PopulateOrRefreshProperties(nullptr, 0, nullptr, 0), kPointer);
    EXPECT_EQ(framework_->PopulateOrRefreshProperties(old.Get(), 0, nullptr, 0), 0);
}

class SimModelItems : public SimDevice {};

TEST_F(SimModelItems, MalformedItemsAreInvalidData) {
    auto item = [](std::string_view members) {
        return "\"items\": [{\"expert\": \"network\", \"name\": \"E\", \"uri\": \"//localhost/network/E\"" +
               std::string(members) + "}]";
    };
    auto property = [&](std::string_view tag, std::string_view type, std::string_view value) {
        return item(", \"properties\": [{\"tag\": " + std::string(tag) + ", \"type\": " + std::string(type) +
                    ", \"value\": " + std::string(value) + "}]");
    };
    struct {
        const char* what;
        std::string members;
    } cases[] = {
        {"items not an array", "\"items\": {}"},
        {"unknown expert", "\"items\": [{\"expert\": \"motion\", \"name\": \"E\", \"uri\": \"//localhost/x/E\"}]"},
        {"name with a comma", "\"items\": [{\"expert\": \"network\", \"name\": \"E,F\", \"uri\": \"//localhost/n/E\"}]"},
        {"uri of another host", "\"items\": [{\"expert\": \"network\", \"name\": \"E\", \"uri\": \"//remote/n/E\"}]"},
        {"uri repeated", "\"items\": [{\"expert\": \"network\", \"name\": \"E\", \"uri\": \"//localhost/n/E\"}, "
                         "{\"expert\": \"storage\", \"name\": \"F\", \"uri\": \"//localhost/n/E\"}]"},
        {"legacyBag not a flag", item(", \"legacyBag\": 1")},
        {"tag not hexadecimal", property("\"0x0100600G\"", "6", "\"x\"")},
        {"tag a number", property("16801792", "6", "\"x\"")},
        {"the URI tag", property("\"0x01000000\"", "6", "\"x\"")},
        {"type 0", property("\"0x01006000\"", "0", "1")},
        {"type 8", property("\"0x01006000\"", "8", "1")},
        {"integer beyond 32 bits", property("\"0x01006000\"", "1", "2147483648")},
        {"negative unsigned", property("\"0x01006000\"", "3", "-1")},
        {"unsigned beyond 32 bits", property("\"0x01006000\"", "3", "4294967296")},
        {"number as text", property("\"0x01006000\"", "4", "\"1.5\"")},
        {"malformed GUID", property("\"0x01006000\"", "5", "\"{1234}\"")},
        {"string as number", property("\"0x01006000\"", "6", "5")},
        {"date-time of another shape", property("\"0x01006000\"", "7", "\"2026-03-14T09:26:53\"")},
        {"month 13", property("\"0x01006000\"", "7", "\"2026-13-14 09:26:53\"")},
        {"seconds missing", property("\"0x01006000\"", "7", "{\"fraction\": 1}")},
        {"negative fraction", property("\"0x01006000\"", "7", "{\"seconds\": 1, \"fraction\": -1}")},
        {"tag twice", item(", \"properties\": [{\"tag\": \"0x1\", \"type\": 3, \"value\": 1}, "
                           "{\"tag\": \"0x01\", \"type\": 3, \"value\": 2}]")},
        {"fault without status", "\"faults\": [{\"operation\": \"SearchForItemNames\"}]"},
        {"fault that succeeds", "\"faults\": [{\"operation\": \"SearchForItemNames\", \"status\": \"0x0\"}]"},
        {"firmware pace negative", "\"firmware\": {\"millisecondsPerPercent\": -1}"},
    };
    // The same builders with good values give a model that loads.
    ASSERT_NO_FATAL_FAILURE(WriteModel(ModelWith(property("\"0x01006000\"", "7", "{\"seconds\": -1}"))));
    Ref<api::IkrSysFramework> framework;
    ASSERT_NO_FATAL_FAILURE(Instantiate(framework));
    for (const auto& c : cases) {
        SCOPED_TRACE(c.what);
        ASSERT_NO_FATAL_FAILURE(WriteModel(ModelWith(c.members)));
        EXPECT_EQ(FailedInstantiation(), kInvalidModel);
    }
}

// The model shipped as the development host's default must load and hold
// what the announcer and the catalogue rely on.
TEST_F(SimModelItems, ShippedDefaultModelLoads) {
    std::filesystem::path shipped = 
        std::filesystem::path(__FILE__).parent_path().parent_path().parent_path() / "platform/share/sim/device.json";
    std::ifstream in(shipped, std::ios::binary);
    ASSERT_TRUE(in) << shipped;
    std::string content((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
    ASSERT_NO_FATAL_FAILURE(WriteModel(content));
    Ref<api::IkrSysFramework> framework;
    ASSERT_NO_FATAL_FAILURE(Instantiate(framework));

    std::vector<ExpertTexts> experts = ListExperts(framework.Get());
    ASSERT_EQ(experts.size(), 3u);
    EXPECT_EQ(experts[0].programmaticName, L"controller");
    EXPECT_EQ(experts[1].programmaticName, L"network");
    EXPECT_EQ(experts[2].programmaticName, L"storage");

    Ref<api::IkrSysPropertyBag> filter;
    ASSERT_EQ(framework->CreatePropertyBag(filter.Out()), 0);
    ASSERT_EQ(filter->SetUnsigned(0x0103A000, 4), 0);
    Ref<api::IkrSysEnumPropertyBags> bags;
    ASSERT_EQ(framework->SearchForItemsAndProperties(L"//localhost", 1, filter.Get(), bags.Out()), 0);
    Ref<api::IkrSysPropertyBag> system;
    ASSERT_EQ(bags->Next(1, system.Out(), nullptr), 0);
    std::map<api::PropertyTag, std::wstring> values = ReadBag(system.Get());
    EXPECT_EQ(values[0x01000000], L"//localhost/controller/System");
    for (api::PropertyTag tag : {0x0103C000u, 0x01006000u, 0x01007000u, 0x0104E000u}) {
        SCOPED_TRACE(tag);
        ASSERT_TRUE(values.count(tag));
        EXPECT_FALSE(values[tag].empty());
        EXPECT_NE(values[tag][0], L'!');
    }
    Ref<api::IkrSysPropertyBag> other;
    EXPECT_EQ(bags->Next(1, other.Out(), nullptr), 1);

    Ref<api::IkrSysPropertyBag> ethernet, clock;
    ASSERT_EQ(framework->GetPropertiesOfItem(L"//localhost/network/Ethernet0", ethernet.Out()), 0);
    ASSERT_EQ(framework->GetPropertiesOfItem(L"//localhost/storage/Clock", clock.Out()), 0);
    void* ex = nullptr;
    EXPECT_NE(clock->QueryInterface(api::kIID_IkrSysPropertyBagEx, &ex), 0);
}

}  // namespace
}  // namespace qel::sim::test
