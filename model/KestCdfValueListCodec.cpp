#include "KestCdfValueListCodec.h"

#include <locale.h>
#include <stdlib.h>
#include <algorithm>
#include <cfloat>
#include <charconv>
#include <climits>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <memory>
#include <new>
#include <string>
#include <system_error>
#include <type_traits>

namespace kest {
namespace detail {

namespace {

constexpr VARTYPE kArrayOfVariants = VT_ARRAY | VT_VARIANT;

// The white-space set of isspace in the C locale; the host's locale must not change what a
// file means.
inline bool IsCSpace(char c) noexcept { return c == ' ' || (c >= '\t' && c <= '\r'); }

inline bool IsDigit(char c) noexcept { return c >= '0' && c <= '9'; }

inline char LowerAscii(char c) noexcept { return static_cast<char>(c | 0x20); }

// Tokens are parsed as narrow characters, one byte per UTF-16 unit so that positions match
// the text. A unit outside ASCII can never be part of a number, so one placeholder byte that is
// neither white space, digit, sign nor letter stands in for all: the narrowing is
// min(unit, 0x7f), which compilers turn into a few vector instructions.
void Narrow(std::u16string_view text, char* out) noexcept {
    const char16_t* in = text.data();
    const std::size_t length = text.size();
    for (std::size_t i = 0; i < length; ++i)
        out[i] = static_cast<char>(std::min<char16_t>(in[i], u'\x7f'));
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

// Collects a value text: in the object itself while it is short, which most values are, so
// that writing a file does not allocate per value; on the heap, growing geometrically, beyond.
// One builder for both encodings, so the UTF-8 text the writers store and the UTF-16 text of
// GetNumbersFromSafeArray come from the same rules: everything but string elements is ASCII.
template <class Char>
class TextBuilder {
  public:
    TextBuilder() noexcept = default;
    TextBuilder(const TextBuilder&) = delete;
    TextBuilder& operator=(const TextBuilder&) = delete;

    // Room for `extra` more units at the end; throws _com_error(E_OUTOFMEMORY).
    Char* Reserve(std::size_t extra) {
        if (static_cast<std::size_t>(m_limit - m_end) < extra) Grow(extra);
        return m_end;
    }

    void Push(char c) {
        Char* p = Reserve(1);
        *p = static_cast<Char>(c);
        m_end = p + 1;
    }
    // UTF-16 text, in this builder's encoding. Unpaired surrogates become U+FFFD in UTF-8, as
    // Utf16ToUtf8 has them; the elements' texts are converted one by one, which gives the
    // conversion of the whole text because a separator or quote (never a surrogate) stands
    // between any two of them.
    void Append(std::u16string_view text) {
        if constexpr (std::is_same<Char, char16_t>::value) {
            char16_t* p = Reserve(text.size());
            if (!text.empty()) std::memcpy(p, text.data(), text.size() * sizeof(char16_t));
            m_end = p + text.size();
        } else {
            // At most three bytes per unit (a pair of units takes four).
            if (text.size() > SIZE_MAX / 3) throw _com_error(E_OUTOFMEMORY);
            m_end = Utf16ToUtf8(text, Reserve(3 * text.size()));
        }
    }
    void AppendAscii(const char* first, const char* last) {
        Char* p = Reserve(static_cast<std::size_t>(last - first));
        while (first != last) *p++ = static_cast<Char>(*first++);
        m_end = p;
    }

    const Char* data() const noexcept { return m_begin; }
    std::size_t size() const noexcept { return static_cast<std::size_t>(m_end - m_begin); }

  private:
    void Grow(std::size_t extra) {
        const std::size_t used = size();
        const std::size_t capacity =
            std::max(2 * static_cast<std::size_t>(m_limit - m_begin), used + extra);
        Char* grown = new (std::nothrow) Char[capacity];
        if (!grown) throw _com_error(E_OUTOFMEMORY);
        std::memcpy(grown, m_begin, used * sizeof(Char));
        m_heap.reset(grown);
        m_begin = grown;
        m_end = grown + used;
        m_limit = grown + capacity;
    }

    static constexpr std::size_t kLocalUnits = 4096 / sizeof(Char);
    Char m_local[kLocalUnits];
    std::unique_ptr<Char[]> m_heap;
    Char* m_begin = m_local;
    Char* m_end = m_local;
    Char* m_limit = m_local + kLocalUnits;
};

template <class Char>
void AppendInt(TextBuilder<Char>& out, long long value) {
    char buffer[24];
    auto result = std::to_chars(buffer, buffer + sizeof buffer, value);
    out.AppendAscii(buffer, result.ptr);
}

// "%.15g" leaves the '.' out of numbers such as 1e-005 or 100000000000000, and the reader takes
// a token without '.' for an integer: 1e-005 would come back as 1, 1e+015 as 1 and 1e14 as
// 2147483647. A ".0" in front of the exponent (or at the end) keeps such a double a double.
// Whole numbers within the integer range read back as the same number and keep their text.
char* KeepReadableAsDouble(char* first, char* last, double value) {
    if (std::find(first, last, '.') != last || !std::isfinite(value)) return last;
    char* exponent = std::find(first, last, 'e');
    if (exponent == last && value >= -2147483648.0 && value <= 2147483647.0) return last;
    std::memmove(exponent + 2, exponent, static_cast<std::size_t>(last - exponent));
    exponent[0] = '.';
    exponent[1] = '0';
    return last + 2;
}

template <class Char>
void AppendDouble(TextBuilder<Char>& out, double value) {
    char buffer[kDoubleTextCapacity + 2];
    out.AppendAscii(buffer, KeepReadableAsDouble(buffer, FormatDouble(value, buffer), value));
}

// The platform's text of a value; the empty text when it has none.
template <class Char>
void AppendPlatformText(TextBuilder<Char>& out, const VARIANT& value) {
    VARIANT text;
    VariantInit(&text);
    if (SUCCEEDED(VariantChangeType(&text, &value, 0, VT_BSTR))) {
        try {
            out.Append(BstrView(text.bstrVal));
        } catch (...) {
            VariantClear(&text);
            throw;
        }
    }
    VariantClear(&text);
}

template <class Char>
void AppendElement(TextBuilder<Char>& out, const VARIANT& element, ElementWriting writing,
                   bool quoteStrings) {
    switch (element.vt) {
        case VT_BSTR: {
            const std::u16string_view text = BstrView(element.bstrVal);
            // A string that holds a quote cannot be quoted faithfully (there is no escape); it is
            // written as it stands, which also keeps a host's pre-quoted text unchanged.
            const bool quote = quoteStrings && text.find(u'"') == std::u16string_view::npos;
            if (quote) out.Push('"');
            out.Append(text);
            if (quote) out.Push('"');
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

_bstr_t TakeText(_variant_t value) {
    if (value.vt != VT_BSTR) return static_cast<_bstr_t>(value);
    const VARIANT raw = value.Detach();
    return _bstr_t(raw.bstrVal, false);
}

bool IsFormatType(const KestCdfNormalizedString& formatType, std::u16string_view keyword) noexcept {
    return BstrView(formatType.m_string.m_str) == keyword;
}

namespace {

template <class Char>
int CountSpaces(bool numeric, std::basic_string_view<Char> text) noexcept {
    if (!numeric) return 0;
    std::size_t spaces = 0;
    for (Char c : text) spaces += c == Char(' ');  // branch-free, so that it vectorises
    // A BSTR is at most 2^31 units long, but keep the count in range whatever the view.
    return spaces >= static_cast<std::size_t>(INT_MAX) ? INT_MAX : static_cast<int>(spaces + 1);
}

}  // namespace

int CountValues(bool numeric, std::u16string_view text) noexcept {
    return CountSpaces(numeric, text);
}

int CountValues(bool numeric, std::string_view utf8) noexcept { return CountSpaces(numeric, utf8); }

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

namespace {

// The tokenizer over narrow text: one byte per UTF-16 unit, or UTF-8 as stored. Either way a
// byte outside ASCII is no white space, digit, sign, letter, '.' or space to any rule here or
// in the C library's parser (C locale), so it ends a number wherever it stands, as the
// placeholder of a narrowed unit does: a character is never part of a number, whatever the
// number of bytes it takes.
void FillNarrow(const char* const base, const std::size_t length, NumberTyping typing,
                VARIANT& array, ULONG count);

}  // namespace

void FillNumbers(std::u16string_view text, NumberTyping typing, VARIANT& array) {
    CheckArray(array);
    const ULONG count = array.parray->rgsabound[0].cElements;
    if (count == 0) return;

    // The whole text is narrowed in one pass (on the stack unless it is long) and the tokens
    // are parsed in place.
    const std::size_t length = text.size();
    char local[2048];
    std::unique_ptr<char[]> large;
    char* narrow = local;
    if (length > sizeof local) {
        large.reset(new (std::nothrow) char[length]);
        if (!large) throw _com_error(E_OUTOFMEMORY);
        narrow = large.get();
    }
    Narrow(text, narrow);
    FillNarrow(narrow, length, typing, array, count);
}

void FillNumbersUtf8(std::string_view utf8, NumberTyping typing, VARIANT& array) {
    CheckArray(array);
    const ULONG count = array.parray->rgsabound[0].cElements;
    if (count == 0) return;
    FillNarrow(utf8.data(), utf8.size(), typing, array, count);
}

namespace {

void FillNarrow(const char* const base, const std::size_t length, NumberTyping typing,
                VARIANT& array, ULONG count) {
    ArrayData data(array.parray);
    VARIANT* const elements = data.get();
    const bool wholeTextDouble =
        typing == NumberTyping::kWholeText && length != 0 && std::memchr(base, '.', length);

    ULONG k = 0;
    auto store = [&](std::size_t begin, std::size_t end) {
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
    // Tokens beyond the array's size are not parsed.
    std::size_t start = 0;
    std::size_t i = 1;
    while (i < length) {
        const void* space = std::memchr(base + i, ' ', length - i);
        if (!space) break;
        const std::size_t at = static_cast<std::size_t>(static_cast<const char*>(space) - base);
        store(start, at);
        if (k >= count) return;
        start = at + 1;
        i = at + 1;
    }
    store(start, length);
}

}  // namespace

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

namespace {

template <class Char>
void BuildValueList(TextBuilder<Char>& out, const VARIANT& stored, ElementWriting writing,
                    bool quoteStrings) {
    if (stored.vt == kArrayOfVariants && stored.parray) {
        SAFEARRAY* array = stored.parray;
        const long long n = array->rgsabound[0].cElements;
        const long long lowerBound = array->rgsabound[0].lLbound;
        ArrayData data(array);
        for (long long i = 0; i < n; ++i) {
            // Index i is fetched as an element index; one outside the bounds adds nothing.
            if (i < lowerBound || i - lowerBound >= n) continue;
            AppendElement(out, data.get()[i - lowerBound], writing, quoteStrings);
            if (i < n - 1) out.Push(' ');
        }
    }
}

}  // namespace

_variant_t FormatValueList(const VARIANT& stored, ElementWriting writing, bool quoteStrings) {
    TextBuilder<char16_t> out;
    BuildValueList(out, stored, writing, quoteStrings);
    if (out.size() > UINT_MAX / sizeof(OLECHAR)) throw _com_error(E_OUTOFMEMORY);
    BSTR text = SysAllocStringLen(out.data(), static_cast<UINT>(out.size()));
    if (!text) throw _com_error(E_OUTOFMEMORY);
    _variant_t result;
    result.vt = VT_BSTR;
    result.bstrVal = text;
    return result;
}

void FormatValueListUtf8(const VARIANT& stored, ElementWriting writing, bool quoteStrings,
                         const std::function<void(std::string_view)>& consume) {
    TextBuilder<char> out;
    BuildValueList(out, stored, writing, quoteStrings);
    consume(std::string_view(out.data(), out.size()));
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

namespace {

// The exponent is written with at least three digits, as the files have always had it.
char* WidenExponent(char* buffer, char* end) noexcept {
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

// The C library's own rounding at fifteen digits: exact, but several times slower than the
// shortest form, so kept for the values where the shortest digits cannot decide.
char* FormatDoubleExact(double value, char* buffer) noexcept {
    char* end =
        std::to_chars(buffer, buffer + kDoubleTextCapacity, value, std::chars_format::general, 15)
            .ptr;
    return WidenExponent(buffer, end);
}

constexpr int kPrecision = 15;

// Powers of ten that doubles hold exactly.
constexpr double kExactPowersOfTen[] = {1e0,  1e1,  1e2,  1e3,  1e4,  1e5,  1e6,  1e7,
                                        1e8,  1e9,  1e10, 1e11, 1e12, 1e13, 1e14, 1e15,
                                        1e16, 1e17, 1e18, 1e19, 1e20, 1e21, 1e22};
constexpr int kLargestExactPower = 22;

constexpr char kDigitPairs[] =
    "00010203040506070809101112131415161718192021222324252627282930313233343536373839"
    "40414243444546474849505152535455565758596061626364656667686970717273747576777879"
    "8081828384858687888990919293949596979899";

// "%g" layout of the significant digits d0.d1d2... times 10^exponent: positional when
// -4 <= exponent < 15, else with an exponent of three digits or more. `count` excludes
// trailing zeros.
char* WriteGeneral(char* out, bool negative, const char* digits, int count, int exponent) noexcept {
    if (negative) *out++ = '-';
    if (exponent < -4 || exponent >= kPrecision) {
        *out++ = digits[0];
        if (count > 1) {
            *out++ = '.';
            std::memcpy(out, digits + 1, static_cast<std::size_t>(count - 1));
            out += count - 1;
        }
        *out++ = 'e';
        *out++ = exponent < 0 ? '-' : '+';
        const int e = exponent < 0 ? -exponent : exponent;
        *out++ = static_cast<char>('0' + e / 100);
        *out++ = static_cast<char>('0' + e / 10 % 10);
        *out++ = static_cast<char>('0' + e % 10);
    } else if (exponent >= 0) {
        const int whole = exponent + 1;  // digits before the point
        if (count <= whole) {
            std::memcpy(out, digits, static_cast<std::size_t>(count));
            out += count;
            std::memset(out, '0', static_cast<std::size_t>(whole - count));
            out += whole - count;
        } else {
            std::memcpy(out, digits, static_cast<std::size_t>(whole));
            out += whole;
            *out++ = '.';
            std::memcpy(out, digits + whole, static_cast<std::size_t>(count - whole));
            out += count - whole;
        }
    } else {
        *out++ = '0';
        *out++ = '.';
        const int zeros = -exponent - 1;
        std::memset(out, '0', static_cast<std::size_t>(zeros));
        out += zeros;
        std::memcpy(out, digits, static_cast<std::size_t>(count));
        out += count;
    }
    return out;
}

// For a normal double the distance to its neighbours is below a unit in the fifteenth digit,
// so at most one fifteen-digit decimal reads back as the double, and when one does it is the
// correctly rounded fifteen-digit form: that is what printf writes.
//
// The quick way to find it: scale by an exact power of ten, round to an integer and check
// that the integer, scaled back (one correctly rounded operation), gives the value again.
// Values read from texts of up to fifteen digits, which is what files hold, all pass.
bool FormatScaled(double magnitude, bool negative, char*& out) noexcept {
    // The decimal exponent, from the binary one: floor(log10(2^e)) or one more.
    std::uint64_t bits;
    std::memcpy(&bits, &magnitude, sizeof bits);
    const int binaryExponent = static_cast<int>(bits >> 52) - 1023;  // normal: 2^e <= magnitude
    int exponent = (binaryExponent * 78913) >> 18;                   // floor(e * log10(2))
    const int scale = kPrecision - 1 - exponent;  // makes fifteen digits before the point
    if (scale < -kLargestExactPower + 1 || scale > kLargestExactPower) return false;
    double scaled =
        scale >= 0 ? magnitude * kExactPowersOfTen[scale] : magnitude / kExactPowersOfTen[-scale];
    int usedScale = scale;
    // The estimate is one too small when the value reaches the next power of ten (or rounds
    // to it). The scaling is not exact; a wrong guess only fails the check below.
    if (scaled >= 1e15 - 0.5) {
        ++exponent;
        --usedScale;
        if (usedScale < -kLargestExactPower) return false;
        scaled = usedScale >= 0 ? magnitude * kExactPowersOfTen[usedScale]
                                : magnitude / kExactPowersOfTen[-usedScale];
    }
    std::uint64_t integer = static_cast<std::uint64_t>(scaled + 0.5);
    const double back = usedScale >= 0
                            ? static_cast<double>(integer) / kExactPowersOfTen[usedScale]
                            : static_cast<double>(integer) * kExactPowersOfTen[-usedScale];
    if (back != magnitude) return false;
    if (integer >= 1000000000000000ull) {  // rounded up into the next decade: 10^15
        integer /= 10;
        ++exponent;
    }
    if (integer < 100000000000000ull) return false;  // not fifteen digits: leave it to the slow way
    char digits[kPrecision + 1];
    // Two digits at a time from two halves that fit 32 bits.
    std::uint32_t high = static_cast<std::uint32_t>(integer / 100000000u);  // 7 digits
    std::uint32_t low = static_cast<std::uint32_t>(integer % 100000000u);   // 8 digits
    for (int i = kPrecision - 1; i > 7; i -= 2) {
        std::memcpy(digits + i - 1, kDigitPairs + 2 * (low % 100), 2);
        low /= 100;
    }
    for (int i = 6; i > 0; i -= 2) {
        std::memcpy(digits + i - 1, kDigitPairs + 2 * (high % 100), 2);
        high /= 100;
    }
    digits[0] = static_cast<char>('0' + high);
    int count = kPrecision;
    while (count > 1 && digits[count - 1] == '0') --count;
    out = WriteGeneral(out, negative, digits, count, exponent);
    return true;
}

}  // namespace

char* FormatDouble(double value, char* buffer) noexcept {
    const double magnitude = std::fabs(value);
    if (magnitude < 1e15 && value == std::trunc(value) && !(value == 0.0 && std::signbit(value))) {
        // Whole numbers below 10^15 (axis points, counts) are written by "%.15g" as the plain
        // integer.
        return std::to_chars(buffer, buffer + kDoubleTextCapacity, static_cast<long long>(value))
            .ptr;
    }
    // Infinities, NaNs and subnormals: a subnormal's neighbours are so far apart, relative to
    // its size, that its shortest digits say nothing about its fifteenth digit.
    if (!(magnitude >= DBL_MIN && magnitude <= DBL_MAX)) {
        if (value == 0.0) {  // negative zero
            std::memcpy(buffer, "-0", 2);
            return buffer + 2;
        }
        return FormatDoubleExact(value, buffer);
    }
    const bool negative = std::signbit(value);
    char* out = buffer;
    if (FormatScaled(magnitude, negative, out)) return out;

    // Otherwise from the shortest digits that read back as the value (the closest such when
    // several are). With at most fifteen of them they are the fifteen-digit form (above).
    // With sixteen or seventeen, rounding the digit string gives the rounding of the exact
    // value unless the tail is exactly "5": a fifteen-digit rounding boundary strictly
    // between the value and its shortest digits would itself read back as the value while
    // being shorter, or as short and closer.
    char shortest[kDoubleTextCapacity];
    const char* const shortestEnd = std::to_chars(shortest, shortest + sizeof shortest, magnitude,
                                                  std::chars_format::scientific)
                                        .ptr;
    // Form: d[.ddd]e(+|-)dd[d]
    const char* p = shortest;
    char digits[20];
    int count = 0;
    digits[count++] = *p++;
    if (*p == '.') {
        ++p;
        while (*p != 'e') digits[count++] = *p++;
    }
    ++p;  // 'e'
    const bool negativeExponent = *p++ == '-';
    int exponent = 0;
    for (; p != shortestEnd; ++p) exponent = exponent * 10 + (*p - '0');
    if (negativeExponent) exponent = -exponent;

    if (count > kPrecision) {
        if (count == kPrecision + 1 && digits[kPrecision] == '5')
            return FormatDoubleExact(value, buffer);  // a tie in the digits; the binary decides
        const bool up = digits[kPrecision] >= '5';
        count = kPrecision;
        if (up) {
            int i = kPrecision - 1;
            while (i >= 0 && digits[i] == '9') digits[i--] = '0';
            if (i >= 0) {
                ++digits[i];
            } else {  // 9.99...9 became 10.00...0
                digits[0] = '1';
                ++exponent;
            }
        }
    }
    while (count > 1 && digits[count - 1] == '0') --count;
    return WriteGeneral(buffer, negative, digits, count, exponent);
}

}  // namespace detail
}  // namespace kest
