// Tag lists sized by the client's 32-bit "NbrTags": a count whose array
// cannot be had fails with the out-of-memory status, never with less room.
#include <gtest/gtest.h>

#include <sys/resource.h>
#include <unistd.h>

#include <cstdint>
#include <cstdlib>

#include "FakeFramework.h"
#include "api/Operations.h"
#include "foundation/IntegerText.h"
#include "foundation/Status.h"

namespace qel::api::testing {
namespace {

constexpr bool kNarrowSize = SIZE_MAX <= 0xFFFFFFFFu;

// Both operations with a count given in hexadecimal; a too-large array must
// not become a small one that "Tag_0" then fills.
void ExpectOutOfMemory(const wchar_t* count) {
    FakeFramework fake;
    Dispatch dispatch(fake);
    auto populate = dispatch.Run({{L"Function", L"PopulateOrRefreshProperties"},
                                  {L"AllowAsyncNotification", L"0"},
                                  {L"NbrTags", count},
                                  {L"Tag_0", L"1"}});
    EXPECT_TRUE(populate.thrown);
    EXPECT_EQ(populate.status, fnd::kStatusOutOfMemory);
    EXPECT_EQ(populate.body, L"");
    auto persist = dispatch.Run(
        {{L"Function", L"PersistPropertyChanges"}, {L"NbrTags", count}, {L"Tag_0", L"1"}, {L"NbrTags_0", L"0"}});
    EXPECT_TRUE(persist.thrown);
    EXPECT_EQ(persist.status, fnd::kStatusOutOfMemory);
    EXPECT_EQ(persist.body, L"<PersistChanges requiresRestart='0' /><DetailedResult></DetailedResult>");
    EXPECT_TRUE(fake.log.size() == 1 && fake.log[0] == L"get //localhost") << "no call after the allocation";
    fake.ExpectAllReleased();
}

TEST(TagCount, CountsBeyondTheAddressSpaceFailOn32BitTargets) {
    if (!kNarrowSize) GTEST_SKIP() << "every 32-bit count fits a 64-bit size";
    // 0x40000000 tags are exactly 2^32 bytes: wrapped, a zero-byte array.
    for (const wchar_t* count : {L"FFFFFFFF", L"40000000", L"40000001"}) {
        SCOPED_TRACE(::testing::PrintToString(std::wstring(count)));
        EXPECT_THROW(AllocateTagArray(fnd::StringToInteger<uint32_t>(WString(count), 16)), std::bad_alloc);
        ExpectOutOfMemory(count);
    }
}

TEST(TagCount, AnArrayBeyondTheMemoryLimitFails) {
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
    GTEST_SKIP() << "the sanitizer allocators abort instead of failing an allocation";
#else
    if (kNarrowSize) GTEST_SKIP() << "covered by the address-space test";
    // In a child with its address space capped, 16 GiB of tags cannot be had.
    EXPECT_EXIT(
        {
            struct rlimit limit {};
            limit.rlim_cur = limit.rlim_max = static_cast<rlim_t>(uint64_t{4} << 30);
            if (setrlimit(RLIMIT_AS, &limit) != 0) std::_Exit(2);
            ExpectOutOfMemory(L"FFFFFFFF");
            std::_Exit(::testing::Test::HasFailure() ? 1 : 0);
        },
        ::testing::ExitedWithCode(0), "");
#endif
}

TEST(TagCount, LargeCountsThatFitAreAllocatedWhole) {
    auto tags = AllocateTagArray(0x100000);
    tags[0xFFFFF] = 7;  // the last element exists
    EXPECT_EQ(tags[0xFFFFF], 7u);
    EXPECT_NE(AllocateTagArray(0), nullptr);
}

}  // namespace
}  // namespace qel::api::testing
