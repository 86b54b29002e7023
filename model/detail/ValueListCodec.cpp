#include "ValueListCodec.h"

#include "../KestCdfReadWarnings.h"

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

template <class Char>
void AppendDouble(TextBuilder<Char>& out, double value) {
    char buffer[kDoubleTextCapacity];
    out.AppendAscii(buffer, WriteDouble(value, buffer));
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
                VARIANT& array, ULONG count, ReadWarningScope* warnings);

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
    FillNarrow(narrow, length, typing, array, count, nullptr);
}

void FillNumbersUtf8(std::string_view utf8, NumberTyping typing, VARIANT& array) {
    CheckArray(array);
    const ULONG count = array.parray->rgsabound[0].cElements;
    if (count == 0) return;
    FillNarrow(utf8.data(), utf8.size(), typing, array, count, ReadWarningScope::Current());
}

namespace {

// True when a token of the text names an infinity or a NaN: under whole-text typing such a
// token makes the text one of doubles, as a '.' does, so that the written forms "inf" and "nan"
// read back.
bool AnyTokenNamesNonFinite(const char* base, std::size_t length) noexcept {
    if (!std::memchr(base, 'n', length) && !std::memchr(base, 'N', length)) return false;
    std::size_t start = 0;
    for (std::size_t i = 0; i <= length; ++i) {
        if (i < length && (base[i] != ' ' || i == 0)) continue;
        if (NamesNonFinite(base + start, base + i)) return true;
        start = i + 1;
    }
    return false;
}

void Warn(ReadWarningScope& warnings, const char* first, const char* last, const TokenRead& read) {
    const char* kind = nullptr;
    if (read.overflow)
        kind = "overflow";
    else if (std::all_of(first, last, [](char c) { return c == ' ' || (c >= '\t' && c <= '\r'); }))
        kind = "empty";
    else if (!read.whole)
        kind = "partial";
    if (!kind) return;
    char text[kDoubleTextCapacity];
    const char* end = read.isDouble ? WriteDouble(read.number, text)
                                    : std::to_chars(text, text + sizeof text, read.integer).ptr;
    warnings.Add(first, last, std::string_view(text, static_cast<std::size_t>(end - text)), kind);
}

void FillNarrow(const char* const base, const std::size_t length, NumberTyping typing,
                VARIANT& array, ULONG count, ReadWarningScope* warnings) {
    ArrayData data(array.parray);
    VARIANT* const elements = data.get();
    const bool wholeTextDouble =
        typing == NumberTyping::kWholeText && length != 0 &&
        (std::memchr(base, '.', length) || AnyTokenNamesNonFinite(base, length));

    ULONG k = 0;
    auto store = [&](std::size_t begin, std::size_t end) {
        VARIANT& element = elements[k];
        if (element.vt != VT_EMPTY) VariantClear(&element);
        const char* const first = base + begin;
        const char* const last = base + end;
        bool asDouble = wholeTextDouble;
        if (typing == NumberTyping::kPerToken)
            asDouble = k == 0 || (end > begin && std::memchr(first, '.', end - begin)) ||
                       NamesNonFinite(first, last);
        const TokenRead read = asDouble ? ReadDoubleToken(first, last) : ReadIntToken(first, last);
        if (read.isDouble) {
            element.vt = VT_R8;
            element.dblVal = read.number;
        } else {
            element.vt = VT_I4;
            element.lVal = read.integer;
        }
        if (warnings && (!read.whole || read.overflow)) Warn(*warnings, first, last, read);
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

}  // namespace detail
}  // namespace kest
