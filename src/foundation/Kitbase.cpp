// Kitbase::CqelCS over the foundation's recursive critical section.
#include "foundation/Kitbase.h"

namespace Kitbase {

bool CqelCS::Lock(int32_t /*timeoutMs*/) {
    section_.Lock();
    return true;
}

int32_t CqelCS::Unlock() { return section_.Unlock(); }

}  // namespace Kitbase
