// The foundation's string value type, for wide text (32-bit code points) and
// for bytes; lengths and positions are 32-bit on every platform.
#pragma once

#include <compare>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <cwchar>
#include <new>
#include <type_traits>
#include <utility>

namespace qel::fnd {

namespace detail {
// Out of line so that this header needs no exception definitions (the
// exceptions themselves hold byte strings).
[[noreturn]] void ThrowStringOffsetOutOfRange(int32_t line);
[[noreturn]] void ThrowStringTooLarge(int32_t line);
}  // namespace detail

/// A terminated string over one heap block described by three pointers:
/// begin, end (where the NUL sits) and end of the block. The character pointer
/// handed out is never null and the text is always NUL-terminated.
///
/// The layout is shared with the web server runtime, which hands the plug-in
/// lists of these in place; it must stay exactly three pointers.
template <typename CharT>
class StringBase {
    static_assert(std::is_same_v<CharT, char> || std::is_same_v<CharT, wchar_t>);

public:
    using value_type = CharT;
    using size_type = uint32_t;
    /// What a failed search returns: the largest unsigned 32-bit number.
    static constexpr size_type npos = 0xFFFFFFFFu;
    /// Longest text a string can hold; one less than npos so that a length is
    /// never mistaken for a failed search.
    static constexpr size_type kMaxLength = npos - 1;

    StringBase() { Allocate(0); }
    /// A null pointer gives the empty string.
    StringBase(const CharT* text) : StringBase(text, text ? Measure(text) : 0) {}
    StringBase(const CharT* text, size_type count) {
        Allocate(count);
        Copy(begin_, text, count);
        SetLength(count);
    }
    // A template so that (pointer, 0) picks the counted form, not this one.
    template <typename Ptr>
        requires std::is_same_v<Ptr, const CharT*> || std::is_same_v<Ptr, CharT*>
    StringBase(Ptr first, Ptr last) : StringBase(first, CheckedLength(static_cast<uint64_t>(last - first))) {}
    StringBase(size_type count, CharT c) {
        if (count > kMaxLength) detail::ThrowStringTooLarge(__LINE__);
        Allocate(count);
        for (size_type i = 0; i < count; ++i) begin_[i] = c;
        SetLength(count);
    }
    StringBase(const StringBase& other) : StringBase(other.begin_, other.Length()) {}
    /// The source is left empty (on a shared empty text, without a block).
    StringBase(StringBase&& other) noexcept
        : begin_(other.begin_), end_(other.end_), cap_(other.cap_) {
        other.MakeSentinel();
    }
    ~StringBase() { Release(); }

    StringBase& operator=(const StringBase& other) {
        if (this != &other) Assign(other.begin_, other.Length());
        return *this;
    }
    StringBase& operator=(StringBase&& other) noexcept {
        if (this != &other) {
            Release();
            begin_ = other.begin_;
            end_ = other.end_;
            cap_ = other.cap_;
            other.MakeSentinel();
        }
        return *this;
    }
    StringBase& operator=(const CharT* text) { return Assign(text ? text : Empty(), text ? Measure(text) : 0); }

    void Swap(StringBase& other) noexcept {
        std::swap(begin_, other.begin_);
        std::swap(end_, other.end_);
        std::swap(cap_, other.cap_);
    }

    // --- size and access -------------------------------------------------
    size_type Length() const noexcept { return static_cast<size_type>(end_ - begin_); }
    bool IsEmpty() const noexcept { return end_ == begin_; }
    /// Characters the block can hold without growing, not counting the NUL.
    size_type Capacity() const noexcept { return cap_ == begin_ ? 0 : static_cast<size_type>(cap_ - begin_ - 1); }
    const CharT* CStr() const noexcept { return begin_; }
    const CharT* Data() const noexcept { return begin_; }
    CharT* Data() noexcept { return begin_; }
    const CharT* begin() const noexcept { return begin_; }
    const CharT* end() const noexcept { return end_; }
    CharT* begin() noexcept { return begin_; }
    CharT* end() noexcept { return end_; }
    const CharT& operator[](size_type i) const noexcept { return begin_[i]; }
    CharT& operator[](size_type i) noexcept { return begin_[i]; }
    CharT Back() const noexcept { return end_[-1]; }

    void Reserve(size_type count) {
        if (count > Capacity()) Regrow(count, Length());
    }
    void Clear() noexcept {
        if (cap_ == begin_) return;  // the shared empty text is never written
        end_ = begin_;
        *end_ = CharT();
    }
    /// Shortens or extends (with `c`) to `count` characters.
    void Resize(size_type count, CharT c = CharT()) {
        size_type len = Length();
        if (count > len) {
            Append(count - len, c);
        } else if (cap_ != begin_) {
            SetLength(count);
        }
    }

    // --- assignment and append -------------------------------------------
    StringBase& Assign(const CharT* text, size_type count) {
        if (count > Capacity() || cap_ == begin_) {
            // Copied before our old block goes, so `text` may point into it.
            StringBase fresh(text, count);
            Swap(fresh);
            return *this;
        }
        if (count) std::memmove(begin_, text, static_cast<size_t>(count) * sizeof(CharT));
        SetLength(count);
        return *this;
    }
    StringBase& Assign(const StringBase& other) { return *this = other; }

    StringBase& Append(const CharT* text, size_type count) {
        if (count == 0) return *this;
        size_type len = Length();
        uint64_t total = static_cast<uint64_t>(len) + count;
        if (total > kMaxLength) detail::ThrowStringTooLarge(1423);
        if (total > Capacity()) {
            // `text` may point into our own block: grow into a new block and
            // copy from the source before releasing the old one.
            CharT* oldBegin = begin_;
            CharT* oldCap = cap_;
            size_type newCap = GrowthFor(static_cast<size_type>(total));
            CharT* block = AllocateBlock(newCap);
            Copy(block, oldBegin, len);
            Copy(block + len, text, count);
            begin_ = block;
            cap_ = block + newCap + 1;
            SetLength(static_cast<size_type>(total));
            FreeBlock(oldBegin, oldCap);
            return *this;
        }
        std::memmove(end_, text, static_cast<size_t>(count) * sizeof(CharT));
        SetLength(static_cast<size_type>(total));
        return *this;
    }
    StringBase& Append(const CharT* text) { return Append(text, Measure(text)); }
    StringBase& Append(const StringBase& other) { return Append(other.begin_, other.Length()); }
    /// Appends at most `count` characters of `other` from `pos`; a position
    /// beyond its length throws OutOfRange2.
    StringBase& Append(const StringBase& other, size_type pos, size_type count) {
        if (pos > other.Length()) detail::ThrowStringOffsetOutOfRange(__LINE__);
        return Append(other.begin_ + pos, Clip(other.Length(), pos, count));
    }
    StringBase& Append(size_type count, CharT c) {
        if (count == 0) return *this;
        size_type len = Length();
        uint64_t total = static_cast<uint64_t>(len) + count;
        if (total > kMaxLength) detail::ThrowStringTooLarge(1423);
        if (total > Capacity()) Regrow(GrowthFor(static_cast<size_type>(total)), len);
        for (size_type i = 0; i < count; ++i) end_[i] = c;
        SetLength(static_cast<size_type>(total));
        return *this;
    }
    StringBase& PushBack(CharT c) {
        if (end_ + 1 >= cap_) {
            size_type len = Length();
            if (len >= kMaxLength) detail::ThrowStringTooLarge(1423);
            Regrow(GrowthFor(len + 1), len);
        }
        *end_++ = c;
        *end_ = CharT();
        return *this;
    }
    StringBase& operator+=(const StringBase& other) { return Append(other); }
    StringBase& operator+=(const CharT* text) { return Append(text); }
    StringBase& operator+=(CharT c) { return PushBack(c); }

    // --- pieces -----------------------------------------------------------
    /// At most `count` characters from `pos`; a position beyond the length
    /// throws OutOfRange2.
    StringBase Substr(size_type pos, size_type count = npos) const {
        if (pos > Length()) detail::ThrowStringOffsetOutOfRange(__LINE__);
        return StringBase(begin_ + pos, Clip(Length(), pos, count));
    }
    /// Replaces at most `count` characters from `pos` by `with`.
    StringBase& Replace(size_type pos, size_type count, const CharT* with, size_type withCount) {
        size_type len = Length();
        if (pos > len) detail::ThrowStringOffsetOutOfRange(__LINE__);
        count = Clip(len, pos, count);
        uint64_t total = static_cast<uint64_t>(len) - count + withCount;
        if (total > kMaxLength) detail::ThrowStringTooLarge(1423);
        StringBase result;
        result.Reserve(static_cast<size_type>(total));
        result.Append(begin_, pos).Append(with, withCount).Append(begin_ + pos + count, len - pos - count);
        Swap(result);
        return *this;
    }
    StringBase& Replace(size_type pos, size_type count, const StringBase& with) {
        return Replace(pos, count, with.begin_, with.Length());
    }
    StringBase& Replace(size_type pos, size_type count, const StringBase& with, size_type withPos,
                        size_type withCount) {
        if (withPos > with.Length()) detail::ThrowStringOffsetOutOfRange(__LINE__);
        return Replace(pos, count, with.begin_ + withPos, Clip(with.Length(), withPos, withCount));
    }
    StringBase& Insert(size_type pos, const CharT* text, size_type count) {
        if (pos > Length()) detail::ThrowStringOffsetOutOfRange(__LINE__);
        return Replace(pos, 0, text, count);
    }
    StringBase& Insert(size_type pos, const StringBase& text) { return Insert(pos, text.begin_, text.Length()); }
    StringBase& Erase(size_type pos, size_type count = npos) {
        size_type len = Length();
        if (pos > len) detail::ThrowStringOffsetOutOfRange(__LINE__);
        count = Clip(len, pos, count);
        if (count == 0) return *this;
        std::memmove(begin_ + pos, begin_ + pos + count, static_cast<size_t>(len - pos - count) * sizeof(CharT));
        SetLength(len - count);
        return *this;
    }

    // --- searches: npos when nothing is found -----------------------------
    size_type Find(CharT c, size_type pos = 0) const noexcept {
        for (size_type i = pos, n = Length(); i < n; ++i)
            if (begin_[i] == c) return i;
        return npos;
    }
    size_type Find(const CharT* text, size_type count, size_type pos) const noexcept {
        size_type n = Length();
        if (pos > n || count > n - pos) return npos;
        for (size_type i = pos; i + count <= n; ++i)
            if (std::memcmp(begin_ + i, text, static_cast<size_t>(count) * sizeof(CharT)) == 0) return i;
        return npos;
    }
    size_type Find(const StringBase& text, size_type pos = 0) const noexcept {
        return Find(text.begin_, text.Length(), pos);
    }
    /// Last occurrence of `c` at or before `pos`.
    size_type FindLast(CharT c, size_type pos = npos) const noexcept {
        size_type n = Length();
        if (n == 0) return npos;
        for (size_type i = pos < n ? pos + 1 : n; i-- > 0;)
            if (begin_[i] == c) return i;
        return npos;
    }
    size_type FindFirstOf(const StringBase& set, size_type pos = 0) const noexcept {
        for (size_type i = pos, n = Length(); i < n; ++i)
            if (set.Find(begin_[i]) != npos) return i;
        return npos;
    }
    size_type FindFirstNotOf(const StringBase& set, size_type pos = 0) const noexcept {
        for (size_type i = pos, n = Length(); i < n; ++i)
            if (set.Find(begin_[i]) == npos) return i;
        return npos;
    }
    bool StartsWith(const StringBase& prefix) const noexcept {
        return prefix.Length() <= Length() &&
               std::memcmp(begin_, prefix.begin_, static_cast<size_t>(prefix.Length()) * sizeof(CharT)) == 0;
    }
    bool EndsWith(CharT c) const noexcept { return end_ != begin_ && end_[-1] == c; }

    // --- comparison in code-point order -----------------------------------
    int Compare(const StringBase& other) const noexcept {
        size_type a = Length(), b = other.Length();
        for (size_type i = 0, n = a < b ? a : b; i < n; ++i) {
            auto x = Unit(begin_[i]), y = Unit(other.begin_[i]);
            if (x != y) return x < y ? -1 : 1;
        }
        return a == b ? 0 : (a < b ? -1 : 1);
    }
    friend bool operator==(const StringBase& a, const StringBase& b) noexcept {
        return a.Length() == b.Length() &&
               std::memcmp(a.begin_, b.begin_, static_cast<size_t>(a.Length()) * sizeof(CharT)) == 0;
    }
    friend bool operator==(const StringBase& a, const CharT* b) noexcept {
        size_t n;
        if constexpr (std::is_same_v<CharT, char>) n = std::strlen(b);
        else n = std::wcslen(b);
        return n == a.Length() && std::memcmp(a.begin_, b, n * sizeof(CharT)) == 0;
    }
    friend std::strong_ordering operator<=>(const StringBase& a, const StringBase& b) noexcept {
        return a.Compare(b) <=> 0;
    }
    friend StringBase operator+(StringBase a, const StringBase& b) { return std::move(a.Append(b)); }
    friend StringBase operator+(StringBase a, const CharT* b) { return std::move(a.Append(b)); }

    static size_type Measure(const CharT* text) {
        size_t n;
        if constexpr (std::is_same_v<CharT, char>) n = std::strlen(text);
        else n = std::wcslen(text);
        return CheckedLength(n);
    }

private:
    // Code points compare as unsigned numbers, bytes as unsigned bytes, on
    // every platform (wchar_t is signed on x86-64 and unsigned on ARM).
    static uint32_t Unit(CharT c) noexcept {
        if constexpr (std::is_same_v<CharT, char>) return static_cast<unsigned char>(c);
        else return static_cast<uint32_t>(c);
    }
    static const CharT* Empty() noexcept {
        static const CharT nul = CharT();
        return &nul;
    }
    static size_type CheckedLength(uint64_t n) {
        if (n > kMaxLength) detail::ThrowStringTooLarge(__LINE__);
        return static_cast<size_type>(n);
    }
    static size_type Clip(size_type len, size_type pos, size_type count) noexcept {
        return count > len - pos ? len - pos : count;
    }
    static void Copy(CharT* to, const CharT* from, size_type count) noexcept {
        if (count) std::memcpy(to, from, static_cast<size_t>(count) * sizeof(CharT));
    }
    // Doubling keeps appends amortised constant; capped at the 32-bit limit.
    size_type GrowthFor(size_type needed) const noexcept {
        uint64_t doubled = static_cast<uint64_t>(Capacity()) * 2;
        if (doubled > kMaxLength) doubled = kMaxLength;
        return needed > doubled ? needed : static_cast<size_type>(doubled < 15 ? 15 : doubled);
    }
    static CharT* AllocateBlock(size_type capacity) {
        // capacity + 1 elements must fit size_t, which is 32-bit on the target.
        if (static_cast<uint64_t>(capacity) + 1 > SIZE_MAX / sizeof(CharT)) throw std::bad_alloc();
        return static_cast<CharT*>(::operator new((static_cast<size_t>(capacity) + 1) * sizeof(CharT)));
    }
    static void FreeBlock(CharT* begin, CharT* cap) noexcept {
        if (cap != begin) ::operator delete(begin);
    }
    void Allocate(size_type capacity) {
        begin_ = AllocateBlock(capacity);
        end_ = begin_;
        cap_ = begin_ + capacity + 1;
        *end_ = CharT();
    }
    void Regrow(size_type capacity, size_type keep) {
        CharT* block = AllocateBlock(capacity);
        Copy(block, begin_, keep);
        FreeBlock(begin_, cap_);
        begin_ = block;
        cap_ = block + capacity + 1;
        SetLength(keep);
    }
    void SetLength(size_type count) noexcept {
        end_ = begin_ + count;
        *end_ = CharT();
    }
    void Release() noexcept { FreeBlock(begin_, cap_); }
    // A moved-from string points at a shared NUL with no block (begin == end
    // of block), which Release recognises and every writer replaces first.
    void MakeSentinel() noexcept {
        begin_ = end_ = cap_ = const_cast<CharT*>(Empty());
    }

    CharT* begin_;
    CharT* end_;
    CharT* cap_;
};

using WString = StringBase<wchar_t>;
using NString = StringBase<char>;

/// Case-blind comparison of names: each wide character through `towupper`,
/// bytes through a one-byte `strncasecmp`; a text that runs out first is the
/// smaller.
int CompareNoCase(const WString& a, const WString& b) noexcept;
int CompareNoCase(const NString& a, const NString& b) noexcept;
inline bool EqualsNoCase(const WString& a, const WString& b) noexcept { return CompareNoCase(a, b) == 0; }
inline bool EqualsNoCase(const NString& a, const NString& b) noexcept { return CompareNoCase(a, b) == 0; }

}  // namespace qel::fnd
