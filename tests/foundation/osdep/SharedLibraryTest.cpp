// Loading shared libraries: symbol lookup, failures, the platform file name,
// and which objects keep a library open.
#include "foundation/osdep/SharedLibrary.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <optional>
#include <string>
#include <dlfcn.h>
#include <stdlib.h>

#include "foundation/Exception.h"
#include "foundation/FoundationTestSupport.h"

namespace qel::fnd::osdep {
namespace {

using testing::S;
using testing::TempDir;
using testing::ThrownBy;
using testing::W;

using MathFunction = double (*)(double);




// The absolute path of the maths library, which every C++ program has loaded.
std::string MathLibrary() {
    void* handle = ::dlopen("libm.so.6", RTLD_NOW | RTLD_NOLOAD);
    Dl_info info{};
    void* cosine = handle ? ::dlsym(handle, "cos") : nullptr;
    std::string path = cosine && ::dladdr(cosine, &info) && info.dli_fname ? info.dli_fname : "/missing/libm";
    if (handle) ::dlclose(handle);
    return path;
}

// A private copy of the maths library: nothing else holds it open, so whether
// it is still loaded shows exactly which references remain.
std::string PrivateCopy(const TempDir& dir, const std::string& name) {
    std::filesystem::copy_file(MathLibrary(), dir / name);
    return dir / name;
}

bool StillLoaded(const std::string& path) {
    void* handle = ::dlopen(path.c_str(), RTLD_NOW | RTLD_NOLOAD);
    if (handle) ::dlclose(handle);
    return handle != nullptr;
}

double Cosine(const SharedLibrary& library, double x) {
    return reinterpret_cast<MathFunction>(library.GetSymbol(NString("cos")))(x);
}

TEST(SharedLibrary, ResolvesSymbolsInItsOwnLibraryByNarrowOrWideName) {
    TempDir dir;
    SharedLibrary math(NString(MathLibrary().c_str()));
    SharedLibrary copy(W(PrivateCopy(dir, "libmcopy.so")));
    ASSERT_TRUE(math.IsLoaded());
    void* cosine = math.GetSymbol(NString("cos"));
    EXPECT_EQ(cosine, ::dlsym(RTLD_DEFAULT, "cos"));
    EXPECT_EQ(math.GetSymbol(WString(L"cos")), cosine);
    EXPECT_NE(copy.GetSymbol(WString(L"cos")), cosine);
    EXPECT_EQ(Cosine(copy, 0.0), 1.0);
}

TEST(SharedLibrary, MissingSymbolOrLibraryIsNullWhenOptionalElsePosixError) {
    TempDir dir;
    SharedLibrary math(W(MathLibrary()));
    SharedLibrary missing(W(dir / "libqelmissing.so"));
    SharedLibrary empty;
    empty.Load();
    EXPECT_FALSE(missing.IsLoaded());
    EXPECT_FALSE(empty.IsLoaded());
    struct { const SharedLibrary* library; const wchar_t* name; int32_t line; } cases[] = {
        {&math, L"qel_no_such_symbol", 483}, {&missing, L"cos", 477}, {&empty, L"cos", 477}};
    for (const auto& c : cases) {
        EXPECT_EQ(c.library->GetSymbol(WString(c.name), true), nullptr) << c.line;
        EXPECT_EQ(c.library->GetSymbol(NString(S(c.name).c_str()), true), nullptr) << c.line;
        auto e = ThrownBy<PosixError>([&] { c.library->GetSymbol(WString(c.name)); });
        ASSERT_TRUE(e) << c.line;
        EXPECT_EQ(e->ErrorCode(), 0);
        EXPECT_EQ(e->OSErrorCode(), 0);
        EXPECT_STRNE(e->what(), "");
        EXPECT_STREQ(e->File(), "osdep/SharedLibrary");
        EXPECT_EQ(e->Line(), c.line);
    }
    // The loader's own text, naming what it missed.
    auto e = ThrownBy<PosixError>([&] { math.GetSymbol(NString("qel_no_such_symbol")); });
    ASSERT_TRUE(e);
    EXPECT_NE(std::string(e->what()).find("qel_no_such_symbol"), std::string::npos) << e->what();
}

TEST(SharedLibrary, LoadsThePlatformFileNameOnceOnly) {
    TempDir dir;
    PrivateCopy(dir, "libqelprobe.so");
    EXPECT_TRUE(SharedLibrary(W(dir / "qelprobe")).IsLoaded());
    EXPECT_TRUE(SharedLibrary(NString((dir / "qelprobe").c_str())).IsLoaded());
    SharedLibrary later;
    later.Load(W(dir / "qelprobe"));
    EXPECT_TRUE(later.IsLoaded());
    SharedLibrary failed(W(dir / "libqelmissing.so"));
    for (SharedLibrary* library : {&later, &failed}) {
        auto e = ThrownBy<exception::InvalidOperation>([&] { library->Load(W(MathLibrary())); });
        ASSERT_TRUE(e);
        EXPECT_EQ(e->Line(), 755);
    }
    EXPECT_TRUE(later.IsLoaded());
}

TEST(SharedLibrary, EachObjectHoldsAndReleasesItsOwnReference) {
    TempDir dir;
    const std::string path = PrivateCopy(dir, "libmcopy.so"), other = PrivateCopy(dir, "libother.so");
    {
        SharedLibrary original(W(path));
        { SharedLibrary copy(original); EXPECT_TRUE(copy.IsLoaded()); }
        ASSERT_TRUE(StillLoaded(path)) << "destroying the copy closed the original's handle";
        EXPECT_EQ(Cosine(original, 0.0), 1.0);
        original.Unload();
        EXPECT_FALSE(original.IsLoaded());
        EXPECT_FALSE(StillLoaded(path));
        original.Load();  // the path is kept
        SharedLibrary target(W(other));
        target = original;
        EXPECT_FALSE(StillLoaded(other)) << "assignment kept the old library";
        EXPECT_EQ(Cosine(target, 0.0), 1.0);
    }
    EXPECT_FALSE(StillLoaded(path)) << "a reference leaked";
    // A copy of an object without a handle does not load, even once it could.
    SharedLibrary late(W(dir / "liblate.so"));
    PrivateCopy(dir, "liblate.so");
    SharedLibrary copy(late);
    EXPECT_FALSE(copy.IsLoaded());
}

TEST(SharedLibrary, UnloadOnDestroyFalseLeavesTheLibraryOpenAndSwapsWithIt) {
    TempDir dir;
    const std::string path = PrivateCopy(dir, "libmcopy.so");
    {
        SharedLibrary receiver;
        SharedLibrary giver(W(path), false);
        receiver.Swap(giver);
        EXPECT_FALSE(giver.IsLoaded());
        EXPECT_TRUE(receiver.IsLoaded());
    }
    EXPECT_TRUE(StillLoaded(path));
    while (void* handle = ::dlopen(path.c_str(), RTLD_NOW | RTLD_NOLOAD)) {  // drop what the test left open
        ::dlclose(handle);
        if (::dlclose(handle) != 0) break;
    }
}

TEST(SharedLibrary, PlatformFileNameAddsPrefixAndSuffixToBareNames) {
    struct { const char *path, *file; } cases[] = {
        {"webhost_runtime", "libwebhost_runtime.so"}, {"a/x/webhost_runtime", "a/x/libwebhost_runtime.so"},
        {"/webhost_runtime", "/libwebhost_runtime.so"}, {"/opt/lib.d/runtime", "/opt/lib.d/libruntime.so"},
        {"libfoo.so.1", "libfoo.so.1"}, {"x/y.z", "x/y.z"}, {"/opt/lib/", "/opt/lib/"}, {"", ""},
    };
    for (const auto& c : cases) EXPECT_EQ(S(SharedLibrary::PlatformFileName(W(c.path))), c.file) << c.path;
}

}  // namespace
}  // namespace qel::fnd::osdep
