#pragma once
// ComPtr: an intrusive, reference-counted smart pointer for the heap objects of the DOM service
// (node lists, attribute maps, parse errors, schema caches). Dereferencing an empty pointer
// throws _com_error(E_POINTER).

#include <atomic>
#include <cstddef>
#include <utility>

#include "BStr.h"
#include "ComError.h"
#include "Export.h"

namespace kest {

/// Base of every reference-counted platform object; the count is thread-safe.
class KEST_API RefCounted {
  public:
    void AddRef() const noexcept { m_refs.fetch_add(1, std::memory_order_relaxed); }
    void Release() const noexcept {
        if (m_refs.fetch_sub(1, std::memory_order_acq_rel) == 1) delete this;
    }
    /// Number of platform objects alive in this process (for leak checks in tests).
    static long LiveObjects() noexcept;

  protected:
    RefCounted() noexcept;
    RefCounted(const RefCounted&) = delete;
    RefCounted& operator=(const RefCounted&) = delete;
    virtual ~RefCounted();

  private:
    mutable std::atomic<long> m_refs{0};
};

template <class T>
class ComPtr {
  public:
    ComPtr() noexcept = default;
    ComPtr(std::nullptr_t) noexcept {}
    /// Takes a new reference to `object`.
    explicit ComPtr(T* object) noexcept : m_p(object) {
        if (m_p) m_p->AddRef();
    }
    ComPtr(const ComPtr& other) noexcept : ComPtr(other.m_p) {}
    ComPtr(ComPtr&& other) noexcept : m_p(std::exchange(other.m_p, nullptr)) {}
    ~ComPtr() { Release(); }
    ComPtr& operator=(ComPtr other) noexcept {
        std::swap(m_p, other.m_p);
        return *this;
    }
    ComPtr& operator=(std::nullptr_t) noexcept {
        Release();
        return *this;
    }

    /// Throws _com_error(E_POINTER) when empty.
    T* operator->() const {
        if (!m_p) throw _com_error(E_POINTER);
        return m_p;
    }
    T& operator*() const { return *operator->(); }
    T* GetInterfacePtr() const noexcept { return m_p; }
    explicit operator bool() const noexcept { return m_p != nullptr; }
    bool operator!() const noexcept { return m_p == nullptr; }
    bool operator==(const ComPtr& other) const noexcept { return m_p == other.m_p; }
    bool operator!=(const ComPtr& other) const noexcept { return m_p != other.m_p; }
    bool operator==(std::nullptr_t) const noexcept { return m_p == nullptr; }
    bool operator!=(std::nullptr_t) const noexcept { return m_p != nullptr; }
    void Release() noexcept {
        if (m_p) std::exchange(m_p, nullptr)->Release();
    }
    /// Creates the object registered under a ProgID or class id; the failure code otherwise.
    HRESULT CreateInstance(const OLECHAR* progId) noexcept {
        T* object = nullptr;
        HRESULT hr = T::CreateInstance(progId, &object);
        if (SUCCEEDED(hr)) *this = ComPtr(object);
        return hr;
    }

  private:
    T* m_p = nullptr;
};

}  // namespace kest
