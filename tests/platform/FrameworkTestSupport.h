// A simulated device in a fresh shared data directory, and reference holders,
// for the tests of the framework stand-in.
#pragma once

#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <map>
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

/// The three experts every item model of the tests uses.
inline std::string ThreeExperts() {
    return ExpertJson("controller", "Controller System", "5.0.0", "{2A4C6E80-1B3D-4F57-9A0C-5E7F91B3D5F7}") + ", " +
           ExpertJson("network", "Network Settings", "5.0.0", "{7C1E3A5B-9D2F-4B60-8E4A-1C3D5F7A9B2E}") + ", " +
           ExpertJson("storage", "Storage and Time", "4.2.1", "{D3F5A7C9-2E4B-4D6F-A1C3-E5F7092B4D6F}");
}

/// A model document with the three experts and the given JSON members
/// (", "-separated "key": value pairs) after them.
inline std::string ModelWith(std::string_view members) {
    std::string json = "{\"experts\": [" + ThreeExperts() + "]";
    if (!members.empty()) json.append(", ").append(members);
    return json + "}";
}

/// The text form the tests compare property values in: integers in decimal,
/// doubles with "%g", GUIDs in braces, strings as they are, times as
/// "T<seconds>.<fraction>" from the extended bag or "L<YYYY-MM-DD hh:mm:ss>"
/// from a legacy one. A failing getter gives "!<status in hex>".
inline std::wstring ValueText(api::IkrSysPropertyBag* bag, api::PropertyTag tag) {
    api::PropertyTypeCode type = 0;
    int32_t status = bag->GetPropertyType(tag, &type);
    wchar_t buffer[96];
    auto failed = [&](int32_t s) {
        std::swprintf(buffer, 96, L"!%08X", static_cast<unsigned>(s));
        return std::wstring(buffer);
    };
    if (status != 0) return failed(status);
    switch (type) {
        case 1:
        case 2: {
            int32_t value = 0;
            status = type == 1 ? bag->GetInteger1(tag, &value) : bag->GetInteger2(tag, &value);
            return status ? failed(status) : std::to_wstring(value);
        }
        case 3: {
            uint32_t value = 0;
            status = bag->GetUnsigned(tag, &value);
            return status ? failed(status) : std::to_wstring(value);
        }
        case 4: {
            double value = 0;
            status = bag->GetDouble(tag, &value);
            if (status) return failed(status);
            std::swprintf(buffer, 96, L"%g", value);
            return buffer;
        }
        case 5: {
            api::Guid value;
            status = bag->GetGuid(tag, &value);
            if (status) return failed(status);
            fnd::WString text = value.ToString();
            return std::wstring(text.Data(), text.Length());
        }
        case 6: {
            api::SysString value = nullptr;
            status = bag->GetString(tag, &value);
            return status ? failed(status) : Take(value);
        }
        case 7: {
            api::IkrSysPropertyBagEx* ex = nullptr;
            if (bag->QueryInterface(api::kIID_IkrSysPropertyBagEx, reinterpret_cast<void**>(&ex)) == 0) {
                api::AbsTime time;
                status = ex->GetTimestamp(tag, &time);
                ex->Release();
                if (status) return failed(status);
                std::swprintf(buffer, 96, L"T%lld.%llu", static_cast<long long>(time.seconds),
                              static_cast<unsigned long long>(time.fraction));
                return buffer;
            }
            api::DateTimeFields f;
            status = bag->GetDateTime(tag, &f);
            if (status) return failed(status);
            std::swprintf(buffer, 96, L"L%04d-%02d-%02d %02d:%02d:%02d", static_cast<int>(f.year),
                          static_cast<int>(f.month), static_cast<int>(f.day), static_cast<int>(f.hour),
                          static_cast<int>(f.minute), static_cast<int>(f.second));
            return buffer;
        }
        default:
            return L"?type " + std::to_wstring(type);
    }
}

/// Every property of a bag by tag, in ValueText form; the tags are walked
/// with the bag's own enumerator, which is released.
inline std::map<api::PropertyTag, std::wstring> ReadBag(api::IkrSysPropertyBag* bag) {
    std::map<api::PropertyTag, std::wstring> values;
    api::IkrSysEnumTags* tags = nullptr;
    EXPECT_EQ(bag->EnumPropertyTags(&tags), 0);
    if (!tags) return values;
    api::PropertyTag tag = 0;
    while (tags->Next(1, &tag, nullptr) == 0) values[tag] = ValueText(bag, tag);
    tags->Release();
    return values;
}

/// Every URI an enumerator delivers, each freed.
inline std::vector<std::wstring> ReadUris(api::IkrSysEnumUris* uris) {
    std::vector<std::wstring> all;
    api::SysString uri = nullptr;
    while (uris->Next(1, &uri, nullptr) == 0) all.push_back(Take(uri));
    return all;
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
    std::filesystem::path StatePath() const { return shared_ / "sim" / "device.state.json"; }

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
