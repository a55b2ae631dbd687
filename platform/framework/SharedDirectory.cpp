// Finding the shared data directory from the environment or the device's configuration file.
#include "SharedDirectory.h"

#include <cerrno>
#include <cstdlib>
#include <fcntl.h>
#include <unistd.h>

namespace qel::sim {

namespace {

constexpr const char* kVariable = "QELSHAREDDIR";
constexpr const char* kConfigFile = "/etc/morvane/share/share.dir";
constexpr const char* kDefault = "/usr/local/morvane/share";
// The device reads no more of the configuration file than this.
constexpr uint32_t kConfigReadLimit = 255;

bool IsAbsolute(const fnd::NString& path) { return !path.IsEmpty() && path[0] == '/'; }

/// Up to kConfigReadLimit bytes from the start of the configuration file, cut
/// at the first line end; empty when the file cannot be opened or read.
fnd::NString ReadConfigFirstLine() {
    int fd;
    do {
        fd = ::open(kConfigFile, O_RDONLY | O_CLOEXEC);
    } while (fd < 0 && errno == EINTR);
    if (fd < 0) return fnd::NString();

    char buffer[kConfigReadLimit];
    uint32_t used = 0;
    while (used < kConfigReadLimit) {
        ssize_t got = ::read(fd, buffer + used, kConfigReadLimit - used);
        if (got < 0 && errno == EINTR) continue;
        if (got <= 0) {
            if (got < 0) used = 0;  // a half-read path is no path
            break;
        }
        used += static_cast<uint32_t>(got);
    }
    ::close(fd);

    uint32_t length = 0;
    while (length < used && buffer[length] != '\n' && buffer[length] != '\r' && buffer[length] != '\0') ++length;
    return fnd::NString(buffer, length);
}

}  // namespace

fnd::NString SharedDataDirectory() {
    if (const char* value = std::getenv(kVariable)) {
        fnd::NString fromEnvironment(value);
        return IsAbsolute(fromEnvironment) ? fromEnvironment : fnd::NString(kDefault);
    }
    fnd::NString fromConfig = ReadConfigFirstLine();
    return IsAbsolute(fromConfig) ? fromConfig : fnd::NString(kDefault);
}

}  // namespace qel::sim
