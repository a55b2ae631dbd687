// Opens a shared library by path and resolves symbols in it.
#pragma once

#include "foundation/StringBase.h"

namespace qel::fnd::osdep {

/// One reference to a shared library opened with `dlopen`. Each object owns
/// its handle: a copy opens the library again, which the dynamic loader counts
/// as one more reference. Used by one thread at a time.
class SharedLibrary {
public:
    /// No path and no handle; closes on destruction once loaded.
    SharedLibrary();
    /// Derives the platform file name from `path` and loads it at once. A
    /// library that cannot be opened is not reported: the object then has no
    /// handle. Narrow text is widened with the process code set.
    explicit SharedLibrary(const WString& path, bool unloadOnDestroy = true);
    explicit SharedLibrary(const NString& path, bool unloadOnDestroy = true);
    /// Takes the path and unloadOnDestroy; loads only when `other` is loaded.
    SharedLibrary(const SharedLibrary& other);
    SharedLibrary& operator=(const SharedLibrary& other);
    /// Unloads when unloadOnDestroy is set; otherwise the library stays open
    /// for the rest of the process.
    virtual ~SharedLibrary();

    /// Closes the handle, if any.
    virtual void Unload();
    /// Opens the stored path (nothing when it is empty), binding every symbol
    /// now and making them visible to libraries loaded later. A failure leaves
    /// the object without a handle.
    virtual void Load();
    /// Stores the platform file name of `path` and loads it. An object that
    /// has a path already throws exception::InvalidOperation.
    void Load(const WString& path);

    void Swap(SharedLibrary& other) noexcept;
    bool IsLoaded() const noexcept { return handle_ != nullptr; }

    /// The address of `name`. A missing symbol, or an object without a handle,
    /// gives null when `optional` is set and otherwise throws PosixError whose
    /// message is the loader's error text and whose error number is 0.
    void* GetSymbol(const NString& name, bool optional = false) const;
    /// The same with the name narrowed through the process code set.
    void* GetSymbol(const WString& name, bool optional = false) const;

    /// The file the loader is asked for: a last component without a "." is
    /// taken for a bare library name and becomes "lib" + name + ".so" in the
    /// same directory ("x/webhost_runtime" gives "x/libwebhost_runtime.so");
    /// any other path, an empty one or one ending in "/", is used unchanged.
    static WString PlatformFileName(const WString& path);

private:
    WString path_;
    void* handle_ = nullptr;
    bool unloadOnDestroy_ = true;
};

}  // namespace qel::fnd::osdep
