// Finding the shared data directory and keeping the catalogue directory.
#include "catalog/SharedDirectory.h"

#include <cstdlib>
#include <cstring>
#include <mutex>

#include "foundation/osdep/BinaryFile.h"
#include "foundation/osdep/IConv.h"
#include "foundation/osdep/path.h"

namespace qel::catalog {

namespace {

bool IsAbsolute(const WString& path) { return !path.IsEmpty() && path[0] == L'/'; }

// Written when the framework is created and read by catalogue requests on
// other threads; a plain string would race, so it has a lock of its own
// (a leaf: nothing else is taken while it is held).
std::mutex& DirectoryLock() {
    static std::mutex lock;
    return lock;
}
WString& DirectoryValue() {
    static WString value;
    return value;
}

}  // namespace

WString GetSharedDirectory(const char* shareDirFile) {
    if (const char* env = std::getenv("QELSHAREDDIR")) {
        WString value = fnd::osdep::Widen(fnd::NString(env));
        return IsAbsolute(value) ? value : WString(kDefaultSharedDirectory);
    }
    fnd::osdep::BinaryFile file(fnd::osdep::Widen(fnd::NString(shareDirFile)), fnd::osdep::BinaryFile::kRead, true);
    if (file.IsOpen()) {
        char buffer[256] = {};
        int64_t got = file.Read(buffer, 255);
        if (got > 0) {
            buffer[got] = '\0';
            // The text ends at the first line end of either kind.
            buffer[std::strcspn(buffer, "\n")] = '\0';
            buffer[std::strcspn(buffer, "\r")] = '\0';
            WString value = fnd::osdep::Widen(fnd::NString(buffer));
            if (IsAbsolute(value)) return value;
        }
    }
    return WString(kDefaultSharedDirectory);
}

WString ComputeSysconfigDirectory() {
    return fnd::osdep::JoinPath(fnd::osdep::JoinPath(GetSharedDirectory(), WString(L"uixml")), WString(L"sysconfig"));
}

WString SysconfigDirectory() {
    std::lock_guard<std::mutex> hold(DirectoryLock());
    return DirectoryValue();
}

void SetSysconfigDirectory(const WString& directory) {
    WString copy(directory);  // allocate outside the lock
    std::lock_guard<std::mutex> hold(DirectoryLock());
    DirectoryValue().Swap(copy);
}

}  // namespace qel::catalog
