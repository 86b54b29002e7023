#pragma once
// VARIANT: a tagged value. Types supported: VT_EMPTY, VT_NULL, VT_I2, VT_I4, VT_R4, VT_R8,
// VT_BSTR, VT_BOOL, VT_VARIANT (inside arrays) and VT_ARRAY|VT_VARIANT.

#include "BStr.h"
#include "SafeArray.h"

namespace kest {

enum VARENUM : VARTYPE {
    VT_EMPTY = 0,
    VT_NULL = 1,
    VT_I2 = 2,
    VT_I4 = 3,
    VT_R4 = 4,
    VT_R8 = 5,
    VT_BSTR = 8,
    VT_ERROR = 10,
    VT_BOOL = 11,
    VT_VARIANT = 12,
    VT_ARRAY = 0x2000,
};

struct tagVARIANT {
    VARTYPE vt;
    USHORT wReserved1;
    USHORT wReserved2;
    USHORT wReserved3;
    union {
        LONG lVal;
        SHORT iVal;
        float fltVal;
        double dblVal;
        VARIANT_BOOL boolVal;
        HRESULT scode;
        BSTR bstrVal;
        SAFEARRAY* parray;
    };
};

/// Sets the type to VT_EMPTY without freeing anything.
void VariantInit(VARIANT* value) noexcept;
/// Frees what the value owns (string, array) and makes it VT_EMPTY.
HRESULT VariantClear(VARIANT* value) noexcept;
/// Clears *target, then deep-copies *source into it (arrays with their elements).
HRESULT VariantCopy(VARIANT* target, const VARIANT* source) noexcept;
/// Converts *source to type vt into *target (which may be source itself).
///
/// To VT_BSTR: integers in decimal; doubles as the shortest text that reads back to the same
/// double ('.' separator, exponent form "1e+20" only where shorter, independent of the process
/// locale); floats likewise at float precision; VT_BOOL as "True"/"False"; VT_EMPTY as "".
/// VT_NULL and arrays cannot be converted (DISP_E_TYPEMISMATCH).
/// To VT_R8/VT_R4/VT_I4/VT_I2 from text: a decimal number with optional sign, fraction and
/// exponent, blanks allowed around it; anything else is DISP_E_TYPEMISMATCH and a value out of
/// range DISP_E_OVERFLOW. Conversions to integers round half to even.
HRESULT VariantChangeType(VARIANT* target, const VARIANT* source, USHORT flags, VARTYPE vt) noexcept;

}  // namespace kest
