// Where the simulated device keeps its shared data, found as the device finds it.
#pragma once

#include "foundation/StringBase.h"

namespace qel::sim {

/// The shared data directory, in the bytes the file system takes: an absolute
/// "QELSHAREDDIR" when that variable is set (a relative one means the default,
/// and the configuration file is then not read); otherwise the first line of
/// "/etc/morvane/share/share.dir" when it is an absolute path; otherwise
/// "/usr/local/morvane/share". Reads the environment and the file on every
/// call, so that a test may point each instantiation somewhere else.
fnd::NString SharedDataDirectory();

}  // namespace qel::sim
