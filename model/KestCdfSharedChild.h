#pragma once
// KestCdfSharedChild: how a calibration class holds a child array or child object. The model
// classes hold their children this way; hosts reach them through the getters and setters only.
//
// Copies of a tree share their children: copying a parent copies the child pointer. The library
// keeps a share of every array or object it allocated (readers, Create* functions) beside the
// pointer, so the last copy that refers to it frees it. A pointer a host hands to a setter stays
// the host's, unless the library allocated it, in which case the new holder takes a share too.
//
// To know a library pointer when it comes back through a setter, the allocation is entered in a
// process-wide registry, but only once the pointer has left the library (a getter or a Create*
// function handed it out): pointers that never escape cost no registry work.

#include <atomic>
#include <memory>
#include <new>

#include "../platform/ComError.h"
#include "../platform/Export.h"
#include "../platform/HResult.h"

namespace kest {

/// One library allocation; frees it (and leaves the registry) when the last share goes.
class KEST_API KestCdfSharedAllocation {
  public:
    virtual ~KestCdfSharedAllocation();
    const void* Address() const noexcept { return m_address; }
    /// Number of objects allocated.
    std::size_t Length() const noexcept { return m_length; }
    /// Enters the allocation in the registry once, so a setter can find it.
    void Publish(const std::shared_ptr<KestCdfSharedAllocation>& self);
    /// The share of a published library allocation that starts at `p`, or an empty one when
    /// the library did not hand it out (or it is already gone).
    static std::shared_ptr<KestCdfSharedAllocation> Find(const void* p);

  protected:
    KestCdfSharedAllocation(const void* address, std::size_t length) noexcept
        : m_address(address), m_length(length) {}

  private:
    const void* m_address;
    std::size_t m_length;
    std::atomic<bool> m_published{false};
};

/// A library allocation of an array (IsArray) or of one object of T.
template <class T, bool IsArray>
class KestCdfTypedAllocation final : public KestCdfSharedAllocation {
  public:
    KestCdfTypedAllocation(T* p, std::size_t length) noexcept
        : KestCdfSharedAllocation(p, length), m_p(p) {}
    ~KestCdfTypedAllocation() override {
        if (IsArray)
            delete[] m_p;
        else
            delete m_p;
    }

  private:
    T* m_p;
};

/// A child pointer with the share that keeps a library allocation alive.
template <class T>
class KestCdfSharedChild {
  public:
    /// The pointer, for the library's own use.
    T* get() const noexcept { return m_ptr; }

    /// The pointer, for handing out to a host: from now on a setter recognises it.
    T* Expose() const {
        if (m_owner) m_owner->Publish(m_owner);
        return m_ptr;
    }

    /// Allocates `count` default-constructed objects and holds them; the previous array is
    /// dropped (freed when no other copy refers to it). A negative count throws
    /// std::bad_array_new_length, the runtime's out-of-memory exception.
    T* AllocateArray(int count) {
        if (count < 0) throw std::bad_array_new_length();
        std::unique_ptr<T[]> array(new T[static_cast<std::size_t>(count)]);
        m_owner = std::make_shared<KestCdfTypedAllocation<T, true>>(
            array.get(), static_cast<std::size_t>(count));
        m_ptr = array.release();
        return m_ptr;
    }

    /// Allocates one default-constructed object and holds it.
    T* AllocateObject() {
        std::unique_ptr<T> object(new T());
        m_owner = std::make_shared<KestCdfTypedAllocation<T, false>>(object.get(), 1);
        m_ptr = object.release();
        return m_ptr;
    }

    /// The array for `count` objects: throws _com_error(E_POINTER) when there is none and
    /// `count` is positive, DISP_E_BADINDEX when the library allocated it with fewer objects (a
    /// host's own array has a length the library cannot know).
    T* Checked(long long count) const {
        if (count <= 0) return m_ptr;
        if (!m_ptr) throw _com_error(E_POINTER);
        if (m_owner && static_cast<unsigned long long>(count) > m_owner->Length())
            throw _com_error(DISP_E_BADINDEX);
        return m_ptr;
    }

    /// Stores a pointer given by a host: shared when the library handed it out, else borrowed.
    void Set(T* p) {
        if (p == m_ptr) return;
        m_owner = p ? KestCdfSharedAllocation::Find(p) : std::shared_ptr<KestCdfSharedAllocation>();
        m_ptr = p;
    }

  private:
    T* m_ptr = nullptr;
    std::shared_ptr<KestCdfSharedAllocation> m_owner;
};

}  // namespace kest
