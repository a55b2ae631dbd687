// The XML writer: markup appended in place to a wide or UTF-8 sink, and the
// escaping that callers apply to every piece of free text.
#include "xml/XmlElement.h"

#include <exception>

#include "foundation/Utf.h"

namespace qel::xml {

namespace {

using fnd::NString;
using fnd::WString;

// The fixed markup in both forms, so that neither sink converts it per call.
struct Markup {
    const wchar_t* wide;
    const char* narrow;
    uint32_t length;
};
constexpr Markup kTagOpen{L"<", "<", 1};
constexpr Markup kTagEnd{L">", ">", 1};
constexpr Markup kEmptyTagEnd{L" />", " />", 3};
constexpr Markup kEndTagOpen{L"</", "</", 2};
constexpr Markup kBlank{L" ", " ", 1};
constexpr Markup kValueOpen{L"='", "='", 2};
constexpr Markup kValueClose{L"'", "'", 1};

void Put(WString* wide, NString* utf8, const Markup& piece) {
    if (wide) wide->Append(piece.wide, piece.length);
    else if (utf8) utf8->Append(piece.narrow, piece.length);
}

void PutAsciiBytes(NString& utf8, const wchar_t* text, uint32_t count) {
    if (count == 0) return;
    const uint32_t at = utf8.Length();
    utf8.Append(count, '\0');
    char* out = utf8.Data() + at;
    for (uint32_t i = 0; i < count; ++i) out[i] = static_cast<char>(text[i]);
}

// Almost everything the service writes is ASCII, which is its own UTF-8: that
// leading part is copied byte by byte and only the rest goes to the encoder.
// The rest is encoded before anything is appended, so a failure of the
// encoder leaves the sink as it was.
void PutWide(WString* wide, NString* utf8, const wchar_t* text, uint32_t count) {
    if (wide) {
        wide->Append(text, count);
        return;
    }
    if (!utf8) return;
    uint32_t ascii = 0;
    while (ascii < count && static_cast<uint32_t>(text[ascii]) < 0x80u) ++ascii;
    if (ascii == count) {
        PutAsciiBytes(*utf8, text, count);
        return;
    }
    const NString rest = fnd::WideToUtf8(text + ascii, count - ascii);
    PutAsciiBytes(*utf8, text, ascii);
    utf8->Append(rest);
}

// Attribute names are ASCII by contract, so widening byte by byte is exact.
void PutAscii(WString* wide, NString* utf8, const char* text) {
    const uint32_t count = NString::Measure(text);
    if (wide) {
        const uint32_t at = wide->Length();
        wide->Append(count, L'\0');
        wchar_t* out = wide->Data() + at;
        for (uint32_t i = 0; i < count; ++i) out[i] = static_cast<wchar_t>(static_cast<unsigned char>(text[i]));
    } else if (utf8) {
        utf8->Append(text, count);
    }
}

void PutStartTag(WString* wide, NString* utf8, const wchar_t* name) {
    if (!name) return;
    Put(wide, utf8, kTagOpen);
    PutWide(wide, utf8, name, WString::Measure(name));
}

}  // namespace

WString EscapeXml(const wchar_t* text, std::vector<uint32_t>* positions) {
    WString result;
    if (!text) return result;
    const uint32_t length = WString::Measure(text);
    result.Reserve(length);
    // Characters that stay are copied in runs, not one by one.
    const wchar_t* run = text;
    const wchar_t* const end = text + length;
    for (const wchar_t* p = text; p != end; ++p) {
        const wchar_t* replacement;
        uint32_t replacementLength;
        switch (static_cast<uint32_t>(*p)) {
            case '"': replacement = L"&quot;", replacementLength = 6; break;
            case '&': replacement = L"&amp;", replacementLength = 5; break;
            case '\'': replacement = L"&apos;", replacementLength = 6; break;
            case '<': replacement = L"&lt;", replacementLength = 4; break;
            case '>': replacement = L"&gt;", replacementLength = 4; break;
            default:
                if (IsXmlChar(*p)) continue;
                replacement = L"?", replacementLength = 1;
                break;
        }
        result.Append(run, static_cast<uint32_t>(p - run));
        if (replacementLength == 1 && positions) positions->push_back(result.Length());
        result.Append(replacement, replacementLength);
        run = p + 1;
    }
    result.Append(run, static_cast<uint32_t>(end - run));
    return result;
}

XmlElement::~XmlElement() noexcept(false) {
    try {
        close();
    } catch (...) {
        // During unwinding a second exception would terminate the process;
        // the one already in flight is what the caller has to hear about.
        if (std::uncaught_exceptions() == 0) throw;
    }
}

void XmlElement::openRoot(WString* sink, const wchar_t* name) {
    wideSink_ = sink;
    utf8Sink_ = nullptr;
    name_ = name;
    startTagClosed_ = false;
    PutStartTag(wideSink_, utf8Sink_, name);
}

void XmlElement::openRoot(NString* utf8Sink, const wchar_t* name) {
    wideSink_ = nullptr;
    utf8Sink_ = utf8Sink;
    name_ = name;
    startTagClosed_ = false;
    PutStartTag(wideSink_, utf8Sink_, name);
}

void XmlElement::openChild(const XmlElement& parent, const wchar_t* name) {
    wideSink_ = parent.wideSink_;
    utf8Sink_ = parent.utf8Sink_;
    name_ = name;
    startTagClosed_ = false;
    PutStartTag(wideSink_, utf8Sink_, name);
}

void XmlElement::writeAttribute(const char* name, const WString& value) {
    Put(wideSink_, utf8Sink_, kBlank);
    PutAscii(wideSink_, utf8Sink_, name);
    Put(wideSink_, utf8Sink_, kValueOpen);
    PutWide(wideSink_, utf8Sink_, value.Data(), value.Length());
    Put(wideSink_, utf8Sink_, kValueClose);
}

void XmlElement::writeText(const WString& text) {
    if (name_ && !startTagClosed_) {
        startTagClosed_ = true;
        Put(wideSink_, utf8Sink_, kTagEnd);
    }
    PutWide(wideSink_, utf8Sink_, text.Data(), text.Length());
}

void XmlElement::writeText(const NString& utf8Text) {
    if (wideSink_) {
        // Decoded first, so that text which does not decode writes nothing.
        writeText(fnd::Utf8ToWide(utf8Text));
        return;
    }
    if (name_ && !startTagClosed_) {
        startTagClosed_ = true;
        Put(wideSink_, utf8Sink_, kTagEnd);
    }
    if (utf8Sink_) utf8Sink_->Append(utf8Text);
}

void XmlElement::close() {
    // Forget the name first: if appending fails, the destructor must not try
    // to close a second time.
    const wchar_t* const name = name_;
    name_ = nullptr;
    if (!name) return;
    if (!startTagClosed_) {
        Put(wideSink_, utf8Sink_, kEmptyTagEnd);
        return;
    }
    Put(wideSink_, utf8Sink_, kEndTagOpen);
    PutWide(wideSink_, utf8Sink_, name, WString::Measure(name));
    Put(wideSink_, utf8Sink_, kTagEnd);
}

}  // namespace qel::xml
