// Changing the simulated device: persisting property changes, the state file
// that keeps them across restarts, and renaming aliases.
#include <gtest/gtest.h>

#include <sys/stat.h>

#include "FrameworkTestSupport.h"

namespace qel::sim::test {
namespace {

constexpr int32_t kPointer = static_cast<int32_t>(0x80004003u);
constexpr int32_t kInvalidArg = static_cast<int32_t>(0x80070057u);
constexpr int32_t kCrash = static_cast<int32_t>(0x8007001Du);

const char kItems[] = R"("items": [
  {"expert": "controller", "name": "System", "uri": "//localhost/controller/System", "alias": "sys",
   "properties": [
     {"tag": "0x0103A000", "type": 3, "value": 4, "readOnly": true},
     {"tag": "0x01007000", "type": 6, "value": "qx-lab", "requiresRestart": true},
     {"tag": "0x01042000", "type": 6, "value": "Cabinet 3"},
     {"tag": "0x01052000", "type": 4, "value": 0.25}]},
  {"expert": "network", "name": "Ethernet0", "uri": "//localhost/network/Ethernet0", "alias": "eth0",
   "properties": [{"tag": "0x02004000", "type": 3, "value": 0},
                  {"tag": "0x02009000", "type": 7, "value": {"seconds": 100}}]},
  {"expert": "network", "name": "Ethernet1", "uri": "//localhost/network/Ethernet1", "alias": "eth1",
   "properties": [{"tag": "0x02004000", "type": 3, "value": 1}]}
])";

const wchar_t kSystem[] = L"//localhost/controller/System";

struct Outcome {
    int32_t status = 0;
    uint32_t restart = 0;
    std::wstring detail;
};

/// A change as the plug-in sends it: context properties, the item's URI,
/// change tracking reset, then the changed properties.
template <typename Context, typename Changes>
Outcome Persist(api::IkrSysFramework* framework, const wchar_t* uri, uint32_t validateOnly, Context context,
                Changes changes) {
    Outcome outcome;
    Ref<api::IkrSysPropertyBag> bag;
    EXPECT_EQ(framework->CreatePropertyBag(bag.Out()), 0);
    Ref<api::IkrSysPropertyBagEx> ex;
    EXPECT_EQ(bag->QueryInterface(api::kIID_IkrSysPropertyBagEx, reinterpret_cast<void**>(ex.Out())), 0);
    if (!ex.Get()) return outcome;
    context(ex.Get());
    if (uri) {
        EXPECT_EQ(ex->SetString(0x01000000, uri), 0);
    }
    EXPECT_EQ(ex->ResetChangeTracking(), 0);
    changes(ex.Get());
    api::SysString detail = reinterpret_cast<api::SysString>(uintptr_t{0x10});
    outcome.restart = 77;
    outcome.status = framework->PersistChanges(ex.Get(), validateOnly, &outcome.restart, &detail);
    outcome.detail = Take(detail);
    return outcome;
}

auto NoContext = [](api::IkrSysPropertyBagEx*) {};

class SimPersist : public SimDevice {
protected:
    void SetUp() override {
        SimDevice::SetUp();
        ASSERT_NO_FATAL_FAILURE(WriteModel(ModelWith(kItems)));
        ASSERT_NO_FATAL_FAILURE(Instantiate(framework_));
    }
    void TearDown() override {
        framework_.Reset();
        SimDevice::TearDown();
    }

    std::wstring Value(api::IkrSysFramework* framework, const wchar_t* locator, api::PropertyTag tag) {
        Ref<api::IkrSysPropertyBag> bag;
        EXPECT_EQ(framework->GetPropertiesOfItem(locator, bag.Out()), 0);
        return bag.Get() ? ValueText(bag.Get(), tag) : L"(no bag)";
    }

    /// The host name and location as a fresh framework reads them from disk.
    std::pair<std::wstring, std::wstring> AfterRestart() {
        Ref<api::IkrSysFramework> fresh;
        EXPECT_EQ(qelsysInstantiateFramework(fresh.Out()), 0);
        if (!fresh.Get()) return {};
        return {Value(fresh.Get(), kSystem, 0x01007000), Value(fresh.Get(), kSystem, 0x01042000)};
    }

    std::string ReadFile(const std::filesystem::path& path) {
        std::ifstream in(path, std::ios::binary);
        return std::string((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
    }

    std::vector<std::string> SimFolder() {
        std::vector<std::string> names;
        for (const auto& entry : std::filesystem::directory_iterator(shared_ / "sim"))
            names.push_back(entry.path().filename().string());
        std::sort(names.begin(), names.end());
        return names;
    }

    Outcome RenameHost(const wchar_t* host, uint32_t validateOnly = 0) {
        return Persist(framework_.Get(), kSystem, validateOnly, NoContext, [&](api::IkrSysPropertyBagEx* bag) {
            bag->SetString(0x01007000, host);
            bag->SetString(0x01042000, L"Hall 2");
        });
    }

    Ref<api::IkrSysFramework> framework_;
};

TEST_F(SimPersist, AppliedChangesSurviveANewFramework) {
    Outcome outcome = RenameHost(L"qx-north");
    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.restart, 1u);
    EXPECT_EQ(outcome.detail,
              L"Item //localhost/controller/System:\n"
              L"0x01007000 changed from \"qx-lab\" to \"qx-north\" (takes effect after a restart)\n"
              L"0x01042000 changed from \"Cabinet 3\" to \"Hall 2\"\n"
              L"2 change(s) applied.");
    EXPECT_EQ(Value(framework_.Get(), kSystem, 0x01007000), L"qx-north");
    EXPECT_EQ(AfterRestart(), std::make_pair(std::wstring(L"qx-north"), std::wstring(L"Hall 2")));
    EXPECT_EQ(SimFolder(), (std::vector<std::string>{"device.json", "device.state.json"}));

    // Only the location changes now, which needs no restart; the earlier change stays.
    outcome = Persist(framework_.Get(), L"//localhost/controller/sys", 0, NoContext,
                      [](api::IkrSysPropertyBagEx* bag) { bag->SetString(0x01042000, L"Hall 3"); });
    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.restart, 0u);
    EXPECT_EQ(AfterRestart(), std::make_pair(std::wstring(L"qx-north"), std::wstring(L"Hall 3")));
}

TEST_F(SimPersist, TimesAndNumbersRoundTripThroughTheStateFile) {
    api::AbsTime time{0x8000000000000001ull, 3856325213};
    Outcome outcome = Persist(framework_.Get(), L"//localhost/network/Ethernet0", 0, NoContext,
                              [&](api::IkrSysPropertyBagEx* bag) { bag->SetTimestamp(0x02009000, &time); });
    EXPECT_EQ(outcome.status, 0) << outcome.detail;
    outcome = Persist(framework_.Get(), kSystem, 0, NoContext,
                      [&](api::IkrSysPropertyBagEx* bag) { bag->SetDouble(0x01052000, 1.0 / 3); });
    EXPECT_EQ(outcome.status, 0) << outcome.detail;

    Ref<api::IkrSysFramework> fresh;
    ASSERT_NO_FATAL_FAILURE(Instantiate(fresh));
    EXPECT_EQ(Value(fresh.Get(), L"//localhost/network/Ethernet0", 0x02009000), L"T3856325213.9223372036854775809");
    Ref<api::IkrSysPropertyBag> bag;
    ASSERT_EQ(fresh->GetPropertiesOfItem(kSystem, bag.Out()), 0);
    double value = 0;
    ASSERT_EQ(bag->GetDouble(0x01052000, &value), 0);
    EXPECT_EQ(value, 1.0 / 3);
}

TEST_F(SimPersist, ValidateOnlyChangesNothing) {
    Outcome outcome = RenameHost(L"qx-north", 1);
    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.restart, 1u);
    EXPECT_EQ(outcome.detail,
              L"Item //localhost/controller/System:\n"
              L"0x01007000 would change from \"qx-lab\" to \"qx-north\" (takes effect after a restart)\n"
              L"0x01042000 would change from \"Cabinet 3\" to \"Hall 2\"\n"
              L"Validated: 2 change(s) would be applied.");
    EXPECT_EQ(Value(framework_.Get(), kSystem, 0x01007000), L"qx-lab");
    EXPECT_FALSE(std::filesystem::exists(StatePath()));
}

TEST_F(SimPersist, OneRefusalAppliesNothing) {
    struct {
        const char* what;
        void (*change)(api::IkrSysPropertyBagEx*);
        int32_t status;
        std::wstring line;
    } cases[] = {
        {"read-only", [](api::IkrSysPropertyBagEx* b) { b->SetUnsigned(0x0103A000, 5); }, kStatusReadOnly,
         L"0x0103A000 refused: read-only"},
        {"read-only even when equal", [](api::IkrSysPropertyBagEx* b) { b->SetUnsigned(0x0103A000, 4); },
         kStatusReadOnly, L"0x0103A000 refused: read-only"},
        {"another type", [](api::IkrSysPropertyBagEx* b) { b->SetInteger1(0x01042000, 5); }, kStatusTypeMismatch,
         L"0x01042000 refused: type 6 expected, type 1 given"},
        {"no such property", [](api::IkrSysPropertyBagEx* b) { b->SetString(0x02004000, L"x"); },
         kStatusNoSuchProperty, L"0x02004000 refused: the item has no such property"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.what);
        Outcome outcome = Persist(framework_.Get(), kSystem, 0, NoContext, [&](api::IkrSysPropertyBagEx* bag) {
            bag->SetString(0x01007000, L"qx-north");
            c.change(bag);
        });
        EXPECT_EQ(outcome.status, c.status);
        EXPECT_EQ(outcome.restart, 0u);
        EXPECT_EQ(outcome.detail, L"Item //localhost/controller/System:\n"
                                  L"0x01007000 changed from \"qx-lab\" to \"qx-north\" (takes effect after a restart)\n" +
                                      c.line + L"\n1 change(s) refused; nothing was applied.");
        EXPECT_EQ(Value(framework_.Get(), kSystem, 0x01007000), L"qx-lab");
        EXPECT_FALSE(std::filesystem::exists(StatePath()));
    }
}

TEST_F(SimPersist, ContextSetBeforeTheResetIsNoChange) {
    Outcome outcome = Persist(
        framework_.Get(), kSystem, 0,
        [](api::IkrSysPropertyBagEx* bag) {
            bag->SetUnsigned(0x0103A000, 9);  // read-only, but only context
            bag->SetString(0x01042000, L"Elsewhere");
        },
        [](api::IkrSysPropertyBagEx* bag) { bag->SetString(0x01007000, L"qx-lab"); });
    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.restart, 0u);
    EXPECT_EQ(outcome.detail, L"Item //localhost/controller/System:\n0x01007000 unchanged: \"qx-lab\"\n"
                              L"0 change(s) applied.");
    EXPECT_EQ(Value(framework_.Get(), kSystem, 0x01042000), L"Cabinet 3");
    EXPECT_FALSE(std::filesystem::exists(StatePath()));
}

TEST_F(SimPersist, TheBagMustNameOneItem) {
    struct {
        const wchar_t* uri;
        int32_t status;
    } cases[] = {
        {nullptr, kStatusNoSuchItem},
        {L"//localhost/network", kStatusAmbiguousItem},
        {L"//localhost/network/Ethernet9", kStatusNoSuchItem},
        {L"//remote/network/Ethernet0", static_cast<int32_t>(0x80040372u)},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.uri ? c.uri : L"(none)");
        Outcome outcome = Persist(framework_.Get(), c.uri, 0, NoContext,
                                  [](api::IkrSysPropertyBagEx* bag) { bag->SetUnsigned(0x02004000, 1); });
        EXPECT_EQ(outcome.status, c.status);
        EXPECT_EQ(outcome.restart, 0u);
        EXPECT_FALSE(outcome.detail.empty());
    }
    uint32_t restart = 5;
    api::SysString detail = nullptr;
    EXPECT_EQ(framework_->PersistChanges(nullptr, 0, &restart, &detail), kPointer);
    EXPECT_EQ(restart, 0u);
    Take(detail);
    Ref<api::IkrSysPropertyBag> bag;
    ASSERT_EQ(framework_->CreatePropertyBag(bag.Out()), 0);
    EXPECT_EQ(framework_->PersistChanges(bag.Get(), 0, nullptr, &detail), kPointer);
    EXPECT_EQ(framework_->PersistChanges(bag.Get(), 0, &restart, nullptr), kPointer);
}

// Each save writes a new file and renames it over the old one: a reader that
// opened the old file keeps reading it whole, and nothing else is left behind.
TEST_F(SimPersist, StateFileIsReplacedWhole) {
    ASSERT_EQ(RenameHost(L"first").status, 0);
    std::filesystem::path kept = shared_ / "kept.json";
    std::filesystem::create_hard_link(StatePath(), kept);
    std::string before = ReadFile(kept);
    ASSERT_NE(before.find("first"), std::string::npos);

    ASSERT_EQ(RenameHost(L"second").status, 0);
    EXPECT_EQ(ReadFile(kept), before);
    std::string after = ReadFile(StatePath());
    EXPECT_NE(after.find("second"), std::string::npos);
    EXPECT_EQ(after.find("first"), std::string::npos);
    EXPECT_EQ(SimFolder(), (std::vector<std::string>{"device.json", "device.state.json"}));
}

TEST_F(SimPersist, LeftoverTemporaryFileIsIgnored) {
    ASSERT_EQ(RenameHost(L"saved").status, 0);
    std::ofstream(shared_ / "sim" / ".device.state.json.Xy12ab") << R"({"format": 1, "items": [{"uri": "//localhost/co)";
    EXPECT_EQ(AfterRestart(), std::make_pair(std::wstring(L"saved"), std::wstring(L"Hall 2")));
}

TEST_F(SimPersist, CrashMidWriteLeavesTheStateWhole) {
    ASSERT_EQ(RenameHost(L"saved").status, 0);
    std::string saved = ReadFile(StatePath());

    // The model now makes the device stop half-way through writing.
    ASSERT_NO_FATAL_FAILURE(WriteModel(ModelWith(std::string(kItems) +
                                                 R"(, "faults": [{"operation": "SaveState", "status": "0x8007001D"}])")));
    Ref<api::IkrSysFramework> crashing;
    ASSERT_NO_FATAL_FAILURE(Instantiate(crashing));
    Outcome outcome = Persist(crashing.Get(), kSystem, 0, NoContext,
                              [](api::IkrSysPropertyBagEx* bag) { bag->SetString(0x01007000, L"lost"); });
    EXPECT_EQ(outcome.status, kCrash);
    EXPECT_EQ(outcome.restart, 0u);
    EXPECT_EQ(outcome.detail, L"Changes not applied: the device could not store its state.");
    EXPECT_EQ(Value(crashing.Get(), kSystem, 0x01007000), L"saved");

    EXPECT_EQ(ReadFile(StatePath()), saved);
    std::vector<std::string> names = SimFolder();
    ASSERT_EQ(names.size(), 3u);
    EXPECT_EQ(names[0].rfind(".device.state.json.", 0), 0u);  // the torn temporary file
    EXPECT_EQ(AfterRestart(), std::make_pair(std::wstring(L"saved"), std::wstring(L"Hall 2")));
}

TEST_F(SimPersist, UnreadableStateMeansFactoryState) {
    for (const char* content : {"", "{\"format\": 1, \"items\": [", "{\"format\": 2, \"items\": []}", "[]",
                                R"({"format": 1, "items": [{"uri": "//localhost/controller/System",)"
                                R"( "properties": [{"tag": "0x01007000", "value": 5}]}]})"}) {
        SCOPED_TRACE(content);
        std::ofstream(StatePath(), std::ios::trunc) << content;
        EXPECT_EQ(AfterRestart(), std::make_pair(std::wstring(L"qx-lab"), std::wstring(L"Cabinet 3")));
    }
}

TEST_F(SimPersist, FactoryResetForgetsEveryChange) {
    ASSERT_EQ(RenameHost(L"changed").status, 0);
    Ref<api::IkrSysDiagnostics> diagnostics;
    ASSERT_EQ(framework_->QueryInterface(api::kIID_IkrSysDiagnostics, reinterpret_cast<void**>(diagnostics.Out())), 0);
    EXPECT_EQ(diagnostics->Reset(L"//localhost", kResetRestart), 0);
    EXPECT_EQ(Value(framework_.Get(), kSystem, 0x01007000), L"changed");
    EXPECT_EQ(diagnostics->Reset(L"//localhost", 2), kInvalidArg);
    EXPECT_EQ(diagnostics->Reset(L"//localhost", kResetFactoryDefaults), 0);
    EXPECT_EQ(Value(framework_.Get(), kSystem, 0x01007000), L"qx-lab");
    EXPECT_FALSE(std::filesystem::exists(StatePath()));
    EXPECT_EQ(AfterRestart(), std::make_pair(std::wstring(L"qx-lab"), std::wstring(L"Cabinet 3")));
}

class SimRename : public SimPersist {
protected:
    struct Result {
        int32_t status;
        uint32_t conflict;
        std::optional<std::wstring> uri1, uri2;
    };
    Result Rename(const wchar_t* locator, const wchar_t* name, uint32_t mode) {
        Result result{0, 99, std::nullopt, std::nullopt};
        api::SysString uri1 = reinterpret_cast<api::SysString>(uintptr_t{0x10}), uri2 = uri1;
        result.status = framework_->RenameAlias(locator, name, mode, &result.conflict, &uri1, &uri2);
        if (uri1) result.uri1 = Take(uri1);
        if (uri2) result.uri2 = Take(uri2);
        return result;
    }
    std::vector<std::wstring> Named(const wchar_t* locator) {
        Ref<api::IkrSysEnumUris> uris;
        framework_->SearchForItemNames(locator, uris.Out());
        return uris.Get() ? ReadUris(uris.Get()) : std::vector<std::wstring>{};
    }
};

TEST_F(SimRename, ClashIsReportedAndHandledByMode) {
    const std::wstring eth0 = L"//localhost/network/Ethernet0", eth1 = L"//localhost/network/Ethernet1";
    struct {
        uint32_t mode;
        int32_t status;
        std::vector<std::wstring> namedEth1;
    } cases[] = {
        {kRenameCheckOnly, 0, {eth1}},
        {kRenameRefuseClash, kStatusAliasConflict, {eth1}},
        {kRenameAllowClash, 0, {eth0, eth1}},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.mode);
        Result result = Rename(L"//localhost/network/Ethernet0", L"eth1", c.mode);
        EXPECT_EQ(result.status, c.status);
        EXPECT_EQ(result.conflict, 1u);
        EXPECT_EQ(result.uri1, eth0);
        EXPECT_EQ(result.uri2, eth1);
        EXPECT_EQ(Named(L"//localhost/network/eth1"), c.namedEth1);
    }
}

TEST_F(SimRename, RenameWithoutClashSurvivesANewFramework) {
    Result result = Rename(L"//localhost/network/eth0", L"uplink", kRenameRefuseClash);
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.conflict, 0u);
    EXPECT_EQ(result.uri1, L"//localhost/network/Ethernet0");
    EXPECT_EQ(result.uri2, L"");
    EXPECT_TRUE(Named(L"//localhost/network/eth0").empty());

    framework_.Reset();
    ASSERT_NO_FATAL_FAILURE(Instantiate(framework_));
    EXPECT_EQ(Named(L"//localhost/network/uplink"), std::vector<std::wstring>{L"//localhost/network/Ethernet0"});
    // Its own alias again is no clash.
    EXPECT_EQ(Rename(L"//localhost/network/uplink", L"uplink", kRenameRefuseClash).conflict, 0u);
}

TEST_F(SimRename, BadRequestsChangeNothingAndHandOutNothing) {
    struct {
        const char* what;
        const wchar_t* locator;
        const wchar_t* name;
        uint32_t mode;
        int32_t status;
    } cases[] = {
        {"unknown mode", L"//localhost/network/Ethernet0", L"x", 3, kInvalidArg},
        {"empty name", L"//localhost/network/Ethernet0", L"", 0, kInvalidArg},
        {"null name", L"//localhost/network/Ethernet0", nullptr, 0, kPointer},
        {"no item", L"//localhost/network/Ethernet5", L"x", 0, kStatusNoSuchItem},
        {"several items", L"//localhost/network", L"x", 0, kStatusAmbiguousItem},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.what);
        Result result = Rename(c.locator, c.name, c.mode);
        EXPECT_EQ(result.status, c.status);
        EXPECT_EQ(result.conflict, 0u);
        EXPECT_FALSE(result.uri1);
        EXPECT_FALSE(result.uri2);
    }
    EXPECT_FALSE(std::filesystem::exists(StatePath()));
    uint32_t conflict = 0;
    api::SysString uri = nullptr;
    EXPECT_EQ(framework_->RenameAlias(L"//localhost/network/eth0", L"x", 0, nullptr, &uri, &uri), kPointer);
    EXPECT_EQ(framework_->RenameAlias(L"//localhost/network/eth0", L"x", 0, &conflict, nullptr, &uri), kPointer);
}

}  // namespace
}  // namespace qel::sim::test
