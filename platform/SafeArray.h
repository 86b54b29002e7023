#pragma once
// SAFEARRAY: one-dimensional arrays of VARIANTs (the only kind this library uses).

#include "Export.h"
#include "HResult.h"

namespace kest {

struct tagVARIANT;
using VARIANT = tagVARIANT;
using VARTYPE = std::uint16_t;

struct KEST_API SAFEARRAYBOUND {
    ULONG cElements;
    LONG lLbound;
};

/// An array descriptor. Only one dimension and VARIANT elements are supported; the data is
/// owned by the descriptor and released by SafeArrayDestroy. A descriptor must come from
/// SafeArrayCreate/SafeArrayCreateVector/SafeArrayCopy: it sits in a larger hidden block that
/// records how many elements pvData has room for, so that SafeArrayRedim grows the storage by
/// doubling and a loop that adds one element at a time stays linear.
///
/// Sharing: any number of threads may read one array at a time (SafeArrayAccessData, element
/// reads, copies), as threads writing copies of one tree do; the lock count is atomic. A thread
/// that changes an array (put, redim, destroy) must have it to itself.
struct KEST_API SAFEARRAY {
    USHORT cDims;
    USHORT fFeatures;
    ULONG cbElements;
    ULONG cLocks;
    VARIANT* pvData;
    SAFEARRAYBOUND rgsabound[1];
};

/// New array of `count` empty VARIANTs with the given lower bound; null unless vt is VT_VARIANT
/// or memory runs out.
KEST_API SAFEARRAY* SafeArrayCreateVector(VARTYPE vt, LONG lowerBound, ULONG count) noexcept;
/// New array from bounds; only one dimension of VT_VARIANT is supported.
KEST_API SAFEARRAY* SafeArrayCreate(VARTYPE vt, UINT dims, SAFEARRAYBOUND* bounds) noexcept;
/// Clears every element and frees the array; E_INVALIDARG for null, DISP_E_ARRAYISLOCKED when
/// locked.
KEST_API HRESULT SafeArrayDestroy(SAFEARRAY* array) noexcept;
/// Stores a copy of *value (a VARIANT) at *index; DISP_E_BADINDEX outside the bounds.
KEST_API HRESULT SafeArrayPutElement(SAFEARRAY* array, const LONG* index,
                                     const void* value) noexcept;
/// Copies the element at *index into *value (a VARIANT, overwritten without clearing);
/// DISP_E_BADINDEX outside the bounds, and *value is not touched on failure.
KEST_API HRESULT SafeArrayGetElement(SAFEARRAY* array, const LONG* index, void* value) noexcept;
/// Resizes to bound->cElements elements keeping those below (removed ones are cleared); new
/// elements are empty. DISP_E_ARRAYISLOCKED while the data is accessed.
KEST_API HRESULT SafeArrayRedim(SAFEARRAY* array, SAFEARRAYBOUND* bound) noexcept;
/// Deep copy of the array and its elements.
KEST_API HRESULT SafeArrayCopy(SAFEARRAY* array, SAFEARRAY** copy) noexcept;
/// Bounds of dimension 1 (the upper bound of an empty array is the lower bound minus one);
/// DISP_E_BADINDEX for any other dimension, E_INVALIDARG for null arguments.
KEST_API HRESULT SafeArrayGetLBound(SAFEARRAY* array, UINT dim, LONG* bound) noexcept;
KEST_API HRESULT SafeArrayGetUBound(SAFEARRAY* array, UINT dim, LONG* bound) noexcept;
KEST_API UINT SafeArrayGetDim(SAFEARRAY* array) noexcept;
/// Direct access to the element storage; pair with SafeArrayUnaccessData. Each call adds a
/// lock; E_UNEXPECTED when unaccessing an array that is not locked.
KEST_API HRESULT SafeArrayAccessData(SAFEARRAY* array, void** data) noexcept;
KEST_API HRESULT SafeArrayUnaccessData(SAFEARRAY* array) noexcept;

}  // namespace kest
