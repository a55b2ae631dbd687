// The XML writer as its callers see it: exact documents on both sinks, and the
// escaping table.
#include "xml/XmlElement.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <cstdlib>
#include <initializer_list>
#include <new>
#include <random>
#include <string>
#include <vector>

#include "foundation/Exception.h"
#include "foundation/Utf.h"

// Counts every allocation of the program, so that a test can show that the
// writer appends in place. Kept out of line: inlined into gtest's code, the
// pairs look mismatched to the compiler's new/delete check.
namespace {
uint64_t g_allocations = 0;
}  // namespace

[[gnu::noinline]] void* operator new(std::size_t size) {
    ++g_allocations;
    if (void* p = std::malloc(size ? size : 1)) return p;
    throw std::bad_alloc();
}
[[gnu::noinline]] void operator delete(void* p) noexcept { std::free(p); }
[[gnu::noinline]] void operator delete(void* p, std::size_t) noexcept { std::free(p); }

namespace qel::xml {
namespace {

using fnd::NString;
using fnd::WString;

std::wstring Std(const WString& s) { return std::wstring(s.CStr(), s.Length()); }
std::string Std(const NString& s) { return std::string(s.CStr(), s.Length()); }

// Code points given as numbers, so that surrogates and negative values can be
// written on both platforms.
WString Chars(std::initializer_list<uint32_t> codes) {
    WString s;
    for (uint32_t c : codes) s.PushBack(static_cast<wchar_t>(c));
    return s;
}

// Each script writes into the root it is given; the document must come out
// the same, in UTF-8, on the narrow sink.
struct DocumentCase {
    const char* behaviour;
    const wchar_t* root;
    void (*script)(XmlElement& root);
    const wchar_t* expected;
};

const DocumentCase kDocuments[] = {
    {"bare element self-closes", L"r", [](XmlElement&) {}, L"<r />"},
    {"attributes each get one blank, and one more stands before />", L"r",
     [](XmlElement& r) {
         r.writeAttribute("a", L"1");
         r.writeAttribute("bc", L"");
     },
     L"<r a='1' bc='' />"},
    {"attribute values and texts are written unescaped", L"r",
     [](XmlElement& r) {
         r.writeAttribute("a", L"<&\"");
         r.writeText(L"<x/>&");
     },
     L"<r a='<&\"'><x/>&</r>"},
    {"an empty text alone gives an end tag", L"r", [](XmlElement& r) { r.writeText(L""); }, L"<r></r>"},
    {"texts after the first add no second >", L"r",
     [](XmlElement& r) {
         r.writeText(L"a");
         r.writeText(L"");
         r.writeText(L"b");
     },
     L"<r>ab</r>"},
    {"list: empty text before each child, text after a child follows its end tag", L"r",
     [](XmlElement& r) {
         for (const wchar_t* name : {L"c", L"d"}) {
             r.writeText(L"");
             XmlElement child;
             child.openChild(r, name);
             if (*name == L'd') child.writeText(L"x");
         }
         r.writeText(L"tail");
     },
     L"<r><c /><d>x</d>tail</r>"},
    {"narrow UTF-8 text", L"r", [](XmlElement& r) { r.writeText(NString("\xC3\xA4\xE2\x82\xAC")); },
     L"<r>\u00E4\u20AC</r>"},
    {"a closed element writes nothing more and still supplies the sink", L"r",
     [](XmlElement& r) {
         r.writeText(L"");
         XmlElement child;
         child.openChild(r, L"c");
         child.close();
         child.close();
         XmlElement sibling;
         sibling.openChild(child, L"s");
     },
     L"<r><c /><s /></r>"},
    {"an unnamed child is a fragment without tags", L"r",
     [](XmlElement& r) {
         r.writeText(L"");
         XmlElement fragment;
         fragment.openChild(r, nullptr);
         fragment.writeText(L"t");
         XmlElement child;
         child.openChild(fragment, L"c");
     },
     L"<r>t<c /></r>"},
    {"an unnamed root leaves exactly its text", nullptr, [](XmlElement& r) { r.writeText(L"\u00E4<"); }, L"\u00E4<"},
};

TEST(XmlElement, WritesExactDocumentsOnBothSinks) {
    for (const DocumentCase& c : kDocuments) {
        SCOPED_TRACE(c.behaviour);
        WString wide;
        NString utf8;
        {
            XmlElement root;
            root.openRoot(&wide, c.root);
            c.script(root);
        }
        {
            XmlElement root;
            root.openRoot(&utf8, c.root);
            c.script(root);
        }
        EXPECT_EQ(Std(wide), c.expected);
        EXPECT_EQ(Std(utf8), Std(fnd::WideToUtf8(WString(c.expected))));
    }
}

TEST(XmlElement, Utf8SinkEncodesNamesValuesAndTexts) {
    NString out;
    XmlElement root;
    root.openRoot(&out, L"gr\u00FC\u00DF");
    root.writeAttribute("v", L"\u20AC");
    root.writeText(Chars({'a', 0x10348, 0xFFFFFFFFu}));
    root.writeText(NString("\xC3\xA4"));
    root.close();
    EXPECT_EQ(Std(out), "<gr\xC3\xBC\xC3\x9F v='\xE2\x82\xAC'>a\xF0\x90\x8D\x88?\xC3\xA4</gr\xC3\xBC\xC3\x9F>");
}

TEST(XmlElement, AppendsInPlaceWithoutAllocating) {
    WString wide;
    NString utf8;
    wide.Reserve(1000);
    utf8.Reserve(1000);
    const WString value(L"v"), text(L"text");
    const NString narrowText("more");
    const uint64_t before = g_allocations;
    for (int i = 0; i < 10; ++i) {
        XmlElement a, b;
        a.openRoot(&wide, L"element");
        b.openRoot(&utf8, L"element");
        a.writeAttribute("name", value);
        b.writeAttribute("name", value);
        a.writeText(text);
        b.writeText(text);
        b.writeText(narrowText);
    }
    EXPECT_EQ(g_allocations, before);
    EXPECT_EQ(Std(utf8).size(), 10 * std::string("<element name='v'>textmore</element>").size());
}

TEST(XmlElement, ElementsLeftByAnExceptionAreClosed) {
    WString out;
    try {
        XmlElement root;
        root.openRoot(&out, L"r");
        root.writeText(L"");
        XmlElement child;
        child.openChild(root, L"c");
        child.writeAttribute("a", L"1");
        child.writeText(L"");
        XmlElement inner;
        inner.openChild(child, L"i");
        inner.writeText(NString("\xC3"));  // cut short: must fail before writing ">"
        FAIL() << "an undecodable text must throw";
    } catch (const fnd::exception::InvalidSequence&) {
    }
    EXPECT_EQ(Std(out), L"<r><c a='1'><i /></c></r>");
}

// Random trees with random code points (also beyond Unicode and negative):
// the UTF-8 sink must hold exactly the encoding of what the wide sink holds.
const wchar_t* const kNames[] = {L"a", L"List", L"gr\u00FC\u00DFe", L"\u65E5\u672C", L"x\U00010348"};
const char* const kAttributeNames[] = {"id", "hr", "version"};

WString RandomText(std::mt19937& rng, bool unicodeOnly) {
    static const uint32_t kLimits[] = {0x80, 0x800, 0x10000, 0x110000, 0xFFFFFFFFu};
    WString s;
    for (uint32_t n = rng() % 6; n > 0; --n) {
        uint32_t limit = kLimits[rng() % (unicodeOnly ? 4 : 5)];
        s.PushBack(static_cast<wchar_t>(1 + rng() % (limit - 1)));
    }
    return s;
}

void WriteRandomElement(XmlElement& parent, std::mt19937& rng, int depth) {
    XmlElement e;
    e.openChild(parent, kNames[rng() % 5]);
    for (uint32_t n = rng() % 3; n > 0; --n) e.writeAttribute(kAttributeNames[rng() % 3], RandomText(rng, false));
    for (uint32_t n = rng() % 4; n > 0; --n) {
        switch (rng() % 3) {
            case 0: e.writeText(RandomText(rng, false)); break;
            case 1: e.writeText(fnd::WideToUtf8(RandomText(rng, true))); break;
            default:
                e.writeText(L"");
                if (depth < 4) WriteRandomElement(e, rng, depth + 1);
        }
    }
    if (rng() % 2) e.close();  // otherwise the destructor closes it
}

TEST(XmlElementUtf8, SinkHoldsTheEncodingOfTheWideDocument) {
    for (uint32_t seed = 1; seed <= 200; ++seed) {
        WString wide;
        NString utf8;
        std::mt19937 wideRng(seed), utf8Rng(seed);
        {
            XmlElement a, b;
            a.openRoot(&wide, nullptr);
            b.openRoot(&utf8, nullptr);
            WriteRandomElement(a, wideRng, 0);
            WriteRandomElement(b, utf8Rng, 0);
        }
        ASSERT_EQ(Std(fnd::WideToUtf8(wide)), Std(utf8)) << "seed " << seed;
    }
}

struct EscapeCase {
    WString input;
    WString expected;
    std::vector<uint32_t> positions;
};

TEST(EscapeXml, ReplacesMarkupAndForbiddenCharacters) {
    const EscapeCase cases[] = {
        {L"", L"", {}},
        {L"plain \u00E4\U00010348", L"plain \u00E4\U00010348", {}},
        {L"a<b&c'd>e", L"a&lt;b&amp;c&apos;d&gt;e", {}},
        {L"\"", L"&quot;", {}},
        // Positions count in the escaped text, after earlier expansions.
        {Chars({'&', 'a', 'b', 0x1}), L"&amp;ab?", {7}},
        {Chars({'<', 0x2, '>', 0x3}), L"&lt;?&gt;?", {4, 9}},
        {Chars({0x8, 0x9, 0xA, 0xB, 0xC, 0xD, 0xE, 0x1F, 0x20}), L"?\t\n??\r?? ", {0, 3, 4, 6, 7}},
        {Chars({0xD7FF, 0xD800, 0xDBFF, 0xDC00, 0xDFFF, 0xE000}), Chars({0xD7FF, '?', '?', '?', '?', 0xE000}),
         {1, 2, 3, 4}},
        {Chars({0xFFFD, 0xFFFE, 0xFFFF, 0x10000, 0x10FFFF, 0x110000}),
         Chars({0xFFFD, '?', '?', 0x10000, 0x10FFFF, '?'}),
         {1, 2, 5}},
        {Chars({0x7FFFFFFF, 0x80000000u, 0xFFFFFFFFu}), L"???", {0, 1, 2}},
    };
    for (const EscapeCase& c : cases) {
        SCOPED_TRACE(testing::PrintToString(Std(c.input)));
        std::vector<uint32_t> positions;
        EXPECT_EQ(Std(EscapeXml(c.input.CStr(), &positions)), Std(c.expected));
        EXPECT_EQ(positions, c.positions);
        EXPECT_EQ(Std(EscapeXml(c.input.CStr(), nullptr)), Std(c.expected));
    }
}

TEST(EscapeXml, NullIsEmptyAndPositionsAreAppended) {
    std::vector<uint32_t> positions{99};
    EXPECT_TRUE(EscapeXml(nullptr, &positions).IsEmpty());
    EXPECT_EQ(Std(EscapeXml(Chars({'a', 0x1}).CStr(), &positions)), L"a?");
    EXPECT_EQ(positions, (std::vector<uint32_t>{99, 1}));
}

}  // namespace
}  // namespace qel::xml
