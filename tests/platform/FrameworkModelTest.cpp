// Where the framework stand-in finds its device model, and what it answers
// for a model that is missing or not what it should be.
#include <gtest/gtest.h>

#include <dlfcn.h>
#include <sys/stat.h>
#include <unistd.h>

#include "FrameworkTestSupport.h"

namespace qel::sim::test {
namespace {

constexpr int32_t kMissing = static_cast<int32_t>(0x80070002u);
constexpr int32_t kInvalid = static_cast<int32_t>(0x8007000Du);
constexpr int32_t kDenied = static_cast<int32_t>(0x80070005u);

const std::string kGood = ExpertJson("Motion", "Motion Control", "2.1.0", "{01234567-89AB-CDEF-0123-456789ABCDEF}");

class FrameworkModel : public SimDevice {};

TEST_F(FrameworkModel, MissingModelIsFileNotFound) {
    EXPECT_EQ(FailedInstantiation(), kMissing);
    std::filesystem::create_directories(shared_ / "sim");
    EXPECT_EQ(FailedInstantiation(), kMissing);
    setenv("QELSHAREDDIR", (shared_ / "absent").c_str(), 1);
    EXPECT_EQ(FailedInstantiation(), kMissing);
}

/// A one-expert model whose members carry the given JSON values; an empty
/// value leaves its member out.
std::string ModelWithMembers(std::string_view name, std::string_view display, std::string_view version,
                             std::string_view id) {
    std::string expert;
    auto add = [&](const char* key, std::string_view value) {
        if (value.empty()) return;
        expert.append(expert.empty() ? "{" : ", ").append("\"").append(key).append("\": ").append(value);
    };
    add("programmaticName", name);
    add("displayName", display);
    add("version", version);
    add("productId", id);
    return "{\"experts\": [" + expert + "}]}";
}

TEST_F(FrameworkModel, MalformedDocumentsAreInvalidData) {
    struct {
        const char* what;
        std::string content;
    } cases[] = {
        {"empty file", ""},
        {"not JSON", "experts: none"},
        {"text after the document", "{\"experts\": []} x"},
        {"top level is an array", "[" + kGood + "]"},
        {"experts missing", R"({"items": []})"},
        {"experts not an array", "{\"experts\": " + kGood + "}"},
        {"expert not an object", R"({"experts": ["Motion"]})"},
        {"second expert bad", "{\"experts\": [" + kGood + ", 3]}"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.what);
        ASSERT_NO_FATAL_FAILURE(WriteModel(c.content));
        EXPECT_EQ(FailedInstantiation(), kInvalid);
    }
}

TEST_F(FrameworkModel, MalformedExpertsAreInvalidData) {
    const std::string_view id = R"("{01234567-89AB-CDEF-0123-456789ABCDEF}")";
    struct {
        const char* what;
        std::string_view name, display, version, id;
    } cases[] = {
        {"programmaticName missing", "", R"("D")", R"("V")", id},
        {"displayName a number", R"("P")", "5", R"("V")", id},
        {"version null", R"("P")", R"("D")", "null", id},
        {"productId missing", R"("P")", R"("D")", R"("V")", ""},
        {"productId a number", R"("P")", R"("D")", R"("V")", "1"},
        {"productId without braces", R"("P")", R"("D")", R"("V")", R"("01234567-89AB-CDEF-0123-456789ABCDEF")"},
        {"productId not hexadecimal", R"("P")", R"("D")", R"("V")", R"("{0123456G-89AB-CDEF-0123-456789ABCDEF}")"},
        {"productId separator moved", R"("P")", R"("D")", R"("V")", R"("{0123456-789AB-CDEF-0123-456789ABCDEF}")"},
        {"invalid UTF-8 byte", R"("P")", "\"\xFF\"", R"("V")", id},
        {"overlong UTF-8", "\"P\xC0\xAF\"", R"("D")", R"("V")", id},
        {"lone surrogate escape", R"("\ud800")", R"("D")", R"("V")", id},
    };
    // The same builder with good values must give a model that loads.
    ASSERT_NO_FATAL_FAILURE(WriteModel(ModelWithMembers(R"("P")", R"("D")", R"("V")", id)));
    Ref<api::IkrSysFramework> framework;
    ASSERT_NO_FATAL_FAILURE(Instantiate(framework));
    for (const auto& c : cases) {
        SCOPED_TRACE(c.what);
        ASSERT_NO_FATAL_FAILURE(WriteModel(ModelWithMembers(c.name, c.display, c.version, c.id)));
        EXPECT_EQ(FailedInstantiation(), kInvalid);
    }
}

TEST_F(FrameworkModel, DirectoryInPlaceOfTheModelIsInvalidData) {
    std::filesystem::create_directories(ModelPath());
    EXPECT_EQ(FailedInstantiation(), kInvalid);
}

TEST_F(FrameworkModel, UnreadableModelIsAccessDenied) {
    if (geteuid() == 0) GTEST_SKIP() << "file permissions do not bind the superuser";
    ASSERT_NO_FATAL_FAILURE(WriteExperts({kGood}));
    ASSERT_EQ(chmod(ModelPath().c_str(), 0), 0);
    EXPECT_EQ(FailedInstantiation(), kDenied);
}

TEST_F(FrameworkModel, UnknownKeysAreIgnored) {
    ASSERT_NO_FATAL_FAILURE(WriteModel(
        R"({"vendor": {"x": 1}, "experts": [{"vendor": [1, 2], "programmaticName": "P", "displayName": "D",)"
        R"( "version": "V", "productId": "{01234567-89ab-cdef-0123-456789abcdef}", "extra": null}], "items": []})"));
    Ref<api::IkrSysFramework> framework;
    ASSERT_NO_FATAL_FAILURE(Instantiate(framework));
    std::vector<ExpertTexts> experts = ListExperts(framework.Get());
    ASSERT_EQ(experts.size(), 1u);
    EXPECT_EQ(experts[0].programmaticName, L"P");
    EXPECT_EQ(experts[0].productId.Data1, 0x01234567u);
    EXPECT_EQ(experts[0].productId.Data4[7], 0xEFu);
}

TEST_F(FrameworkModel, EachInstantiationReadsTheModelAnew) {
    ASSERT_NO_FATAL_FAILURE(WriteExperts({kGood}));
    Ref<api::IkrSysFramework> before;
    ASSERT_NO_FATAL_FAILURE(Instantiate(before));
    ASSERT_NO_FATAL_FAILURE(
        WriteExperts({ExpertJson("Other", "D", "V", "{01234567-89AB-CDEF-0123-456789ABCDEF}"), kGood}));
    Ref<api::IkrSysFramework> after;
    ASSERT_NO_FATAL_FAILURE(Instantiate(after));

    std::vector<ExpertTexts> old = ListExperts(before.Get()), fresh = ListExperts(after.Get());
    ASSERT_EQ(old.size(), 1u);
    EXPECT_EQ(old[0].programmaticName, L"Motion");
    ASSERT_EQ(fresh.size(), 2u);
    EXPECT_EQ(fresh[0].programmaticName, L"Other");
}

// A relative variable does not name the directory: the device falls back to
// its default and does not consult its configuration file either.
TEST_F(FrameworkModel, RelativeSharedDirectoryVariableIsIgnored) {
    if (std::filesystem::exists("/etc/morvane/share/share.dir") ||
        std::filesystem::exists("/usr/local/morvane/share/sim/device.json"))
        GTEST_SKIP() << "this machine has a shared data directory of its own";
    ASSERT_NO_FATAL_FAILURE(WriteExperts({kGood}));
    char* cwd = getcwd(nullptr, 0);
    ASSERT_NE(cwd, nullptr);
    ASSERT_EQ(chdir(shared_.parent_path().c_str()), 0);
    setenv("QELSHAREDDIR", shared_.filename().c_str(), 1);
    int32_t status = FailedInstantiation();
    EXPECT_EQ(chdir(cwd), 0);
    free(cwd);
    EXPECT_EQ(status, kMissing);
}

// The plug-in links its own copy of the foundation; the framework must export
// only its entry points so that neither binds to the other's internals.
TEST(FrameworkLibrary, ExportsOnlyItsEntryPoints) {
#ifndef QEL_FRAMEWORK_LIB
    GTEST_SKIP() << "the library's path was not given to this build";
#else
    void* library = dlopen(QEL_FRAMEWORK_LIB, RTLD_NOW | RTLD_LOCAL);
    ASSERT_NE(library, nullptr) << dlerror();
    EXPECT_EQ(dlsym(library, "qelsysInstantiateFramework"), reinterpret_cast<void*>(&qelsysInstantiateFramework));
    EXPECT_EQ(dlsym(library, "qelsysSimLiveObjects"), reinterpret_cast<void*>(&qelsysSimLiveObjects));
    // qel::fnd::Utf8ToWide(const char*, uint32_t) and qel::sim::LiveObjects(),
    // both inside the library.
    EXPECT_EQ(dlsym(library, "_ZN3qel3fnd10Utf8ToWideEPKcj"), nullptr);
    EXPECT_EQ(dlsym(library, "_ZN3qel3sim11LiveObjectsEv"), nullptr);
    dlclose(library);
#endif
}

}  // namespace
}  // namespace qel::sim::test
