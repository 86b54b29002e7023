#include "SafeArray.h"

#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <new>

#include "Variant.h"

namespace kest {

namespace {

constexpr USHORT FADF_HAVEVARTYPE = 0x0080;
constexpr USHORT FADF_VARIANT = 0x0800;

// Every descriptor lives at the start of a block that also records how many elements pvData
// has room for. Growing one element at a time (as the string splitter of the value codec does)
// therefore doubles the storage now and then instead of reallocating on every call.
struct ArrayBlock {
    SAFEARRAY descriptor;
    ULONG capacity;
};

ArrayBlock* BlockOf(SAFEARRAY* array) noexcept {
    // The descriptor is the first member of a standard-layout block.
    return reinterpret_cast<ArrayBlock*>(array);
}

ULONG CountOf(const SAFEARRAY* array) noexcept { return array->rgsabound[0].cElements; }

bool BoundsFit(LONG lowerBound, ULONG count) noexcept {
    // The upper bound lowerBound + count - 1 must be a LONG as well.
    return static_cast<std::int64_t>(lowerBound) + count - 1 <= std::numeric_limits<LONG>::max();
}

bool ResizeStorage(ArrayBlock* block, ULONG capacity) noexcept {
    // On 64-bit targets a 32-bit count times 16 bytes cannot overflow size_t.
    static_assert(sizeof(std::size_t) >= 8, "element storage size is computed in size_t");
    std::size_t bytes = static_cast<std::size_t>(capacity) * sizeof(VARIANT);
    void* data = std::realloc(block->descriptor.pvData, bytes ? bytes : 1);
    if (!data) return false;
    block->descriptor.pvData = static_cast<VARIANT*>(data);
    block->capacity = capacity;
    return true;
}

void InitElements(VARIANT* first, ULONG count) noexcept {
    for (ULONG i = 0; i < count; ++i) VariantInit(first + i);
}

// Offset of *index within the array, or -1 when it lies outside the bounds.
std::int64_t OffsetOf(const SAFEARRAY* array, const LONG* index) noexcept {
    std::int64_t offset = static_cast<std::int64_t>(*index) - array->rgsabound[0].lLbound;
    if (offset < 0 || offset >= static_cast<std::int64_t>(CountOf(array))) return -1;
    return offset;
}

SAFEARRAY* CreateVariantArray(LONG lowerBound, ULONG count) noexcept {
    if (!BoundsFit(lowerBound, count)) return nullptr;
    ArrayBlock* block = new (std::nothrow) ArrayBlock{};
    if (!block) return nullptr;
    if (!ResizeStorage(block, count)) {
        delete block;
        return nullptr;
    }
    SAFEARRAY& array = block->descriptor;
    array.cDims = 1;
    array.fFeatures = FADF_HAVEVARTYPE | FADF_VARIANT;
    array.cbElements = sizeof(VARIANT);
    array.cLocks = 0;
    array.rgsabound[0].cElements = count;
    array.rgsabound[0].lLbound = lowerBound;
    InitElements(array.pvData, count);
    return &array;
}

void FreeArray(SAFEARRAY* array) noexcept {
    std::free(array->pvData);
    delete BlockOf(array);
}

}  // namespace

SAFEARRAY* SafeArrayCreateVector(VARTYPE vt, LONG lowerBound, ULONG count) noexcept {
    if (vt != VT_VARIANT) return nullptr;
    return CreateVariantArray(lowerBound, count);
}

SAFEARRAY* SafeArrayCreate(VARTYPE vt, UINT dims, SAFEARRAYBOUND* bounds) noexcept {
    if (vt != VT_VARIANT || dims != 1 || !bounds) return nullptr;
    return CreateVariantArray(bounds->lLbound, bounds->cElements);
}

HRESULT SafeArrayDestroy(SAFEARRAY* array) noexcept {
    if (!array) return E_INVALIDARG;
    if (__atomic_load_n(&array->cLocks, __ATOMIC_ACQUIRE) > 0) return DISP_E_ARRAYISLOCKED;
    for (ULONG i = 0; i < CountOf(array); ++i) VariantClear(array->pvData + i);
    FreeArray(array);
    return S_OK;
}

HRESULT SafeArrayPutElement(SAFEARRAY* array, const LONG* index, const void* value) noexcept {
    if (!array || !index || !value) return E_INVALIDARG;
    std::int64_t offset = OffsetOf(array, index);
    if (offset < 0) return DISP_E_BADINDEX;
    VARIANT copy;
    VariantInit(&copy);
    HRESULT hr = VariantCopy(&copy, static_cast<const VARIANT*>(value));
    if (FAILED(hr)) return hr;
    VARIANT& element = array->pvData[offset];
    hr = VariantClear(&element);
    if (FAILED(hr)) {
        VariantClear(&copy);
        return hr;
    }
    element = copy;
    return S_OK;
}

HRESULT SafeArrayGetElement(SAFEARRAY* array, const LONG* index, void* value) noexcept {
    if (!array || !index || !value) return E_INVALIDARG;
    std::int64_t offset = OffsetOf(array, index);
    if (offset < 0) return DISP_E_BADINDEX;
    VARIANT copy;
    VariantInit(&copy);
    HRESULT hr = VariantCopy(&copy, array->pvData + offset);
    if (FAILED(hr)) return hr;
    *static_cast<VARIANT*>(value) = copy;
    return S_OK;
}

HRESULT SafeArrayRedim(SAFEARRAY* array, SAFEARRAYBOUND* bound) noexcept {
    if (!array || !bound) return E_INVALIDARG;
    if (__atomic_load_n(&array->cLocks, __ATOMIC_ACQUIRE) > 0) return DISP_E_ARRAYISLOCKED;
    ULONG count = bound->cElements;
    if (!BoundsFit(bound->lLbound, count)) return E_INVALIDARG;
    ArrayBlock* block = BlockOf(array);
    ULONG old = CountOf(array);
    if (count > block->capacity) {
        std::uint64_t doubled = static_cast<std::uint64_t>(block->capacity) * 2;
        ULONG capacity = count;
        if (doubled > count && doubled <= std::numeric_limits<ULONG>::max()) {
            capacity = static_cast<ULONG>(doubled);
        }
        if (!ResizeStorage(block, capacity) && !ResizeStorage(block, count)) {
            return E_OUTOFMEMORY;
        }
    }
    for (ULONG i = count; i < old; ++i) VariantClear(array->pvData + i);
    if (count > old) InitElements(array->pvData + old, count - old);
    array->rgsabound[0].cElements = count;
    array->rgsabound[0].lLbound = bound->lLbound;
    return S_OK;
}

HRESULT SafeArrayCopy(SAFEARRAY* array, SAFEARRAY** copy) noexcept {
    if (!copy) return E_POINTER;
    *copy = nullptr;
    if (!array) return E_INVALIDARG;
    SAFEARRAY* result = CreateVariantArray(array->rgsabound[0].lLbound, CountOf(array));
    if (!result) return E_OUTOFMEMORY;
    for (ULONG i = 0; i < CountOf(array); ++i) {
        HRESULT hr = VariantCopy(result->pvData + i, array->pvData + i);
        if (FAILED(hr)) {
            SafeArrayDestroy(result);
            return hr;
        }
    }
    *copy = result;
    return S_OK;
}

HRESULT SafeArrayGetLBound(SAFEARRAY* array, UINT dim, LONG* bound) noexcept {
    if (!array || !bound) return E_INVALIDARG;
    if (dim != 1) return DISP_E_BADINDEX;
    *bound = array->rgsabound[0].lLbound;
    return S_OK;
}

HRESULT SafeArrayGetUBound(SAFEARRAY* array, UINT dim, LONG* bound) noexcept {
    if (!array || !bound) return E_INVALIDARG;
    if (dim != 1) return DISP_E_BADINDEX;
    *bound = static_cast<LONG>(static_cast<std::int64_t>(array->rgsabound[0].lLbound) +
                               CountOf(array) - 1);
    return S_OK;
}

UINT SafeArrayGetDim(SAFEARRAY* array) noexcept { return array ? array->cDims : 0; }

// The lock count is changed atomically: copies of a tree share their value arrays, and
// threads writing copies lock the same array for reading at the same time. Everything else
// about an array (its elements, its size) is only read while it is shared.
HRESULT SafeArrayAccessData(SAFEARRAY* array, void** data) noexcept {
    if (!array || !data) return E_INVALIDARG;
    ULONG locks = __atomic_load_n(&array->cLocks, __ATOMIC_RELAXED);
    do {
        if (locks == std::numeric_limits<ULONG>::max()) return E_UNEXPECTED;
    } while (!__atomic_compare_exchange_n(&array->cLocks, &locks, locks + 1, true, __ATOMIC_ACQUIRE,
                                          __ATOMIC_RELAXED));
    *data = array->pvData;
    return S_OK;
}

HRESULT SafeArrayUnaccessData(SAFEARRAY* array) noexcept {
    if (!array) return E_INVALIDARG;
    ULONG locks = __atomic_load_n(&array->cLocks, __ATOMIC_RELAXED);
    do {
        if (locks == 0) return E_UNEXPECTED;
    } while (!__atomic_compare_exchange_n(&array->cLocks, &locks, locks - 1, true, __ATOMIC_RELEASE,
                                          __ATOMIC_RELAXED));
    return S_OK;
}

}  // namespace kest
