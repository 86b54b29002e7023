#include "Variant.h"

#include <charconv>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <new>
#include <string>
#include <system_error>
#include <type_traits>

namespace kest {

namespace {

constexpr VARTYPE kVariantArray = VT_ARRAY | VT_VARIANT;

bool IsSupported(VARTYPE vt) noexcept {
    switch (vt) {
        case VT_EMPTY:
        case VT_NULL:
        case VT_I2:
        case VT_I4:
        case VT_R4:
        case VT_R8:
        case VT_BSTR:
        case VT_ERROR:
        case VT_BOOL:
        case kVariantArray:
            return true;
        default:
            return false;
    }
}

bool IsNumeric(VARTYPE vt) noexcept {
    return vt == VT_I2 || vt == VT_I4 || vt == VT_R4 || vt == VT_R8 || vt == VT_BOOL;
}

double NumericValue(const VARIANT& value) noexcept {
    switch (value.vt) {
        case VT_I2:
            return value.iVal;
        case VT_I4:
            return value.lVal;
        case VT_R4:
            return value.fltVal;
        case VT_R8:
            return value.dblVal;
        case VT_BOOL:
            return value.boolVal ? -1.0 : 0.0;
        default:
            return 0.0;
    }
}

// Rounds half to even without depending on the floating-point environment.
double RoundHalfEven(double value) noexcept {
    double floor = std::floor(value);
    double fraction = value - floor;
    if (fraction > 0.5) return floor + 1.0;
    if (fraction < 0.5) return floor;
    return std::fmod(floor, 2.0) == 0.0 ? floor : floor + 1.0;
}

// Stores `number` into `result` as type vt (one of the numeric types or VT_BOOL).
HRESULT FromDouble(double number, VARTYPE vt, VARIANT* result) noexcept {
    switch (vt) {
        case VT_R8:
            result->dblVal = number;
            break;
        case VT_R4:
            if (std::isfinite(number) && std::fabs(number) > std::numeric_limits<float>::max()) {
                return DISP_E_OVERFLOW;
            }
            result->fltVal = static_cast<float>(number);
            break;
        case VT_I4: {
            double rounded = RoundHalfEven(number);
            // NaN fails both comparisons and is refused too.
            if (!(rounded >= std::numeric_limits<LONG>::min() &&
                  rounded <= std::numeric_limits<LONG>::max())) {
                return DISP_E_OVERFLOW;
            }
            result->lVal = static_cast<LONG>(rounded);
            break;
        }
        case VT_I2: {
            double rounded = RoundHalfEven(number);
            if (!(rounded >= std::numeric_limits<SHORT>::min() &&
                  rounded <= std::numeric_limits<SHORT>::max())) {
                return DISP_E_OVERFLOW;
            }
            result->iVal = static_cast<SHORT>(rounded);
            break;
        }
        case VT_BOOL:
            result->boolVal = number != 0.0 ? VARIANT_TRUE : VARIANT_FALSE;
            break;
        default:
            return DISP_E_TYPEMISMATCH;
    }
    result->vt = vt;
    return S_OK;
}

bool IsBlank(char16_t c) noexcept { return c == u' ' || c == u'\t' || c == u'\r' || c == u'\n'; }
bool IsDigit(char16_t c) noexcept { return c >= u'0' && c <= u'9'; }

std::u16string_view TrimBlanks(std::u16string_view text) noexcept {
    while (!text.empty() && IsBlank(text.front())) text.remove_prefix(1);
    while (!text.empty() && IsBlank(text.back())) text.remove_suffix(1);
    return text;
}

// Parses a decimal number: optional sign, digits with an optional fraction (at least one digit
// in all), optional exponent; blanks around it are allowed. The grammar is checked here so
// that std::from_chars never sees the forms it would accept beyond it (inf, nan, hex).
HRESULT ParseNumber(std::u16string_view text, double* number) {
    text = TrimBlanks(text);
    if (text.empty()) return DISP_E_TYPEMISMATCH;
    std::string ascii;
    ascii.reserve(text.size());
    std::size_t i = 0;
    bool negative = false;
    if (text[i] == u'+' || text[i] == u'-') {
        negative = text[i] == u'-';
        ++i;
    }
    std::size_t integerDigits = 0, fractionDigits = 0;
    // Decimal position of the first significant digit, to tell underflow from overflow.
    std::int64_t magnitude = 0;
    bool significant = false;
    for (; i < text.size() && IsDigit(text[i]); ++i, ++integerDigits) {
        if (text[i] != u'0' && !significant) significant = true;
        if (significant) ++magnitude;
        ascii.push_back(static_cast<char>(text[i]));
    }
    if (significant) --magnitude;
    if (i < text.size() && text[i] == u'.') {
        ascii.push_back('.');
        for (++i; i < text.size() && IsDigit(text[i]); ++i, ++fractionDigits) {
            if (!significant) {
                --magnitude;
                if (text[i] != u'0') significant = true;
            }
            ascii.push_back(static_cast<char>(text[i]));
        }
    }
    if (integerDigits + fractionDigits == 0) return DISP_E_TYPEMISMATCH;
    std::int64_t exponent = 0;
    if (i < text.size() && (text[i] == u'e' || text[i] == u'E')) {
        ascii.push_back('e');
        ++i;
        bool negativeExponent = false;
        if (i < text.size() && (text[i] == u'+' || text[i] == u'-')) {
            negativeExponent = text[i] == u'-';
            ascii.push_back(static_cast<char>(text[i]));
            ++i;
        }
        std::size_t exponentDigits = 0;
        for (; i < text.size() && IsDigit(text[i]); ++i, ++exponentDigits) {
            if (exponent < 100000000) exponent = exponent * 10 + (text[i] - u'0');
            ascii.push_back(static_cast<char>(text[i]));
        }
        if (exponentDigits == 0) return DISP_E_TYPEMISMATCH;
        if (negativeExponent) exponent = -exponent;
    }
    if (i != text.size()) return DISP_E_TYPEMISMATCH;

    double value = 0.0;
    const char* first = ascii.data();
    const char* last = first + ascii.size();
    std::from_chars_result parsed = std::from_chars(first, last, value);
    if (parsed.ec == std::errc::result_out_of_range) {
        if (!significant || magnitude + exponent < 0) {
            value = 0.0;  // too small to represent: the nearest double is zero
        } else {
            return DISP_E_OVERFLOW;
        }
    } else if (parsed.ec != std::errc() || parsed.ptr != last) {
        return DISP_E_TYPEMISMATCH;
    }
    *number = negative ? -value : value;
    return S_OK;
}

bool EqualsIgnoringAsciiCase(std::u16string_view text, std::u16string_view word) noexcept {
    if (text.size() != word.size()) return false;
    for (std::size_t i = 0; i < text.size(); ++i) {
        char16_t a = text[i], b = word[i];
        if (a >= u'A' && a <= u'Z') a = static_cast<char16_t>(a - u'A' + u'a');
        if (b >= u'A' && b <= u'Z') b = static_cast<char16_t>(b - u'A' + u'a');
        if (a != b) return false;
    }
    return true;
}

HRESULT FromText(BSTR text, VARTYPE vt, VARIANT* result) noexcept {
    std::u16string_view view = BstrView(text);
    if (vt == VT_BOOL) {
        std::u16string_view word = TrimBlanks(view);
        if (EqualsIgnoringAsciiCase(word, u"true")) return FromDouble(-1.0, VT_BOOL, result);
        if (EqualsIgnoringAsciiCase(word, u"false")) return FromDouble(0.0, VT_BOOL, result);
    }
    double number = 0.0;
    HRESULT hr;
    try {
        hr = ParseNumber(view, &number);
    } catch (const std::bad_alloc&) {
        return E_OUTOFMEMORY;  // the narrow copy of a very long text
    }
    if (FAILED(hr)) return hr;
    return FromDouble(number, vt, result);
}

template <class Number>
HRESULT TextOf(Number number, VARIANT* result) noexcept {
    char buffer[64];
    const char* text;
    std::size_t length;
    if constexpr (std::is_floating_point_v<Number>) {
        if (std::isnan(number)) {
            text = "NaN";
            length = 3;
        } else if (std::isinf(number)) {
            text = number < 0 ? "-Infinity" : "Infinity";
            length = std::strlen(text);
        } else {
            std::to_chars_result written = std::to_chars(buffer, buffer + sizeof buffer, number);
            text = buffer;
            length = static_cast<std::size_t>(written.ptr - buffer);
        }
    } else {
        std::to_chars_result written = std::to_chars(buffer, buffer + sizeof buffer, number);
        text = buffer;
        length = static_cast<std::size_t>(written.ptr - buffer);
    }
    BSTR bstr = SysAllocStringLen(nullptr, static_cast<UINT>(length));
    if (!bstr) return E_OUTOFMEMORY;
    for (std::size_t i = 0; i < length; ++i) bstr[i] = static_cast<OLECHAR>(text[i]);
    result->vt = VT_BSTR;
    result->bstrVal = bstr;
    return S_OK;
}

HRESULT ToText(const VARIANT& source, VARIANT* result) noexcept {
    switch (source.vt) {
        case VT_EMPTY: {
            BSTR empty = SysAllocStringLen(nullptr, 0);
            if (!empty) return E_OUTOFMEMORY;
            result->vt = VT_BSTR;
            result->bstrVal = empty;
            return S_OK;
        }
        case VT_I2:
            return TextOf(static_cast<int>(source.iVal), result);
        case VT_I4:
            return TextOf(static_cast<long>(source.lVal), result);
        case VT_R4:
            return TextOf(source.fltVal, result);
        case VT_R8:
            return TextOf(source.dblVal, result);
        case VT_BOOL: {
            BSTR text = SysAllocString(source.boolVal ? u"True" : u"False");
            if (!text) return E_OUTOFMEMORY;
            result->vt = VT_BSTR;
            result->bstrVal = text;
            return S_OK;
        }
        default:
            return DISP_E_TYPEMISMATCH;
    }
}

// Converts into a fresh VARIANT; `source` is left alone.
HRESULT Convert(const VARIANT& source, VARTYPE vt, VARIANT* result) noexcept {
    if (source.vt == vt) return VariantCopy(result, &source);
    if (vt == VT_EMPTY) return S_OK;  // result is already VT_EMPTY
    if (vt == VT_NULL) {
        if (source.vt != VT_EMPTY) return DISP_E_TYPEMISMATCH;
        result->vt = VT_NULL;
        return S_OK;
    }
    if (vt == VT_BSTR) return ToText(source, result);
    if (!IsNumeric(vt)) return DISP_E_TYPEMISMATCH;  // VT_ERROR, arrays
    if (source.vt == VT_EMPTY) return FromDouble(0.0, vt, result);
    if (source.vt == VT_BSTR) return FromText(source.bstrVal, vt, result);
    if (IsNumeric(source.vt)) return FromDouble(NumericValue(source), vt, result);
    return DISP_E_TYPEMISMATCH;  // VT_NULL, VT_ERROR, arrays
}

}  // namespace

void VariantInit(VARIANT* value) noexcept {
    if (!value) return;
    value->vt = VT_EMPTY;
    value->wReserved1 = value->wReserved2 = value->wReserved3 = 0;
}

HRESULT VariantClear(VARIANT* value) noexcept {
    if (!value) return E_INVALIDARG;
    switch (value->vt) {
        case VT_BSTR:
            SysFreeString(value->bstrVal);
            break;
        case kVariantArray:
            if (value->parray) {
                HRESULT hr = SafeArrayDestroy(value->parray);
                if (FAILED(hr)) return hr;
            }
            break;
        default:
            if (!IsSupported(value->vt)) return DISP_E_BADVARTYPE;
            break;
    }
    VariantInit(value);
    return S_OK;
}

HRESULT VariantCopy(VARIANT* target, const VARIANT* source) noexcept {
    if (!target || !source) return E_INVALIDARG;
    if (target == source) return S_OK;
    if (!IsSupported(source->vt)) return DISP_E_BADVARTYPE;
    // Copy first: the source may be owned by the target (an element of its array).
    VARIANT copy = *source;
    if (source->vt == VT_BSTR && source->bstrVal) {
        copy.bstrVal = SysAllocStringByteLen(reinterpret_cast<const char*>(source->bstrVal),
                                             SysStringByteLen(source->bstrVal));
        if (!copy.bstrVal) return E_OUTOFMEMORY;
    } else if (source->vt == kVariantArray && source->parray) {
        HRESULT hr = SafeArrayCopy(source->parray, &copy.parray);
        if (FAILED(hr)) return hr;
    }
    HRESULT hr = VariantClear(target);
    if (FAILED(hr)) {
        VariantClear(&copy);
        return hr;
    }
    *target = copy;
    return S_OK;
}

HRESULT VariantChangeType(VARIANT* target, const VARIANT* source, USHORT, VARTYPE vt) noexcept {
    if (!target || !source) return E_INVALIDARG;
    if (!IsSupported(source->vt) || !IsSupported(vt)) return DISP_E_BADVARTYPE;
    VARIANT result;
    VariantInit(&result);
    HRESULT hr = Convert(*source, vt, &result);
    if (FAILED(hr)) return hr;
    // The source is read completely before the target (which may be the source) is cleared.
    hr = VariantClear(target);
    if (FAILED(hr)) {
        VariantClear(&result);
        return hr;
    }
    *target = result;
    return S_OK;
}

}  // namespace kest
