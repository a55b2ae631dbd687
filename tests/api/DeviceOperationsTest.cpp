// Firmware, reset and diagnostics through the dispatcher, against fake
// framework interfaces: arguments passed on, exact output, statuses.
#include <gtest/gtest.h>

#include <cstdio>
#include <fstream>
#include <string>
#include <unistd.h>

#include "FakeFramework.h"
#include "foundation/Status.h"

namespace qel::api::testing {
namespace {

const int32_t kBroken = fnd::Status(0x8ABC0042u);

TEST(CheckFirmwareStatus, WritesTheStateInHexadecimal) {
    FakeFramework fake;
    Dispatch dispatch(fake);
    auto r = dispatch.Run({{L"Function", L"CheckFirmwareStatus"}, {L"Plugins", L"P"}}, false, false);
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.body,
              L"<CheckFirmwareResult state='2' percentComplete='64' requiresRestart='1'"
              L" firmwareVersion='5.1 &lt;beta&gt;' />");
    EXPECT_EQ(fake.firmware.log, std::vector<std::wstring>{L"check //localhost/P"});

    fake.firmware.status = kBroken;
    r = dispatch.Run({{L"Function", L"CheckFirmwareStatus"}});
    EXPECT_TRUE(r.thrown);
    EXPECT_EQ(r.status, kBroken);
    EXPECT_EQ(r.body, L"");
    fake.ExpectAllReleased();
    ExpectNoLeaks();
}

TEST(FirmwareOperations, PassArgumentsAndWriteTheirResults) {
    struct Case {
        std::vector<std::pair<const wchar_t*, std::wstring>> args;
        std::wstring call;
        std::wstring body;
    } cases[] = {
        {{{L"Function", L"BeginFirmwareChange"}, {L"StopTasks", L"1"}, {L"ImageLength", L"0x100"}},
         L"begin //localhost 1 256", L"<DetailedResult>ok</DetailedResult>"},
        {{{L"Function", L"UpdateFirmwareVersion"},
          {L"RequestToken", L"tok"},
          {L"Overwrite", L"1"},
          {L"FirmwareVersion", L"5.2"}},
         L"version //localhost tok 1 5.2", L""},
        {{{L"Function", L"EraseFirmware"}, {L"RequestToken", L"tok"}}, L"erase //localhost tok", L""},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.call);
        FakeFramework fake;
        Dispatch dispatch(fake);
        ArgumentMap map;
        for (const auto& [k, v] : c.args) map[WString(k)] = WString(v.c_str());
        auto r = dispatch.Run(map, false, true);
        EXPECT_EQ(r.status, 0);
        EXPECT_EQ(r.body, c.body);
        EXPECT_EQ(fake.firmware.log, std::vector<std::wstring>{c.call});

        // The framework's failure fails the request; a detailed result
        // already written stays.
        fake.firmware.status = kBroken;
        r = dispatch.Run(map, false, true);
        EXPECT_TRUE(r.thrown);
        EXPECT_EQ(r.status, kBroken);
        EXPECT_EQ(r.body, c.body);

        // Each required argument missing: nothing is called.
        for (const auto& [key, value] : c.args) {
            if (std::wstring(key) == L"Function") continue;
            ArgumentMap partial = map;
            partial.erase(WString(key));
            fake.firmware.log.clear();
            r = dispatch.Run(partial, false, true);
            EXPECT_EQ(r.status, fnd::kStatusFail) << key;
            EXPECT_EQ(r.body, L"");
            EXPECT_TRUE(fake.firmware.log.empty());
        }
        fake.ExpectAllReleased();
    }
    ExpectNoLeaks();
}

TEST(DiagnosticOperations, PassArgumentsAndWriteTheirResults) {
    FakeFramework fake;
    fake.diagnostics.detail = L"fan <2>\x1";
    Dispatch dispatch(fake);
    auto r = dispatch.Run({{L"Function", L"PerformDeviceReset"}, {L"DiagnosticMode", L"F"}}, true, false);
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.body, L"");
    r = dispatch.Run({{L"Function", L"DiagnosticSelfTest"}, {L"DiagnosticMode", L"2"}, {L"Plugins", L"P"}}, true,
                     false);
    EXPECT_EQ(r.body, L"<DetailedResult>fan &lt;2&gt;?</DetailedResult>");
    EXPECT_EQ(r.debug, L"<InvalidChar item='//localhost/P'  position='D'/>");
    fake.diagnostics.status = kBroken;
    r = dispatch.Run({{L"Function", L"DiagnosticSelfCalibrate"}}, true, false);
    EXPECT_TRUE(r.thrown);
    EXPECT_EQ(r.status, kBroken);
    EXPECT_EQ(r.body, L"<DetailedResult>fan &lt;2&gt;?</DetailedResult>");
    EXPECT_EQ(fake.diagnostics.log,
              (std::vector<std::wstring>{L"reset //localhost 15", L"test //localhost/P 2", L"calibrate //localhost"}));

    fake.diagnostics.log.clear();
    r = dispatch.Run({{L"Function", L"DiagnosticSelfTest"}}, true, false);
    EXPECT_EQ(r.status, fnd::kStatusFail);
    EXPECT_TRUE(fake.diagnostics.log.empty());
    fake.ExpectAllReleased();
    ExpectNoLeaks();
}

TEST(DeviceOperations, AFrameworkWithoutTheInterfaceFailsThem) {
    FakeFramework fake;
    fake.offersFirmware = false;
    fake.offersDiagnostics = false;
    Dispatch dispatch(fake);
    for (const wchar_t* name : {L"CheckFirmwareStatus", L"DiagnosticSelfCalibrate", L"EraseFirmware"}) {
        auto r = dispatch.Run({{L"Function", name}, {L"RequestToken", L"t"}});
        EXPECT_TRUE(r.thrown);
        EXPECT_EQ(r.status, fnd::kStatusNoInterface) << name;
        EXPECT_EQ(r.body, L"");
    }
}

// An uploaded file in a fresh temporary directory.
class UploadedFile {
public:
    explicit UploadedFile(const std::string& content) {
        char dir[] = "/tmp/qel_upload_XXXXXX";
        dir_ = mkdtemp(dir);
        path_ = dir_ + "/upload.bin";
        std::ofstream(path_, std::ios::binary) << content;
    }
    ~UploadedFile() {
        std::remove(path_.c_str());
        rmdir(dir_.c_str());
    }
    std::wstring Path() const { return std::wstring(path_.begin(), path_.end()); }
    std::wstring Missing() const { return std::wstring(dir_.begin(), dir_.end()) + L"/none.bin"; }

private:
    std::string dir_, path_;
};

Dispatch::Result UploadImage(Dispatch& dispatch, const std::wstring& path) {
    return dispatch.Run({{L"Function", L"UpdateFirmwareImage"},
                         {L"RequestToken", L"tok"},
                         {L"Overwrite", L"0"},
                         {L"FormAttachedLocalFilename", path},
                         {L"FormAttachedClientFilename", L"fw.img"}},
                        false, true);
}

TEST(UpdateFirmwareImage, HandsTheFileContentToTheFramework) {
    const std::string content("\x00\x01\xFFimage", 8);
    UploadedFile file(content);
    FakeFramework fake;
    fake.firmware.keepImage = true;
    Dispatch dispatch(fake);
    auto r = UploadImage(dispatch, file.Path());
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.body, L"");
    EXPECT_EQ(std::string(fake.firmware.imageBytes.begin(), fake.firmware.imageBytes.end()), content);
    EXPECT_EQ(fake.firmware.log, std::vector<std::wstring>{L"image //localhost tok 0 fw.img 8"});
    fake.ExpectAllReleased();

    // The framework's own reference keeps the image alive after the request.
    IkrSysBinaryImage* kept = fake.firmware.keptImage;
    ASSERT_NE(kept, nullptr);
    uint32_t size = 0;
    EXPECT_EQ(kept->GetSize(&size), 0);
    EXPECT_EQ(size, 8u);
    EXPECT_EQ(kept->Release(), 0u);
    ExpectNoLeaks();
}

TEST(UpdateFirmwareImage, EmptyMissingAndRefusedUploads) {
    UploadedFile empty("");
    FakeFramework fake;
    Dispatch dispatch(fake);
    auto r = UploadImage(dispatch, empty.Path());
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(fake.firmware.log, std::vector<std::wstring>{L"image //localhost tok 0 fw.img 0"});

    fake.firmware.log.clear();
    r = UploadImage(dispatch, empty.Missing());
    EXPECT_TRUE(r.thrown);
    EXPECT_EQ(r.status, fnd::kStatusBadUpload);
    EXPECT_TRUE(fake.firmware.log.empty());

    fake.firmware.status = kBroken;
    r = UploadImage(dispatch, empty.Path());
    EXPECT_EQ(r.status, kBroken);
    fake.ExpectAllReleased();
    ExpectNoLeaks();
}

}  // namespace
}  // namespace qel::api::testing
