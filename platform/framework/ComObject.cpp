// The object count and the text hand-out shared by all framework objects.
#include "ComObject.h"

namespace qel::sim {

namespace {
std::atomic<int32_t> liveObjects{0};
}  // namespace

int32_t LiveObjects() noexcept { return liveObjects.load(std::memory_order_acquire); }

detail::LiveObject::LiveObject() noexcept { liveObjects.fetch_add(1, std::memory_order_relaxed); }
detail::LiveObject::~LiveObject() { liveObjects.fetch_sub(1, std::memory_order_release); }

int32_t HandOutText(const fnd::WString& text, api::SysString* out) noexcept {
    if (!out) return fnd::kStatusPointer;
    *out = api::SysStringAllocLen(text.Data(), text.Length());
    return *out ? fnd::kStatusOk : fnd::kStatusOutOfMemory;
}

}  // namespace qel::sim
