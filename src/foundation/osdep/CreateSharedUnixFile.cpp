// Opens or creates a lock or state file shared by every local user.
#include "foundation/osdep/CreateSharedUnixFile.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

#include "foundation/Exception.h"

namespace qel::fnd::osdep {

namespace {

constexpr const char* kModule = "osdep/CreateSharedUnixFile";
// Another process may be between creating the file and opening up its bits.
constexpr int kOpenAttempts = 3;

void SleepOneMillisecond() {
    struct timespec left = {0, 1000000};
    while (::nanosleep(&left, &left) != 0 && errno == EINTR) {
    }
}

}  // namespace

int32_t CreateSharedUnixFile(const NString& path) {
    // O_NOFOLLOW: the directory is world-writable, so the last component may
    // be a link planted by another user.
    const int flags = O_RDWR | O_CREAT | O_NOFOLLOW | O_CLOEXEC;
    int fd = -1;
    for (int attempt = 1;;) {
        fd = ::open(path.CStr(), flags, 0666);
        if (fd >= 0) break;
        if (errno == EINTR) continue;
        if (errno != EACCES || attempt == kOpenAttempts) throw PosixError(kModule, 58);
        ++attempt;
        SleepOneMillisecond();
    }
    // The umask narrowed the bits of a new file; an existing file of another
    // user answers EPERM and is left as its owner made it.
    int r;
    do {
        r = ::fchmod(fd, 0666);
    } while (r != 0 && errno == EINTR);
    if (r != 0 && errno != EPERM) {
        int error = errno;
        ::close(fd);
        throw PosixError(kModule, 70, PosixError::Describe(error), error);
    }
    return static_cast<int32_t>(fd);
}

}  // namespace qel::fnd::osdep
