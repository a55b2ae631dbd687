// Firmware changes, diagnostics and model-made faults of the simulated device.
#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <thread>

#include "FrameworkTestSupport.h"

namespace qel::sim::test {
namespace {

constexpr int32_t kPointer = static_cast<int32_t>(0x80004003u);
constexpr int32_t kInvalidArg = static_cast<int32_t>(0x80070057u);
constexpr int32_t kBadLocator = static_cast<int32_t>(0x80040372u);

const char kItems[] = R"("items": [
  {"expert": "controller", "name": "System", "uri": "//localhost/controller/System",
   "properties": [{"tag": "0x0103C000", "type": 6, "value": "QX"}, {"tag": "0x01007000", "type": 6, "value": "h"}]},
  {"expert": "network", "name": "Ethernet0", "uri": "//localhost/network/Ethernet0", "properties": []}
])";

/// An uploaded image as the service hands it over, counting its references.
class Image final : public api::IkrSysBinaryImage {
public:
    explicit Image(std::string bytes) : bytes_(std::move(bytes)) {}
    int32_t QueryInterface(const api::Guid&, void** out) override { return *out = nullptr, 0x80004002; }
    uint32_t AddRef() override { return ++refs_; }
    uint32_t Release() override { return --refs_; }
    int32_t GetSize(uint32_t* size) override { return *size = static_cast<uint32_t>(bytes_.size()), 0; }
    int32_t GetData(const uint8_t** data) override {
        *data = bytes_.empty() ? nullptr : reinterpret_cast<const uint8_t*>(bytes_.data());
        return 0;
    }
    uint32_t Refs() const { return refs_; }

private:
    std::string bytes_;
    std::atomic<uint32_t> refs_{1};
};

struct FirmwareStatus {
    uint32_t state = 99, percent = 99, restart = 99;
    std::wstring version;
    bool operator==(const FirmwareStatus&) const = default;
};

class SimFirmware : public SimDevice {
protected:
    void Start(uint32_t millisecondsPerPercent, std::string_view faults = "[]") {
        ASSERT_NO_FATAL_FAILURE(WriteModel(ModelWith(
            std::string(kItems) + ", \"firmware\": {\"version\": \"5.0.0\", \"millisecondsPerPercent\": " +
            std::to_string(millisecondsPerPercent) + "}, \"faults\": " + std::string(faults))));
        ASSERT_NO_FATAL_FAILURE(Instantiate(framework_));
        ASSERT_EQ(framework_->QueryInterface(api::kIID_IkrSysFirmware, reinterpret_cast<void**>(firmware_.Out())), 0);
        ASSERT_EQ(
            framework_->QueryInterface(api::kIID_IkrSysDiagnostics, reinterpret_cast<void**>(diagnostics_.Out())), 0);
    }
    void TearDown() override {
        diagnostics_.Reset();
        firmware_.Reset();
        framework_.Reset();
        SimDevice::TearDown();
    }

    FirmwareStatus Status() {
        FirmwareStatus status;
        api::SysString version = nullptr;
        EXPECT_EQ(firmware_->CheckFirmwareStatus(L"//localhost", &status.state, &status.percent, &status.restart,
                                                 &version),
                  0);
        status.version = Take(version);
        return status;
    }

    /// Begins a change and returns the token its detailed result carries.
    std::wstring Begin(uint32_t imageLength = 0) {
        api::SysString detail = nullptr;
        EXPECT_EQ(firmware_->BeginFirmwareChange(L"//localhost", 1, imageLength, &detail), 0);
        std::wstring text = Take(detail);
        size_t at = text.find(L"RequestToken: ");
        if (at == std::wstring::npos) {
            ADD_FAILURE() << "no token in the detailed result";
            return L"";
        }
        return text.substr(at + 14, text.find(L'\n', at) - at - 14);
    }

    /// Polls until the state leaves `busy`, checking that the percentage never
    /// goes back; gives the status it ended in.
    FirmwareStatus WaitWhile(uint32_t busy) {
        auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(60);
        uint32_t last = 0;
        FirmwareStatus status = Status();
        while (status.state == busy && std::chrono::steady_clock::now() < deadline) {
            EXPECT_GE(status.percent, last);
            EXPECT_LE(status.percent, 100u);
            EXPECT_EQ(status.restart, 0u);
            last = status.percent;
            std::this_thread::sleep_for(std::chrono::milliseconds(2));
            status = Status();
        }
        return status;
    }

    Ref<api::IkrSysFramework> framework_;
    Ref<api::IkrSysFirmware> firmware_;
    Ref<api::IkrSysDiagnostics> diagnostics_;
};

TEST_F(SimFirmware, TokenFlowWritesAVersionThatARestartActivates) {
    ASSERT_NO_FATAL_FAILURE(Start(1));
    EXPECT_EQ(Status(), (FirmwareStatus{kFirmwareIdle, 0, 0, L"5.0.0"}));

    api::SysString detail = nullptr;
    ASSERT_EQ(firmware_->BeginFirmwareChange(L"//localhost", 1, 4096, &detail), 0);
    std::wstring text = Take(detail);
    size_t at = text.find(L"RequestToken: FWT-");
    ASSERT_NE(at, std::wstring::npos) << text;
    std::wstring token = text.substr(at + 14, 20);
    EXPECT_EQ(text, L"Firmware change prepared.\nRequestToken: " + token +
                        L"\nImage length: 4096 bytes\nApplication tasks stopped: yes\nRunning version: 5.0.0");
    EXPECT_EQ(Status(), (FirmwareStatus{kFirmwarePrepared, 0, 0, L"5.0.0"}));

    EXPECT_EQ(firmware_->UpdateFirmwareVersion(L"//localhost", L"FWT-0000000000000000", 1, L"5.1.0"), kStatusBadToken);
    EXPECT_EQ(firmware_->UpdateFirmwareVersion(L"//localhost", L"", 1, L"5.1.0"), kStatusBadToken);
    EXPECT_EQ(firmware_->UpdateFirmwareVersion(L"//localhost", nullptr, 1, L"5.1.0"), kPointer);
    EXPECT_EQ(firmware_->UpdateFirmwareVersion(L"//localhost", token.c_str(), 1, L""), kInvalidArg);
    ASSERT_EQ(firmware_->UpdateFirmwareVersion(L"//localhost", token.c_str(), 1, L"5.1.0"), 0);
    // The token is spent once the change runs.
    EXPECT_EQ(firmware_->UpdateFirmwareVersion(L"//localhost", token.c_str(), 1, L"5.2.0"), kStatusBadToken);
    EXPECT_EQ(firmware_->EraseFirmware(L"//localhost", token.c_str()), kStatusBadToken);

    EXPECT_EQ(WaitWhile(kFirmwareWriting), (FirmwareStatus{kFirmwareAwaitingRestart, 100, 1, L"5.1.0"}));
    EXPECT_EQ(diagnostics_->Reset(L"//localhost", kResetRestart), 0);
    EXPECT_EQ(Status(), (FirmwareStatus{kFirmwareIdle, 0, 0, L"5.1.0"}));
}

TEST_F(SimFirmware, EveryBeginIssuesANewToken) {
    ASSERT_NO_FATAL_FAILURE(Start(1));
    std::wstring first = Begin(), second = Begin();
    EXPECT_NE(first, second);
    EXPECT_EQ(first.size(), 20u);
    EXPECT_EQ(firmware_->EraseFirmware(L"//localhost", first.c_str()), kStatusBadToken);
    EXPECT_EQ(firmware_->EraseFirmware(L"//localhost", second.c_str()), 0);
    EXPECT_EQ(WaitWhile(kFirmwareErasing), (FirmwareStatus{kFirmwareErased, 100, 1, L""}));
    // Nothing to restart into: the device stays erased until it gets an image.
    EXPECT_EQ(diagnostics_->Reset(L"//localhost", kResetRestart), 0);
    EXPECT_EQ(Status().state, kFirmwareErased);
}

TEST_F(SimFirmware, ImageNamesTheVersionItCarries) {
    ASSERT_NO_FATAL_FAILURE(Start(1));
    Image tagged("VERSION=6.0.1\r\n\x7F" "ELF...");
    Image plain(std::string(300, '\xA5'));
    Image empty("");
    struct {
        const char* what;
        uint32_t announced;
        Image* image;
        const wchar_t* fileName;
        int32_t status;
        std::wstring version;
    } cases[] = {
        {"version line", 0, &tagged, L"any.bin", 0, L"6.0.1"},
        {"file name", 300, &plain, L"C:\\upload\\qx-7.2.bin", 0, L"qx-7.2"},
        {"length differs", 299, &plain, L"a.bin", kInvalidArg, L""},
        {"empty image", 0, &empty, L"a.bin", kInvalidArg, L""},
        {"no image", 0, nullptr, L"a.bin", kPointer, L""},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.what);
        std::wstring token = Begin(c.announced);
        EXPECT_EQ(firmware_->UpdateFirmwareImage(L"//localhost", token.c_str(), 1, c.fileName, c.image), c.status);
        if (c.image) {
            EXPECT_EQ(c.image->Refs(), 1u);
        }
        if (c.status == 0) {
            EXPECT_EQ(WaitWhile(kFirmwareWriting), (FirmwareStatus{kFirmwareAwaitingRestart, 100, 1, c.version}));
        } else {
            EXPECT_EQ(Status().state, kFirmwarePrepared);
        }
    }
}

TEST_F(SimFirmware, SameVersionNeedsOverwrite) {
    ASSERT_NO_FATAL_FAILURE(Start(1));
    std::wstring token = Begin();
    EXPECT_EQ(firmware_->UpdateFirmwareVersion(L"//localhost", token.c_str(), 0, L"5.0.0"), 1);
    EXPECT_EQ(Status().state, kFirmwarePrepared);
    EXPECT_EQ(firmware_->UpdateFirmwareVersion(L"//localhost", token.c_str(), 1, L"5.0.0"), 0);
    EXPECT_EQ(WaitWhile(kFirmwareWriting).state, kFirmwareAwaitingRestart);
}

// A slow change: nothing else may start, and releasing the framework in the
// middle stops and joins its thread.
TEST_F(SimFirmware, BusyWhileWritingAndStoppedWithTheFramework) {
    ASSERT_NO_FATAL_FAILURE(Start(60000));
    std::wstring token = Begin();
    ASSERT_EQ(firmware_->UpdateFirmwareVersion(L"//localhost", token.c_str(), 1, L"9.9.9"), 0);
    EXPECT_EQ(Status(), (FirmwareStatus{kFirmwareWriting, 0, 0, L"5.0.0"}));
    api::SysString detail = nullptr;
    EXPECT_EQ(firmware_->BeginFirmwareChange(L"//localhost", 0, 0, &detail), kStatusFirmwareBusy);
    EXPECT_EQ(Take(detail), L"Firmware change refused: a change is still in progress (0% complete).");
    EXPECT_EQ(diagnostics_->Reset(L"//localhost", kResetRestart), kStatusFirmwareBusy);

    // The interfaces are the framework's own: it lives until the last goes.
    framework_.Reset();
    diagnostics_.Reset();
    EXPECT_EQ(Status().state, kFirmwareWriting);
    auto before = std::chrono::steady_clock::now();
    firmware_.Reset();
    EXPECT_EQ(qelsysSimLiveObjects(), liveBefore_);
    // Not a speed check: a thread left to its 60 s step would take that long.
    EXPECT_LT(std::chrono::steady_clock::now() - before, std::chrono::seconds(30));
}

TEST_F(SimFirmware, FirmwareCallsCheckTheirArguments) {
    ASSERT_NO_FATAL_FAILURE(Start(1));
    uint32_t a = 0, b = 0, c = 0;
    api::SysString text = nullptr;
    EXPECT_EQ(firmware_->CheckFirmwareStatus(L"//remote", &a, &b, &c, &text), kBadLocator);
    EXPECT_EQ(text, nullptr);
    EXPECT_EQ(firmware_->CheckFirmwareStatus(L"//localhost", nullptr, &b, &c, &text), kPointer);
    EXPECT_EQ(firmware_->CheckFirmwareStatus(L"//localhost", &a, &b, &c, nullptr), kPointer);
    EXPECT_EQ(firmware_->BeginFirmwareChange(nullptr, 0, 0, &text), kPointer);
    EXPECT_EQ(firmware_->BeginFirmwareChange(L"//localhost", 0, 0, nullptr), kPointer);
    EXPECT_EQ(firmware_->EraseFirmware(L"//remote", L"x"), kBadLocator);
    EXPECT_EQ(firmware_->EraseFirmware(L"//localhost", nullptr), kPointer);
    EXPECT_EQ(Status().state, kFirmwareIdle);
}

TEST_F(SimFirmware, DiagnosticsAnswerDetailedResults) {
    ASSERT_NO_FATAL_FAILURE(Start(1));
    struct {
        const char* what;
        const wchar_t* locator;
        uint32_t mode;
        int32_t status;
        std::wstring text;
    } cases[] = {
        {"quick", L"//localhost", kSelfTestQuick, 0,
         L"Quick self-test passed.\nRAM: ok\nFlash checksum: ok\nWatchdog: ok\n2 item(s) checked, 0 fault(s)."},
        {"extended", L"//localhost/network", kSelfTestExtended, 0,
         L"Extended self-test passed.\nRAM: ok\nFlash checksum: ok\nWatchdog: ok\n"
         L"//localhost/network/Ethernet0: ok\n1 item(s) checked, 0 fault(s)."},
        {"unknown mode", L"//localhost", 2, kInvalidArg, L"Self-test not run: unknown mode 2."},
        {"no item", L"//localhost/storage", kSelfTestQuick, kStatusNoSuchItem, L"Self-test not run: no item selected."},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.what);
        api::SysString detail = nullptr;
        EXPECT_EQ(diagnostics_->SelfTest(c.locator, c.mode, &detail), c.status);
        EXPECT_EQ(Take(detail), c.text);
    }
    api::SysString detail = reinterpret_cast<api::SysString>(uintptr_t{0x10});
    EXPECT_EQ(diagnostics_->SelfTest(L"//remote", 0, &detail), kBadLocator);
    EXPECT_EQ(detail, nullptr);
    EXPECT_EQ(diagnostics_->SelfCalibrate(L"//localhost", &detail), 0);
    EXPECT_EQ(Take(detail).rfind(L"Self-calibration complete.\n", 0), 0u);
    EXPECT_EQ(diagnostics_->SelfCalibrate(L"//localhost", nullptr), kPointer);
    EXPECT_EQ(diagnostics_->Reset(nullptr, 0), kPointer);
}

class SimFaults : public SimFirmware {};

TEST_F(SimFaults, ModelMakesChosenCallsFail) {
    ASSERT_NO_FATAL_FAILURE(Start(1, R"([
      {"operation": "SearchForItemNames", "locator": "//localhost/network", "status": "0x80004005"},
      {"operation": "SearchForItemsAndProperties", "status": "0x8007000E"},
      {"operation": "GetProductDisplayName", "expert": "network", "status": "0x80070005"},
      {"operation": "GetString", "tag": "0x01007000", "status": "0x80040A0F"},
      {"operation": "GetString", "tag": "0x0103C000", "locator": "//localhost/network/Ethernet0", "status": "0x80004005"},
      {"operation": "CheckFirmwareStatus", "status": "0x80040A07"},
      {"operation": "SelfTest", "locator": "//localhost/network", "status": "0x80004005"},
      {"operation": "PersistChanges", "status": "0x80070015"}])"));

    Ref<api::IkrSysEnumUris> uris;
    EXPECT_EQ(framework_->SearchForItemNames(L"//localhost/network", uris.Out()), static_cast<int32_t>(0x80004005u));
    EXPECT_EQ(uris.Get(), nullptr);
    EXPECT_EQ(framework_->SearchForItemNames(L"//localhost/controller", uris.Out()), 0);
    Ref<api::IkrSysEnumPropertyBags> bags;
    EXPECT_EQ(framework_->SearchForItemsAndProperties(L"//localhost", 0, nullptr, bags.Out()),
              static_cast<int32_t>(0x8007000Eu));
    EXPECT_EQ(bags.Get(), nullptr);

    std::vector<ExpertTexts> experts;
    Ref<api::IkrSysEnumExperts> all;
    ASSERT_EQ(framework_->EnumSystemExperts(L"//localhost", all.Out()), 0);
    int32_t displayStatus[3] = {};
    for (int i = 0; i < 3; ++i) {
        Ref<api::IkrSysExpertInfo> expert;
        ASSERT_EQ(all->Next(1, expert.Out(), nullptr), 0);
        api::SysString name = reinterpret_cast<api::SysString>(uintptr_t{0x10});
        displayStatus[i] = expert->GetProductDisplayName(&name);
        if (displayStatus[i] == 0) Take(name);
        else EXPECT_EQ(name, nullptr);
        EXPECT_EQ(expert->GetProgrammaticName(&name), 0);
        Take(name);
    }
    EXPECT_EQ(displayStatus[0], 0);
    EXPECT_EQ(displayStatus[1], static_cast<int32_t>(0x80070005u));
    EXPECT_EQ(displayStatus[2], 0);

    Ref<api::IkrSysPropertyBag> bag;
    ASSERT_EQ(framework_->GetPropertiesOfItem(L"//localhost/controller/System", bag.Out()), 0);
    EXPECT_EQ(ValueText(bag.Get(), 0x01007000), L"!80040A0F");
    EXPECT_EQ(ValueText(bag.Get(), 0x0103C000), L"QX");  // the other fault is for another item

    uint32_t state = 7, percent = 7, restart = 7;
    api::SysString version = nullptr;
    EXPECT_EQ(firmware_->CheckFirmwareStatus(L"//localhost", &state, &percent, &restart, &version), kStatusFirmwareBusy);
    EXPECT_EQ(state, 0u);
    EXPECT_EQ(version, nullptr);

    api::SysString detail = nullptr;
    EXPECT_EQ(diagnostics_->SelfTest(L"//localhost/network", 0, &detail), static_cast<int32_t>(0x80004005u));
    EXPECT_EQ(Take(detail), L"Self-test aborted: memory check failed at block 0x3F.");
    EXPECT_EQ(diagnostics_->SelfTest(L"//localhost", 0, &detail), 0);
    Take(detail);

    Ref<api::IkrSysPropertyBag> change;
    ASSERT_EQ(framework_->CreatePropertyBag(change.Out()), 0);
    EXPECT_EQ(framework_->PersistChanges(change.Get(), 0, &restart, &detail), static_cast<int32_t>(0x80070015u));
    EXPECT_EQ(restart, 0u);
    EXPECT_EQ(Take(detail), L"Changes not accepted: the device is not ready.");
}

}  // namespace
}  // namespace qel::sim::test
