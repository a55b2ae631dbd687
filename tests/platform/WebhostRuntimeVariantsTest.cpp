// Tests of the runtime builds as the plug-in finds them: loaded by path, with
// optional entry points looked up by name.
#include <gtest/gtest.h>

#include <dlfcn.h>

#include <cstdlib>
#include <filesystem>
#include <memory>
#include <ostream>
#include <set>
#include <string>

#include "Request.h"
#include "service/WebhostRuntime.h"

namespace qel::webhost {
namespace {

const char* const kOptional[] = {
    "GetEncryptKey_C_REST_QEL_QLWS_",           "Decrypt_C_REST_QEL_QLWS_",
    "ReadAllFormDataWithMime_C_REST_QEL_QLWS_", "KeyValueWithMimeGetFirst_C_REST_QEL_QLWS_",
    "KeyValueWithMimeGetNext_C_REST_QEL_QLWS_", "KeyValueWithMimeGetKey_C_REST_QEL_QLWS_",
    "KeyValueWithMimeGetValue_C_REST_QEL_QLWS_", "FreeKeyValuePairWithMimeList_C_REST_QEL_QLWS_"};
const char* const kRequired[] = {"ReadRequestVariable_C_REST_QEL_QLWS_", "SetHTTPResponseMimeType_C_REST_QEL_QLWS_",
                                 "WriteOutput_C_REST_QEL_QLWS_", "ReadAllFormData_C_REST_QEL_QLWS_",
                                 "ReadUploadedFilesList_C_REST_QEL_QLWS_"};

struct Closer {
    void operator()(void* handle) const noexcept { dlclose(handle); }
};
using Library = std::unique_ptr<void, Closer>;

Library Open(const char* path) {
    Library library(dlopen(path, RTLD_NOW | RTLD_LOCAL));
    EXPECT_TRUE(library) << path << ": " << dlerror();
    return library;
}

struct Build {
    const char* path;
    bool isVariant;
    std::set<std::string> optional;
};

// Names the build in failure messages instead of dumping its bytes.
void PrintTo(const Build& build, std::ostream* out) { *out << build.path; }

std::set<std::string> AllOptional() { return {std::begin(kOptional), std::end(kOptional)}; }

class WebhostRuntimeVariants : public testing::TestWithParam<Build> {};

TEST_P(WebhostRuntimeVariants, ExportsExactlyItsOptionalEntryPoints) {
    const Build& build = GetParam();
    Library library = Open(build.path);
    ASSERT_TRUE(library);
    for (const char* name : kRequired) {
        EXPECT_NE(dlsym(library.get(), name), nullptr) << name;
    }
    std::set<std::string> found;
    for (const char* name : kOptional) {
        if (dlsym(library.get(), name)) found.insert(name);
    }
    EXPECT_EQ(found, build.optional);
    // The plug-in opens "libwebhost_runtime" from a directory it is given.
    if (build.isVariant) {
        EXPECT_EQ(std::filesystem::path(build.path).filename(), "libwebhost_runtime.so");
    }
}

// The plug-in closes the runtime as soon as it has looked up the optional
// entry points, and calls them for every request after that.
TEST_P(WebhostRuntimeVariants, StaysMappedAfterClose) {
    const Build& build = GetParam();
    Library library = Open(build.path);
    ASSERT_TRUE(library);
    auto read = reinterpret_cast<decltype(&ReadRequestVariable_C_REST_QEL_QLWS_)>(
        dlsym(library.get(), "ReadRequestVariable_C_REST_QEL_QLWS_"));
    ASSERT_NE(read, nullptr);
    library.reset();
    Library again(dlopen(build.path, RTLD_NOW | RTLD_NOLOAD));
    ASSERT_TRUE(again) << "unloaded by dlclose";

    Request request("GET");
    char buffer[32];
    uint32_t size = sizeof buffer;
    EXPECT_EQ(read(&request, "REQUEST_METHOD", buffer, &size), 0);
    EXPECT_STREQ(buffer, "GET");
}

// A variant serves a request object built here: same layout on both sides.
TEST_P(WebhostRuntimeVariants, ServesRequestsThroughItsOwnEntryPoints) {
    const Build& build = GetParam();
    Library library = Open(build.path);
    ASSERT_TRUE(library);
    Request request("POST");
    request.SetEncryptKey(EncryptKey{0x42});

    auto read = reinterpret_cast<decltype(&ReadRequestVariable_C_REST_QEL_QLWS_)>(
        dlsym(library.get(), "ReadRequestVariable_C_REST_QEL_QLWS_"));
    ASSERT_NE(read, nullptr);
    char buffer[32];
    uint32_t size = sizeof buffer;
    EXPECT_EQ(read(&request, "REQUEST_METHOD", buffer, &size), 0);
    EXPECT_STREQ(buffer, "POST");

    auto getKey = reinterpret_cast<GetEncryptKeyFn>(dlsym(library.get(), "GetEncryptKey_C_REST_QEL_QLWS_"));
    if (!getKey) return;
    uint8_t* key = nullptr;
    uint32_t length = 0;
    ASSERT_EQ(getKey(&request, &key, &length), 0);
    ASSERT_EQ(length, kEncryptKeyLength);
    EXPECT_EQ(key[0], 0x42);
    std::free(key);
    EXPECT_EQ(request.Calls().getEncryptKey, 1u);
}

const Build kBuilds[] = {
    {QEL_RUNTIME_LIB, false, AllOptional()},
    {QEL_RUNTIME_VARIANT_ALL, true, AllOptional()},
    {QEL_RUNTIME_VARIANT_NONE, true, {}},
    {QEL_RUNTIME_VARIANT_ENCRYPT_KEY_ONLY, true, {"GetEncryptKey_C_REST_QEL_QLWS_"}},
    {QEL_RUNTIME_VARIANT_NO_MIME, true, {"GetEncryptKey_C_REST_QEL_QLWS_", "Decrypt_C_REST_QEL_QLWS_"}},
};
const char* const kBuildNames[] = {"Runtime", "All", "None", "EncryptKeyOnly", "NoMime"};

INSTANTIATE_TEST_SUITE_P(Builds, WebhostRuntimeVariants, testing::ValuesIn(kBuilds),
                         [](const testing::TestParamInfo<Build>& info) { return kBuildNames[info.index]; });

}  // namespace
}  // namespace qel::webhost
