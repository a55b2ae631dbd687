// The item and property operations through the dispatcher, against fake
// framework objects: exact bodies, statuses, and every reference released.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "FakeFramework.h"
#include "foundation/Status.h"

namespace qel::api::testing {
namespace {

constexpr int32_t kFail = fnd::kStatusFail;
const int32_t kBroken = fnd::Status(0x8ABC0042u);

// A bag holding one property of each type, in an order the output keeps.
void FillMixed(FakeBag& bag) {
    bag.Add(0x2001, kTypeInteger1).integer = -1;
    bag.Add(0x2002, kTypeInteger2).integer = 7;
    bag.Add(0x2003, kTypeUnsigned).unsignedValue = 0xFFFFFFFFu;
    bag.Add(0x2004, kTypeDouble).real = 0.5;
    bag.Add(0x2005, kTypeGuid).guid = Guid{0x00A1B2C3, 0x0D4E, 0x00F5, {6, 0xA7, 0xB8, 9, 0xCA, 0xDB, 0xEC, 0x0F}};
    bag.Add(0x2006, kTypeString).text = L"<a & 'b'>";
    bag.Add(0x2007, kTypeString);
    bag.Add(0x2008, kTypeTime).time = AbsTime{0, 0xE0000000};
}

const std::wstring kMixedProperties =
    L"<Property tag='2001' type='1'>-1</Property>"
    L"<Property tag='2002' type='2'>7</Property>"
    L"<Property tag='2003' type='3'>4294967295</Property>"
    L"<Property tag='2004' type='4'>0.500000</Property>"
    L"<Property tag='2005' type='5'>{00A1B2C3-0D4E-00F5-06A7-B809CADBEC0F}</Property>"
    L"<Property tag='2006' type='6'>&lt;a &amp; &apos;b&apos;&gt;</Property>"
    L"<Property tag='2007' type='6' />"
    L"<Property tag='2008' type='7'>0 0 E0000000 0</Property>";

TEST(Dispatcher, RefusesOperationsThroughTheWrongMapping) {
    struct Case {
        const wchar_t* function;
        bool authenticated, firmware;
    } cases[] = {
        {L"PerformDeviceReset", false, true},  {L"DiagnosticSelfTest", false, true},
        {L"DiagnosticSelfCalibrate", false, false}, {L"RenameAlias", false, true},
        {L"PersistPropertyChanges", false, false}, {L"BeginFirmwareChange", true, false},
        {L"UpdateFirmwareVersion", true, false}, {L"UpdateFirmwareImage", false, false},
        {L"EraseFirmware", true, false},
    };
    FakeFramework fake;
    Dispatch dispatch(fake);
    for (const Case& c : cases) {
        SCOPED_TRACE(c.function);
        auto r = dispatch.Run({{L"Function", c.function}, {L"RequestToken", L"t"}, {L"DiagnosticMode", L"1"}},
                              c.authenticated, c.firmware);
        EXPECT_TRUE(r.thrown);
        EXPECT_EQ(r.status, fnd::kStatusWrongMapping);
        EXPECT_EQ(r.body, L"");
    }
    EXPECT_TRUE(fake.log.empty());
    EXPECT_TRUE(fake.firmware.log.empty());
    EXPECT_TRUE(fake.diagnostics.log.empty());
    fake.ExpectAllReleased();
}

TEST(Dispatcher, NotificationOperationsAreNotAvailable) {
    FakeFramework fake;
    Dispatch dispatch(fake);
    for (const wchar_t* name : {L"RegisterNotifications", L"WaitForNotification", L"UnregisterNotifications"}) {
        auto r = dispatch.Run({{L"Function", name}, {L"Context", L"1"}});
        EXPECT_TRUE(r.thrown);
        EXPECT_EQ(r.status, kFail) << name;
    }
}

TEST(GetPropertiesOfItem, WritesEveryPropertyInItsTextForm) {
    FakeFramework fake;
    FillMixed(fake.item);
    Dispatch dispatch(fake);
    auto r = dispatch.Run({{L"function", L"getpropertiesofitem"}, {L"Plugins", L"P"}, {L"Items", L"I"}});
    EXPECT_FALSE(r.thrown);
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.body, L"<PropertyBag>" + kMixedProperties + L"</PropertyBag>");
    EXPECT_EQ(fake.log, std::vector<std::wstring>{L"get //localhost/P/I"});
    fake.ExpectAllReleased();
    ExpectNoLeaks();
}

TEST(GetPropertiesOfItem, LegacyBagTimeBefore1904IsZero) {
    FakeFramework fake;
    fake.item.extended = false;
    fake.item.Add(0x7, kTypeTime).fields = DateTimeFields{1903, 12, 31, 23, 59, 59};
    Dispatch dispatch(fake);
    auto r = dispatch.Run({{L"Function", L"GetPropertiesOfItem"}});
    EXPECT_EQ(r.body, L"<PropertyBag><Property tag='7' type='7'>0 0 0 0</Property></PropertyBag>");
    fake.ExpectAllReleased();
}

TEST(GetPropertiesOfItem, FailuresAreThrownAndReleaseTheBag) {
    FakeFramework fake;
    Dispatch dispatch(fake);
    fake.itemStatus = kBroken;
    auto r = dispatch.Run({{L"Function", L"GetPropertiesOfItem"}});
    EXPECT_TRUE(r.thrown);
    EXPECT_EQ(r.status, kBroken);
    EXPECT_EQ(r.body, L"");
    fake.ExpectAllReleased();

    // A failing value query keeps the properties written before it.
    fake.itemStatus = 0;
    fake.item.Add(0x1, kTypeInteger1).integer = 5;
    fake.item.Add(0x2, kTypeString).text = L"lost";
    fake.item.Add(0x3, kTypeInteger1);
    fake.item.failingTag = 0x2;
    r = dispatch.Run({{L"Function", L"GetPropertiesOfItem"}});
    EXPECT_EQ(r.status, fake.item.failure);
    EXPECT_EQ(r.body, L"<PropertyBag><Property tag='1' type='1'>5</Property></PropertyBag>");

    // An unknown type code fails the whole list.
    fake.item.failingTag = 0xFFFFFFFF;
    fake.item.properties[1].type = 8;
    r = dispatch.Run({{L"Function", L"GetPropertiesOfItem"}});
    EXPECT_EQ(r.status, kFail);
    fake.ExpectAllReleased();
    ExpectNoLeaks();
}

TEST(SearchForItemNames, ListsEscapedNamesOnlyWhenFound) {
    FakeFramework fake;
    fake.uris.uris = {L"//localhost/a", L"//localhost/<b>&'c'"};
    Dispatch dispatch(fake);
    auto r = dispatch.Run({{L"Function", L"SearchForItemNames"}, {L"Plugins", L""}, {L"Items", L""}});
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.body, L"<URIs><URI>//localhost/a</URI><URI>//localhost/&lt;b&gt;&amp;&apos;c&apos;</URI></URIs>");
    EXPECT_EQ(fake.log.back(), L"names //localhost");

    fake.uris.next = 2;
    r = dispatch.Run({{L"Function", L"SearchForItemNames"}});
    EXPECT_EQ(r.body, L"<URIs />");

    fake.namesStatus = fnd::kStatusFalse;
    fake.uris.next = 0;
    r = dispatch.Run({{L"Function", L"SearchForItemNames"}});
    EXPECT_FALSE(r.thrown);
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.body, L"");

    fake.namesStatus = kBroken;
    r = dispatch.Run({{L"Function", L"SearchForItemNames"}});
    EXPECT_TRUE(r.thrown);
    EXPECT_EQ(r.status, kBroken);
    fake.ExpectAllReleased();
    ExpectNoLeaks();
}

TEST(SearchForItemsAndProperties, FilterModeAndBagCount) {
    struct Case {
        std::vector<std::pair<const wchar_t*, std::wstring>> args;
        uint32_t mode;
        bool filter;
    } cases[] = {
        {{}, 1, false},
        {{{L"FilterMode", L""}}, 0, false},
        {{{L"FilterMode", L"0x1F"}, {L"NbrBags", L"0"}}, 0x1F, false},
        {{{L"FilterMode", L"2"}, {L"NbrBags", L"1"}, {L"NbrTags_0", L"0"}}, 2, true},
    };
    FakeFramework fake;
    Dispatch dispatch(fake);
    for (const Case& c : cases) {
        ArgumentMap map;
        map[WString(L"Function")] = WString(L"SearchForItemsAndProperties");
        for (const auto& [k, v] : c.args) map[WString(k)] = WString(v.c_str());
        auto r = dispatch.Run(map);
        EXPECT_EQ(r.status, 0);
        EXPECT_EQ(fake.searchFilterMode, c.mode);
        EXPECT_EQ(fake.searchHadFilter, c.filter);
        EXPECT_EQ(r.body, L"<PropertyBags />");
        fake.bags.next = 0;
    }
    fake.ExpectAllReleased();

    auto r = dispatch.Run({{L"Function", L"SearchForItemsAndProperties"}, {L"NbrBags", L"2"}});
    EXPECT_TRUE(r.thrown);
    EXPECT_EQ(r.status, kFail);
    EXPECT_EQ(fake.log.size(), 5u) << "no framework call for two bags";  // four searches, one bag created
}

TEST(SearchForItemsAndProperties, DecodesTheFilterAndWritesEachBag) {
    FakeFramework fake;
    FakeBag first, second;
    FillMixed(first);
    second.Add(0x1000001, kTypeString).text = L"//localhost/P/I";
    fake.bags.items = {&first, &second};
    Dispatch dispatch(fake);
    auto r = dispatch.Run({{L"Function", L"SearchForItemsAndProperties"},
                           {L"Plugins", L"P"},
                           {L"NbrBags", L"1"},
                           {L"NbrTags_0", L"2"},
                           {L"Tag_0_0", L"1000000"},
                           {L"Type_0_0", L"6"},
                           {L"Value_0_0", L"//localhost/P/I"},
                           {L"Tag_0_1", L"0x2008"},
                           {L"Type_0_1", L"7"},
                           {L"Value_0_1", L"1900 1 1 0 0 0"}});
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(fake.created.log, (std::vector<std::wstring>{L"S 1000000 //localhost/P/I", L"T 2008 0/0"}));
    EXPECT_EQ(fake.log, (std::vector<std::wstring>{L"create", L"search //localhost/P"}));
    EXPECT_EQ(r.body, L"<PropertyBags><PropertyBag>" + kMixedProperties +
                          L"</PropertyBag><PropertyBag><Property tag='1000001' type='6'>//localhost/P/I</Property>"
                          L"</PropertyBag></PropertyBags>");
    EXPECT_EQ(first.refs, 0);
    EXPECT_EQ(second.refs, 0);
    fake.ExpectAllReleased();
    ExpectNoLeaks();
}

TEST(SearchForItemsAndProperties, NothingFoundAndFailures) {
    FakeFramework fake;
    Dispatch dispatch(fake);
    fake.searchStatus = fnd::kStatusFalse;
    auto r = dispatch.Run({{L"Function", L"SearchForItemsAndProperties"}});
    EXPECT_FALSE(r.thrown);
    EXPECT_EQ(r.status, 1);
    EXPECT_EQ(r.body, L"");

    fake.searchStatus = kBroken;
    r = dispatch.Run({{L"Function", L"SearchForItemsAndProperties"}});
    EXPECT_TRUE(r.thrown);
    EXPECT_EQ(r.status, kBroken);

    // A filter property the bag refuses fails the search before it is made.
    fake.searchStatus = 0;
    fake.created.failingTag = 0x10;
    r = dispatch.Run({{L"Function", L"SearchForItemsAndProperties"},
                      {L"NbrBags", L"1"},
                      {L"NbrTags_0", L"1"},
                      {L"Tag_0_0", L"10"},
                      {L"Type_0_0", L"1"},
                      {L"Value_0_0", L"3"}});
    EXPECT_EQ(r.status, fake.created.failure);
    EXPECT_EQ(fake.log.back(), L"create");
    fake.ExpectAllReleased();
}

TEST(PopulateOrRefreshProperties, RefreshesAndWritesOnlyTheListedTags) {
    FakeFramework fake;
    FillMixed(fake.item);
    fake.item.Add(0x3001, kTypeInteger1).integer = 9;
    Dispatch dispatch(fake);
    auto r = dispatch.Run({{L"Function", L"PopulateOrRefreshProperties"},
                           {L"AllowAsyncNotification", L"1"},
                           {L"NbrTags", L"2"},
                           {L"Tag_0", L"3000"},
                           {L"Tag_1", L"2002"}});
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(fake.populatedTags, (std::vector<PropertyTag>{0x3000, 0x2002}));
    EXPECT_EQ(fake.populateAsync, 1u);
    EXPECT_EQ(r.body,
              L"<PropertyBag><Property tag='2002' type='2'>7</Property>"
              L"<Property tag='3001' type='1'>9</Property></PropertyBag>");

    // A failing refresh still answers with the bag, then fails the request.
    fake.populateStatus = kBroken;
    r = dispatch.Run({{L"Function", L"PopulateOrRefreshProperties"},
                      {L"AllowAsyncNotification", L"0"},
                      {L"NbrTags", L"1"},
                      {L"Tag_0", L"2001"}});
    EXPECT_TRUE(r.thrown);
    EXPECT_EQ(r.status, kBroken);
    EXPECT_EQ(r.body, L"<PropertyBag><Property tag='2001' type='1'>-1</Property></PropertyBag>");
    fake.ExpectAllReleased();
}

TEST(PopulateOrRefreshProperties, MissingArgumentsAndAnIncompleteTagList) {
    FakeFramework fake;
    FillMixed(fake.item);
    Dispatch dispatch(fake);
    auto r = dispatch.Run({{L"Function", L"PopulateOrRefreshProperties"}, {L"NbrTags", L"1"}});
    EXPECT_EQ(r.status, kFail);
    EXPECT_EQ(r.body, L"");
    fake.ExpectAllReleased();

    r = dispatch.Run({{L"Function", L"PopulateOrRefreshProperties"},
                      {L"AllowAsyncNotification", L"0"},
                      {L"NbrTags", L"2"},
                      {L"Tag_0", L"2001"}});
    EXPECT_TRUE(r.thrown);
    EXPECT_EQ(r.status, kFail);
    EXPECT_EQ(r.body, L"<PropertyBag />");
    EXPECT_EQ(std::count(fake.log.begin(), fake.log.end(), L"populate"), 0);
    fake.ExpectAllReleased();
}

TEST(RenameAlias, WritesTheEscapedUrisWhateverTheStatus) {
    FakeFramework fake;
    Dispatch dispatch(fake);
    const std::wstring expected =
        L"<RenameAliasResult conflictExisted='1'><URIs><URI>//localhost/P/a&apos;b</URI>"
        L"<URI>//localhost/P/&lt;c&gt;</URI></URIs></RenameAliasResult>";
    auto r = dispatch.Run({{L"Function", L"RenameAlias"},
                           {L"Plugins", L"P"},
                           {L"Items", L"x"},
                           {L"ItemName", L"y"},
                           {L"RenameValidationMode", L"A"}});
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.body, expected);
    EXPECT_EQ(fake.renameArgs, L"//localhost/P/x y 10");

    fake.renameStatus = kBroken;
    r = dispatch.Run({{L"Function", L"RenameAlias"}, {L"ItemName", L"y"}, {L"RenameValidationMode", L"A"}});
    EXPECT_TRUE(r.thrown);
    EXPECT_EQ(r.status, kBroken);
    EXPECT_EQ(r.body, expected);

    fake.renameArgs.clear();
    r = dispatch.Run({{L"Function", L"RenameAlias"}, {L"ItemName", L"y"}});
    EXPECT_EQ(r.status, kFail);
    EXPECT_EQ(r.body, L"");
    EXPECT_EQ(fake.renameArgs, L"");
    ExpectNoLeaks();
}

// A changed string and an unchanged integer, with the client's tag list.
ArgumentMap PersistRequest() {
    ArgumentMap map;
    for (auto [k, v] : std::initializer_list<std::pair<const wchar_t*, const wchar_t*>>{
             {L"Function", L"PersistPropertyChanges"},
             {L"Plugins", L"P"},
             {L"Items", L"I"},
             {L"NbrTags", L"1"},
             {L"Tag_0", L"2006"},
             {L"NbrTags_0", L"2"},
             {L"Tag_0_0", L"2001"},
             {L"Type_0_0", L"1"},
             {L"Value_0_0", L"-5"},
             {L"Tag_0_1", L"2006"},
             {L"Type_0_1", L"6"},
             {L"Value_0_1", L"new"}})
        map[WString(k)] = WString(v);
    return map;
}

TEST(PersistPropertyChanges, SetsUnchangedValuesBeforeTrackingStarts) {
    FakeFramework fake;
    Dispatch dispatch(fake);
    ArgumentMap request = PersistRequest();
    request[WString(L"ValidateOnly")] = WString(L"1");
    auto r = dispatch.Run(request);
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(fake.persistedLog,
              (std::vector<std::wstring>{L"I1 2001 -5", L"S 1000000 //localhost/P/I", L"reset", L"S 2006 new"}));
    EXPECT_EQ(fake.persistValidate, 1u);
    EXPECT_EQ(r.body, L"<PersistChanges requiresRestart='1' /><DetailedResult>saved</DetailedResult>");
    EXPECT_EQ(r.debug, L"");
    fake.ExpectAllReleased();

    // With no listed tags every property is set before the reset.
    fake.created.log.clear();
    request[WString(L"NbrTags")] = WString(L"0");
    request.erase(WString(L"ValidateOnly"));
    r = dispatch.Run(request);
    EXPECT_EQ(fake.persistedLog, (std::vector<std::wstring>{L"I1 2001 -5", L"S 2006 new",
                                                            L"S 1000000 //localhost/P/I", L"reset"}));
    EXPECT_EQ(fake.persistValidate, 0u);
    fake.ExpectAllReleased();
    ExpectNoLeaks();
}

TEST(PersistPropertyChanges, ReportsReplacedCharactersWithAnEscapedItemName) {
    FakeFramework fake;
    fake.persistDetail = std::wstring(L"bad\x1 value\x2");
    Dispatch dispatch(fake);
    ArgumentMap request = PersistRequest();
    request[WString(L"Items")] = WString(L"a'<b>");
    auto r = dispatch.Run(request);
    EXPECT_EQ(r.body, L"<PersistChanges requiresRestart='1' /><DetailedResult>bad? value?</DetailedResult>");
    EXPECT_EQ(r.debug,
              L"<InvalidChar item='//localhost/P/a&apos;&lt;b&gt;'  position='3'/>"
              L"<InvalidChar item='//localhost/P/a&apos;&lt;b&gt;'  position='A'/>");
    ExpectNoLeaks();
}

TEST(PersistPropertyChanges, FailuresStillWriteTheResultElements) {
    struct Case {
        const char* what;
        void (*arrange)(FakeFramework&, ArgumentMap&);
        int32_t status;
        const wchar_t* restart;
    } cases[] = {
        {"persist fails", [](FakeFramework& f, ArgumentMap&) { f.persistStatus = fnd::Status(0x8ABC0042u); },
         fnd::Status(0x8ABC0042u), L"1"},
        {"reset fails", [](FakeFramework& f, ArgumentMap&) { f.created.resetStatus = fnd::Status(0x8ABC0043u); },
         fnd::Status(0x8ABC0043u), L"0"},
        {"no extended bag", [](FakeFramework& f, ArgumentMap&) { f.created.extended = false; },
         fnd::kStatusNoInterface, L"0"},
        {"tag missing", [](FakeFramework&, ArgumentMap& m) { m.erase(WString(L"Tag_0")); }, fnd::kStatusFail,
         L"0"},
        {"value missing", [](FakeFramework&, ArgumentMap& m) { m.erase(WString(L"Value_0_1")); },
         fnd::kStatusFail, L"0"},
        {"create fails", [](FakeFramework& f, ArgumentMap&) { f.createStatus = fnd::Status(0x8ABC0044u); },
         fnd::Status(0x8ABC0044u), L"0"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.what);
        FakeFramework fake;
        Dispatch dispatch(fake);
        ArgumentMap request = PersistRequest();
        c.arrange(fake, request);
        auto r = dispatch.Run(request);
        EXPECT_TRUE(r.thrown);
        EXPECT_EQ(r.status, c.status);
        const std::wstring detail = c.status == fnd::Status(0x8ABC0042u) ? L"saved" : L"";
        const std::wstring result = detail.empty() ? L"<DetailedResult></DetailedResult>"
                                                   : L"<DetailedResult>" + detail + L"</DetailedResult>";
        EXPECT_EQ(r.body, L"<PersistChanges requiresRestart='" + std::wstring(c.restart) + L"' />" + result);
        fake.ExpectAllReleased();
    }

    FakeFramework fake;
    Dispatch dispatch(fake);
    ArgumentMap request = PersistRequest();
    request.erase(WString(L"NbrTags"));
    auto r = dispatch.Run(request);
    EXPECT_EQ(r.status, fnd::kStatusFail);
    EXPECT_EQ(r.body, L"");
    EXPECT_TRUE(fake.log.empty());
    ExpectNoLeaks();
}

}  // namespace
}  // namespace qel::api::testing
