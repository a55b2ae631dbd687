// The process-wide framework object and the lock that guards its creation.
#pragma once

#include <cstdint>

#include "api/Framework.h"
#include "foundation/Kitbase.h"

namespace qel::api {

/// Guards the framework's creation and release, and the notification
/// registrations. Taken after the module critical section, never before it.
Kitbase::CqelCS& ServiceLock();

/// The framework object, or null before EnsureFramework and after release.
/// Read without the lock by request threads.
IkrSysFramework* FrameworkPointer();

/// Creates the framework on first use (and again after a release); also
/// refreshes the catalogue directory whenever it finds no framework.
/// Returns 0 or the framework's failure status.
int32_t EnsureFramework();

/// Releases the framework under ServiceLock; nothing happens when none exists.
void ReleaseFramework();

}  // namespace qel::api
