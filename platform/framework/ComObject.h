// The component-object machinery every object of the simulated framework is
// built on: interface lookup, atomic reference counts, and the status edge.
#pragma once

#include <atomic>
#include <cstdint>
#include <new>
#include <type_traits>

#include "api/Framework.h"
#include "foundation/Exception.h"
#include "foundation/Status.h"

namespace qel::sim {

/// The identifier each interface answers to in QueryInterface.
template <typename Interface>
struct InterfaceId;
template <>
struct InterfaceId<api::IkrSysFramework> {
    static constexpr const fnd::Guid& kId = api::kIID_IkrSysFramework;
};
template <>
struct InterfaceId<api::IkrSysEnumExperts> {
    static constexpr const fnd::Guid& kId = api::kIID_IkrSysEnumExperts;
};
template <>
struct InterfaceId<api::IkrSysExpertInfo> {
    static constexpr const fnd::Guid& kId = api::kIID_IkrSysExpertInfo;
};
template <>
struct InterfaceId<api::IkrSysFirmware> {
    static constexpr const fnd::Guid& kId = api::kIID_IkrSysFirmware;
};
template <>
struct InterfaceId<api::IkrSysDiagnostics> {
    static constexpr const fnd::Guid& kId = api::kIID_IkrSysDiagnostics;
};
template <>
struct InterfaceId<api::IkrSysPropertyBag> {
    static constexpr const fnd::Guid& kId = api::kIID_IkrSysPropertyBag;
};
template <>
struct InterfaceId<api::IkrSysPropertyBagEx> {
    static constexpr const fnd::Guid& kId = api::kIID_IkrSysPropertyBagEx;
};
template <>
struct InterfaceId<api::IkrSysEnumPropertyBags> {
    static constexpr const fnd::Guid& kId = api::kIID_IkrSysEnumPropertyBags;
};
template <>
struct InterfaceId<api::IkrSysEnumUris> {
    static constexpr const fnd::Guid& kId = api::kIID_IkrSysEnumUris;
};
template <>
struct InterfaceId<api::IkrSysEnumTags> {
    static constexpr const fnd::Guid& kId = api::kIID_IkrSysEnumTags;
};

/// Number of framework objects alive in the process, for tests to prove that
/// every object handed out was released exactly once.
int32_t LiveObjects() noexcept;

namespace detail {
/// Counts one live object for as long as it exists.
class LiveObject {
public:
    LiveObject() noexcept;
    ~LiveObject();
    LiveObject(const LiveObject&) = delete;
    LiveObject& operator=(const LiveObject&) = delete;
};

template <typename First, typename...>
struct FirstOf {
    using Type = First;
};
}  // namespace detail

/// Runs the body of an interface method and turns whatever it throws into a
/// status: nothing may unwind into the caller, which may be C code.
template <typename Body>
int32_t Guarded(Body&& body) noexcept {
    try {
        return body();
    } catch (const std::bad_alloc&) {
        return fnd::kStatusOutOfMemory;
    } catch (const fnd::exception::Exception& e) {
        int32_t code = e.ErrorCode();
        return fnd::Failed(code) ? code : fnd::kStatusFail;
    } catch (...) {
        return fnd::kStatusFail;
    }
}

/// Base of every framework object: implements IUnknown for all of
/// `Interfaces`. An object starts with one reference, owned by whoever created
/// it, and deletes itself when the last one is released. The first interface
/// is the object's identity: QueryInterface for IUnknown always answers it.
template <typename... Interfaces>
class ComObject : public Interfaces... {
    static_assert(sizeof...(Interfaces) > 0);
    static_assert((std::is_base_of_v<api::IUnknown, Interfaces> && ...));

public:
    ComObject(const ComObject&) = delete;
    ComObject& operator=(const ComObject&) = delete;

    int32_t QueryInterface(const fnd::Guid& iid, void** out) override {
        if (!out) return fnd::kStatusPointer;
        *out = nullptr;
        void* found = nullptr;
        if (iid == api::kIID_IUnknown) {
            found = static_cast<api::IUnknown*>(static_cast<typename detail::FirstOf<Interfaces...>::Type*>(this));
        } else {
            auto match = [&]<typename I>(I* self) {
                if (!found && iid == InterfaceId<I>::kId) found = self;
            };
            (match(static_cast<Interfaces*>(this)), ...);
        }
        if (!found) return fnd::kStatusNoInterface;
        AddRef();
        *out = found;
        return fnd::kStatusOk;
    }

    uint32_t AddRef() override { return refs_.fetch_add(1, std::memory_order_relaxed) + 1; }

    uint32_t Release() override {
        // acq_rel: whatever another thread did to the object before its own
        // Release happens before the destructor runs here.
        uint32_t left = refs_.fetch_sub(1, std::memory_order_acq_rel) - 1;
        if (left == 0) delete this;
        return left;
    }

protected:
    ComObject() = default;
    virtual ~ComObject() = default;

private:
    std::atomic<uint32_t> refs_{1};
    detail::LiveObject live_;
};

/// Returns a copy of `text` as a SysString through `out`, which the caller
/// frees; a null `out` gives kStatusPointer.
int32_t HandOutText(const fnd::WString& text, api::SysString* out) noexcept;

}  // namespace qel::sim
