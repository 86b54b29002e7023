#pragma once
// Shared ownership of the child arrays and objects of a calibration tree.
//
// Copies of a tree share their children: copying a parent copies the child pointer. The library
// keeps a share of every array or object it allocated (readers, Create* functions) beside the
// pointer, so the last copy that refers to it frees it. A pointer a host hands to a setter stays
// the host's, unless the library allocated it, in which case the new holder takes a share too.

#include <memory>
#include <new>

namespace kest {
namespace detail {

/// The share of a library allocation that starts at `p`, or an empty one when the library did
/// not allocate it (or it is already gone).
std::shared_ptr<void> FindLibraryAllocation(const void* p);
void RegisterLibraryAllocation(const void* p, const std::weak_ptr<void>& owner);
void UnregisterLibraryAllocation(const void* p) noexcept;

template <class T>
class SharedChild {
public:
    T* get() const noexcept { return m_ptr; }

    /// Allocates `count` default-constructed objects and holds them; the previous array is
    /// dropped (freed when no other copy refers to it). A negative count throws std::bad_alloc.
    T* AllocateArray(int count) {
        if (count < 0) throw std::bad_array_new_length();
        T* array = new T[static_cast<std::size_t>(count)];
        Adopt(array, [](T* p) {
            UnregisterLibraryAllocation(p);
            delete[] p;
        });
        return array;
    }

    /// Allocates one default-constructed object and holds it.
    T* AllocateObject() {
        T* object = new T();
        Adopt(object, [](T* p) {
            UnregisterLibraryAllocation(p);
            delete p;
        });
        return object;
    }

    /// Stores a pointer given by a host: shared when the library allocated it, else borrowed.
    void Set(T* p) {
        if (p == m_ptr) return;
        m_owner = p ? FindLibraryAllocation(p) : std::shared_ptr<void>();
        m_ptr = p;
    }

private:
    template <class Deleter>
    void Adopt(T* p, Deleter deleter) {
        std::shared_ptr<T> owner;
        try {
            owner = std::shared_ptr<T>(p, deleter);
        } catch (...) {
            // shared_ptr already ran the deleter on failure.
            throw;
        }
        RegisterLibraryAllocation(p, owner);
        m_owner = std::move(owner);
        m_ptr = p;
    }

    T* m_ptr = nullptr;
    std::shared_ptr<void> m_owner;
};

}  // namespace detail
}  // namespace kest
