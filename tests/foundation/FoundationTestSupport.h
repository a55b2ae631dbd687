// Helpers shared by the foundation's tests: text conversions for literals,
// a temporary directory, exception capture and raw wide buffers.
#pragma once

#include <sys/stat.h>
#include <stdlib.h>

#include <filesystem>
#include <optional>
#include <string>
#include <system_error>
#include <vector>

#include "foundation/StringBase.h"

namespace qel::fnd::testing {

// ASCII only: these build paths and names for the tests.
inline WString W(const std::string& text) { return WString(std::wstring(text.begin(), text.end()).c_str()); }
inline std::string S(const WString& text) { return std::string(text.begin(), text.end()); }
inline NString N(const std::string& text) { return NString(text.c_str()); }

/// A fresh directory for one test, removed with everything below it; open to
/// every user so that a check may run as another one inside it.
struct TempDir {
    std::string path = [] {
        char p[] = "/tmp/qel-test-XXXXXX";
        return std::string(::mkdtemp(p) ? p : "/nonexistent");
    }();
    TempDir() { ::chmod(path.c_str(), 0755); }
    ~TempDir() {
        std::error_code ignored;
        std::filesystem::remove_all(path, ignored);
    }
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;
    std::string operator/(const std::string& name) const { return path + "/" + name; }
};

/// The exception of type E that `call` throws, if it throws one.
template <typename E, typename F>
std::optional<E> ThrownBy(F&& call) {
    try {
        call();
    } catch (const E& e) {
        return e;
    }
    return std::nullopt;
}

/// The bytes of wide characters with the given values, as iconv reads them.
inline std::string RawWide(const std::vector<uint32_t>& values) {
    std::string raw;
    for (uint32_t v : values) {
        wchar_t c = static_cast<wchar_t>(v);
        raw.append(reinterpret_cast<const char*>(&c), sizeof c);
    }
    return raw;
}

}  // namespace qel::fnd::testing
