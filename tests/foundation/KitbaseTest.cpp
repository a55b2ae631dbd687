// The in-process locks: recursion by the owner, exclusion of other threads,
// and unlocks by threads that do not own the lock.
#include "foundation/Kitbase.h"

#include <gtest/gtest.h>

#include <atomic>
#include <thread>

#include "foundation/osdep/RecursiveCriticalSection.h"

namespace qel::fnd::osdep {
namespace {

bool TryFromOtherThread(RecursiveCriticalSection& cs) {
    bool got = false;
    std::thread([&] {
        got = cs.TryLock();
        if (got) cs.Unlock();
    }).join();
    return got;
}

TEST(RecursiveCriticalSection, OwnerNestsAndOthersWaitForTheLastUnlock) {
    RecursiveCriticalSection cs;
    cs.Lock();
    EXPECT_TRUE(cs.TryLock());
    cs.Lock();
    EXPECT_TRUE(cs.IsOwnedByCaller());
    EXPECT_FALSE(TryFromOtherThread(cs));
    cs.Unlock();
    cs.Unlock();
    EXPECT_FALSE(TryFromOtherThread(cs));  // one level still held
    cs.Unlock();
    EXPECT_FALSE(cs.IsOwnedByCaller());
    EXPECT_TRUE(TryFromOtherThread(cs));
}

TEST(RecursiveCriticalSection, UnlockByAnotherThreadDoesNothing) {
    RecursiveCriticalSection cs;
    cs.Lock();
    int32_t result = -1;
    std::thread([&] { result = cs.Unlock(); }).join();
    EXPECT_EQ(result, 0);
    EXPECT_TRUE(cs.IsOwnedByCaller());
    EXPECT_FALSE(TryFromOtherThread(cs));
    cs.Unlock();
    EXPECT_TRUE(TryFromOtherThread(cs));
}

TEST(CqelCS, SerialisesThreadsAndIgnoresTheTimeout) {
    Kitbase::CqelCS cs;
    int64_t counter = 0;  // guarded only by cs: the thread sanitizer checks it
    std::atomic<int> ready{0};
    auto work = [&] {
        ready.fetch_add(1);
        for (int i = 0; i < 2000; ++i) {
            EXPECT_TRUE(cs.Lock(i % 2 ? -1 : 0));
            Kitbase::CqelCSLock nested(cs);
            ++counter;
            cs.Unlock();
        }
    };
    std::thread a(work), b(work), c(work);
    a.join();
    b.join();
    c.join();
    EXPECT_EQ(counter, 6000);
}

}  // namespace
}  // namespace qel::fnd::osdep
