// 128-bit identifiers and their braced registry text form.
#pragma once

#include <cstdint>

#include "StringBase.h"

namespace qel::fnd {

struct Guid {
    uint32_t Data1 = 0;
    uint16_t Data2 = 0;
    uint16_t Data3 = 0;
    uint8_t Data4[8] = {};

    /// "{XXXXXXXX-XXXX-XXXX-XXXX-XXXXXXXXXXXX}" in upper-case hexadecimal.
    WString ToString() const;
    /// Exactly 38 characters in the layout above, digits of either case;
    /// anything else throws exception::BadGuidString (module "Guid").
    static Guid FromString(const WString& text);

    friend bool operator==(const Guid&, const Guid&) = default;
};

}  // namespace qel::fnd
