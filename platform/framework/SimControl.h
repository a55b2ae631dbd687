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

// What the simulated device answers beyond the generic statuses; the model
// documentation (docs/DEVICE_MODEL.md) says which operation answers which.
/// A locator naming this device selects no item where one is needed.
inline constexpr int32_t kStatusNoSuchItem = fnd::Status(0x80040A01u);
/// A bag or item does not hold the property asked for.
inline constexpr int32_t kStatusNoSuchProperty = fnd::Status(0x80040A02u);
/// A property was asked for, or changed, with another type than it has.
inline constexpr int32_t kStatusTypeMismatch = fnd::Status(0x80040A03u);
/// A change touches a read-only property.
inline constexpr int32_t kStatusReadOnly = fnd::Status(0x80040A04u);
/// RenameAlias in a mode that forbids clashes met another item's alias.
inline constexpr int32_t kStatusAliasConflict = fnd::Status(0x80040A05u);
/// A firmware step came without the token of the change in progress.
inline constexpr int32_t kStatusBadToken = fnd::Status(0x80040A06u);
/// The firmware is being written or erased; nothing else may start.
inline constexpr int32_t kStatusFirmwareBusy = fnd::Status(0x80040A07u);
/// A locator selects several items where one is needed.
inline constexpr int32_t kStatusAmbiguousItem = fnd::Status(0x80040A08u);
/// A time cannot be shown as a local calendar date-time on this system.
inline constexpr int32_t kStatusTimeOutOfRange = fnd::Status(0x80040A09u);


/// RenameAlias modes: what a clash with another item's alias does.
enum RenameMode : uint32_t {
    kRenameAllowClash = 0,   ///< rename anyway; the clash is reported
    kRenameRefuseClash = 1,  ///< rename only without a clash, else kStatusAliasConflict
    kRenameCheckOnly = 2,    ///< report a clash, rename nothing
};

/// Reset modes.
enum ResetMode : uint32_t {
    kResetRestart = 0,          ///< restart: a written firmware becomes the running one
    kResetFactoryDefaults = 1,  ///< restart and forget every persisted change
};

/// SelfTest modes.
enum SelfTestMode : uint32_t {
    kSelfTestQuick = 0,
    kSelfTestExtended = 1,  ///< also reports every item the locator selects
};

/// The states CheckFirmwareStatus reports.
enum FirmwareState : uint32_t {
    kFirmwareIdle = 0,             ///< running the installed firmware
    kFirmwarePrepared = 1,         ///< a change has begun; its token is awaited
    kFirmwareWriting = 2,          ///< a new image or version is being written
    kFirmwareErasing = 3,          ///< the firmware is being erased
    kFirmwareAwaitingRestart = 4,  ///< written; takes effect at the next reset
    kFirmwareErased = 5,           ///< erased; the device needs a new image
};

}  // namespace qel::sim

extern "C" {
/// Number of framework objects currently alive in the process (the framework,
/// its enumerators and the objects they deliver). Back at its earlier value
/// once every reference handed out has been released exactly once.
int32_t qelsysSimLiveObjects();
}
