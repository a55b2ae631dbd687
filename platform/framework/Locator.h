// Which items a locator names: "//localhost", "//localhost/P", "//localhost/P/I".
#pragma once

#include <cstdint>
#include <vector>

#include "DeviceState.h"

namespace qel::sim {

/// 0 when `locator` names this device ("//localhost", alone or followed by
/// "/" and a path), kStatusBadLocator for another host, kStatusPointer for null.
int32_t CheckDevice(const wchar_t* locator) noexcept;

/// The indexes of the items `locator` names, in model order: every item for
/// "//localhost"; for "//localhost/P" those whose expert is in the
/// comma-separated list P; for "//localhost/P/I" those of them whose name or
/// current alias is in the comma-separated list I. An empty list selects all.
/// An item's own URI names that item. Answers CheckDevice's failures, and
/// kStatusBadLocator for a path of more than two parts.
int32_t SelectItems(const wchar_t* locator, const DeviceModel& model, const std::vector<ItemState>& state,
                    std::vector<size_t>* items);

/// SelectItems for operations on one item: kStatusNoSuchItem when none is
/// named, kStatusAmbiguousItem when several are.
int32_t SelectOneItem(const wchar_t* locator, const DeviceModel& model, const std::vector<ItemState>& state,
                      size_t* item);

}  // namespace qel::sim
