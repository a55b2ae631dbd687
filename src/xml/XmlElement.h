// The one streaming XML writer of the service, and the escaping of text for it.
#pragma once

#include <cstdint>
#include <vector>

#include "foundation/StringBase.h"

namespace qel::xml {

/// True for the characters of the XML 1.0 Char production: 0x9, 0xA, 0xD,
/// 0x20-0xD7FF, 0xE000-0xFFFD and 0x10000-0x10FFFF. Compared as an unsigned
/// 32-bit value, so a negative wchar_t (x86-64) is never a character.
constexpr bool IsXmlChar(wchar_t c) noexcept {
    const uint32_t u = static_cast<uint32_t>(c);
    return u == 0x9u || u == 0xAu || u == 0xDu || (u >= 0x20u && u <= 0xD7FFu) || (u >= 0xE000u && u <= 0xFFFDu) ||
           (u >= 0x10000u && u <= 0x10FFFFu);
}

/// Escapes a NUL-terminated text (null is empty) for character data and for
/// single-quoted attribute values: the five markup characters become entities
/// and every character that XML 1.0 forbids becomes "?". When `positions` is
/// given, the index of each "?" in the returned text is appended to it.
/// Throws std::bad_alloc, or BoundExceeded when the result outgrows a string.
fnd::WString EscapeXml(const wchar_t* text, std::vector<uint32_t>* positions);

/// One element being written, appended in place to the sink of its document.
/// It lives on the writer's stack and holds only pointers: the sink belongs
/// to the caller, and the name is not copied, so it must outlive the element.
///
/// Use: open (root or child), attributes, then any mix of text and children,
/// then close. A child may be opened only after the parent's start tag was
/// ended by writing text to it (an empty text will do). An element without a
/// name is a fragment: it writes no tags and serves as the parent of
/// top-level elements appended one after another.
///
/// Nothing is escaped here: callers pass attribute values and character data
/// through EscapeXml first. Failures of the string layer (std::bad_alloc,
/// InvalidSequence, BufferOverflow) pass through unchanged.
class XmlElement {
public:
    XmlElement() noexcept = default;
    /// Closes the element if close() was not called, so an element left by an
    /// exception still gets its end tag. A failure to append the end tag is
    /// thrown unless another exception is already unwinding the stack.
    ~XmlElement() noexcept(false);

    // Copies would close the same element twice.
    XmlElement(const XmlElement&) = delete;
    XmlElement& operator=(const XmlElement&) = delete;

    /// Starts a document on a wide sink: appends "<" and the name (nothing for
    /// a null name).
    void openRoot(fnd::WString* sink, const wchar_t* name);
    /// The same on a sink that receives the markup as UTF-8.
    void openRoot(fnd::NString* utf8Sink, const wchar_t* name);
    /// Starts an element in the parent's document; the parent only supplies
    /// the sink and is not changed (its start tag must already be ended).
    void openChild(const XmlElement& parent, const wchar_t* name);

    /// Appends ` name='value'` unchanged. `name` is NUL-terminated ASCII.
    void writeAttribute(const char* name, const fnd::WString& value);
    /// Ends the start tag with ">" if it is still open, then appends the text
    /// unchanged.
    void writeText(const fnd::WString& text);
    /// The same for UTF-8 text: decoded on a wide sink (InvalidSequence when
    /// it does not decode, before anything is written), copied as it is on a
    /// UTF-8 sink.
    void writeText(const fnd::NString& utf8Text);

    /// Appends " />" while the start tag is open, otherwise "</name>"; a
    /// fragment writes nothing. Later calls and the destructor write nothing,
    /// but the element can still serve as a parent for openChild.
    void close();

private:
    // A wide sink wins over a UTF-8 sink; exactly one is set once opened.
    fnd::WString* wideSink_ = nullptr;
    fnd::NString* utf8Sink_ = nullptr;
    const wchar_t* name_ = nullptr;
    bool startTagClosed_ = false;
};

}  // namespace qel::xml
