// What callers see of the exception hierarchy: texts, codes, bases, and the
// status thrown as a long.
#include "foundation/Exception.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <cstring>
#include <new>
#include <typeinfo>

#include "foundation/Status.h"
#include "foundation/ThrowingStatus.h"

namespace qel::fnd {
namespace {

using namespace exception;

template <typename E>
void ExpectFixed(const char* text, uint32_t code) {
    SCOPED_TRACE(typeid(E).name());
    E byDefault;
    EXPECT_STREQ(byDefault.what(), text);
    EXPECT_EQ(byDefault.ErrorCode(), static_cast<int32_t>(code));
    EXPECT_EQ(byDefault.File(), nullptr);
    EXPECT_EQ(byDefault.Line(), 0);
    E placed("osdep/Thread", 123);
    EXPECT_STREQ(placed.what(), text);
    EXPECT_STREQ(placed.File(), "osdep/Thread");
    EXPECT_EQ(placed.Line(), 123);
}

TEST(Exception, FixedTextsAndCodes) {
    ExpectFixed<Exception>("unspecified exception", 0xFFFFFFFFu);
    ExpectFixed<OutOfRange>("Out of range", 0x8ABC7007u);
    ExpectFixed<BoundExceeded>("A request was made that would exceed the bounds", 0x8ABC7007u);
    ExpectFixed<InvalidArgument>("Invalid argument(s)", 0x8ABC700Fu);
    ExpectFixed<ObjectAlreadyExists>("Object already exists", 0x8ABC7009u);
    ExpectFixed<NonexistentException>("The object does not exist", 0x8ABC700Au);
    ExpectFixed<InvalidOperation>("Invalid operation", 0x8ABC700Eu);
    ExpectFixed<FileWriteFailed>("Write file operation failed", 0x8ABC7011u);
    ExpectFixed<FileReadFailed>("Read file operation failed", 0x8ABC7012u);
    ExpectFixed<DeserializationError>("Failed to deserialize", 0x8ABC7014u);
    ExpectFixed<BufferOverflow>("Buffer overflowed", 0x8ABC7017u);
    ExpectFixed<FileAlreadyExists>("File already exists", 0x8ABC701Bu);
    ExpectFixed<InvalidLocale>("Invalid locale", 0x8ABC7024u);
    ExpectFixed<InvalidSequence>("Invalid UTF8 encoding sequence", 0x8ABC7030u);
    ExpectFixed<BadGuidString>("Badly formatted Guid string.", 0x8ABC7032u);
    ExpectFixed<UnableToConvert>("Unable to convert.", 0x8ABC7034u);
    ExpectFixed<NotImplemented>("Not implemented", 0x80004001u);
}

TEST(Exception, ComposedMessagesKeepPrefixAndBaseClass) {
    try {
        throw OutOfRange2("StringBase", 7, NString("String offset out of range"));
    } catch (const OutOfRange& e) {
        EXPECT_STREQ(e.what(), "Out of range: String offset out of range");
        EXPECT_EQ(e.ErrorCode(), static_cast<int32_t>(0x8ABC7007u));
        EXPECT_EQ(e.Line(), 7);
    }
    try {
        throw InvalidArgument2(NString("bad"));
    } catch (const InvalidArgument& e) {
        EXPECT_STREQ(e.what(), "Invalid argument(s): bad");
        EXPECT_EQ(e.ErrorCode(), static_cast<int32_t>(0x8ABC700Fu));
    }
    try {
        throw BoundExceeded2(NString("Resulting string too large"));
    } catch (const BoundExceeded& e) {
        EXPECT_STREQ(e.what(), "A request was made that would exceed the bounds: Resulting string too large");
    }
}

TEST(Exception, CopiesOwnTheirMessage) {
    auto* original = new InvalidArgument2("m", 1, NString("detail"));
    InvalidArgument2 copy(*original);
    delete original;
    EXPECT_STREQ(copy.what(), "Invalid argument(s): detail");
    EXPECT_STREQ(copy.File(), "m");
}

TEST(Exception, AccessDeniedNamesThePath) {
    AccessDenied e("osdep/path", 525, WString(L"/var/lib/x"));
    EXPECT_STREQ(e.what(), "Access denied: /var/lib/x");
    EXPECT_EQ(e.ErrorCode(), static_cast<int32_t>(0x8ABC7019u));
}

TEST(OSException, DefaultIsUnknownError) {
    osdep::OSException e;
    EXPECT_STREQ(e.what(), "Unknown error");
    EXPECT_EQ(e.OSErrorCode(), 0);
    EXPECT_EQ(e.ErrorCode(), 42);
}

TEST(PosixError, CodeDependsOnErrorNumber) {
    struct Case {
        int32_t osError;
        int32_t code;
    } cases[] = {{2, 7}, {0, 0}, {13, 42}, {22, 42}};
    for (const auto& c : cases) {
        osdep::PosixError e(NString("text"), c.osError);
        EXPECT_EQ(e.ErrorCode(), c.code) << c.osError;
        EXPECT_EQ(e.OSErrorCode(), c.osError);
        EXPECT_STREQ(e.what(), "text");
    }
}

TEST(PosixError, TakesErrnoAtConstruction) {
    errno = EACCES;
    osdep::PosixError e("osdep/path", 1044);
    EXPECT_EQ(e.OSErrorCode(), EACCES);
    EXPECT_STREQ(e.what(), std::strerror(EACCES));
    EXPECT_EQ(e.ErrorCode(), 42);
    try {
        throw e;
    } catch (const osdep::OSException& caught) {
        EXPECT_EQ(caught.OSErrorCode(), EACCES);
    }
}

TEST(ThrowingStatus, FailureIsThrownAsSignExtendedLong) {
    ThrowingStatus hr;
    try {
        hr = kStatusFail;
        FAIL() << "no throw";
    } catch (long thrown) {
        // Negative on 32- and 64-bit longs alike, and the same 32-bit value.
        EXPECT_LT(thrown, 0);
        EXPECT_EQ(thrown, -2147467259L);
        EXPECT_EQ(static_cast<int32_t>(thrown), static_cast<int32_t>(0x80004005u));
    }
    EXPECT_EQ(hr.Value(), kStatusFail);
}

TEST(ThrowingStatus, SuccessValuesPassSilently) {
    ThrowingStatus hr;
    EXPECT_NO_THROW(hr = 1);
    EXPECT_EQ(hr.Value(), 1);
    EXPECT_NO_THROW(hr = 0);
    EXPECT_EQ(static_cast<int32_t>(hr), 0);
}

}  // namespace
}  // namespace qel::fnd
