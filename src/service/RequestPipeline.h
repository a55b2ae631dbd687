// One request, from the host's call to the written result document.
#pragma once

namespace qel::webhost {
class RequestMapping;
}

namespace qel::service {

/// Routes by mapping name, runs the API operation or catalogue builder and
/// writes exactly one document through the runtime. Never throws.
void RunRequest(const webhost::RequestMapping* mapping, void* request) noexcept;

}  // namespace qel::service
