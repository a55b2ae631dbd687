// StringBase as its callers use it: value semantics, limits, searches and the
// errors at its edges.
#include "foundation/StringBase.h"

#include <gtest/gtest.h>

#include <clocale>
#include <string>
#include <vector>

#include "foundation/Exception.h"

namespace qel::fnd {
namespace {

using exception::BoundExceeded;
using exception::BoundExceeded2;
using exception::OutOfRange;
using exception::OutOfRange2;

std::wstring Std(const WString& s) { return std::wstring(s.CStr(), s.Length()); }

TEST(StringBase, EveryStringIsTerminatedAndNeverNull) {
    WString empty;
    WString fromNull(static_cast<const wchar_t*>(nullptr));
    WString fromCount(L"abc", 0);
    for (const WString* s : {&empty, &fromNull, &fromCount}) {
        ASSERT_NE(s->CStr(), nullptr);
        EXPECT_EQ(s->CStr()[0], L'\0');
        EXPECT_EQ(s->Length(), 0u);
        EXPECT_TRUE(s->IsEmpty());
    }
    WString moved(L"text");
    WString target(std::move(moved));
    ASSERT_NE(moved.CStr(), nullptr);  // NOLINT(bugprone-use-after-move): the moved-from state is part of the contract
    EXPECT_EQ(moved.CStr()[0], L'\0');
    EXPECT_EQ(target, L"text");
}

TEST(StringBase, MovedFromStringIsUsableAgain) {
    NString a("abc");
    NString b(std::move(a));
    a.Clear();  // NOLINT(bugprone-use-after-move)
    a.Resize(0);
    a.Erase(0);
    a.Assign("", 0);
    EXPECT_TRUE(a.IsEmpty());
    a.Append("xy");
    a.PushBack('z');
    EXPECT_EQ(a, "xyz");
    NString c(std::move(b));
    b = NString("again");
    EXPECT_EQ(b, "again");
    EXPECT_EQ(c, "abc");
}

TEST(StringBase, CopiesAreIndependentValues) {
    WString a(L"shared");
    WString b(a);
    b[0] = L'S';
    EXPECT_EQ(a, L"shared");
    EXPECT_EQ(b, L"Shared");
    a = b;
    b.Append(L"!");
    EXPECT_EQ(a, L"Shared");
}

TEST(StringBase, HoldsEmbeddedNulAndAnyValue) {
    const wchar_t raw[] = {L'a', 0, static_cast<wchar_t>(0x110000), static_cast<wchar_t>(-1)};
    WString s(raw, 4);
    EXPECT_EQ(s.Length(), 4u);
    EXPECT_EQ(s[1], L'\0');
    EXPECT_EQ(static_cast<uint32_t>(s[3]), 0xFFFFFFFFu);
    EXPECT_FALSE(s == L"a");
    EXPECT_TRUE(WString(L"a") == L"a");
    EXPECT_FALSE(WString(L"a") == L"ab");
}

TEST(StringBase, AppendForms) {
    WString s;
    s.Append(L"ab").Append(WString(L"cd")).Append(L"efgh", 2).Append(3, L'x').PushBack(L'!');
    s.Append(WString(L"0123456789"), 7, 100);  // the count is clipped to what is there
    s += L'.';
    EXPECT_EQ(Std(s), L"abcdefxxx!789.");
    WString tail;
    tail.Append(WString(L"abc"), 3, 1);  // a position at the end appends nothing
    EXPECT_TRUE(tail.IsEmpty());
}

TEST(StringBase, AppendOfItselfSurvivesGrowth) {
    WString s(L"abc");
    for (int i = 0; i < 6; ++i) s.Append(s);
    EXPECT_EQ(s.Length(), 3u * 64);
    for (uint32_t i = 0; i < s.Length(); ++i) ASSERT_EQ(s[i], L"abc"[i % 3]) << i;
    NString n("xyz");
    n.Append(n.CStr() + 1, 2);
    n.Assign(n.CStr() + 2, 3);
    EXPECT_EQ(n, "zyz");
}

TEST(StringBase, ManySmallAppendsKeepEveryCharacter) {
    WString s;
    std::wstring expected;
    for (int i = 0; i < 20000; ++i) {
        wchar_t piece[3] = {static_cast<wchar_t>(L'a' + i % 26), static_cast<wchar_t>(0x4E00 + i % 100), 0};
        s.Append(piece, 1 + i % 2);
        expected.append(piece, 1 + i % 2);
    }
    EXPECT_EQ(Std(s), expected);
    EXPECT_GE(s.Capacity(), s.Length());
}

TEST(StringBase, SubstrReplaceInsertErase) {
    WString s(L"hello world");
    EXPECT_EQ(Std(s.Substr(6)), L"world");
    EXPECT_EQ(Std(s.Substr(0, 5)), L"hello");
    EXPECT_EQ(Std(s.Substr(11)), L"");
    EXPECT_EQ(Std(s.Substr(4, WString::npos)), L"o world");
    s.Replace(0, 5, WString(L"goodbye"));
    EXPECT_EQ(Std(s), L"goodbye world");
    s.Replace(8, 100, WString(L"XXmoonYY"), 2, 4);
    EXPECT_EQ(Std(s), L"goodbye moon");
    s.Insert(0, WString(L">> "));
    s.Insert(s.Length(), WString(L"!"));
    EXPECT_EQ(Std(s), L">> goodbye moon!");
    s.Erase(0, 3);
    s.Erase(7);
    EXPECT_EQ(Std(s), L"goodbye");
    s.Erase(7, 5);  // erasing at the end removes nothing
    EXPECT_EQ(Std(s), L"goodbye");
}

TEST(StringBase, PositionBeyondLengthThrowsOutOfRange2) {
    WString s(L"abc");
    auto expectOutOfRange = [](auto&& op) {
        try {
            op();
            ADD_FAILURE() << "no exception";
        } catch (const OutOfRange2& e) {
            EXPECT_STREQ(e.what(), "Out of range: String offset out of range");
            EXPECT_STREQ(e.File(), "StringBase");
        }
    };
    expectOutOfRange([&] { s.Substr(4); });
    expectOutOfRange([&] { s.Replace(4, 0, WString(L"x")); });
    expectOutOfRange([&] { s.Replace(0, 0, WString(L"x"), 2, 1); });
    expectOutOfRange([&] { s.Insert(5, WString(L"x")); });
    expectOutOfRange([&] { s.Erase(4); });
    expectOutOfRange([&] { s.Append(WString(L"ab"), 3, 1); });
    EXPECT_EQ(Std(s), L"abc");  // nothing changed by the failed calls
}

TEST(StringBase, ResultBeyond32BitsThrowsBoundExceeded2) {
    NString s("abc");
    try {
        s.Append(NString::npos - 2, 'x');
        FAIL() << "no exception";
    } catch (const BoundExceeded2& e) {
        EXPECT_STREQ(e.what(), "A request was made that would exceed the bounds: Resulting string too large");
        EXPECT_EQ(e.Line(), 1423);
        EXPECT_EQ(e.ErrorCode(), static_cast<int32_t>(0x8ABC7007u));
    }
    EXPECT_THROW(s.Append(s.CStr(), NString::npos), BoundExceeded);
    EXPECT_EQ(s, "abc");
}

struct SearchCase {
    const wchar_t* text;
    const wchar_t* needle;
    uint32_t from;
    uint32_t find, firstOf, firstNotOf;
};

TEST(StringBase, Searches) {
    const uint32_t npos = WString::npos;
    static_assert(WString::npos == 0xFFFFFFFFu);
    const SearchCase cases[] = {
        {L"a/b/c", L"/", 0, 1, 1, 0},
        {L"a/b/c", L"/", 2, 3, 3, 2},
        {L"a/b/c", L"b/", 0, 2, 1, 0},
        {L"a/b/c", L"x", 0, npos, npos, 0},
        {L"//ab", L"/", 0, 0, 0, 2},
        {L"////", L"/", 0, 0, 0, npos},
        {L"abc", L"", 1, 1, npos, 1},
        {L"abc", L"c", 9, npos, npos, npos},
        {L"", L"a", 0, npos, npos, npos},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(testing::Message() << "text " << c.text << " needle " << c.needle << " from " << c.from);
        WString text(c.text), needle(c.needle);
        EXPECT_EQ(text.Find(needle, c.from), c.find);
        EXPECT_EQ(text.FindFirstOf(needle, c.from), c.firstOf);
        EXPECT_EQ(text.FindFirstNotOf(needle, c.from), c.firstNotOf);
    }
    EXPECT_EQ(WString(L"a/b/c").Find(L'/', 2), 3u);
    EXPECT_EQ(WString(L"a/b/c").FindLast(L'/'), 3u);
    EXPECT_EQ(WString(L"a/b/c").FindLast(L'/', 2), 1u);
    EXPECT_EQ(WString(L"abc").FindLast(L'/'), npos);
}

TEST(StringBase, ComparesByCodePoint) {
    // Values at and above 0x80000000 order after every Unicode character on
    // both targets, whatever the signedness of wchar_t.
    const wchar_t high[] = {static_cast<wchar_t>(0x80000000u), 0};
    EXPECT_LT(WString(L"z").Compare(WString(high)), 0);
    EXPECT_LT(WString(L"ab").Compare(WString(L"abc")), 0);
    EXPECT_GT(WString(L"b").Compare(WString(L"abc")), 0);
    EXPECT_EQ(WString(L"abc").Compare(WString(L"abc")), 0);
    EXPECT_LT(NString("a").Compare(NString("\xC3\xA9")), 0);  // bytes are unsigned
    EXPECT_TRUE(WString(L"a") < WString(L"b"));
}

struct NoCaseCase {
    const wchar_t* a;
    const wchar_t* b;
    int sign;
};

TEST(CompareNoCase, WideNames) {
    const NoCaseCase cases[] = {
        {L"itemdefs", L"ItemDefs", 0}, {L"ItemDef", L"itemdefs", -1}, {L"SERVER", L"server", 0},
        {L"serverb", L"ServerA", 1},   {L"", L"", 0},                  {L"a", L"", 1},
        {L"\u00e9t\u00e9", L"\u00c9T\u00c9", 0},
    };
    setlocale(LC_CTYPE, "C.UTF-8");
    for (const auto& c : cases) {
        int r = CompareNoCase(WString(c.a), WString(c.b));
        EXPECT_EQ((r > 0) - (r < 0), c.sign) << "a=" << c.a;
    }
    setlocale(LC_CTYPE, "C");
    EXPECT_TRUE(EqualsNoCase(WString(L"Function"), WString(L"FUNCTION")));
}

TEST(CompareNoCase, Bytes) {
    EXPECT_TRUE(EqualsNoCase(NString("<?XML"), NString("<?xml")));
    EXPECT_LT(CompareNoCase(NString("ab"), NString("ABC")), 0);
    EXPECT_GT(CompareNoCase(NString("b"), NString("ABC")), 0);
    EXPECT_FALSE(EqualsNoCase(NString("a\0b", 3), NString("a\0c", 3)));
}

}  // namespace
}  // namespace qel::fnd
