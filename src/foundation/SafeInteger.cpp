// Checked size arithmetic.
#include "foundation/SafeInteger.h"

#include "foundation/Exception.h"

namespace qel::fnd {

uint32_t CheckedMultiply(uint32_t a, uint32_t b) {
    uint64_t product = static_cast<uint64_t>(a) * b;
    if (product > UINT32_MAX) throw exception::OutOfRange("SafeInteger", __LINE__);
    return static_cast<uint32_t>(product);
}

uint32_t CheckedAdd(uint32_t a, uint32_t b) {
    uint64_t sum = static_cast<uint64_t>(a) + b;
    if (sum > UINT32_MAX) throw exception::OutOfRange("SafeInteger", __LINE__);
    return static_cast<uint32_t>(sum);
}

}  // namespace qel::fnd
