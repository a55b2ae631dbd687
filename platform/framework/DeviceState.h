// What the simulated device has been told since it left the factory: item
// aliases and property values that differ from the model, kept in a state
// file beside the model so that they survive a restart.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "DeviceModel.h"

namespace qel::sim {

/// The current alias and property values of one item; `values` runs parallel
/// to the item's properties in the model.
struct ItemState {
    std::wstring alias;
    std::vector<PropertyValue> values;
};

/// The device's current state over one model. Thread-safe.
class DeviceState {
public:
    /// Starts from the model and lays over it what the state file at
    /// `statePath` remembers for items and tags the model still has (with the
    /// same type). A missing or unreadable state file means factory state.
    DeviceState(std::shared_ptr<const DeviceModel> model, std::string statePath);

    /// Where the state of the model at `modelPath` is kept.
    static std::string PathBeside(const std::string& modelPath);

    /// A copy of the whole state, consistent at one moment.
    std::vector<ItemState> Snapshot() const;

    /// Runs `change` on a copy of the state; when it answers true the copy is
    /// written to the state file and becomes the state. Returns the status of
    /// the write (the state is unchanged when it failed), or 1 when `change`
    /// answered false. Changes are serialised, so check and change are one step.
    int32_t Update(const std::function<bool(std::vector<ItemState>&)>& change);

    /// Back to the model's values: the state file is removed.
    int32_t FactoryReset();

private:
    int32_t Save(const std::vector<ItemState>& items) const;
    std::vector<ItemState> Factory() const;

    std::shared_ptr<const DeviceModel> model_;
    std::string path_;
    mutable std::mutex lock_;
    std::vector<ItemState> items_;
};

}  // namespace qel::sim
