// Size arithmetic for conversions that throws instead of wrapping around.
#pragma once

#include <cstdint>

namespace qel::fnd {

/// `a * b` as a 32-bit size; a product that does not fit throws
/// exception::OutOfRange from module "SafeInteger".
uint32_t CheckedMultiply(uint32_t a, uint32_t b);
/// `a + b` as a 32-bit size, with the same failure as CheckedMultiply.
uint32_t CheckedAdd(uint32_t a, uint32_t b);

}  // namespace qel::fnd
