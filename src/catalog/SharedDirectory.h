// Where the controller keeps the files that the framework's plug-ins share,
// and the catalogue directory beneath it.
#pragma once

#include "foundation/StringBase.h"

namespace qel::catalog {

using fnd::WString;

inline constexpr const char* kShareDirFile = "/etc/morvane/share/share.dir";
inline constexpr const wchar_t* kDefaultSharedDirectory = L"/usr/local/morvane/share";

/// "QELSHAREDDIR" when set (its value if absolute, else the default); else
/// the first line of `shareDirFile` when it names an absolute path; else
/// "/usr/local/morvane/share". Never fails for want of configuration.
WString GetSharedDirectory(const char* shareDirFile = kShareDirFile);

/// The shared data directory joined with "uixml" and "sysconfig".
WString ComputeSysconfigDirectory();

/// The catalogue directory kept for the plug-in's lifetime. Set whenever the
/// framework is created; read by the catalogue requests. Empty until set.
WString SysconfigDirectory();
void SetSysconfigDirectory(const WString& directory);

}  // namespace qel::catalog
