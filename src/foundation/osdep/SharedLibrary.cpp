// Opens a shared library by path and resolves symbols in it.
#include "foundation/osdep/SharedLibrary.h"

#include <dlfcn.h>
#include <utility>

#include "foundation/Exception.h"
#include "foundation/osdep/IConv.h"
#include "foundation/osdep/path.h"

namespace qel::fnd::osdep {

namespace {

constexpr const char* kModule = "osdep/SharedLibrary";

// dlerror has nothing to say when no loader call failed on this thread since
// it was last read, which is the case for a library that was never opened.
PosixError LoaderError(int32_t line, const char* fallback) {
    const char* text = ::dlerror();
    return PosixError(kModule, line, NString(text ? text : fallback), 0);
}

}  // namespace

SharedLibrary::SharedLibrary() = default;

SharedLibrary::SharedLibrary(const WString& path, bool unloadOnDestroy)
    : path_(PlatformFileName(path)), unloadOnDestroy_(unloadOnDestroy) {
    Load();
}

SharedLibrary::SharedLibrary(const NString& path, bool unloadOnDestroy)
    : SharedLibrary(Widen(path), unloadOnDestroy) {}

SharedLibrary::SharedLibrary(const SharedLibrary& other)
    : path_(other.path_), unloadOnDestroy_(other.unloadOnDestroy_) {
    if (other.IsLoaded()) Load();
}

SharedLibrary& SharedLibrary::operator=(const SharedLibrary& other) {
    // The old state goes with the temporary, after the new one is in place.
    SharedLibrary copy(other);
    Swap(copy);
    return *this;
}

SharedLibrary::~SharedLibrary() {
    if (unloadOnDestroy_) Unload();
}

void SharedLibrary::Unload() {
    if (handle_ == nullptr) return;
    ::dlclose(handle_);
    handle_ = nullptr;
}

void SharedLibrary::Load() {
    if (path_.IsEmpty()) return;
    handle_ = ::dlopen(Narrow(path_).CStr(), RTLD_NOW | RTLD_GLOBAL);
}

void SharedLibrary::Load(const WString& path) {
    if (!path_.IsEmpty()) throw exception::InvalidOperation(kModule, 755);
    path_ = PlatformFileName(path);
    Load();
}

void SharedLibrary::Swap(SharedLibrary& other) noexcept {
    path_.Swap(other.path_);
    std::swap(handle_, other.handle_);
    std::swap(unloadOnDestroy_, other.unloadOnDestroy_);
}

void* SharedLibrary::GetSymbol(const NString& name, bool optional) const {
    if (handle_ == nullptr) {
        if (optional) return nullptr;
        throw LoaderError(477, "shared library not loaded");
    }
    ::dlerror();  // so that the text read below belongs to this lookup
    void* symbol = ::dlsym(handle_, name.CStr());
    if (symbol != nullptr || optional) return symbol;
    // A symbol whose value is null is found all the same: dlerror stays quiet.
    const char* text = ::dlerror();
    if (text == nullptr) return nullptr;
    throw PosixError(kModule, 483, NString(text), 0);
}

void* SharedLibrary::GetSymbol(const WString& name, bool optional) const {
    return GetSymbol(Narrow(name), optional);
}

WString SharedLibrary::PlatformFileName(const WString& path) {
    if (path.IsEmpty()) return path;
    WString name = FileName(path);
    if (name.IsEmpty() || name.Find(L'.') != WString::npos) return path;
    WString file = WString(L"lib") + name + L".so";
    WString parent = ParentDirectory(path);
    return parent.IsEmpty() ? file : JoinPath(parent, file);
}

}  // namespace qel::fnd::osdep
