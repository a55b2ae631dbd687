// Owns one reference to a component interface and releases it on every path.
#pragma once

#include <utility>

namespace qel::api {

template <typename T>
class ComPtr {
public:
    ComPtr() = default;
    /// Takes over a reference the caller already holds (an out parameter).
    explicit ComPtr(T* p) : p_(p) {}
    ~ComPtr() { Reset(); }
    ComPtr(const ComPtr&) = delete;
    ComPtr& operator=(const ComPtr&) = delete;
    ComPtr(ComPtr&& other) noexcept : p_(std::exchange(other.p_, nullptr)) {}
    ComPtr& operator=(ComPtr&& other) noexcept {
        if (this != &other) {
            Reset();
            p_ = std::exchange(other.p_, nullptr);
        }
        return *this;
    }

    void Reset() {
        if (p_) std::exchange(p_, nullptr)->Release();
    }
    /// For an out parameter: releases what was held first.
    T** Out() {
        Reset();
        return &p_;
    }
    void** OutVoid() { return reinterpret_cast<void**>(Out()); }
    T* Get() const { return p_; }
    T* operator->() const { return p_; }
    explicit operator bool() const { return p_ != nullptr; }

private:
    T* p_ = nullptr;
};

}  // namespace qel::api
