// The "Function" dispatcher: common arguments, access checks, routing.
#include "api/Dispatcher.h"

#include <iterator>

#include "api/FrameworkAccess.h"
#include "api/Operations.h"
#include "foundation/Status.h"
#include "foundation/ThrowingStatus.h"

namespace qel::api {

namespace {

enum class Access { kAny, kAuthenticated, kFirmware };

using Handler = int32_t (*)(OperationContext&);

struct Operation {
    const wchar_t* name;
    Access access;
    Handler handler;  // null: not available in this build; the name then matches nothing
};

// Names are tested in this order; the first match runs.
const Operation kOperations[] = {
    {L"SearchForItemsAndProperties", Access::kAny, nullptr},
    {L"EnumSystemExperts", Access::kAny, &EnumSystemExperts},
    {L"GetPropertiesOfItem", Access::kAny, nullptr},
    {L"SearchForItemNames", Access::kAny, nullptr},
    {L"PopulateOrRefreshProperties", Access::kAny, nullptr},
    {L"CheckFirmwareStatus", Access::kAny, nullptr},
    {L"RegisterNotifications", Access::kAny, nullptr},
    {L"WaitForNotification", Access::kAny, nullptr},
    {L"UnregisterNotifications", Access::kAny, nullptr},
    {L"PerformDeviceReset", Access::kAuthenticated, nullptr},
    {L"DiagnosticSelfTest", Access::kAuthenticated, nullptr},
    {L"DiagnosticSelfCalibrate", Access::kAuthenticated, nullptr},
    {L"RenameAlias", Access::kAuthenticated, nullptr},
    {L"PersistPropertyChanges", Access::kAuthenticated, nullptr},
    {L"BeginFirmwareChange", Access::kFirmware, nullptr},
    {L"UpdateFirmwareVersion", Access::kFirmware, nullptr},
    {L"UpdateFirmwareImage", Access::kFirmware, nullptr},
    {L"EraseFirmware", Access::kFirmware, nullptr},
};

const Operation* FindOperation(const WString& name) {
    for (const Operation& op : kOperations)
        if (op.handler && fnd::EqualsNoCase(name, WString(op.name))) return &op;
    return nullptr;
}

WString BuildLocator(const ArgumentMap& args) {
    WString locator(L"//localhost");
    const WString* plugins = FindArgument(args, L"Plugins");
    const WString* items = FindArgument(args, L"Items");
    if (!plugins) {
        if (items) throw static_cast<long>(fnd::kStatusBadLocator);
        return locator;
    }
    if (!plugins->IsEmpty()) locator.PushBack(L'/').Append(*plugins);
    if (items && !items->IsEmpty()) {
        if (plugins->IsEmpty()) throw static_cast<long>(fnd::kStatusBadLocator);
        locator.PushBack(L'/').Append(*items);
    }
    return locator;
}

}  // namespace

int32_t DispatchFunction(const ArgumentMap& args, WString& body, WString& debugText, bool authenticated,
                         bool firmware) {
    IkrSysFramework* framework = FrameworkPointer();
    if (!framework) return fnd::kStatusFail;

    xml::XmlElement fragment;
    fragment.openRoot(&body, nullptr);
    WString locator = BuildLocator(args);

    const WString* function = FindArgument(args, L"Function");
    if (!function) throw static_cast<long>(fnd::kStatusFail);

    fnd::ThrowingStatus status;
    const Operation* op = FindOperation(*function);
    if (!op) {
        status = fnd::kStatusFail;
    } else if ((op->access == Access::kAuthenticated && !authenticated) ||
               (op->access == Access::kFirmware && !firmware)) {
        status = fnd::kStatusWrongMapping;
    } else {
        OperationContext context{framework, locator, args, fragment, debugText};
        status = op->handler(context);
    }
    fragment.close();
    return status;
}

}  // namespace qel::api
