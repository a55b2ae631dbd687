// Resolving item locators against the model and the device's current aliases.
#include "Locator.h"

#include <cwchar>
#include <string>

namespace qel::sim {

namespace {

constexpr wchar_t kThisDevice[] = L"//localhost";
constexpr size_t kThisDeviceLength = sizeof kThisDevice / sizeof kThisDevice[0] - 1;

std::vector<std::wstring> Split(const std::wstring& text, wchar_t separator) {
    std::vector<std::wstring> parts;
    size_t start = 0;
    for (;;) {
        size_t end = text.find(separator, start);
        parts.push_back(text.substr(start, end == std::wstring::npos ? std::wstring::npos : end - start));
        if (end == std::wstring::npos) return parts;
        start = end + 1;
    }
}

/// True when `list` (comma-separated, empty entries ignored) is empty or holds
/// one of the two names.
bool Listed(const std::vector<std::wstring>& list, const std::wstring& name, const std::wstring& alias) {
    bool any = false;
    for (const auto& entry : list) {
        if (entry.empty()) continue;
        any = true;
        if (entry == name || (!alias.empty() && entry == alias)) return true;
    }
    return !any;
}

}  // namespace

int32_t CheckDevice(const wchar_t* locator) noexcept {
    if (!locator) return fnd::kStatusPointer;
    if (std::wcsncmp(locator, kThisDevice, kThisDeviceLength) != 0) return fnd::kStatusBadLocator;
    wchar_t next = locator[kThisDeviceLength];
    return next == L'\0' || next == L'/' ? fnd::kStatusOk : fnd::kStatusBadLocator;
}

int32_t SelectItems(const wchar_t* locator, const DeviceModel& model, const std::vector<ItemState>& state,
                    std::vector<size_t>* items) {
    items->clear();
    int32_t status = CheckDevice(locator);
    if (fnd::Failed(status)) return status;
    const auto& all = model.Items();
    for (size_t i = 0; i < all.size(); ++i) {
        if (all[i].uri == locator) {
            items->push_back(i);
            return fnd::kStatusOk;
        }
    }
    std::wstring path(locator + kThisDeviceLength);
    std::vector<std::wstring> experts, names;
    if (!path.empty()) {
        std::vector<std::wstring> parts = Split(path.substr(1), L'/');
        if (parts.size() > 2) return fnd::kStatusBadLocator;
        experts = Split(parts[0], L',');
        if (parts.size() == 2) names = Split(parts[1], L',');
    }
    for (size_t i = 0; i < all.size(); ++i) {
        if (Listed(experts, all[i].expert, std::wstring()) && Listed(names, all[i].name, state[i].alias))
            items->push_back(i);
    }
    return fnd::kStatusOk;
}

int32_t SelectOneItem(const wchar_t* locator, const DeviceModel& model, const std::vector<ItemState>& state,
                      size_t* item) {
    std::vector<size_t> items;
    int32_t status = SelectItems(locator, model, state, &items);
    if (fnd::Failed(status)) return status;
    if (items.empty()) return kStatusNoSuchItem;
    if (items.size() > 1) return kStatusAmbiguousItem;
    *item = items[0];
    return fnd::kStatusOk;
}

}  // namespace qel::sim
