// The enumerators over the model's lists.
#include "Enumerators.h"

#include "ExpertInfo.h"

namespace qel::sim {

uint32_t EnumExperts::Size() const noexcept { return static_cast<uint32_t>(model_->Experts().size()); }

api::IkrSysExpertInfo* EnumExperts::Make(uint32_t index) { return new ExpertInfo(model_, model_->Experts()[index]); }

void EnumExperts::Discard(api::IkrSysExpertInfo* expert) noexcept { expert->Release(); }

uint32_t EnumUris::Size() const noexcept { return static_cast<uint32_t>(uris_.size()); }

api::SysString EnumUris::Make(uint32_t index) {
    const std::wstring& uri = uris_[index];
    api::SysString text = api::SysStringAllocLen(uri.data(), static_cast<uint32_t>(uri.size()));
    if (!text) throw std::bad_alloc();
    return text;
}

void EnumUris::Discard(api::SysString uri) noexcept { api::SysStringFree(uri); }

uint32_t EnumPropertyBags::Size() const noexcept { return static_cast<uint32_t>(bags_.size()); }

api::IkrSysPropertyBag* EnumPropertyBags::Make(uint32_t index) {
    const BagSource& source = bags_[index];
    return MakeBag(model_, source.itemUri, source.legacy, source.entries);
}

void EnumPropertyBags::Discard(api::IkrSysPropertyBag* bag) noexcept { bag->Release(); }

}  // namespace qel::sim
