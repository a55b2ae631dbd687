// A simulated device in a fresh shared data directory, and reference holders,
// for the tests of the framework stand-in.
#pragma once

#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "api/Framework.h"
#include "framework/SimControl.h"

namespace qel::sim::test {

/// Holds one interface reference and releases it.
template <typename I>
class Ref {
public:
    Ref() = default;
    ~Ref() { Reset(); }
    Ref(const Ref&) = delete;
    Ref& operator=(const Ref&) = delete;
    I** Out() {
        Reset();
        return &p_;
    }
    I* operator->() const { return p_; }
    I* Get() const { return p_; }
    void Reset() {
        if (p_) p_->Release();
        p_ = nullptr;
    }

private:
    I* p_ = nullptr;
};

/// What one expert answered.
struct ExpertTexts {
    std::wstring programmaticName, displayName, version;
    api::Guid productId;
};

/// The text of a SysString, which it frees; checks the terminator callers
/// that ignore the count rely on.
inline std::wstring Take(api::SysString s) {
    if (!s) {
        ADD_FAILURE() << "a text query answered success without a text";
        return {};
    }
    EXPECT_EQ(s[api::SysStringLen(s)], L'\0');
    std::wstring text(s, api::SysStringLen(s));
    api::SysStringFree(s);
    return text;
}

inline ExpertTexts Ask(api::IkrSysExpertInfo* expert) {
    ExpertTexts texts;
    api::SysString s = nullptr;
    EXPECT_EQ(expert->GetProgrammaticName(&s), 0);
    texts.programmaticName = Take(s);
    EXPECT_EQ(expert->GetProductDisplayName(&s), 0);
    texts.displayName = Take(s);
    EXPECT_EQ(expert->GetProductVersion(&s), 0);
    texts.version = Take(s);
    EXPECT_EQ(expert->GetProductID(&texts.productId), 0);
    return texts;
}

/// Walks a fresh enumeration of all experts one at a time.
inline std::vector<ExpertTexts> ListExperts(api::IkrSysFramework* framework) {
    std::vector<ExpertTexts> all;
    Ref<api::IkrSysEnumExperts> experts;
    EXPECT_EQ(framework->EnumSystemExperts(L"//localhost", experts.Out()), 0);
    if (!experts.Get()) return all;
    for (;;) {
        api::IkrSysExpertInfo* expert = nullptr;
        uint32_t fetched = 99;
        int32_t status = experts->Next(1, &expert, &fetched);
        if (status != 0) {
            EXPECT_EQ(status, 1);
            EXPECT_EQ(fetched, 0u);
            EXPECT_EQ(expert, nullptr);
            break;
        }
        if (fetched != 1 || !expert) {
            ADD_FAILURE() << "Next answered 0 but fetched " << fetched;
            break;
        }
        all.push_back(Ask(expert));
        expert->Release();
    }
    return all;
}

/// One expert entry of a model document.
inline std::string ExpertJson(std::string_view name, std::string_view display, std::string_view version,
                              std::string_view id) {
    std::string json = "{\"programmaticName\": \"";
    json.append(name).append("\", \"displayName\": \"").append(display);
    json.append("\", \"version\": \"").append(version).append("\", \"productId\": \"").append(id).append("\"}");
    return json;
}

/// Each test gets its own shared data directory (through "QELSHAREDDIR") and
/// must leave as many framework objects alive as it found.
class SimDevice : public ::testing::Test {
protected:
    void SetUp() override {
        std::string pattern = (std::filesystem::temp_directory_path() / "qelsim-XXXXXX").string();
        ASSERT_NE(mkdtemp(pattern.data()), nullptr);
        shared_ = pattern;
        if (const char* old = std::getenv("QELSHAREDDIR")) savedVariable_ = old;
        setenv("QELSHAREDDIR", shared_.c_str(), 1);
        liveBefore_ = qelsysSimLiveObjects();
    }

    void TearDown() override {
        EXPECT_EQ(qelsysSimLiveObjects(), liveBefore_) << "a framework object was not released exactly once";
        if (savedVariable_)
            setenv("QELSHAREDDIR", savedVariable_->c_str(), 1);
        else
            unsetenv("QELSHAREDDIR");
        std::error_code ignored;
        std::filesystem::remove_all(shared_, ignored);
    }

    std::filesystem::path ModelPath() const { return shared_ / "sim" / "device.json"; }

    void WriteModel(std::string_view content) {
        std::filesystem::create_directories(ModelPath().parent_path());
        std::ofstream out(ModelPath(), std::ios::binary | std::ios::trunc);
        out.write(content.data(), static_cast<std::streamsize>(content.size()));
        ASSERT_TRUE(out.good());
    }

    void WriteExperts(const std::vector<std::string>& experts) {
        std::string json = "{\"experts\": [";
        for (size_t i = 0; i < experts.size(); ++i) json.append(i ? ", " : "").append(experts[i]);
        WriteModel(json + "]}");
    }

    /// A framework over the model written so far; fails the test otherwise.
    void Instantiate(Ref<api::IkrSysFramework>& framework) {
        ASSERT_EQ(qelsysInstantiateFramework(framework.Out()), 0);
        ASSERT_NE(framework.Get(), nullptr);
    }

    /// The status of an instantiation that must fail, checking that it hands
    /// out nothing.
    int32_t FailedInstantiation() {
        auto* sentinel = reinterpret_cast<api::IkrSysFramework*>(uintptr_t{0x10});
        api::IkrSysFramework* framework = sentinel;
        int32_t status = qelsysInstantiateFramework(&framework);
        EXPECT_EQ(framework, nullptr);
        if (framework && framework != sentinel) framework->Release();
        return status;
    }

    std::filesystem::path shared_;
    std::optional<std::string> savedVariable_;
    int32_t liveBefore_ = 0;
};

}  // namespace qel::sim::test
