// The framework stand-in as the plug-in sees it: experts enumerated from the
// model, component-object rules, and statuses for bad arguments.
#include <gtest/gtest.h>

#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <set>
#include <thread>

#include "FrameworkTestSupport.h"

namespace qel::sim::test {
namespace {

using api::Guid;

constexpr int32_t kNoInterface = static_cast<int32_t>(0x80004002u);
constexpr int32_t kPointer = static_cast<int32_t>(0x80004003u);
constexpr int32_t kBadLocator = static_cast<int32_t>(0x80040372u);

const std::string kFirst = ExpertJson("Motion", "Motion Control", "2.1.0", "{01234567-89AB-CDEF-0123-456789ABCDEF}");
const std::string kSecond =
    ExpertJson("Überwachung", "Température – 温度 监控", "1.0β", "{fedcba98-7654-3210-fedc-ba9876543210}");
// The same kind of text spelled with JSON escapes, one outside the 16-bit range.
const std::string kThird =
    ExpertJson("Esc", "\\u00dcber \\ud83d\\ude00 \\\"q\\\"", "", "{00000000-0000-0000-0000-000000000001}");

class FrameworkExperts : public SimDevice {};

TEST_F(FrameworkExperts, ListedInModelOrderWithExactTexts) {
    WriteExperts({kFirst, kSecond, kThird});
    Ref<api::IkrSysFramework> framework;
    ASSERT_NO_FATAL_FAILURE(Instantiate(framework));

    std::vector<ExpertTexts> experts = ListExperts(framework.Get());
    ASSERT_EQ(experts.size(), 3u);

    EXPECT_EQ(experts[0].programmaticName, L"Motion");
    EXPECT_EQ(experts[0].displayName, L"Motion Control");
    EXPECT_EQ(experts[0].version, L"2.1.0");
    EXPECT_EQ(experts[0].productId,
              (Guid{0x01234567, 0x89AB, 0xCDEF, {0x01, 0x23, 0x45, 0x67, 0x89, 0xAB, 0xCD, 0xEF}}));

    EXPECT_EQ(experts[1].programmaticName, L"\u00DCberwachung");
    EXPECT_EQ(experts[1].displayName, L"Temp\u00E9rature \u2013 \u6E29\u5EA6 \u76D1\u63A7");
    EXPECT_EQ(experts[1].version, L"1.0\u03B2");
    EXPECT_EQ(experts[1].productId,
              (Guid{0xFEDCBA98, 0x7654, 0x3210, {0xFE, 0xDC, 0xBA, 0x98, 0x76, 0x54, 0x32, 0x10}}));

    // One 32-bit character for the character outside the 16-bit range.
    EXPECT_EQ(experts[2].displayName, std::wstring(L"\u00DCber \U0001F600 \"q\""));
    EXPECT_EQ(experts[2].displayName.size(), 10u);
    EXPECT_EQ(experts[2].version, L"");
    EXPECT_EQ(experts[2].productId, (Guid{0, 0, 0, {0, 0, 0, 0, 0, 0, 0, 1}}));
}

TEST_F(FrameworkExperts, EmptyListEndsAtOnceAndStaysEnded) {
    WriteExperts({});
    Ref<api::IkrSysFramework> framework;
    ASSERT_NO_FATAL_FAILURE(Instantiate(framework));
    Ref<api::IkrSysEnumExperts> experts;
    ASSERT_EQ(framework->EnumSystemExperts(L"//localhost", experts.Out()), 0);
    for (int round = 0; round < 2; ++round) {
        api::IkrSysExpertInfo* expert = reinterpret_cast<api::IkrSysExpertInfo*>(uintptr_t{0x10});
        uint32_t fetched = 7;
        EXPECT_EQ(experts->Next(1, &expert, &fetched), 1);
        EXPECT_EQ(fetched, 0u);
        EXPECT_EQ(expert, nullptr);
    }
}

TEST_F(FrameworkExperts, NextWithACountDeliversWhatIsLeft) {
    WriteExperts({kFirst, kSecond, kThird});
    Ref<api::IkrSysFramework> framework;
    ASSERT_NO_FATAL_FAILURE(Instantiate(framework));
    Ref<api::IkrSysEnumExperts> experts;
    ASSERT_EQ(framework->EnumSystemExperts(L"//localhost", experts.Out()), 0);

    struct Step {
        int32_t status;
        uint32_t fetched;
        std::vector<std::wstring> names;
    } steps[] = {
        {0, 2, {L"Motion", L"\u00DCberwachung"}},
        {1, 1, {L"Esc"}},
        {1, 0, {}},
    };
    for (const Step& step : steps) {
        api::IkrSysExpertInfo* got[2] = {};
        uint32_t fetched = 99;
        EXPECT_EQ(experts->Next(2, got, &fetched), step.status);
        ASSERT_EQ(fetched, step.fetched);
        for (uint32_t i = 0; i < 2; ++i) {
            if (i < fetched) {
                EXPECT_EQ(Ask(got[i]).programmaticName, step.names[i]);
                got[i]->Release();
            } else {
                EXPECT_EQ(got[i], nullptr);
            }
        }
    }
}

TEST_F(FrameworkExperts, ExpertOutlivesItsEnumeratorAndFramework) {
    WriteExperts({kFirst});
    api::IkrSysFramework* framework = nullptr;
    ASSERT_EQ(qelsysInstantiateFramework(&framework), 0);
    api::IkrSysEnumExperts* experts = nullptr;
    ASSERT_EQ(framework->EnumSystemExperts(L"//localhost", &experts), 0);
    api::IkrSysExpertInfo* expert = nullptr;
    ASSERT_EQ(experts->Next(1, &expert, nullptr), 0);
    EXPECT_EQ(qelsysSimLiveObjects() - liveBefore_, 3);

    EXPECT_EQ(framework->Release(), 0u);
    EXPECT_EQ(experts->Release(), 0u);
    EXPECT_EQ(qelsysSimLiveObjects() - liveBefore_, 1);
    EXPECT_EQ(Ask(expert).version, L"2.1.0");
    EXPECT_EQ(expert->Release(), 0u);
}

TEST_F(FrameworkExperts, LocatorMustNameThisDevice) {
    WriteExperts({kFirst});
    Ref<api::IkrSysFramework> framework;
    ASSERT_NO_FATAL_FAILURE(Instantiate(framework));
    struct {
        const wchar_t* locator;
        int32_t status;
    } cases[] = {
        {L"//localhost", 0},         {L"//localhost/Motion", 0},       {L"//localhost/Motion/Axis 1", 0},
        {L"//localhost/", 0},        {L"//localhostess", kBadLocator}, {L"//otherhost", kBadLocator},
        {L"localhost", kBadLocator}, {L"//local", kBadLocator},        {L"", kBadLocator},
        {nullptr, kPointer},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.locator ? c.locator : L"(null)");
        auto* sentinel = reinterpret_cast<api::IkrSysEnumExperts*>(uintptr_t{0x10});
        api::IkrSysEnumExperts* experts = sentinel;
        EXPECT_EQ(framework->EnumSystemExperts(c.locator, &experts), c.status);
        if (c.status == 0) {
            ASSERT_NE(experts, nullptr);
            ASSERT_NE(experts, sentinel);
            experts->Release();
        } else {
            EXPECT_EQ(experts, nullptr);
        }
    }
}

// Threads share one framework and one enumerator: every expert goes to
// exactly one caller, and every reference is released once.
TEST_F(FrameworkExperts, ConcurrentCallersShareOneEnumeration) {
    std::vector<std::string> entries;
    for (int i = 0; i < 64; ++i) {
        char id[40];
        std::snprintf(id, sizeof id, "{%08X-0000-0000-0000-000000000000}", i);
        entries.push_back(ExpertJson("E" + std::to_string(i), "d", "v", id));
    }
    WriteExperts(entries);
    Ref<api::IkrSysFramework> framework;
    ASSERT_NO_FATAL_FAILURE(Instantiate(framework));
    Ref<api::IkrSysEnumExperts> shared;
    ASSERT_EQ(framework->EnumSystemExperts(L"//localhost", shared.Out()), 0);

    std::vector<std::vector<uint32_t>> seen(4);
    std::atomic<int> listedWhole{0};
    std::vector<std::thread> threads;
    for (size_t t = 0; t < seen.size(); ++t) {
        threads.emplace_back([&, t] {
            api::IkrSysExpertInfo* expert = nullptr;
            while (shared->Next(1, &expert, nullptr) == 0) {
                Guid id;
                if (expert->GetProductID(&id) == 0) seen[t].push_back(id.Data1);
                expert->AddRef();
                expert->Release();
                expert->Release();
            }
            // Private enumerations of the same framework, meanwhile.
            if (ListExperts(framework.Get()).size() == 64) ++listedWhole;
        });
    }
    for (auto& thread : threads) thread.join();

    std::multiset<uint32_t> all;
    for (const auto& ids : seen) all.insert(ids.begin(), ids.end());
    EXPECT_EQ(all.size(), 64u);
    for (uint32_t i = 0; i < 64; ++i) EXPECT_EQ(all.count(i), 1u) << i;
    EXPECT_EQ(listedWhole.load(), 4);
}

class FrameworkComObjects : public SimDevice {
protected:
    void SetUp() override {
        SimDevice::SetUp();
        WriteExperts({kFirst});
        ASSERT_NO_FATAL_FAILURE(Instantiate(framework_));
        ASSERT_EQ(framework_->EnumSystemExperts(L"//localhost", experts_.Out()), 0);
        ASSERT_EQ(experts_->Next(1, expert_.Out(), nullptr), 0);
    }
    void TearDown() override {
        expert_.Reset();
        experts_.Reset();
        framework_.Reset();
        SimDevice::TearDown();
    }

    Ref<api::IkrSysFramework> framework_;
    Ref<api::IkrSysEnumExperts> experts_;
    Ref<api::IkrSysExpertInfo> expert_;
};

TEST_F(FrameworkComObjects, QueryInterfaceAnswersOwnInterfacesOnly) {
    const Guid unknownId{0x12345678, 0x9abc, 0xdef0, {1, 2, 3, 4, 5, 6, 7, 8}};
    struct Case {
        const char* what;
        api::IUnknown* object;
        const Guid* iid;
        bool answers;
    } cases[] = {
        {"framework: IUnknown", framework_.Get(), &api::kIID_IUnknown, true},
        {"framework: IkrSysFramework", framework_.Get(), &api::kIID_IkrSysFramework, true},
        {"framework: IkrSysFirmware", framework_.Get(), &api::kIID_IkrSysFirmware, true},
        {"framework: IkrSysDiagnostics", framework_.Get(), &api::kIID_IkrSysDiagnostics, true},
        {"framework: IkrSysExpertInfo", framework_.Get(), &api::kIID_IkrSysExpertInfo, false},
        {"framework: unknown", framework_.Get(), &unknownId, false},
        {"enumerator: IUnknown", experts_.Get(), &api::kIID_IUnknown, true},
        {"enumerator: IkrSysEnumExperts", experts_.Get(), &api::kIID_IkrSysEnumExperts, true},
        {"enumerator: IkrSysEnumUris", experts_.Get(), &api::kIID_IkrSysEnumUris, false},
        {"enumerator: IkrSysFramework", experts_.Get(), &api::kIID_IkrSysFramework, false},
        {"expert: IUnknown", expert_.Get(), &api::kIID_IUnknown, true},
        {"expert: IkrSysExpertInfo", expert_.Get(), &api::kIID_IkrSysExpertInfo, true},
        {"expert: IkrSysEnumExperts", expert_.Get(), &api::kIID_IkrSysEnumExperts, false},
        {"expert: unknown", expert_.Get(), &unknownId, false},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.what);
        void* sentinel = reinterpret_cast<void*>(uintptr_t{0x10});
        void* out = sentinel;
        int32_t live = qelsysSimLiveObjects();
        EXPECT_EQ(c.object->QueryInterface(*c.iid, &out), c.answers ? 0 : kNoInterface);
        if (!c.answers) {
            EXPECT_EQ(out, nullptr);
            continue;
        }
        // Every answer is the same object with a reference of its own: asked
        // for IUnknown, it gives back the identity the caller started from.
        ASSERT_NE(out, nullptr);
        ASSERT_NE(out, sentinel);
        void* identity = nullptr;
        ASSERT_EQ(static_cast<api::IUnknown*>(out)->QueryInterface(api::kIID_IUnknown, &identity), 0);
        EXPECT_EQ(identity, static_cast<void*>(c.object));
        static_cast<api::IUnknown*>(identity)->Release();
        EXPECT_EQ(static_cast<api::IUnknown*>(out)->Release(), 1u);
        EXPECT_EQ(qelsysSimLiveObjects(), live);
    }
}

TEST_F(FrameworkComObjects, NullOutPointersAreRefused) {
    EXPECT_EQ(qelsysInstantiateFramework(nullptr), kPointer);
    EXPECT_EQ(framework_->QueryInterface(api::kIID_IUnknown, nullptr), kPointer);
    EXPECT_EQ(experts_->QueryInterface(api::kIID_IkrSysEnumExperts, nullptr), kPointer);
    EXPECT_EQ(expert_->QueryInterface(api::kIID_IkrSysExpertInfo, nullptr), kPointer);
    EXPECT_EQ(framework_->EnumSystemExperts(L"//localhost", nullptr), kPointer);
    EXPECT_EQ(expert_->GetProductID(nullptr), kPointer);
    EXPECT_EQ(expert_->GetProductDisplayName(nullptr), kPointer);
    EXPECT_EQ(expert_->GetProductVersion(nullptr), kPointer);
    EXPECT_EQ(expert_->GetProgrammaticName(nullptr), kPointer);

    // A refused Next consumes nothing: the one expert is still there after.
    Ref<api::IkrSysEnumExperts> experts;
    ASSERT_EQ(framework_->EnumSystemExperts(L"//localhost", experts.Out()), 0);
    uint32_t fetched = 5;
    EXPECT_EQ(experts->Next(1, nullptr, &fetched), kPointer);
    EXPECT_EQ(fetched, 0u);
    api::IkrSysExpertInfo* two[2] = {};
    EXPECT_EQ(experts->Next(2, two, nullptr), kPointer);
    EXPECT_EQ(two[0], nullptr);
    Ref<api::IkrSysExpertInfo> expert;
    EXPECT_EQ(experts->Next(1, expert.Out(), nullptr), 0);
    EXPECT_EQ(qelsysSimLiveObjects() - liveBefore_, 5);
}

}  // namespace
}  // namespace qel::sim::test
