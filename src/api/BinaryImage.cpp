// Reference counting of the service's component objects and the firmware
// image object.
#include "api/BinaryImage.h"

#include <cstdlib>
#include <limits>
#include <new>

#include "foundation/QelMutex.h"
#include "foundation/Status.h"

namespace qel::api {

template <typename ThreadModel>
uint32_t CQelComObjectRootEx<ThreadModel>::InternalAddRef() {
    fnd::CQelMutexLock lock(fnd::ComObjectCountMutex());
    if (refCount_ == std::numeric_limits<uint32_t>::max()) std::abort();
    return ++refCount_;
}

template <typename ThreadModel>
uint32_t CQelComObjectRootEx<ThreadModel>::InternalRelease() {
    fnd::CQelMutexLock lock(fnd::ComObjectCountMutex());
    if (refCount_ < 1) std::abort();
    return --refCount_;
}

template class CQelComObjectRootEx<CQelComMultiThreadModelNoCS>;

template <typename T>
int32_t CQelComObject<T>::CreateInstance(CQelComObject** out) {
    *out = new (std::nothrow) CQelComObject();
    return *out ? fnd::kStatusOk : fnd::kStatusOutOfMemory;
}

template <typename T>
int32_t CQelComObject<T>::QueryInterface(const Guid& iid, void** out) {
    // A caller without a place for the answer cannot be told anything, and
    // a reference handed nowhere would leak the object.
    if (!out) std::abort();
    *out = T::FindInterface(this, iid);
    if (!*out) return fnd::kStatusNoInterface;
    AddRef();
    return fnd::kStatusOk;
}

template <typename T>
uint32_t CQelComObject<T>::Release() {
    const uint32_t count = this->InternalRelease();
    if (count == 0) delete this;
    return count;
}

void* CkrSysBinaryImage::FindInterface(CkrSysBinaryImage* self, const Guid& iid) {
    if (iid == kIID_IkrSysBinaryImage || iid == kIID_IUnknown) return static_cast<IkrSysBinaryImage*>(self);
    return nullptr;
}

int32_t CkrSysBinaryImage::GetSize(uint32_t* size) {
    if (!size) return fnd::kStatusPointer;
    *size = size_;
    return fnd::kStatusOk;
}

int32_t CkrSysBinaryImage::GetData(const uint8_t** data) {
    if (!data) return fnd::kStatusPointer;
    *data = data_.get();
    return fnd::kStatusOk;
}

uint8_t* CkrSysBinaryImage::Allocate(uint32_t capacity) {
    data_.reset(new uint8_t[capacity]);
    capacity_ = capacity;
    size_ = 0;
    return data_.get();
}

void CkrSysBinaryImage::SetSize(uint32_t size) { size_ = size <= capacity_ ? size : capacity_; }

template class CQelComObject<CkrSysBinaryImage>;

}  // namespace qel::api
