// A status holder whose assignment throws a failure status as a `long`.
#pragma once

#include <cstdint>

namespace qel::fnd {

/// Assigning a negative status throws it as a sign-extended `long`, so the
/// request boundary sees the same negative number on 32- and 64-bit targets;
/// success values (0, 1, ...) are just kept.
class ThrowingStatus {
public:
    ThrowingStatus() noexcept = default;
    ThrowingStatus& operator=(int32_t status) {
        value_ = status;
        if (status < 0) throw static_cast<long>(status);
        return *this;
    }
    int32_t Value() const noexcept { return value_; }
    operator int32_t() const noexcept { return value_; }

private:
    int32_t value_ = 0;
};

}  // namespace qel::fnd
