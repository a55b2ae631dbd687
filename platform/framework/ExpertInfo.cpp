// The queries about one installed system expert.
#include "ExpertInfo.h"

#include <string>

namespace qel::sim {

namespace {

/// The fault the model sets for `operation` on this expert, clearing `out`.
template <typename T>
int32_t Fault(const DeviceModel& model, const wchar_t* operation, const ExpertRecord& record, T* out) {
    if (out) *out = T{};
    return Guarded([&] {
        std::wstring name(record.programmaticName.Data(), record.programmaticName.Length());
        return model.Fault(operation, nullptr, &name);
    });
}

}  // namespace

int32_t ExpertInfo::GetProductID(fnd::Guid* id) {
    if (int32_t fault = Fault(*model_, L"GetProductID", record_, id)) return fault;
    if (!id) return fnd::kStatusPointer;
    *id = record_.productId;
    return fnd::kStatusOk;
}

int32_t ExpertInfo::GetProductDisplayName(api::SysString* name) {
    if (int32_t fault = Fault(*model_, L"GetProductDisplayName", record_, name)) return fault;
    return HandOutText(record_.displayName, name);
}

int32_t ExpertInfo::GetProductVersion(api::SysString* version) {
    if (int32_t fault = Fault(*model_, L"GetProductVersion", record_, version)) return fault;
    return HandOutText(record_.version, version);
}

int32_t ExpertInfo::GetProgrammaticName(api::SysString* name) {
    if (int32_t fault = Fault(*model_, L"GetProgrammaticName", record_, name)) return fault;
    return HandOutText(record_.programmaticName, name);
}

}  // namespace qel::sim
