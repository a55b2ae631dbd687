// Named status values (HRESULT convention: negative means failure) that the
// service itself produces.
#pragma once

#include <cstdint>

namespace qel::fnd {

inline constexpr int32_t Status(uint32_t bits) { return static_cast<int32_t>(bits); }

inline constexpr int32_t kStatusOk = 0;
inline constexpr int32_t kStatusFalse = 1;  // nothing found, or a wait timed out
inline constexpr int32_t kStatusFail = Status(0x80004005u);
inline constexpr int32_t kStatusNotImplemented = Status(0x80004001u);
inline constexpr int32_t kStatusNoInterface = Status(0x80004002u);
inline constexpr int32_t kStatusPointer = Status(0x80004003u);
inline constexpr int32_t kStatusOutOfMemory = Status(0x8007000Eu);
inline constexpr int32_t kStatusInvalidArg = Status(0x80070057u);
inline constexpr int32_t kStatusBadLocator = Status(0x80040372u);
inline constexpr int32_t kStatusDecryptFailed = Status(0x80040378u);
inline constexpr int32_t kStatusWrongMapping = Status(0x8004037Du);
inline constexpr int32_t kStatusBadUpload = Status(0x80040387u);

inline constexpr bool Failed(int32_t status) { return status < 0; }

}  // namespace qel::fnd
