// Runs the operation named by a request's "Function" argument.
#pragma once

#include <cstdint>

#include "api/ArgumentMap.h"
#include "foundation/StringBase.h"

namespace qel::api {

/// Builds the item locator from "Plugins" and "Items", checks that the
/// mapping admits the operation and runs it. Output elements go to `body`;
/// replaced-character reports to `debugText`. A failure status is thrown as
/// a `long`; the returned value is a success status (0, or 1 for "nothing
/// found").
int32_t DispatchFunction(const ArgumentMap& args, WString& body, WString& debugText, bool authenticated,
                         bool firmware);

}  // namespace qel::api
