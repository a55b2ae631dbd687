// AES-256-CBC sealing and opening of encrypted form data through OpenSSL's EVP
// interface.
#include "Crypto.h"

#include <algorithm>
#include <climits>
#include <memory>
#include <new>
#include <stdexcept>

#include <openssl/evp.h>
#include <openssl/rand.h>

namespace qel::webhost {

namespace {

struct CipherContextDeleter {
    void operator()(EVP_CIPHER_CTX* context) const noexcept { EVP_CIPHER_CTX_free(context); }
};
using CipherContext = std::unique_ptr<EVP_CIPHER_CTX, CipherContextDeleter>;

CipherContext NewContext() {
    CipherContext context(EVP_CIPHER_CTX_new());
    if (!context) throw std::bad_alloc();
    return context;
}

[[noreturn]] void ThrowOpenSslFailure(const char* step) {
    throw std::runtime_error(std::string("AES-256-CBC: ") + step + " failed");
}

}  // namespace

std::vector<uint8_t> EncryptForRequest(std::span<const uint8_t> key, std::string_view plaintext) {
    std::array<uint8_t, kCipherBlockLength> iv{};
    if (RAND_bytes(iv.data(), static_cast<int>(iv.size())) != 1) ThrowOpenSslFailure("RAND_bytes");
    return EncryptForRequest(key, iv, plaintext);
}

std::vector<uint8_t> EncryptForRequest(std::span<const uint8_t> key,
                                       std::span<const uint8_t, kCipherBlockLength> iv,
                                       std::string_view plaintext) {
    if (key.size() != kEncryptKeyLength) throw std::invalid_argument("AES-256-CBC needs a 32-byte key");
    // EVP counts in int; one block of padding must fit as well.
    if (plaintext.size() > static_cast<size_t>(INT_MAX) - 2 * kCipherBlockLength)
        throw std::invalid_argument("plaintext too long for one EVP call");

    std::vector<uint8_t> cipher(kCipherBlockLength + plaintext.size() + kCipherBlockLength);
    std::copy(iv.begin(), iv.end(), cipher.begin());

    CipherContext context = NewContext();
    if (EVP_EncryptInit_ex(context.get(), EVP_aes_256_cbc(), nullptr, key.data(), iv.data()) != 1)
        ThrowOpenSslFailure("EVP_EncryptInit_ex");
    int written = 0;
    if (EVP_EncryptUpdate(context.get(), cipher.data() + kCipherBlockLength, &written,
                          reinterpret_cast<const unsigned char*>(plaintext.data()),
                          static_cast<int>(plaintext.size())) != 1)
        ThrowOpenSslFailure("EVP_EncryptUpdate");
    int last = 0;
    if (EVP_EncryptFinal_ex(context.get(), cipher.data() + kCipherBlockLength + written, &last) != 1)
        ThrowOpenSslFailure("EVP_EncryptFinal_ex");
    cipher.resize(kCipherBlockLength + static_cast<size_t>(written) + static_cast<size_t>(last));
    return cipher;
}

std::optional<std::string> DecryptFromRequest(std::span<const uint8_t> key, std::span<const uint8_t> cipher) {
    if (key.size() != kEncryptKeyLength) return std::nullopt;
    if (cipher.size() < 2 * kCipherBlockLength || cipher.size() % kCipherBlockLength != 0) return std::nullopt;
    if (cipher.size() > static_cast<size_t>(INT_MAX)) return std::nullopt;

    std::span<const uint8_t> iv = cipher.first(kCipherBlockLength);
    std::span<const uint8_t> body = cipher.subspan(kCipherBlockLength);
    // EVP may write up to one block beyond the input before Final strips the
    // padding.
    std::string text(body.size() + kCipherBlockLength, '\0');
    auto* out = reinterpret_cast<unsigned char*>(text.data());

    CipherContext context = NewContext();
    if (EVP_DecryptInit_ex(context.get(), EVP_aes_256_cbc(), nullptr, key.data(), iv.data()) != 1)
        return std::nullopt;
    int written = 0;
    if (EVP_DecryptUpdate(context.get(), out, &written, body.data(), static_cast<int>(body.size())) != 1)
        return std::nullopt;
    int last = 0;
    if (EVP_DecryptFinal_ex(context.get(), out + written, &last) != 1) return std::nullopt;
    text.resize(static_cast<size_t>(written) + static_cast<size_t>(last));
    return text;
}

}  // namespace qel::webhost
