// The operations on the device as a whole: firmware, reset, diagnostics.
#include <cstdint>
#include <new>

#include "api/BinaryImage.h"
#include "api/ComPtr.h"
#include "api/Operations.h"
#include "api/PropertyBagCodec.h"
#include "foundation/Exception.h"
#include "foundation/IntegerText.h"
#include "foundation/Status.h"
#include "foundation/ThrowingStatus.h"
#include "foundation/osdep/BinaryFile.h"
#include "xml/Serializers.h"

namespace qel::api {

namespace {

const WString& Required(const OperationContext& context, const wchar_t* name) {
    return *GetRequestVariable(context.args, name, true);
}

uint32_t RequiredHex(const OperationContext& context, const wchar_t* name) {
    return fnd::StringToInteger<uint32_t>(Required(context, name), 16);
}

// A framework without the interface has nothing to run the operation on; its
// answer to the query is the operation's failure.
template <typename Interface>
ComPtr<Interface> Query(IkrSysFramework* framework, const Guid& iid) {
    ComPtr<Interface> result;
    fnd::ThrowingStatus status;
    status = framework->QueryInterface(iid, result.OutVoid());
    if (!result) throw static_cast<long>(fnd::kStatusNoInterface);
    return result;
}

ComPtr<IkrSysFirmware> Firmware(const OperationContext& context) {
    return Query<IkrSysFirmware>(context.framework, kIID_IkrSysFirmware);
}

ComPtr<IkrSysDiagnostics> Diagnostics(const OperationContext& context) {
    return Query<IkrSysDiagnostics>(context.framework, kIID_IkrSysDiagnostics);
}

void WriteDetail(OperationContext& context, const SysStringHolder& detail) {
    xml::WriteDetailedResult(detail.Get(), context.locator, context.fragment, &context.debugText);
}

// The whole uploaded file in one read; a read that fails leaves the image
// empty rather than failing the upload, and the framework judges the image.
void LoadImage(CkrSysBinaryImage& image, const WString& path) {
    fnd::osdep::BinaryFile file(path, fnd::osdep::BinaryFile::kRead);
    const int64_t end = file.Seek(0, fnd::osdep::BinaryFile::kFromEnd);
    if (end < 0 || file.Seek(0, fnd::osdep::BinaryFile::kFromStart) != 0)
        throw fnd::osdep::PosixError("api/DeviceOperations", __LINE__);
    // The framework's interface counts image bytes in 32 bits.
    if (end > static_cast<int64_t>(UINT32_MAX)) throw std::bad_alloc();
    const uint32_t size = static_cast<uint32_t>(end);
    if (size == 0) return;
    uint8_t* buffer = image.Allocate(size);
    const int64_t read = file.Read(buffer, size);
    image.SetSize(read > 0 ? static_cast<uint32_t>(read) : 0);
    file.Close();
}

}  // namespace

int32_t CheckFirmwareStatus(OperationContext& context) {
    ComPtr<IkrSysFirmware> firmware = Firmware(context);
    uint32_t state = 0;
    uint32_t percent = 0;
    uint32_t requiresRestart = 0;
    SysStringHolder version;
    const int32_t status =
        firmware->CheckFirmwareStatus(context.locator.CStr(), &state, &percent, &requiresRestart, version.Out());
    if (status >= 0) {
        const WString versionText = xml::EscapeXml(version.Get(), nullptr);
        xml::XmlElement result;
        result.openChild(context.fragment, L"CheckFirmwareResult");
        result.writeAttribute("state", fnd::IntegerToString<uint32_t>(state, 16));
        result.writeAttribute("percentComplete", fnd::IntegerToString<uint32_t>(percent, 16));
        result.writeAttribute("requiresRestart", fnd::IntegerToString<uint32_t>(requiresRestart, 16));
        result.writeAttribute("firmwareVersion", versionText);
        result.close();
    }
    return status;
}

int32_t BeginFirmwareChange(OperationContext& context) {
    const uint32_t stopTasks = RequiredHex(context, L"StopTasks");
    const uint32_t imageLength = RequiredHex(context, L"ImageLength");
    ComPtr<IkrSysFirmware> firmware = Firmware(context);
    SysStringHolder detail;
    const int32_t status = firmware->BeginFirmwareChange(context.locator.CStr(), stopTasks, imageLength, detail.Out());
    WriteDetail(context, detail);
    return status;
}

int32_t UpdateFirmwareVersion(OperationContext& context) {
    const WString& token = Required(context, L"RequestToken");
    const uint32_t overwrite = RequiredHex(context, L"Overwrite");
    const WString& version = Required(context, L"FirmwareVersion");
    ComPtr<IkrSysFirmware> firmware = Firmware(context);
    return firmware->UpdateFirmwareVersion(context.locator.CStr(), token.CStr(), overwrite, version.CStr());
}

int32_t UpdateFirmwareImage(OperationContext& context) {
    const WString& token = Required(context, L"RequestToken");
    const uint32_t overwrite = RequiredHex(context, L"Overwrite");
    const WString& localFile = Required(context, L"FormAttachedLocalFilename");
    const WString& clientFile = Required(context, L"FormAttachedClientFilename");
    ComPtr<IkrSysFirmware> firmware = Firmware(context);
    try {
        BinaryImageObject* created = nullptr;
        fnd::ThrowingStatus status;
        status = BinaryImageObject::CreateInstance(&created);
        created->AddRef();
        ComPtr<BinaryImageObject> image(created);
        LoadImage(*image.Get(), localFile);
        return firmware->UpdateFirmwareImage(context.locator.CStr(), token.CStr(), overwrite, clientFile.CStr(),
                                             image.Get());
    } catch (const fnd::osdep::OSException&) {
        return fnd::kStatusBadUpload;
    } catch (const std::bad_alloc&) {
        return fnd::kStatusOutOfMemory;
    }
}

int32_t EraseFirmware(OperationContext& context) {
    const WString& token = Required(context, L"RequestToken");
    ComPtr<IkrSysFirmware> firmware = Firmware(context);
    fnd::ThrowingStatus status;
    status = firmware->EraseFirmware(context.locator.CStr(), token.CStr());
    return status;
}

int32_t PerformDeviceReset(OperationContext& context) {
    const uint32_t mode = RequiredHex(context, L"DiagnosticMode");
    ComPtr<IkrSysDiagnostics> diagnostics = Diagnostics(context);
    return diagnostics->Reset(context.locator.CStr(), mode);
}

int32_t DiagnosticSelfTest(OperationContext& context) {
    const uint32_t mode = RequiredHex(context, L"DiagnosticMode");
    ComPtr<IkrSysDiagnostics> diagnostics = Diagnostics(context);
    SysStringHolder detail;
    const int32_t status = diagnostics->SelfTest(context.locator.CStr(), mode, detail.Out());
    WriteDetail(context, detail);
    return status;
}

int32_t DiagnosticSelfCalibrate(OperationContext& context) {
    ComPtr<IkrSysDiagnostics> diagnostics = Diagnostics(context);
    SysStringHolder detail;
    const int32_t status = diagnostics->SelfCalibrate(context.locator.CStr(), detail.Out());
    WriteDetail(context, detail);
    return status;
}

}  // namespace qel::api
