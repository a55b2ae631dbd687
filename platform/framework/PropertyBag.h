// The property bags the simulated framework hands out and takes back.
#pragma once

#include <cstdint>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "ComObject.h"
#include "DeviceModel.h"

namespace qel::sim {

/// One property in a bag. `changed` is set by every setter and cleared by
/// ResetChangeTracking, so that the framework can tell changes from context.
struct BagEntry {
    api::PropertyTag tag = 0;
    PropertyValue value;
    bool changed = false;
};

/// The framework's own view of a bag it made, beyond the interfaces.
class BagContent {
public:
    /// The properties in the order they were first set.
    virtual std::vector<BagEntry> Entries() const = 0;
    /// The URI of the item the bag was read from; empty for a bag made by
    /// CreatePropertyBag.
    virtual const std::wstring& ItemUri() const noexcept = 0;
    /// Replaces the values of the listed tags, which the bag already holds,
    /// without marking them changed.
    virtual void Refresh(const std::vector<BagEntry>& fresh) = 0;

protected:
    ~BagContent() = default;
};

/// A bag made by this framework; null for a foreign one. Lends the pointer
/// for as long as the caller holds `bag`.
BagContent* ContentOf(api::IkrSysPropertyBag* bag) noexcept;

/// A new bag with one reference. `legacy` bags do not answer
/// IkrSysPropertyBagEx. `model` supplies the faults of the getters, which
/// match on `itemUri` as their locator.
api::IkrSysPropertyBag* MakeBag(std::shared_ptr<const DeviceModel> model, std::wstring itemUri, bool legacy,
                                std::vector<BagEntry> entries);

}  // namespace qel::sim
