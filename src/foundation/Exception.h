// The foundation's exception hierarchy: every failure of foundation code is
// one of these, carrying its source module, line and a 32-bit status code.
#pragma once

#include <cstdint>
#include <exception>

#include "StringBase.h"

namespace qel::fnd::exception {

/// Root of the hierarchy. `file` is a static module name such as
/// "osdep/Thread" and is never owned; null with line 0 means "not given".
class Exception : public std::exception {
public:
    Exception() noexcept = default;
    Exception(const char* file, int32_t line) noexcept : line_(line), file_(file) {}

    const char* what() const noexcept override { return "unspecified exception"; }
    virtual int32_t ErrorCode() const noexcept { return -1; }

    int32_t Line() const noexcept { return line_; }
    const char* File() const noexcept { return file_; }

private:
    int32_t line_ = 0;
    const char* file_ = nullptr;
};

// Classes with a fixed text and code differ only in those two; the macro keeps
// the table of them readable and impossible to get half-right.
#define QEL_FIXED_EXCEPTION(Name, Base, Text, Code)                            \
    class Name : public Base {                                                 \
    public:                                                                    \
        Name() noexcept = default;                                             \
        Name(const char* file, int32_t line) noexcept : Base(file, line) {}    \
        const char* what() const noexcept override { return Text; }            \
        int32_t ErrorCode() const noexcept override {                          \
            return static_cast<int32_t>(Code);                                 \
        }                                                                      \
    }

QEL_FIXED_EXCEPTION(OutOfRange, Exception, "Out of range", 0x8ABC7007u);
QEL_FIXED_EXCEPTION(BoundExceeded, Exception, "A request was made that would exceed the bounds", 0x8ABC7007u);
QEL_FIXED_EXCEPTION(InvalidArgument, Exception, "Invalid argument(s)", 0x8ABC700Fu);
QEL_FIXED_EXCEPTION(ObjectAlreadyExists, Exception, "Object already exists", 0x8ABC7009u);
QEL_FIXED_EXCEPTION(NonexistentException, Exception, "The object does not exist", 0x8ABC700Au);
QEL_FIXED_EXCEPTION(InvalidOperation, Exception, "Invalid operation", 0x8ABC700Eu);
QEL_FIXED_EXCEPTION(FileWriteFailed, Exception, "Write file operation failed", 0x8ABC7011u);
QEL_FIXED_EXCEPTION(FileReadFailed, Exception, "Read file operation failed", 0x8ABC7012u);
QEL_FIXED_EXCEPTION(DeserializationError, Exception, "Failed to deserialize", 0x8ABC7014u);
QEL_FIXED_EXCEPTION(BufferOverflow, Exception, "Buffer overflowed", 0x8ABC7017u);
QEL_FIXED_EXCEPTION(FileAlreadyExists, Exception, "File already exists", 0x8ABC701Bu);
QEL_FIXED_EXCEPTION(InvalidLocale, Exception, "Invalid locale", 0x8ABC7024u);
QEL_FIXED_EXCEPTION(InvalidSequence, Exception, "Invalid UTF8 encoding sequence", 0x8ABC7030u);
QEL_FIXED_EXCEPTION(BadGuidString, Exception, "Badly formatted Guid string.", 0x8ABC7032u);
QEL_FIXED_EXCEPTION(UnableToConvert, Exception, "Unable to convert.", 0x8ABC7034u);
QEL_FIXED_EXCEPTION(NotImplemented, Exception, "Not implemented", 0x80004001u);

#undef QEL_FIXED_EXCEPTION

// Composed messages: a fixed prefix followed by the detail given at the throw.
// Building the message may throw std::bad_alloc.
#define QEL_COMPOSED_EXCEPTION(Name, Base, Prefix)                             \
    class Name : public Base {                                                 \
    public:                                                                    \
        explicit Name(const NString& detail) : message_(Compose(detail)) {}    \
        Name(const char* file, int32_t line, const NString& detail)            \
            : Base(file, line), message_(Compose(detail)) {}                   \
        const char* what() const noexcept override { return message_.CStr(); } \
        const NString& Message() const noexcept { return message_; }           \
                                                                               \
    private:                                                                   \
        static NString Compose(const NString& detail) {                        \
            NString text(Prefix);                                              \
            text.Append(detail);                                               \
            return text;                                                       \
        }                                                                      \
        NString message_;                                                      \
    }

QEL_COMPOSED_EXCEPTION(OutOfRange2, OutOfRange, "Out of range: ");
QEL_COMPOSED_EXCEPTION(BoundExceeded2, BoundExceeded, "A request was made that would exceed the bounds: ");
QEL_COMPOSED_EXCEPTION(InvalidArgument2, InvalidArgument, "Invalid argument(s): ");

#undef QEL_COMPOSED_EXCEPTION

/// "Access denied: " followed by the path in the process code set.
class AccessDenied : public Exception {
public:
    explicit AccessDenied(const WString& path);
    AccessDenied(const char* file, int32_t line, const WString& path);
    const char* what() const noexcept override { return message_.CStr(); }
    int32_t ErrorCode() const noexcept override { return static_cast<int32_t>(0x8ABC7019u); }

private:
    static NString Compose(const WString& path);
    NString message_;
};

}  // namespace qel::fnd::exception

namespace qel::fnd::osdep {

/// An operating-system failure with its native error number.
class OSException : public exception::Exception {
public:
    OSException() : message_("Unknown error") {}
    OSException(const char* file, int32_t line) : Exception(file, line), message_("Unknown error") {}
    OSException(const NString& message, int32_t osError) : message_(message), osError_(osError) {}
    OSException(const char* file, int32_t line, const NString& message, int32_t osError)
        : Exception(file, line), message_(message), osError_(osError) {}

    const char* what() const noexcept override { return message_.CStr(); }
    int32_t ErrorCode() const noexcept override { return 42; }
    virtual int32_t OSErrorCode() const noexcept { return osError_; }

private:
    NString message_;
    int32_t osError_ = 0;
};

/// A failed system call: the forms without a message read `errno` once, at
/// construction, and take its `strerror` text.
class PosixError : public OSException {
public:
    PosixError();
    PosixError(const char* file, int32_t line);
    PosixError(const NString& message, int32_t osError) : OSException(message, osError) {}
    PosixError(const char* file, int32_t line, const NString& message, int32_t osError)
        : OSException(file, line, message, osError) {}

    /// 0 for no error, 7 for "no such file or directory", 42 otherwise.
    int32_t ErrorCode() const noexcept override;

    /// The `strerror` text of an error number, safe on any thread.
    static NString Describe(int error);

private:
    struct Captured;
    PosixError(const char* file, int32_t line, Captured captured);
};

}  // namespace qel::fnd::osdep
