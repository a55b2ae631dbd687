// The serializers against a fake framework object: exact elements, statuses
// thrown as a `long`, and every received string freed.
#include "xml/Serializers.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "foundation/Status.h"

#if defined(__SANITIZE_ADDRESS__)
#include <sanitizer/lsan_interface.h>
#endif

namespace qel::xml {
namespace {

using fnd::WString;

std::wstring Std(const WString& s) { return std::wstring(s.CStr(), s.Length()); }

// Answers from fixed values; one query (0 to 3, in the order of the
// interface) can be given another status. Strings are handed out even with a
// failure, because the receiver owns whatever it gets on every path.
class FakeExpert final : public api::IkrSysExpertInfo {
public:
    api::Guid id{0x00A1B2C3, 0x0D4E, 0x00F5, {0x06, 0xA7, 0xB8, 0x09, 0xCA, 0xDB, 0xEC, 0x0F}};
    const wchar_t* texts[3] = {L"Caf\u00E9 <Pro> & 'Co'", L"1.0\x1", L"qel.expert"};
    int special = -1;
    int32_t specialStatus = 0;
    std::vector<int> asked;
    int references = 0;
    int stringsHandedOut = 0;

    int32_t QueryInterface(const api::Guid&, void** out) override {
        *out = nullptr;
        return fnd::kStatusNoInterface;
    }
    uint32_t AddRef() override { return static_cast<uint32_t>(++references); }
    uint32_t Release() override { return static_cast<uint32_t>(--references); }
    int32_t GetProductID(api::Guid* out) override {
        *out = id;
        return Answer(0);
    }
    int32_t GetProductDisplayName(api::SysString* out) override { return Text(1, out); }
    int32_t GetProductVersion(api::SysString* out) override { return Text(2, out); }
    int32_t GetProgrammaticName(api::SysString* out) override { return Text(3, out); }

private:
    int32_t Answer(int query) {
        asked.push_back(query);
        return query == special ? specialStatus : fnd::kStatusOk;
    }
    int32_t Text(int query, api::SysString* out) {
        const wchar_t* text = texts[query - 1];
        *out = text ? api::SysStringAlloc(text) : nullptr;
        stringsHandedOut += text != nullptr;
        return Answer(query);
    }
};

void ExpectNoLeaks() {
#if defined(__SANITIZE_ADDRESS__)
    EXPECT_EQ(__lsan_do_recoverable_leak_check(), 0) << "a received string was not freed";
#endif
}

const wchar_t kExpected[] =
    L"<ExpertInfo productID='{00A1B2C3-0D4E-00F5-06A7-B809CADBEC0F}'"
    L" productDisplayName='Caf\u00E9 &lt;Pro&gt; &amp; &apos;Co&apos;' productVersion='1.0?'"
    L" programmaticName='qel.expert' />";

TEST(Serializers, ExpertInfoIsOneSelfClosedElement) {
    FakeExpert expert;
    WString out;
    {
        XmlElement list;
        list.openRoot(&out, L"SystemExperts");
        list.writeText(L"");
        WriteExpertInfo(list, &expert);
    }
    EXPECT_EQ(Std(out), L"<SystemExperts>" + std::wstring(kExpected) + L"</SystemExperts>");
    EXPECT_EQ(expert.asked, (std::vector<int>{0, 1, 2, 3}));
    EXPECT_EQ(expert.stringsHandedOut, 3);
    EXPECT_EQ(expert.references, 0);
    ExpectNoLeaks();
}

TEST(Serializers, ExpertInfoStopsAtTheFirstFailingQuery) {
    const int32_t failure = fnd::Status(0x8ABC1234u);
    for (int query = 0; query < 4; ++query) {
        SCOPED_TRACE(query);
        FakeExpert good, failing;
        failing.special = query;
        failing.specialStatus = failure;
        WString out;
        XmlElement fragment;
        fragment.openRoot(&out, nullptr);
        WriteExpertInfo(fragment, &good);
        try {
            WriteExpertInfo(fragment, &failing);
            ADD_FAILURE() << "no status thrown";
        } catch (long status) {
            EXPECT_EQ(status, static_cast<long>(failure));
            EXPECT_LT(static_cast<int32_t>(status), 0);
        }
        // The expert written before stays; the failing one left no trace.
        EXPECT_EQ(Std(out), kExpected);
        std::vector<int> expectedAsked;
        for (int q = 0; q <= query; ++q) expectedAsked.push_back(q);
        EXPECT_EQ(failing.asked, expectedAsked);
        EXPECT_EQ(failing.references, 0);
    }
    ExpectNoLeaks();
}

TEST(Serializers, ExpertInfoTakesSuccessValuesAndNullStrings) {
    FakeExpert expert;
    expert.special = 2;
    expert.specialStatus = fnd::kStatusFalse;  // success, though not 0
    expert.texts[0] = nullptr;
    WString out;
    XmlElement fragment;
    fragment.openRoot(&out, nullptr);
    WriteExpertInfo(fragment, &expert);
    EXPECT_EQ(Std(out),
              L"<ExpertInfo productID='{00A1B2C3-0D4E-00F5-06A7-B809CADBEC0F}' productDisplayName=''"
              L" productVersion='1.0?' programmaticName='qel.expert' />");
    ExpectNoLeaks();
}

TEST(Serializers, ExpertInfoOfANullExpertThrowsThePointerStatus) {
    WString out;
    XmlElement fragment;
    fragment.openRoot(&out, nullptr);
    try {
        WriteExpertInfo(fragment, nullptr);
        ADD_FAILURE() << "no status thrown";
    } catch (long status) {
        EXPECT_EQ(status, static_cast<long>(fnd::kStatusPointer));
    }
    EXPECT_TRUE(out.IsEmpty());
}

}  // namespace
}  // namespace qel::xml
