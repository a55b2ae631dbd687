// The queries about one installed system expert.
#include "ExpertInfo.h"

namespace qel::sim {

int32_t ExpertInfo::GetProductID(fnd::Guid* id) {
    if (!id) return fnd::kStatusPointer;
    *id = record_.productId;
    return fnd::kStatusOk;
}

int32_t ExpertInfo::GetProductDisplayName(api::SysString* name) { return HandOutText(record_.displayName, name); }

int32_t ExpertInfo::GetProductVersion(api::SysString* version) { return HandOutText(record_.version, version); }

int32_t ExpertInfo::GetProgrammaticName(api::SysString* name) { return HandOutText(record_.programmaticName, name); }

}  // namespace qel::sim
