#pragma once
// VARIANT: a tagged value. Types supported: VT_EMPTY, VT_NULL, VT_I2, VT_I4, VT_R4, VT_R8,
// VT_BSTR, VT_BOOL, VT_VARIANT (inside arrays) and VT_ARRAY|VT_VARIANT.

#include "BStr.h"
#include "Export.h"
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

struct KEST_API tagVARIANT {
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
KEST_API void VariantInit(VARIANT* value) noexcept;
/// Frees what the value owns (string, array) and makes it VT_EMPTY.
KEST_API HRESULT VariantClear(VARIANT* value) noexcept;
/// Clears *target, then deep-copies *source into it (arrays with their elements).
KEST_API HRESULT VariantCopy(VARIANT* target, const VARIANT* source) noexcept;
/// Converts *source to type vt into *target (which may be source itself).
///
/// To VT_BSTR: integers in decimal; doubles as the shortest text that reads back to the same
/// double ('.' separator, exponent form "1e+20" only where shorter, independent of the process
/// locale); floats likewise at float precision; VT_BOOL as "True"/"False"; VT_EMPTY as "".
/// VT_NULL and arrays cannot be converted (DISP_E_TYPEMISMATCH).
/// To VT_R8/VT_R4/VT_I4/VT_I2 from text: a decimal number with optional sign, fraction and
/// exponent, blanks allowed around it; anything else is DISP_E_TYPEMISMATCH and a value out of
/// range DISP_E_OVERFLOW. Conversions to integers round half to even.
///
/// Details of the text forms:
/// - Shortest form: among all texts that read back to the same value, the one with the fewest
///   characters, fixed notation on a tie. The exponent carries its sign and at least two digits
///   ("1e+20", "1e-05", "1.5e-300"). Negative zero is "-0". Not-a-number is "NaN", infinities
///   are "Infinity" and "-Infinity"; these three do not convert back to numbers.
/// - Number grammar: blanks (space, tab, CR, LF) * [+|-] (digits [. digits*] | . digits)
///   [(e|E) [+|-] digits] blanks*. The empty text, "inf", "nan", "0x10", "1,5" and "1e" are
///   DISP_E_TYPEMISMATCH; a magnitude above the target type's range is DISP_E_OVERFLOW; a
///   magnitude below the smallest double reads as zero.
/// - To VT_BOOL from text: "True" or "False" in any letter case (blanks around allowed), or a
///   number as above, non-zero meaning VARIANT_TRUE. Numbers to VT_BOOL: non-zero is true;
///   VT_BOOL to numbers: -1 and 0.
/// - Doubles to VT_R4: DISP_E_OVERFLOW above the float range. Doubles to VT_I4/VT_I2 (also
///   from text): rounded half to even, then DISP_E_OVERFLOW outside the type's range (NaN too).
/// - VT_EMPTY converts to 0, false and ""; VT_EMPTY to VT_NULL is allowed. VT_NULL, VT_ERROR
///   and arrays convert only to their own type (a deep copy) and to VT_EMPTY; otherwise
///   DISP_E_TYPEMISMATCH. An unsupported type on either side is DISP_E_BADVARTYPE.
/// - `flags` is accepted for compatibility and has no effect. On failure *target is unchanged.
KEST_API HRESULT VariantChangeType(VARIANT* target, const VARIANT* source, USHORT flags,
                                   VARTYPE vt) noexcept;

}  // namespace kest
