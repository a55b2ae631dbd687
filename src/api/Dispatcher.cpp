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

// Names are tested in this order; the first match runs. Every handler's
// status goes into the status holder, which throws a failure and keeps a
// success (1 for "nothing found" included) as the request's status.
const Operation kOperations[] = {
    {L"SearchForItemsAndProperties", Access::kAny, &SearchForItemsAndProperties},
    {L"EnumSystemExperts", Access::kAny, &EnumSystemExperts},
    {L"GetPropertiesOfItem", Access::kAny, &GetPropertiesOfItem},
    {L"SearchForItemNames", Access::kAny, &SearchForItemNames},
    {L"PopulateOrRefreshProperties", Access::kAny, &PopulateOrRefreshProperties},
    {L"CheckFirmwareStatus", Access::kAny, &CheckFirmwareStatus},
    {L"RegisterNotifications", Access::kAny, nullptr},
    {L"WaitForNotification", Access::kAny, nullptr},
    {L"UnregisterNotifications", Access::kAny, nullptr},
    {L"PerformDeviceReset", Access::kAuthenticated, &PerformDeviceReset},
    {L"DiagnosticSelfTest", Access::kAuthenticated, &DiagnosticSelfTest},
    {L"DiagnosticSelfCalibrate", Access::kAuthenticated, &DiagnosticSelfCalibrate},
    {L"RenameAlias", Access::kAuthenticated, &RenameAlias},
    {L"PersistPropertyChanges", Access::kAuthenticated, &PersistPropertyChanges},
    {L"BeginFirmwareChange", Access::kFirmware, &BeginFirmwareChange},
    {L"UpdateFirmwareVersion", Access::kFirmware, &UpdateFirmwareVersion},
    {L"UpdateFirmwareImage", Access::kFirmware, &UpdateFirmwareImage},
    {L"EraseFirmware", Access::kFirmware, &EraseFirmware},
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
