// The runtime's request-variable protocol.
#include "service/RequestVariables.h"

#include <cstring>
#include <vector>

#include "service/WebhostRuntime.h"

namespace qel::service {

fnd::NString ReadRequestVariable(void* request, const char* name) {
    char first[32] = {};
    uint32_t size = sizeof first;
    if (ReadRequestVariable_C_REST_QEL_QLWS_(request, name, first, &size) == 0) {
        return fnd::NString(first, static_cast<uint32_t>(strnlen(first, sizeof first)));
    }
    if (size == 0) {
        // The runtime left a terminated text in the buffer; take it, but never
        // read past the buffer if it did not.
        return fnd::NString(first, static_cast<uint32_t>(strnlen(first, sizeof first)));
    }
    // One extra byte so that the text is terminated whatever the runtime does.
    std::vector<char> buffer(static_cast<size_t>(size) + 1, '\0');
    uint32_t retrySize = size;
    if (ReadRequestVariable_C_REST_QEL_QLWS_(request, name, buffer.data(), &retrySize) != 0) return fnd::NString();
    return fnd::NString(buffer.data(), static_cast<uint32_t>(strnlen(buffer.data(), size)));
}

}  // namespace qel::service
