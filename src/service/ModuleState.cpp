// Start-up and shut-down of the plug-in.
#include "service/ModuleState.h"

#include "api/FrameworkAccess.h"
#include "catalog/SharedDirectory.h"
#include "foundation/osdep/IConv.h"
#include "foundation/osdep/SharedLibrary.h"
#include "foundation/osdep/path.h"

namespace qel::service {

OptionalEntryPoints& EntryPoints() {
    static OptionalEntryPoints points;
    return points;
}

Kitbase::CqelCS& ModuleCriticalSection() {
    static Kitbase::CqelCS cs;
    return cs;
}

namespace {
template <typename Fn>
void Bind(fnd::osdep::SharedLibrary& library, Fn& slot, const char* name) {
    slot = reinterpret_cast<Fn>(library.GetSymbol(name, true));
}
}  // namespace

void Initialize() {
    fnd::WString directory = fnd::osdep::JoinPath(catalog::GetSharedDirectory(), fnd::WString(L"QelWebServer"));
    fnd::NString path = fnd::osdep::JoinPath(fnd::osdep::Narrow(directory), fnd::NString("webhost_runtime"));
    // The loader turns ".../webhost_runtime" into ".../libwebhost_runtime.so".
    // The entry points stay valid after the handle closes because the same
    // runtime is a load-time dependency of the plug-in.
    fnd::osdep::SharedLibrary runtime(path, true);
    OptionalEntryPoints& points = EntryPoints();
    Bind(runtime, points.getEncryptKey, "GetEncryptKey_C_REST_QEL_QLWS_");
    Bind(runtime, points.decrypt, "Decrypt_C_REST_QEL_QLWS_");
    Bind(runtime, points.readAllFormDataWithMime, "ReadAllFormDataWithMime_C_REST_QEL_QLWS_");
    Bind(runtime, points.keyValueWithMimeGetFirst, "KeyValueWithMimeGetFirst_C_REST_QEL_QLWS_");
    Bind(runtime, points.keyValueWithMimeGetNext, "KeyValueWithMimeGetNext_C_REST_QEL_QLWS_");
    Bind(runtime, points.keyValueWithMimeGetKey, "KeyValueWithMimeGetKey_C_REST_QEL_QLWS_");
    Bind(runtime, points.keyValueWithMimeGetValue, "KeyValueWithMimeGetValue_C_REST_QEL_QLWS_");
    Bind(runtime, points.freeKeyValuePairWithMimeList, "FreeKeyValuePairWithMimeList_C_REST_QEL_QLWS_");
}

void Finalize() {
    Kitbase::CqelCSLock hold(ModuleCriticalSection());
    api::ReleaseFramework();
}

}  // namespace qel::service
