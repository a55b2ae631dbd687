// Property bags: typed values by tag, with change tracking and faults.
#include "PropertyBag.h"

#include "Enumerators.h"

namespace qel::sim {

namespace {

// Answered only inside this library: gives the framework the bag's content.
constexpr fnd::Guid kIID_BagContent{0x7d3e5a10, 0x2c4b, 0x4e8f, {0x9b, 0x61, 0x50, 0x0a, 0xd2, 0x7c, 0x11, 0x3e}};

class EnumTags final : public ListEnumerator<api::IkrSysEnumTags, api::PropertyTag> {
public:
    explicit EnumTags(std::vector<api::PropertyTag> tags) noexcept : tags_(std::move(tags)) {}

protected:
    uint32_t Size() const noexcept override { return static_cast<uint32_t>(tags_.size()); }
    api::PropertyTag Make(uint32_t index) override { return tags_[index]; }
    void Discard(api::PropertyTag) noexcept override {}

private:
    std::vector<api::PropertyTag> tags_;
};

template <typename Interface>
class Bag final : public ComObject<Interface>, public BagContent {
public:
    Bag(std::shared_ptr<const DeviceModel> model, std::wstring itemUri, std::vector<BagEntry> entries)
        : model_(std::move(model)), uri_(std::move(itemUri)), entries_(std::move(entries)) {}

    int32_t QueryInterface(const fnd::Guid& iid, void** out) override {
        if (out && iid == kIID_BagContent) {
            *out = static_cast<BagContent*>(this);
            return fnd::kStatusOk;
        }
        // The extended bag is a plain bag too.
        if (out && iid == api::kIID_IkrSysPropertyBag) {
            this->AddRef();
            *out = static_cast<api::IkrSysPropertyBag*>(this);
            return fnd::kStatusOk;
        }
        return ComObject<Interface>::QueryInterface(iid, out);
    }

    std::vector<BagEntry> Entries() const override {
        std::lock_guard<std::mutex> guard(lock_);
        return entries_;
    }
    const std::wstring& ItemUri() const noexcept override { return uri_; }
    void Refresh(const std::vector<BagEntry>& fresh) override {
        std::lock_guard<std::mutex> guard(lock_);
        for (const auto& entry : fresh)
            for (auto& held : entries_)
                if (held.tag == entry.tag) held.value = entry.value;
    }

    int32_t EnumPropertyTags(api::IkrSysEnumTags** out) override {
        return Guarded([&] {
            if (!out) return fnd::kStatusPointer;
            *out = nullptr;
            if (int32_t fault = Fault(L"EnumPropertyTags", nullptr)) return fault;
            std::vector<api::PropertyTag> tags;
            {
                std::lock_guard<std::mutex> guard(lock_);
                for (const auto& entry : entries_) tags.push_back(entry.tag);
            }
            *out = new EnumTags(std::move(tags));
            return fnd::kStatusOk;
        });
    }

    int32_t GetPropertyType(api::PropertyTag tag, api::PropertyTypeCode* type) override {
        if (!type) return fnd::kStatusPointer;
        *type = 0;
        if (int32_t fault = Fault(L"GetPropertyType", &tag)) return fault;
        std::lock_guard<std::mutex> guard(lock_);
        const BagEntry* entry = Find(tag);
        if (!entry) return kStatusNoSuchProperty;
        *type = entry->value.type;
        return fnd::kStatusOk;
    }

    int32_t SetInteger1(api::PropertyTag tag, int32_t value) override {
        return Set(tag, [&](PropertyValue& v) { v.type = api::kTypeInteger1, v.integer = value; });
    }
    int32_t SetInteger2(api::PropertyTag tag, int32_t value) override {
        return Set(tag, [&](PropertyValue& v) { v.type = api::kTypeInteger2, v.integer = value; });
    }
    int32_t SetUnsigned(api::PropertyTag tag, uint32_t value) override {
        return Set(tag, [&](PropertyValue& v) { v.type = api::kTypeUnsigned, v.integer = value; });
    }
    int32_t SetDouble(api::PropertyTag tag, double value) override {
        return Set(tag, [&](PropertyValue& v) { v.type = api::kTypeDouble, v.number = value; });
    }
    int32_t SetGuid(api::PropertyTag tag, fnd::Guid value) override {
        return Set(tag, [&](PropertyValue& v) { v.type = api::kTypeGuid, v.guid = value; });
    }
    int32_t SetString(api::PropertyTag tag, const wchar_t* value) override {
        if (!value) return fnd::kStatusPointer;
        return Set(tag, [&](PropertyValue& v) { v.type = api::kTypeString, v.text = value; });
    }

    int32_t GetInteger1(api::PropertyTag tag, int32_t* value) override {
        return Get(L"GetInteger1", tag, api::kTypeInteger1, value,
                   [](const PropertyValue& v, int32_t* out) { *out = static_cast<int32_t>(v.integer); });
    }
    int32_t GetInteger2(api::PropertyTag tag, int32_t* value) override {
        return Get(L"GetInteger2", tag, api::kTypeInteger2, value,
                   [](const PropertyValue& v, int32_t* out) { *out = static_cast<int32_t>(v.integer); });
    }
    int32_t GetUnsigned(api::PropertyTag tag, uint32_t* value) override {
        return Get(L"GetUnsigned", tag, api::kTypeUnsigned, value,
                   [](const PropertyValue& v, uint32_t* out) { *out = static_cast<uint32_t>(v.integer); });
    }
    int32_t GetDouble(api::PropertyTag tag, double* value) override {
        return Get(L"GetDouble", tag, api::kTypeDouble, value,
                   [](const PropertyValue& v, double* out) { *out = v.number; });
    }
    int32_t GetGuid(api::PropertyTag tag, fnd::Guid* value) override {
        return Get(L"GetGuid", tag, api::kTypeGuid, value,
                   [](const PropertyValue& v, fnd::Guid* out) { *out = v.guid; });
    }
    int32_t GetString(api::PropertyTag tag, api::SysString* value) override {
        if (value) *value = nullptr;
        std::wstring text;
        int32_t status = Get(L"GetString", tag, api::kTypeString, &text,
                             [](const PropertyValue& v, std::wstring* out) { *out = v.text; });
        if (!value) return fnd::kStatusPointer;
        if (fnd::Failed(status)) return status;
        *value = api::SysStringAllocLen(text.data(), static_cast<uint32_t>(text.size()));
        return *value ? fnd::kStatusOk : fnd::kStatusOutOfMemory;
    }
    int32_t GetDateTime(api::PropertyTag tag, api::DateTimeFields* value) override {
        if (value) *value = api::DateTimeFields{};
        api::AbsTime time;
        int32_t status = Get(L"GetDateTime", tag, api::kTypeTime, value ? &time : nullptr,
                             [](const PropertyValue& v, api::AbsTime* out) { *out = v.time; });
        if (fnd::Failed(status)) return status;
        if (!AbsTimeToLocalFields(time, value)) return kStatusTimeOutOfRange;
        return fnd::kStatusOk;
    }

    // IkrSysPropertyBagEx only; the legacy bag never exposes them.
    int32_t ResetChangeTracking() {
        std::lock_guard<std::mutex> guard(lock_);
        for (auto& entry : entries_) entry.changed = false;
        return fnd::kStatusOk;
    }
    int32_t GetTimestamp(api::PropertyTag tag, api::AbsTime* value) {
        return Get(L"GetTimestamp", tag, api::kTypeTime, value,
                   [](const PropertyValue& v, api::AbsTime* out) { *out = v.time; });
    }
    int32_t SetTimestamp(api::PropertyTag tag, const api::AbsTime* value) {
        if (!value) return fnd::kStatusPointer;
        return Set(tag, [&](PropertyValue& v) { v.type = api::kTypeTime, v.time = *value; });
    }

private:
    int32_t Fault(const wchar_t* operation, const api::PropertyTag* tag) const noexcept {
        return model_->Fault(operation, uri_.empty() ? nullptr : uri_.c_str(), nullptr, tag);
    }

    const BagEntry* Find(api::PropertyTag tag) const noexcept {
        for (const auto& entry : entries_)
            if (entry.tag == tag) return &entry;
        return nullptr;
    }

    template <typename Assign>
    int32_t Set(api::PropertyTag tag, Assign assign) {
        return Guarded([&] {
            std::lock_guard<std::mutex> guard(lock_);
            for (auto& entry : entries_) {
                if (entry.tag != tag) continue;
                entry.value = PropertyValue{};
                assign(entry.value);
                entry.changed = true;
                return fnd::kStatusOk;
            }
            BagEntry entry;
            entry.tag = tag;
            assign(entry.value);
            entry.changed = true;
            entries_.push_back(std::move(entry));
            return fnd::kStatusOk;
        });
    }

    template <typename T, typename Read>
    int32_t Get(const wchar_t* operation, api::PropertyTag tag, api::PropertyTypeCode type, T* out, Read read) {
        if (!out) return fnd::kStatusPointer;
        *out = T{};
        if (int32_t fault = Fault(operation, &tag)) return fault;
        return Guarded([&] {
            std::lock_guard<std::mutex> guard(lock_);
            const BagEntry* entry = Find(tag);
            if (!entry) return kStatusNoSuchProperty;
            if (entry->value.type != type) return kStatusTypeMismatch;
            read(entry->value, out);
            return fnd::kStatusOk;
        });
    }

    std::shared_ptr<const DeviceModel> model_;
    const std::wstring uri_;
    mutable std::mutex lock_;
    std::vector<BagEntry> entries_;
};

}  // namespace

BagContent* ContentOf(api::IkrSysPropertyBag* bag) noexcept {
    if (!bag) return nullptr;
    void* content = nullptr;
    if (fnd::Failed(bag->QueryInterface(kIID_BagContent, &content))) return nullptr;
    return static_cast<BagContent*>(content);
}

api::IkrSysPropertyBag* MakeBag(std::shared_ptr<const DeviceModel> model, std::wstring itemUri, bool legacy,
                                std::vector<BagEntry> entries) {
    if (legacy) return new Bag<api::IkrSysPropertyBag>(std::move(model), std::move(itemUri), std::move(entries));
    return new Bag<api::IkrSysPropertyBagEx>(std::move(model), std::move(itemUri), std::move(entries));
}

}  // namespace qel::sim
