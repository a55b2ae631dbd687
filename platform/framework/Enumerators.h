// The enumerators the framework hands out: a list walked once, in order.
#pragma once

#include <cstdint>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "ComObject.h"
#include "DeviceModel.h"
#include "PropertyBag.h"

namespace qel::sim {

/// Walks a fixed list of Size() elements once. Next(count) delivers up to
/// `count` elements, each made afresh for the caller, and answers 0 when it
/// delivered all of them and 1 when the list ended first; the slots it could
/// not fill are set to a null element. `fetched` may be null only for a count
/// of 1. Safe to call from several threads: each element goes to one caller.
template <typename Interface, typename Element>
class ListEnumerator : public ComObject<Interface> {
public:
    int32_t Next(uint32_t count, Element* elements, uint32_t* fetched) override {
        return Guarded([&] { return Deliver(count, elements, fetched); });
    }

protected:
    virtual uint32_t Size() const noexcept = 0;
    /// Element `index` with its own reference (or storage) for the caller.
    virtual Element Make(uint32_t index) = 0;
    /// Gives back an element made by this call when a later one failed.
    virtual void Discard(Element element) noexcept = 0;

private:
    int32_t Deliver(uint32_t count, Element* elements, uint32_t* fetched) {
        if (fetched) *fetched = 0;
        if (count > 0 && !elements) return fnd::kStatusPointer;
        if (!fetched && count != 1) return fnd::kStatusPointer;

        std::lock_guard<std::mutex> guard(lock_);
        uint32_t made = 0;
        try {
            for (; made < count && position_ + made < Size(); ++made) elements[made] = Make(position_ + made);
        } catch (...) {
            // All or nothing: the caller never owns half of a failed call.
            while (made > 0) Discard(elements[--made]);
            for (uint32_t i = 0; i < count; ++i) elements[i] = Element{};
            throw;
        }
        position_ += made;
        for (uint32_t i = made; i < count; ++i) elements[i] = Element{};
        if (fetched) *fetched = made;
        return made == count ? fnd::kStatusOk : fnd::kStatusFalse;
    }

    std::mutex lock_;
    uint32_t position_ = 0;
};

/// The system experts of the model, in model order.
class EnumExperts final : public ListEnumerator<api::IkrSysEnumExperts, api::IkrSysExpertInfo*> {
public:
    explicit EnumExperts(std::shared_ptr<const DeviceModel> model) noexcept : model_(std::move(model)) {}

protected:
    uint32_t Size() const noexcept override;
    api::IkrSysExpertInfo* Make(uint32_t index) override;
    void Discard(api::IkrSysExpertInfo* expert) noexcept override;

private:
    std::shared_ptr<const DeviceModel> model_;
};

/// Item URIs, each handed out as a new SysString.
class EnumUris final : public ListEnumerator<api::IkrSysEnumUris, api::SysString> {
public:
    explicit EnumUris(std::vector<std::wstring> uris) noexcept : uris_(std::move(uris)) {}

protected:
    uint32_t Size() const noexcept override;
    api::SysString Make(uint32_t index) override;
    void Discard(api::SysString uri) noexcept override;

private:
    std::vector<std::wstring> uris_;
};

/// What one bag of a search will hold, read when the search ran.
struct BagSource {
    std::wstring itemUri;
    bool legacy = false;
    std::vector<BagEntry> entries;
};

/// The bags of a search, each made afresh for the caller.
class EnumPropertyBags final : public ListEnumerator<api::IkrSysEnumPropertyBags, api::IkrSysPropertyBag*> {
public:
    EnumPropertyBags(std::shared_ptr<const DeviceModel> model, std::vector<BagSource> bags) noexcept
        : model_(std::move(model)), bags_(std::move(bags)) {}

protected:
    uint32_t Size() const noexcept override;
    api::IkrSysPropertyBag* Make(uint32_t index) override;
    void Discard(api::IkrSysPropertyBag* bag) noexcept override;

private:
    std::shared_ptr<const DeviceModel> model_;
    std::vector<BagSource> bags_;
};

}  // namespace qel::sim
