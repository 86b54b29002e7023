#include "KestCdfValueListCodec.h"

#include <charconv>
#include <climits>
#include <cmath>
#include <cstring>
#include <locale.h>
#include <stdlib.h>
#include <string>
#include <system_error>

namespace kest {
namespace detail {

namespace {

constexpr VARTYPE kArrayOfVariants = VT_ARRAY | VT_VARIANT;

// The white-space set of isspace in the C locale; the host's locale must not change what a
// file means.
inline bool IsCSpace(char c) noexcept {
    return c == ' ' || (c >= '\t' && c <= '\r');
}

inline bool IsDigit(char c) noexcept { return c >= '0' && c <= '9'; }

inline char LowerAscii(char c) noexcept { return static_cast<char>(c | 0x20); }

// Texts are parsed as narrow characters. Every UTF-16 unit becomes exactly one byte so that
// positions match the text; a unit outside ASCII can never be part of a number, so one
// placeholder byte that is neither white space, digit, sign nor letter stands in for all.
void Narrow(std::u16string_view text, std::string& out) {
    out.resize(text.size());
    char* p = out.data();
    for (char16_t c : text) *p++ = c < 0x80 ? static_cast<char>(c) : '\x7f';
}

// The rare forms (hexadecimal, infinities, NaNs, results out of range) go to the C library's
// own parser in the C locale, which is the reference these rules follow.
double ParseDoubleSlow(const char* first, const char* last) noexcept {
    static const locale_t cLocale = newlocale(LC_ALL_MASK, "C", static_cast<locale_t>(0));
    char small[64];
    std::string large;
    const std::size_t length = static_cast<std::size_t>(last - first);
    const char* text;
    if (length < sizeof small) {
        std::memcpy(small, first, length);
        small[length] = '\0';
        text = small;
    } else {
        try {
            large.assign(first, last);
        } catch (...) {
            return 0.0;  // no memory for a copy of an absurd token: read it as no number
        }
        text = large.c_str();
    }
    return cLocale ? strtod_l(text, nullptr, cLocale) : strtod(text, nullptr);
}

void CheckArray(const VARIANT& array) {
    if (array.vt != kArrayOfVariants || !array.parray) throw _com_error(E_INVALIDARG);
}

// Element access for the duration of one fill or read.
class ArrayData {
public:
    explicit ArrayData(SAFEARRAY* array) : m_array(array) {
        ThrowIfFailed(SafeArrayAccessData(array, reinterpret_cast<void**>(&m_data)));
    }
    ~ArrayData() { SafeArrayUnaccessData(m_array); }
    ArrayData(const ArrayData&) = delete;
    ArrayData& operator=(const ArrayData&) = delete;
    VARIANT* get() const noexcept { return m_data; }

private:
    SAFEARRAY* m_array;
    VARIANT* m_data = nullptr;
};

void AppendAscii(std::u16string& out, const char* first, const char* last) {
    while (first != last) out.push_back(static_cast<char16_t>(*first++));
}

void AppendInt(std::u16string& out, long long value) {
    char buffer[24];
    auto result = std::to_chars(buffer, buffer + sizeof buffer, value);
    AppendAscii(out, buffer, result.ptr);
}

void AppendDouble(std::u16string& out, double value) {
    char buffer[kDoubleTextCapacity];
    AppendAscii(out, buffer, FormatDouble(value, buffer));
}

// The platform's text of a value; the empty text when it has none.
void AppendPlatformText(std::u16string& out, const VARIANT& value) {
    VARIANT text;
    VariantInit(&text);
    if (SUCCEEDED(VariantChangeType(&text, &value, 0, VT_BSTR))) out.append(BstrView(text.bstrVal));
    VariantClear(&text);
}

void AppendElement(std::u16string& out, const VARIANT& element, ElementWriting writing,
                   bool quoteStrings) {
    switch (element.vt) {
    case VT_BSTR: {
        const std::u16string_view text = BstrView(element.bstrVal);
        // A string that holds a quote cannot be quoted faithfully (there is no escape); it is
        // written as it stands, which also keeps a host's pre-quoted text unchanged.
        const bool quote = quoteStrings && text.find(u'"') == std::u16string_view::npos;
        if (quote) out.push_back(u'"');
        out.append(text);
        if (quote) out.push_back(u'"');
        return;
    }
    case VT_R8:
        // "%.15g" never writes a ',' in the C locale, so no separator needs replacing.
        AppendDouble(out, element.dblVal);
        return;
    case VT_I4:
        AppendInt(out, element.lVal);
        return;
    default:
        break;
    }
    if (writing == ElementWriting::kCalItemValue) {
        if (element.vt != VT_EMPTY) AppendPlatformText(out, element);
        return;
    }
    if (element.vt == VT_R4) {
        AppendDouble(out, static_cast<double>(element.fltVal));
        return;
    }
    // Any other element is written as its 32-bit integer value; one that has none (VT_EMPTY,
    // or a type without an integer form) as 0.
    VARIANT number;
    VariantInit(&number);
    long long value = 0;
    if (element.vt != VT_EMPTY && SUCCEEDED(VariantChangeType(&number, &element, 0, VT_I4)))
        value = number.lVal;
    VariantClear(&number);
    AppendInt(out, value);
}

}  // namespace

ValueText::ValueText(const VARIANT& value) {
    if (value.vt == VT_BSTR) {
        m_view = BstrView(value.bstrVal);
        return;
    }
    _variant_t text;
    ThrowIfFailed(VariantChangeType(&text, &value, 0, VT_BSTR));
    VARIANT raw = text.Detach();
    m_converted = _bstr_t(raw.bstrVal, false);  // takes the converted string over
    m_view = m_converted.View();
}

bool IsFormatType(const KestCdfNormalizedString& formatType, std::u16string_view keyword) noexcept {
    return BstrView(formatType.m_string.m_str) == keyword;
}

int CountValues(bool numeric, std::u16string_view text) noexcept {
    if (!numeric) return 0;
    long long spaces = 0;
    for (char16_t c : text)
        if (c == u' ') ++spaces;
    // A BSTR is at most 2^31 units long, but keep the count in range whatever the view.
    return spaces >= INT_MAX ? INT_MAX : static_cast<int>(spaces + 1);
}

_variant_t NewValueArray(ULONG count) {
    SAFEARRAY* array = SafeArrayCreateVector(VT_VARIANT, 0, count);
    if (!array) throw _com_error(E_OUTOFMEMORY);
    _variant_t result;
    result.vt = kArrayOfVariants;
    result.parray = array;
    return result;
}

_variant_t SingleValueArray(const VARIANT& value) {
    _variant_t result = NewValueArray(1);
    const LONG index = 0;
    ThrowIfFailed(SafeArrayPutElement(result.parray, &index, &value));
    return result;
}

void FillNumbers(std::u16string_view text, NumberTyping typing, VARIANT& array) {
    CheckArray(array);
    const ULONG count = array.parray->rgsabound[0].cElements;
    if (count == 0) return;

    // One narrow copy per text, reused across calls: tokens are parsed in place.
    thread_local std::string narrow;
    Narrow(text, narrow);
    const char* const base = narrow.data();
    const std::size_t length = narrow.size();

    ArrayData data(array.parray);
    VARIANT* const elements = data.get();
    const bool wholeTextDouble =
        typing == NumberTyping::kWholeText && length != 0 && std::memchr(base, '.', length);

    ULONG k = 0;
    auto store = [&](std::size_t begin, std::size_t end) {
        if (k >= count) return;
        VARIANT& element = elements[k];
        if (element.vt != VT_EMPTY) VariantClear(&element);
        bool asDouble = wholeTextDouble;
        if (typing == NumberTyping::kPerToken)
            asDouble = k == 0 || (end > begin && std::memchr(base + begin, '.', end - begin));
        if (asDouble) {
            element.vt = VT_R8;
            element.dblVal = ParseDouble(base + begin, base + end);
        } else {
            element.vt = VT_I4;
            element.lVal = ParseInt(base + begin, base + end);
        }
        ++k;
    };

    // Every space separates except one in the first position, which stays leading white space
    // of the first token. Without that exception a text starting with a space would yield one
    // token more than CountValues allocates; with it, the last element stays VT_EMPTY.
    std::size_t start = 0;
    std::size_t i = 1;
    while (i < length) {
        const void* space = std::memchr(base + i, ' ', length - i);
        if (!space) break;
        const std::size_t at = static_cast<std::size_t>(static_cast<const char*>(space) - base);
        store(start, at);
        start = at + 1;
        i = at + 1;
    }
    store(start, length);
    // Keep the buffer for the next text unless one huge text made it grow.
    if (narrow.capacity() > (std::size_t(1) << 22)) std::string().swap(narrow);
}

bool IsQuoted(std::u16string_view text) noexcept {
    return !text.empty() && text.front() == u'"' && text.back() == u'"';
}

void PutQuotedStrings(std::u16string_view text, VARIANT& array) {
    CheckArray(array);
    // First count the pairs, so that the array is resized once.
    ULONG pairs = 0;
    bool open = false;
    for (char16_t c : text) {
        if (c != u'"') continue;
        if (open) ++pairs;
        open = !open;
    }
    SAFEARRAYBOUND bound{pairs, 0};
    ThrowIfFailed(SafeArrayRedim(array.parray, &bound));
    if (pairs == 0) return;

    ArrayData data(array.parray);
    VARIANT* elements = data.get();
    std::size_t start = 0;
    open = false;
    for (std::size_t i = 0; i < text.size(); ++i) {
        if (text[i] != u'"') continue;
        if (!open) {
            start = i + 1;
            open = true;
            continue;
        }
        open = false;
        BSTR value = SysAllocStringLen(text.data() + start, static_cast<UINT>(i - start));
        if (!value) throw _com_error(E_OUTOFMEMORY);
        VariantClear(elements);
        elements->vt = VT_BSTR;
        elements->bstrVal = value;
        ++elements;
    }
}

_variant_t FormatValueList(const VARIANT& stored, ElementWriting writing, bool quoteStrings) {
    // One growing buffer per thread, so that writing many values does not allocate per value.
    thread_local std::u16string out;
    out.clear();
    if (stored.vt == kArrayOfVariants && stored.parray) {
        SAFEARRAY* array = stored.parray;
        const long long n = array->rgsabound[0].cElements;
        const long long lowerBound = array->rgsabound[0].lLbound;
        ArrayData data(array);
        out.reserve(static_cast<std::size_t>(n) * 8);
        for (long long i = 0; i < n; ++i) {
            // Index i is fetched as an element index; one outside the bounds adds nothing.
            if (i < lowerBound || i - lowerBound >= n) continue;
            AppendElement(out, data.get()[i - lowerBound], writing, quoteStrings);
            if (i < n - 1) out.push_back(u' ');
        }
    }
    BSTR text = SysAllocStringLen(out.data(), static_cast<UINT>(out.size()));
    if (out.capacity() > (std::size_t(1) << 22)) std::u16string().swap(out);
    if (!text) throw _com_error(E_OUTOFMEMORY);
    _variant_t result;
    result.vt = VT_BSTR;
    result.bstrVal = text;
    return result;
}

int ParseInt(const char* first, const char* last) noexcept {
    while (first != last && IsCSpace(*first)) ++first;
    bool negative = false;
    if (first != last && (*first == '+' || *first == '-')) {
        negative = *first == '-';
        ++first;
    }
    // Stop growing just past the 32-bit range; the digits that follow only saturate further.
    constexpr long long kLimit = static_cast<long long>(INT_MAX) + 2;
    long long value = 0;
    for (; first != last && IsDigit(*first); ++first) {
        if (value < kLimit) value = value * 10 + (*first - '0');
    }
    if (negative) value = -value;
    if (value > INT_MAX) return INT_MAX;
    if (value < INT_MIN) return INT_MIN;
    return static_cast<int>(value);
}

double ParseDouble(const char* first, const char* last) noexcept {
    while (first != last && IsCSpace(*first)) ++first;
    if (first == last) return 0.0;
    const char* p = first;
    bool negative = false;
    if (*p == '+' || *p == '-') {
        negative = *p == '-';
        ++p;
    }
    if (p == last) return 0.0;
    if (IsDigit(*p) || *p == '.') {
        const bool hex = *p == '0' && last - p > 1 && LowerAscii(p[1]) == 'x';
        if (!hex) {
            double value = 0.0;
            const std::from_chars_result result =
                std::from_chars(p, last, value, std::chars_format::general);
            if (result.ec == std::errc()) return negative ? -value : value;
            if (result.ec == std::errc::invalid_argument) return 0.0;
            // Out of range: the C library decides between infinity, zero and a subnormal.
        }
        return ParseDoubleSlow(first, last);
    }
    const char c = LowerAscii(*p);
    if (c == 'i' || c == 'n') return ParseDoubleSlow(first, last);
    return 0.0;
}

char* FormatDouble(double value, char* buffer) noexcept {
    char* end;
    const bool negativeZero = value == 0.0 && std::signbit(value);
    if (std::fabs(value) < 1e15 && value == std::trunc(value) && !negativeZero) {
        // Whole numbers below 10^15 (axis points, counts) are written by "%.15g" as the plain
        // integer; the integer conversion is much cheaper than a fixed precision.
        end = std::to_chars(buffer, buffer + kDoubleTextCapacity, static_cast<long long>(value))
                  .ptr;
    } else {
        end = std::to_chars(buffer, buffer + kDoubleTextCapacity, value,
                            std::chars_format::general, 15)
                  .ptr;
    }
    // The exponent is written with at least three digits, as the files have always had it.
    char* e = static_cast<char*>(std::memchr(buffer, 'e', static_cast<std::size_t>(end - buffer)));
    if (!e) return end;
    char* digits = e + 2;  // past the exponent's sign
    const std::ptrdiff_t count = end - digits;
    if (count >= 3) return end;
    const std::ptrdiff_t shift = 3 - count;
    std::memmove(digits + shift, digits, static_cast<std::size_t>(count));
    std::memset(digits, '0', static_cast<std::size_t>(shift));
    return end + shift;
}

}  // namespace detail
}  // namespace kest
