// Splitting texts at delimiter sets: which tokens come out, and in which
// order, for the shapes callers pass.
#include "foundation/Tokenizer.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace qel::fnd {
namespace {

std::vector<std::wstring> Split(const WString& text, const WString& delimiters, bool keepEmpty = false) {
    Tokenizer tokenizer(text, delimiters, keepEmpty);
    std::vector<std::wstring> tokens;
    while (tokenizer.HasMoreTokens()) {
        WString token = tokenizer.NextToken();
        tokens.emplace_back(token.CStr(), token.Length());
        if (tokens.size() > 100) break;  // a tokenizer that never ends fails below, not here
    }
    return tokens;
}

struct SplitCase {
    const wchar_t* text;
    const wchar_t* delimiters;
    std::vector<std::wstring> tokens;
};

TEST(Tokenizer, SkipsLeadingAndRepeatedDelimiters) {
    const SplitCase kCases[] = {
        {L"/a//b/", L"/", {L"a", L"b"}},
        {L"////", L"/", {}},
        {L"", L"/", {}},
        {L"abc", L"/", {L"abc"}},
        {L"abc", L"", {L"abc"}},
        {L"a", L"a", {}},
        {L"/usr/local//lib", L"/", {L"usr", L"local", L"lib"}},
        {L"a,b;c", L",;", {L"a", L"b", L"c"}},
        {L" ,;a ; b,, ", L" ,;", {L"a", L"b"}},
        {L"en-US, de;q=0.8", L", ", {L"en-US", L"de;q=0.8"}},
        {L"x\u00e9y\u00e9\u00e9z", L"\u00e9", {L"x", L"y", L"z"}},
    };
    for (const SplitCase& c : kCases) {
        EXPECT_EQ(Split(WString(c.text), WString(c.delimiters)), c.tokens) << c.text << " at " << c.delimiters;
    }
}

TEST(Tokenizer, NextTokenWhenNoneRemainsIsEmpty) {
    Tokenizer tokenizer(WString(L"/only/"), WString(L"/"));
    ASSERT_TRUE(tokenizer.HasMoreTokens());
    EXPECT_EQ(tokenizer.NextToken(), L"only");
    EXPECT_FALSE(tokenizer.HasMoreTokens());
    EXPECT_TRUE(tokenizer.NextToken().IsEmpty());
    EXPECT_FALSE(tokenizer.HasMoreTokens());

    Tokenizer delimitersOnly(WString(L"::"), WString(L":"));
    EXPECT_FALSE(delimitersOnly.HasMoreTokens());
    EXPECT_TRUE(delimitersOnly.NextToken().IsEmpty());
}

TEST(Tokenizer, DelimiterCanBeNul) {
    WString text(L"a\0b\0\0c", 6);
    WString nul(L"\0", 1);
    EXPECT_EQ(Split(text, nul), (std::vector<std::wstring>{L"a", L"b", L"c"}));
}

TEST(Tokenizer, KeepEmptyReturnsTheGapsBetweenDelimiters) {
    const SplitCase kCases[] = {
        {L"a,,b", L",", {L"a", L"", L"b"}},
        {L",a", L",", {L"", L"a"}},
        {L"a,", L",", {L"a"}},  // the end is no token of its own
        {L",,", L",", {L"", L""}},
    };
    for (const SplitCase& c : kCases) {
        EXPECT_EQ(Split(WString(c.text), WString(c.delimiters), true), c.tokens) << c.text;
    }
}

TEST(Tokenizer, WorksOnItsOwnCopies) {
    WString text(L"one two");
    WString delimiters(L" ");
    Tokenizer tokenizer(text, delimiters);
    text = L"changed";
    delimiters = L"n";
    EXPECT_EQ(tokenizer.NextToken(), L"one");
    EXPECT_EQ(tokenizer.NextToken(), L"two");
    EXPECT_FALSE(tokenizer.HasMoreTokens());
}

}  // namespace
}  // namespace qel::fnd
