// Creates or opens up a directory shared by every local user.
#include "foundation/osdep/CreateSharedUnixDir.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "foundation/Exception.h"
#include "foundation/osdep/IConv.h"
#include "foundation/osdep/path.h"

namespace qel::fnd::osdep {

namespace {
constexpr const char* kModule = "osdep/CreateSharedUnixDir";
}

void CreateSharedUnixDir(const WString& path) {
    if (!IsDirectory(path)) {
        CreateDirectories(path);
        if (!IsDirectory(path)) throw PosixError(kModule, 28);
    }
    // The directory lives in world-writable /tmp: a link planted there by
    // another user must not make us open up whatever it points to. Open the
    // directory itself without following a link (a trailing slash would
    // follow it, so it goes) and change the bits on what was opened.
    NString bytes = Narrow(path);
    while (bytes.Length() > 1 && bytes.Back() == '/') bytes.Resize(bytes.Length() - 1);
    int fd;
    do {
        fd = ::open(bytes.CStr(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
    } while (fd < 0 && errno == EINTR);
    if (fd < 0) throw PosixError(kModule, 39);
    int r;
    do {
        r = ::fchmod(fd, 0777);
    } while (r != 0 && errno == EINTR);
    int error = errno;
    ::close(fd);
    errno = error;
    // EPERM: the directory belongs to another user, who shared it already.
    if (r != 0 && errno != EPERM) throw PosixError(kModule, 39);
}

}  // namespace qel::fnd::osdep
