// CQelMutex on a default (non-recursive) POSIX mutex.
#include "foundation/QelMutex.h"

#include <pthread.h>

#include <cstdint>
#include <cstdlib>

namespace qel::fnd {

struct CQelMutex::Record {
    uint32_t locked = 0;
    pthread_t owner{};
    pthread_mutex_t mutex = PTHREAD_MUTEX_INITIALIZER;
};

CQelMutex::CQelMutex() : record_(std::make_unique<Record>()) {}

CQelMutex::~CQelMutex() { pthread_mutex_destroy(&record_->mutex); }

void CQelMutex::Lock() {
    pthread_mutex_lock(&record_->mutex);
    // Only the holder of the mutex writes the flag, so finding it set means
    // the bookkeeping is broken; carrying on would corrupt reference counts.
    if (record_->locked) std::abort();
    __atomic_store_n(&record_->owner, pthread_self(), __ATOMIC_RELAXED);
    __atomic_store_n(&record_->locked, 1u, __ATOMIC_RELAXED);
}

void CQelMutex::Unlock() {
    __atomic_store_n(&record_->locked, 0u, __ATOMIC_RELAXED);
    __atomic_store_n(&record_->owner, pthread_t{}, __ATOMIC_RELAXED);
    pthread_mutex_unlock(&record_->mutex);
}

bool CQelMutex::IsLockedByCaller() const {
    // Read without the mutex: a thread can only find its own id here when it
    // wrote it itself, which is the question being asked.
    return __atomic_load_n(&record_->locked, __ATOMIC_RELAXED) &&
           pthread_equal(__atomic_load_n(&record_->owner, __ATOMIC_RELAXED), pthread_self());
}

CQelMutex& ComObjectCountMutex() {
    static CQelMutex mutex;
    return mutex;
}

namespace {
// Built at load so that no component object's first reference races the
// construction of the lock.
[[maybe_unused]] const CQelMutex& kBuiltAtLoad = ComObjectCountMutex();
}  // namespace

}  // namespace qel::fnd
