// The enumerators over the model's lists.
#include "Enumerators.h"

#include "ExpertInfo.h"

namespace qel::sim {

uint32_t EnumExperts::Size() const noexcept { return static_cast<uint32_t>(model_->Experts().size()); }

api::IkrSysExpertInfo* EnumExperts::Make(uint32_t index) { return new ExpertInfo(model_, model_->Experts()[index]); }

void EnumExperts::Discard(api::IkrSysExpertInfo* expert) noexcept { expert->Release(); }

}  // namespace qel::sim
