// Exceptions whose messages need conversions or the system's error texts.
#include "foundation/Exception.h"

#include <cerrno>
#include <cstring>

#include "foundation/osdep/IConv.h"

namespace qel::fnd::exception {

AccessDenied::AccessDenied(const WString& path) : message_(Compose(path)) {}

AccessDenied::AccessDenied(const char* file, int32_t line, const WString& path)
    : Exception(file, line), message_(Compose(path)) {}

NString AccessDenied::Compose(const WString& path) {
    NString text("Access denied: ");
    text.Append(osdep::Narrow(path));
    return text;
}

}  // namespace qel::fnd::exception

namespace qel::fnd::osdep {

// errno is read before anything else can run (the message is built after).
struct PosixError::Captured {
    int error;
    Captured() : error(errno) {}
};

PosixError::PosixError() : PosixError(nullptr, 0) {}

PosixError::PosixError(const char* file, int32_t line)
    : PosixError(file, line, Captured()) {}

PosixError::PosixError(const char* file, int32_t line, Captured captured)
    : OSException(file, line, Describe(captured.error), captured.error) {}

int32_t PosixError::ErrorCode() const noexcept {
    switch (OSErrorCode()) {
        case 0: return 0;
        case ENOENT: return 7;
        default: return 42;
    }
}

NString PosixError::Describe(int error) {
    char buffer[256];
    // The GNU strerror_r may return a static text instead of filling buffer.
    const char* text = strerror_r(error, buffer, sizeof buffer);
    return NString(text);
}

}  // namespace qel::fnd::osdep
