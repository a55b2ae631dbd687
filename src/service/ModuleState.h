// The plug-in's process-wide state: the module critical section and the
// optional runtime entry points bound at start-up.
#pragma once

#include "foundation/Kitbase.h"
#include "service/WebhostRuntime.h"

namespace qel::service {

/// Optional entry points of the web server runtime; null when the runtime
/// lacks one. Written only by Init, read by every request without a lock.
struct OptionalEntryPoints {
    webhost::GetEncryptKeyFn getEncryptKey = nullptr;
    webhost::DecryptFn decrypt = nullptr;
    webhost::ReadAllFormDataWithMimeFn readAllFormDataWithMime = nullptr;
    webhost::KeyValueWithMimeGetFirstFn keyValueWithMimeGetFirst = nullptr;
    webhost::KeyValueWithMimeGetNextFn keyValueWithMimeGetNext = nullptr;
    webhost::KeyValueWithMimeGetKeyFn keyValueWithMimeGetKey = nullptr;
    webhost::KeyValueWithMimeGetValueFn keyValueWithMimeGetValue = nullptr;
    webhost::FreeKeyValuePairWithMimeListFn freeKeyValuePairWithMimeList = nullptr;
};

OptionalEntryPoints& EntryPoints();

/// Guards the announcer's start, reaping and stop. Taken before ServiceLock.
Kitbase::CqelCS& ModuleCriticalSection();

/// Start-up: binds the optional entry points from
/// <shared data directory>/QelWebServer/libwebhost_runtime.so.
void Initialize();
/// Shut-down: releases the framework.
void Finalize();

}  // namespace qel::service
