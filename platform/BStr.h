#pragma once
// BSTR: a length-prefixed, zero-terminated UTF-16 string; a null BSTR reads as empty.
// The byte count sits in the four bytes before the pointer; a zero code unit follows the text.
// Strings must be made and freed by the Sys* functions below.
//
// Narrow text is UTF-8 everywhere in this library. Conversions never fail on bad input:
// an invalid UTF-8 sequence becomes U+FFFD (one per maximal ill-formed subsequence), and an
// unpaired surrogate becomes U+FFFD on the way to UTF-8.

#include <cstddef>
#include <string>
#include <string_view>

#include "Export.h"
#include "HResult.h"

namespace kest {

using OLECHAR = char16_t;
using BSTR = OLECHAR*;
using LPCOLESTR = const OLECHAR*;

/// New BSTR holding a copy of the zero-terminated text; null for a null argument or no memory.
KEST_API BSTR SysAllocString(const OLECHAR* text) noexcept;
/// New BSTR of `length` characters copied from `text` (zero-filled when `text` is null);
/// null when memory runs out or the byte count would not fit in 32 bits.
KEST_API BSTR SysAllocStringLen(const OLECHAR* text, UINT length) noexcept;
/// New BSTR of `bytes` bytes copied from `data` (zero-filled when null); the bytes are not
/// converted, as on the platform this type comes from.
KEST_API BSTR SysAllocStringByteLen(const char* data, UINT bytes) noexcept;
/// Frees a BSTR made by the Sys* functions; null is allowed.
KEST_API void SysFreeString(BSTR text) noexcept;
/// Replaces *target with a new copy of the text; false when memory runs out.
KEST_API bool SysReAllocString(BSTR* target, const OLECHAR* text) noexcept;
/// Number of UTF-16 code units; 0 for null.
KEST_API UINT SysStringLen(BSTR text) noexcept;
/// Number of bytes; 0 for null.
KEST_API UINT SysStringByteLen(BSTR text) noexcept;

/// Ordinal, case-sensitive comparison (null equals empty): VARCMP_LT, VARCMP_EQ or VARCMP_GT.
/// The locale and flags are accepted for compatibility and do not change the result.
KEST_API HRESULT VarBstrCmp(BSTR left, BSTR right, LCID lcid, ULONG flags) noexcept;

/// UTF-8 to UTF-16 (invalid sequences become U+FFFD).
KEST_API std::u16string Utf8ToUtf16(std::string_view utf8);
/// UTF-16 to UTF-8 (unpaired surrogates become U+FFFD).
KEST_API std::string Utf16ToUtf8(std::u16string_view utf16);
/// The same conversion into `out`, which has room for three bytes per unit (a pair of units
/// takes four); returns the end of what was written. The one UTF-8 encoder of the library.
KEST_API char* Utf16ToUtf8(std::u16string_view utf16, char* out) noexcept;
/// New BSTR from UTF-8 text; null when memory runs out.
KEST_API BSTR SysAllocStringFromUtf8(std::string_view utf8) noexcept;
/// View of a BSTR's text (empty for null), embedded zeros included.
inline std::u16string_view BstrView(BSTR text) noexcept {
    return text ? std::u16string_view(text, SysStringLen(text)) : std::u16string_view();
}

/// Test aid for out-of-memory paths: the next `count` BSTR allocations succeed and the one
/// after fails as if memory had run out; a negative count (the default) turns this off.
KEST_API void SysFailAllocationAfter(long count) noexcept;

}  // namespace kest
