// The service's own component objects: the reference-counting scheme they
// share, and the uploaded firmware image handed to the framework.
#pragma once

#include <cstdint>
#include <memory>

#include "api/Framework.h"

namespace qel::api {

/// Threading policy of the service's component objects: the count is a plain
/// word, changed only under fnd::ComObjectCountMutex().
class CQelComMultiThreadModelNoCS {};

/// Holds the reference count. Reaching the largest count, or releasing an
/// object with none, is a broken reference discipline somewhere in the
/// process; it aborts rather than free an object still in use.
template <typename ThreadModel>
class CQelComObjectRootEx {
protected:
    CQelComObjectRootEx() = default;
    virtual ~CQelComObjectRootEx() = default;
    uint32_t InternalAddRef();
    /// The new count; 0 means the caller destroys the object.
    uint32_t InternalRelease();

private:
    uint32_t refCount_ = 0;
};

extern template class CQelComObjectRootEx<CQelComMultiThreadModelNoCS>;

/// The instantiable form of a component class T, which supplies
/// `static void* FindInterface(T*, const Guid&)` (null for an unknown
/// identifier). Created with a count of 0: the creator takes the first
/// reference.
template <typename T>
class CQelComObject final : public T {
public:
    /// 0 and a new object, or kStatusOutOfMemory and null.
    static int32_t CreateInstance(CQelComObject** out);

    int32_t QueryInterface(const Guid& iid, void** out) override;
    uint32_t AddRef() override { return this->InternalAddRef(); }
    uint32_t Release() override;

private:
    CQelComObject() = default;
    ~CQelComObject() override = default;
};

/// An uploaded firmware image held in memory: one byte buffer, read by the
/// framework through IkrSysBinaryImage.
class CkrSysBinaryImage : public IkrSysBinaryImage,
                          public virtual CQelComObjectRootEx<CQelComMultiThreadModelNoCS> {
public:
    int32_t GetSize(uint32_t* size) override;
    /// Null while no buffer was ever allocated.
    int32_t GetData(const uint8_t** data) override;

    /// A buffer of `capacity` bytes for the content to be written into;
    /// throws std::bad_alloc. The size stays 0 until SetSize.
    uint8_t* Allocate(uint32_t capacity);
    /// The number of bytes written into the buffer (at most its capacity).
    void SetSize(uint32_t size);

    static void* FindInterface(CkrSysBinaryImage* self, const Guid& iid);

protected:
    CkrSysBinaryImage() = default;
    ~CkrSysBinaryImage() override = default;

private:
    std::unique_ptr<uint8_t[]> data_;
    uint32_t capacity_ = 0;
    uint32_t size_ = 0;
};

using BinaryImageObject = CQelComObject<CkrSysBinaryImage>;
extern template class CQelComObject<CkrSysBinaryImage>;

}  // namespace qel::api
