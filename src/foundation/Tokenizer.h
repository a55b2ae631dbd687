// Splits a wide text into tokens at any of a set of delimiter characters.
#pragma once

#include "StringBase.h"

namespace qel::fnd {

/// Leading and repeated delimiters produce no empty tokens (unless
/// `keepEmpty`), so "/a//b/" split at "/" gives "a" and "b".
class Tokenizer {
public:
    Tokenizer(const WString& text, const WString& delimiters, bool keepEmpty = false);
    virtual ~Tokenizer() = default;

    bool HasMoreTokens() const noexcept { return position_ < end_; }
    /// The next token; the empty text when none remains.
    WString NextToken();

private:
    void SkipDelimiters() noexcept;

    WString text_;
    WString delimiters_;
    WString::size_type position_ = 0;
    WString::size_type end_ = 0;
    bool keepEmpty_ = false;
};

}  // namespace qel::fnd
