// Reading request variables through the web server runtime.
#pragma once

#include "foundation/StringBase.h"

namespace qel::service {

/// The variable's value ("REQUEST_METHOD", "CONTENT_TYPE", "items", "loc"),
/// following the runtime's buffer protocol: 32 bytes first, then one retry
/// with the size the runtime asks for. A value the runtime cannot give is
/// the empty text.
fnd::NString ReadRequestVariable(void* request, const char* name);

}  // namespace qel::service
