// Splitting a wide text at any of a set of delimiter characters.
#include "foundation/Tokenizer.h"

namespace qel::fnd {

Tokenizer::Tokenizer(const WString& text, const WString& delimiters, bool keepEmpty)
    : text_(text), delimiters_(delimiters), position_(0), end_(text.Length()), keepEmpty_(keepEmpty) {
    SkipDelimiters();
}

void Tokenizer::SkipDelimiters() noexcept {
    if (keepEmpty_) return;
    while (position_ < end_ && delimiters_.Find(text_[position_]) != WString::npos) ++position_;
}

WString Tokenizer::NextToken() {
    if (position_ >= end_) return WString();
    WString::size_type stop = position_;
    while (stop < end_ && delimiters_.Find(text_[stop]) == WString::npos) ++stop;
    WString token(text_.Data() + position_, stop - position_);
    // Past the delimiter that ended the token; at the end there is none.
    position_ = stop < end_ ? stop + 1 : end_;
    SkipDelimiters();
    return token;
}

}  // namespace qel::fnd
