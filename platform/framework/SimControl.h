// What tests of the simulated framework may ask of it beyond the framework's
// own interface, and the statuses its instantiation answers.
#pragma once

#include <cstdint>

#include "foundation/Status.h"

namespace qel::sim {

/// qelsysInstantiateFramework: the model file "sim/device.json" does not
/// exist under the shared data directory.
inline constexpr int32_t kStatusModelMissing = fnd::Status(0x80070002u);
/// qelsysInstantiateFramework: the model may not be read.
inline constexpr int32_t kStatusModelDenied = fnd::Status(0x80070005u);
/// qelsysInstantiateFramework: the model is not JSON, not strict UTF-8, or not
/// of the expected shape (including a malformed GUID).
inline constexpr int32_t kStatusModelInvalid = fnd::Status(0x8007000Du);

}  // namespace qel::sim

extern "C" {
/// Number of framework objects currently alive in the process (the framework,
/// its enumerators and the objects they deliver). Back at its earlier value
/// once every reference handed out has been released exactly once.
int32_t qelsysSimLiveObjects();
}
