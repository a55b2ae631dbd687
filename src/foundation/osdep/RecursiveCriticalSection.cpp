// RecursiveCriticalSection over a recursive, priority-inheriting pthread mutex.
#include "foundation/osdep/RecursiveCriticalSection.h"

#include <pthread.h>

#include <atomic>

#include "foundation/Exception.h"

namespace qel::fnd::osdep {

namespace {
constexpr const char* kModule = "osdep/RecursiveCriticalSection";
}

struct RecursiveCriticalSection::Record {
    // Read by IsOwnedByCaller without the mutex, hence atomic.
    std::atomic<pthread_t> owner{};
    pthread_mutex_t mutex;
    int32_t depth = 0;
};

RecursiveCriticalSection::RecursiveCriticalSection() : record_(std::make_unique<Record>()) {
    pthread_mutexattr_t attr;
    pthread_mutexattr_init(&attr);
    pthread_mutexattr_settype(&attr, PTHREAD_MUTEX_RECURSIVE);
    // Priority inheritance keeps a low-priority holder from stalling the
    // announcer or a request thread of higher priority.
    pthread_mutexattr_setprotocol(&attr, PTHREAD_PRIO_INHERIT);
    int rc = pthread_mutex_init(&record_->mutex, &attr);
    pthread_mutexattr_destroy(&attr);
    if (rc != 0) throw PosixError(kModule, __LINE__, PosixError::Describe(rc), rc);
}

RecursiveCriticalSection::~RecursiveCriticalSection() { pthread_mutex_destroy(&record_->mutex); }

void RecursiveCriticalSection::Lock() {
    int rc = pthread_mutex_lock(&record_->mutex);
    if (rc != 0) throw PosixError(kModule, __LINE__, PosixError::Describe(rc), rc);
    record_->owner.store(pthread_self(), std::memory_order_relaxed);
    ++record_->depth;
}

bool RecursiveCriticalSection::TryLock() {
    if (pthread_mutex_trylock(&record_->mutex) != 0) return false;
    record_->owner.store(pthread_self(), std::memory_order_relaxed);
    ++record_->depth;
    return true;
}

int32_t RecursiveCriticalSection::Unlock() {
    if (!IsOwnedByCaller()) return 0;
    if (record_->depth > 0) --record_->depth;
    if (record_->depth == 0) record_->owner.store(pthread_t{}, std::memory_order_relaxed);
    return pthread_mutex_unlock(&record_->mutex);
}

bool RecursiveCriticalSection::IsOwnedByCaller() const {
    return pthread_equal(record_->owner.load(std::memory_order_relaxed), pthread_self()) != 0;
}

}  // namespace qel::fnd::osdep
