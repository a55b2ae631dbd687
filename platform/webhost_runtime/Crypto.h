// The sealing of encrypted form data between a client and the web server
// runtime: AES-256-CBC with PKCS#7 padding, a 16-byte IV before the ciphertext.
#pragma once

#include <array>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace qel::webhost {

inline constexpr uint32_t kEncryptKeyLength = 32;
/// The cipher's block length, which is also the length of the IV.
inline constexpr uint32_t kCipherBlockLength = 16;

using EncryptKey = std::array<uint8_t, kEncryptKeyLength>;

/// What a client sends for `plaintext` under `key`: a fresh random IV followed
/// by the ciphertext (not Base64-encoded). Throws std::invalid_argument when
/// the key is not 32 bytes, std::runtime_error when OpenSSL fails.
std::vector<uint8_t> EncryptForRequest(std::span<const uint8_t> key, std::string_view plaintext);

/// The same with a chosen IV, for ciphertexts that must be reproducible
/// (fixtures, and cases whose outcome would otherwise depend on the IV).
std::vector<uint8_t> EncryptForRequest(std::span<const uint8_t> key,
                                       std::span<const uint8_t, kCipherBlockLength> iv,
                                       std::string_view plaintext);

/// The inverse of EncryptForRequest. Empty when the key is not 32 bytes, when
/// the cipher is not an IV followed by at least one whole block, or when the
/// padding is wrong; the padding is the only sign of a wrong key, so a wrong
/// key goes unnoticed about once in 256 cases.
std::optional<std::string> DecryptFromRequest(std::span<const uint8_t> key, std::span<const uint8_t> cipher);

}  // namespace qel::webhost
