// Lists the paths that match a wildcard pattern, through the system's glob.
#include "foundation/osdep/FindFiles.h"

#include <cerrno>
#include <glob.h>

#include "foundation/Exception.h"
#include "foundation/osdep/IConv.h"

namespace qel::fnd::osdep {

namespace {

constexpr const char* kModule = "osdep/FindFiles";

// Releases the glob result however the listing ends.
struct GlobResult {
    GlobResult() = default;
    ~GlobResult() { ::globfree(&matches); }
    GlobResult(const GlobResult&) = delete;
    GlobResult& operator=(const GlobResult&) = delete;

    glob_t matches{};
};

}  // namespace

std::vector<WString> FindFiles(const WString& pattern) {
    NString bytes = Narrow(pattern);
    GlobResult result;
    int r = ::glob(bytes.CStr(), 0, nullptr, &result.matches);
    if (r == GLOB_NOMATCH) return {};
    if (r != 0) {
        int error = errno;
        throw PosixError(kModule, 288, PosixError::Describe(error), error);
    }
    std::vector<WString> paths;
    paths.reserve(result.matches.gl_pathc);
    for (size_t i = 0; i < result.matches.gl_pathc; ++i) paths.push_back(Widen(NString(result.matches.gl_pathv[i])));
    return paths;
}

}  // namespace qel::fnd::osdep
