// The framework, firmware and diagnostics operations of the simulated device.
#include "FrameworkObject.h"

#include <cstring>
#include <cwchar>
#include <string>

#include "Enumerators.h"
#include "Locator.h"

namespace qel::sim {

namespace {

template <typename T>
void Clear(T* out) noexcept {
    if (out) *out = T{};
}

int32_t HandOut(const std::wstring& text, api::SysString* out) {
    *out = api::SysStringAllocLen(text.data(), static_cast<uint32_t>(text.size()));
    return *out ? fnd::kStatusOk : fnd::kStatusOutOfMemory;
}

/// `status` unless handing out `text` failed.
int32_t WithText(int32_t status, const std::wstring& text, api::SysString* out) {
    int32_t handed = HandOut(text, out);
    return fnd::Failed(handed) ? handed : status;
}

std::wstring TypeName(api::PropertyTypeCode type) { return L"type " + std::to_wstring(type); }

/// The version an image carries in a first line "VERSION=...", else the
/// client's file name without folder and extension.
std::wstring ImageVersion(const uint8_t* data, uint32_t size, const wchar_t* clientFileName) {
    static constexpr char kPrefix[] = "VERSION=";
    constexpr uint32_t prefixLength = sizeof kPrefix - 1;
    if (size > prefixLength && std::memcmp(data, kPrefix, prefixLength) == 0) {
        std::wstring version;
        for (uint32_t i = prefixLength; i < size && version.size() < 64; ++i) {
            uint8_t c = data[i];
            if (c == '\n' || c == '\r') break;
            if (c < 0x20 || c > 0x7E) return L"";
            version.push_back(static_cast<wchar_t>(c));
        }
        return version;
    }
    std::wstring name = clientFileName ? clientFileName : L"";
    size_t slash = name.find_last_of(L"/\\");
    if (slash != std::wstring::npos) name.erase(0, slash + 1);
    size_t dot = name.rfind(L'.');
    if (dot != std::wstring::npos && dot > 0) name.erase(dot);
    return name;
}

}  // namespace

std::vector<BagEntry> FrameworkObject::ItemEntries(size_t item, const ItemState& state) const {
    const ItemRecord& record = model_->Items()[item];
    std::vector<BagEntry> entries;
    entries.reserve(record.properties.size() + 1);
    BagEntry uri;
    uri.tag = kItemUriTag;
    uri.value.type = api::kTypeString;
    uri.value.text = record.uri;
    entries.push_back(std::move(uri));
    for (size_t p = 0; p < record.properties.size(); ++p) {
        BagEntry entry;
        entry.tag = record.properties[p].tag;
        entry.value = state.values[p];
        entries.push_back(std::move(entry));
    }
    return entries;
}

int32_t FrameworkObject::EnumSystemExperts(const wchar_t* locator, api::IkrSysEnumExperts** out) {
    return Guarded([&] {
        if (!out) return fnd::kStatusPointer;
        *out = nullptr;
        int32_t status = CheckDevice(locator);
        if (fnd::Failed(status)) return status;
        if (int32_t fault = model_->Fault(L"EnumSystemExperts", locator)) return fault;
        *out = new EnumExperts(model_);
        return fnd::kStatusOk;
    });
}

int32_t FrameworkObject::SearchForItemNames(const wchar_t* locator, api::IkrSysEnumUris** out) {
    return Guarded([&] {
        if (!out) return fnd::kStatusPointer;
        *out = nullptr;
        if (int32_t fault = model_->Fault(L"SearchForItemNames", locator)) return fault;
        std::vector<size_t> items;
        int32_t status = SelectItems(locator, *model_, state_->Snapshot(), &items);
        if (fnd::Failed(status)) return status;
        std::vector<std::wstring> uris;
        for (size_t item : items) uris.push_back(model_->Items()[item].uri);
        *out = new EnumUris(std::move(uris));
        return items.empty() ? fnd::kStatusFalse : fnd::kStatusOk;
    });
}

int32_t FrameworkObject::SearchForItemsAndProperties(const wchar_t* locator, uint32_t filterMode,
                                                     api::IkrSysPropertyBag* filter,
                                                     api::IkrSysEnumPropertyBags** out) {
    return Guarded([&] {
        if (!out) return fnd::kStatusPointer;
        *out = nullptr;
        if (int32_t fault = model_->Fault(L"SearchForItemsAndProperties", locator)) return fault;
        std::vector<BagEntry> wanted;
        bool filtering = filterMode != 0 && filter;
        if (filtering) {
            BagContent* content = ContentOf(filter);
            if (!content) return fnd::kStatusInvalidArg;
            wanted = content->Entries();
        }
        std::vector<ItemState> state = state_->Snapshot();
        std::vector<size_t> items;
        int32_t status = SelectItems(locator, *model_, state, &items);
        if (fnd::Failed(status)) return status;

        std::vector<BagSource> bags;
        for (size_t item : items) {
            std::vector<BagEntry> entries = ItemEntries(item, state[item]);
            if (filtering) {
                size_t held = 0;
                for (const auto& filterEntry : wanted)
                    for (const auto& entry : entries)
                        if (entry.tag == filterEntry.tag && entry.value == filterEntry.value) ++held;
                bool keep = filterMode == 1 ? held == wanted.size() : held > 0;
                if (!keep) continue;
            }
            const ItemRecord& record = model_->Items()[item];
            bags.push_back(BagSource{record.uri, record.legacyBag, std::move(entries)});
        }
        bool found = !bags.empty();
        *out = new EnumPropertyBags(model_, std::move(bags));
        return found ? fnd::kStatusOk : fnd::kStatusFalse;
    });
}

int32_t FrameworkObject::GetPropertiesOfItem(const wchar_t* locator, api::IkrSysPropertyBag** out) {
    return Guarded([&] {
        if (!out) return fnd::kStatusPointer;
        *out = nullptr;
        if (int32_t fault = model_->Fault(L"GetPropertiesOfItem", locator)) return fault;
        std::vector<ItemState> state = state_->Snapshot();
        size_t item = 0;
        int32_t status = SelectOneItem(locator, *model_, state, &item);
        if (fnd::Failed(status)) return status;
        const ItemRecord& record = model_->Items()[item];
        *out = MakeBag(model_, record.uri, record.legacyBag, ItemEntries(item, state[item]));
        return fnd::kStatusOk;
    });
}

int32_t FrameworkObject::SetNotificationHandler(const wchar_t*, api::IkrSysNotificationHandler*, uint32_t) {
    return fnd::kStatusNotImplemented;
}

int32_t FrameworkObject::PopulateOrRefreshProperties(api::IkrSysPropertyBag* bag, uint32_t count,
                                                     const api::PropertyTag* tags, uint32_t) {
    return Guarded([&] {
        if (!bag || (count > 0 && !tags)) return fnd::kStatusPointer;
        BagContent* content = ContentOf(bag);
        if (!content || content->ItemUri().empty()) return fnd::kStatusInvalidArg;
        if (int32_t fault = model_->Fault(L"PopulateOrRefreshProperties", content->ItemUri().c_str())) return fault;
        std::vector<ItemState> state = state_->Snapshot();
        size_t item = 0;
        const auto& items = model_->Items();
        while (item < items.size() && items[item].uri != content->ItemUri()) ++item;
        if (item == items.size()) return kStatusNoSuchItem;

        // Every tag is checked before any is refreshed: all or nothing.
        std::vector<BagEntry> current = ItemEntries(item, state[item]), fresh;
        for (uint32_t i = 0; i < count; ++i) {
            const BagEntry* found = nullptr;
            for (const auto& entry : current)
                if (entry.tag == tags[i]) found = &entry;
            if (!found) return kStatusNoSuchProperty;
            fresh.push_back(*found);
        }
        content->Refresh(fresh);
        return fnd::kStatusOk;
    });
}

int32_t FrameworkObject::CreatePropertyBag(api::IkrSysPropertyBag** out) {
    return Guarded([&] {
        if (!out) return fnd::kStatusPointer;
        *out = nullptr;
        if (int32_t fault = model_->Fault(L"CreatePropertyBag")) return fault;
        *out = MakeBag(model_, std::wstring(), false, {});
        return fnd::kStatusOk;
    });
}

int32_t FrameworkObject::RenameAlias(const wchar_t* locator, const wchar_t* name, uint32_t mode, uint32_t* conflict,
                                     api::SysString* uri1, api::SysString* uri2) {
    Clear(conflict);
    Clear(uri1);
    Clear(uri2);
    return Guarded([&] {
        if (!conflict || !uri1 || !uri2 || !name) return fnd::kStatusPointer;
        if (int32_t fault = model_->Fault(L"RenameAlias", locator)) return fault;
        if (mode > kRenameCheckOnly || name[0] == L'\0') return fnd::kStatusInvalidArg;

        int32_t status = fnd::kStatusOk;
        std::wstring renamed, clashing;
        int32_t saved = state_->Update([&](std::vector<ItemState>& items) {
            size_t item = 0;
            status = SelectOneItem(locator, *model_, items, &item);
            if (fnd::Failed(status)) return false;
            renamed = model_->Items()[item].uri;
            for (size_t other = 0; other < items.size(); ++other)
                if (other != item && items[other].alias == name) clashing = model_->Items()[other].uri;
            if (!clashing.empty() && mode == kRenameRefuseClash) status = kStatusAliasConflict;
            if (fnd::Failed(status) || mode == kRenameCheckOnly || items[item].alias == name) return false;
            items[item].alias = name;
            return true;
        });
        if (fnd::Failed(saved)) return saved;
        if (renamed.empty()) return status;  // no item: nothing to report
        *conflict = clashing.empty() ? 0 : 1;
        int32_t handed = HandOut(renamed, uri1);
        if (!fnd::Failed(handed)) handed = HandOut(clashing, uri2);
        return fnd::Failed(handed) ? handed : status;
    });
}

int32_t FrameworkObject::PersistChanges(api::IkrSysPropertyBag* bag, uint32_t validateOnly, uint32_t* requiresRestart,
                                        api::SysString* detailedResult) {
    Clear(requiresRestart);
    Clear(detailedResult);
    return Guarded([&] {
        if (!requiresRestart || !detailedResult) return fnd::kStatusPointer;
        if (int32_t fault = model_->Fault(L"PersistChanges"))
            return WithText(fault, L"Changes not accepted: the device is not ready.", detailedResult);
        BagContent* content = ContentOf(bag);
        if (!content)
            return WithText(bag ? fnd::kStatusInvalidArg : fnd::kStatusPointer,
                            L"Changes not accepted: the bag was not made by this device.", detailedResult);
        std::vector<BagEntry> entries = content->Entries();
        const BagEntry* uriEntry = nullptr;
        for (const auto& entry : entries)
            if (entry.tag == kItemUriTag && entry.value.type == api::kTypeString) uriEntry = &entry;
        if (!uriEntry)
            return WithText(kStatusNoSuchItem, L"Changes not accepted: the bag names no item (property 0x01000000).",
                            detailedResult);
        const std::wstring locator = uriEntry->value.text;

        int32_t status = fnd::kStatusOk;
        uint32_t restart = 0;
        std::wstring report;
        auto judge = [&](std::vector<ItemState>& items) {
            size_t item = 0;
            status = SelectOneItem(locator.c_str(), *model_, items, &item);
            if (fnd::Failed(status)) {
                report = L"Changes not accepted: " + locator + L" names no single item.";
                return false;
            }
            const ItemRecord& record = model_->Items()[item];
            report = L"Item " + record.uri + L":\n";
            uint32_t changes = 0, refused = 0;
            for (const auto& entry : entries) {
                if (!entry.changed || entry.tag == kItemUriTag) continue;
                std::wstring line = TagText(entry.tag) + L" ";
                const PropertyRecord* property = record.Find(entry.tag);
                int32_t refusal = fnd::kStatusOk;
                if (!property) {
                    refusal = kStatusNoSuchProperty;
                    line += L"refused: the item has no such property";
                } else if (property->value.type != entry.value.type) {
                    refusal = kStatusTypeMismatch;
                    line += L"refused: " + TypeName(property->value.type) + L" expected, " +
                            TypeName(entry.value.type) + L" given";
                } else if (property->readOnly) {
                    refusal = kStatusReadOnly;
                    line += L"refused: read-only";
                } else {
                    PropertyValue& current = items[item].values[static_cast<size_t>(property - record.properties.data())];
                    if (current == entry.value) {
                        line += L"unchanged: " + DescribeValue(current);
                    } else {
                        line += std::wstring(validateOnly ? L"would change" : L"changed") + L" from " +
                                DescribeValue(current) + L" to " + DescribeValue(entry.value);
                        if (property->requiresRestart) {
                            restart = 1;
                            line += L" (takes effect after a restart)";
                        }
                        current = entry.value;
                        ++changes;
                    }
                }
                if (fnd::Failed(refusal)) {
                    ++refused;
                    if (!fnd::Failed(status)) status = refusal;
                }
                report += line + L"\n";
            }
            if (refused) {
                restart = 0;
                report += std::to_wstring(refused) + L" change(s) refused; nothing was applied.";
                return false;
            }
            if (validateOnly) {
                report += L"Validated: " + std::to_wstring(changes) + L" change(s) would be applied.";
                return false;
            }
            report += std::to_wstring(changes) + L" change(s) applied.";
            return changes > 0;
        };
        int32_t saved = state_->Update(judge);
        if (fnd::Failed(saved)) {
            restart = 0;
            status = saved;
            report = L"Changes not applied: the device could not store its state.";
        }
        *requiresRestart = restart;
        return WithText(status, report, detailedResult);
    });
}

int32_t FrameworkObject::BeginFirmwareChange(const wchar_t* locator, uint32_t stopTasks, uint32_t imageLength,
                                             api::SysString* detailedResult) {
    Clear(detailedResult);
    return Guarded([&] {
        if (!detailedResult) return fnd::kStatusPointer;
        int32_t status = CheckDevice(locator);
        if (fnd::Failed(status)) return status;
        if (int32_t fault = model_->Fault(L"BeginFirmwareChange", locator))
            return WithText(fault, L"Firmware change refused by the device.", detailedResult);
        std::wstring detailed;
        status = firmware_.Begin(stopTasks, imageLength, &detailed);
        return WithText(status, detailed, detailedResult);
    });
}

int32_t FrameworkObject::UpdateFirmwareImage(const wchar_t* locator, const wchar_t* token, uint32_t overwrite,
                                             const wchar_t* clientFileName, api::IkrSysBinaryImage* image) {
    return Guarded([&] {
        int32_t status = CheckDevice(locator);
        if (fnd::Failed(status)) return status;
        if (int32_t fault = model_->Fault(L"UpdateFirmwareImage", locator)) return fault;
        if (!image || !token) return fnd::kStatusPointer;
        uint32_t size = 0;
        const uint8_t* data = nullptr;
        status = image->GetSize(&size);
        if (fnd::Failed(status)) return status;
        status = image->GetData(&data);
        if (fnd::Failed(status)) return status;
        uint32_t announced = firmware_.AnnouncedLength();
        if (size == 0 || !data || (announced != 0 && announced != size)) return fnd::kStatusInvalidArg;
        std::wstring version = ImageVersion(data, size, clientFileName);
        if (version.empty()) return fnd::kStatusInvalidArg;
        return firmware_.Write(token, overwrite, version);
    });
}

int32_t FrameworkObject::UpdateFirmwareVersion(const wchar_t* locator, const wchar_t* token, uint32_t overwrite,
                                               const wchar_t* version) {
    return Guarded([&] {
        int32_t status = CheckDevice(locator);
        if (fnd::Failed(status)) return status;
        if (int32_t fault = model_->Fault(L"UpdateFirmwareVersion", locator)) return fault;
        if (!version || !token) return fnd::kStatusPointer;
        if (version[0] == L'\0') return fnd::kStatusInvalidArg;
        return firmware_.Write(token, overwrite, version);
    });
}

int32_t FrameworkObject::EraseFirmware(const wchar_t* locator, const wchar_t* token) {
    return Guarded([&] {
        int32_t status = CheckDevice(locator);
        if (fnd::Failed(status)) return status;
        if (int32_t fault = model_->Fault(L"EraseFirmware", locator)) return fault;
        return firmware_.Erase(token);
    });
}

int32_t FrameworkObject::CheckFirmwareStatus(const wchar_t* locator, uint32_t* state, uint32_t* percentComplete,
                                             uint32_t* requiresRestart, api::SysString* version) {
    Clear(state);
    Clear(percentComplete);
    Clear(requiresRestart);
    Clear(version);
    return Guarded([&] {
        if (!state || !percentComplete || !requiresRestart || !version) return fnd::kStatusPointer;
        int32_t status = CheckDevice(locator);
        if (fnd::Failed(status)) return status;
        if (int32_t fault = model_->Fault(L"CheckFirmwareStatus", locator)) return fault;
        std::wstring text;
        firmware_.Status(state, percentComplete, requiresRestart, &text);
        return HandOut(text, version);
    });
}

int32_t FrameworkObject::Reset(const wchar_t* locator, uint32_t mode) {
    return Guarded([&] {
        int32_t status = CheckDevice(locator);
        if (fnd::Failed(status)) return status;
        if (int32_t fault = model_->Fault(L"Reset", locator)) return fault;
        if (mode != kResetRestart && mode != kResetFactoryDefaults) return fnd::kStatusInvalidArg;
        status = firmware_.Restart();
        if (fnd::Failed(status) || mode == kResetRestart) return status;
        return state_->FactoryReset();
    });
}

int32_t FrameworkObject::SelfTest(const wchar_t* locator, uint32_t mode, api::SysString* detailedResult) {
    Clear(detailedResult);
    return Guarded([&] {
        if (!detailedResult) return fnd::kStatusPointer;
        std::vector<size_t> items;
        int32_t status = SelectItems(locator, *model_, state_->Snapshot(), &items);
        if (fnd::Failed(status)) return status;
        if (int32_t fault = model_->Fault(L"SelfTest", locator))
            return WithText(fault, L"Self-test aborted: memory check failed at block 0x3F.", detailedResult);
        if (mode != kSelfTestQuick && mode != kSelfTestExtended)
            return WithText(fnd::kStatusInvalidArg, L"Self-test not run: unknown mode " + std::to_wstring(mode) + L".",
                            detailedResult);
        if (items.empty()) return WithText(kStatusNoSuchItem, L"Self-test not run: no item selected.", detailedResult);
        std::wstring report = mode == kSelfTestQuick ? L"Quick self-test passed.\n" : L"Extended self-test passed.\n";
        report += L"RAM: ok\nFlash checksum: ok\nWatchdog: ok\n";
        if (mode == kSelfTestExtended) {
            for (size_t item : items) report += model_->Items()[item].uri + L": ok\n";
        }
        report += std::to_wstring(items.size()) + L" item(s) checked, 0 fault(s).";
        return WithText(fnd::kStatusOk, report, detailedResult);
    });
}

int32_t FrameworkObject::SelfCalibrate(const wchar_t* locator, api::SysString* detailedResult) {
    Clear(detailedResult);
    return Guarded([&] {
        if (!detailedResult) return fnd::kStatusPointer;
        int32_t status = CheckDevice(locator);
        if (fnd::Failed(status)) return status;
        if (int32_t fault = model_->Fault(L"SelfCalibrate", locator))
            return WithText(fault, L"Self-calibration aborted: reference voltage out of tolerance.", detailedResult);
        return WithText(fnd::kStatusOk,
                        L"Self-calibration complete.\nReal-time clock: drift 1.8 ppm, trimmed\n"
                        L"Analog reference: 2.5001 V, within tolerance\nTemperature sensor: offset -0.3 K, stored",
                        detailedResult);
    });
}

}  // namespace qel::sim
