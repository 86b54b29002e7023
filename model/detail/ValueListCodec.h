#pragma once
// The value list codec shared by KestCdfAxis and KestCdfCalItemValue: turns the text of an
// AXIS or VALUE element into an array of VARIANTs and back. The two classes differ in how they
// type numbers and how they write elements that are not strings; each passes its own rule.
//
// Numbers are read and written independently of the process locale ('.' is the decimal
// separator whatever the host sets).

#include <cstddef>
#include <functional>
#include <string_view>

#include "../../platform/Automation.h"
#include "../../text/KestCdfNormalizedString.h"
#include "NumberText.h"

namespace kest {
namespace detail {

/// Format type keywords; compared case-sensitively.
constexpr std::u16string_view kFormatNumeric = u"NUMERIC";
constexpr std::u16string_view kFormatString = u"STRING";
constexpr std::u16string_view kFormatLabel = u"LABEL";

/// How the tokens of a numeric text become VT_I4 or VT_R8 elements.
enum class NumberTyping {
    /// One decision for the whole text: a '.' anywhere makes every token a double, otherwise
    /// every token is an integer (axes).
    kWholeText,
    /// The first token is always a double; a later token is a double when it holds a '.',
    /// otherwise an integer (item values).
    kPerToken,
};

/// How elements other than strings and doubles are written.
enum class ElementWriting {
    /// Floats as "%.15g" of the widened value; integers in decimal, VT_EMPTY as 0 (axes).
    kAxis,
    /// The platform's text of the element; VT_EMPTY as the empty text (item values).
    kCalItemValue,
};

/// True when the format type is exactly `keyword`.
bool IsFormatType(const KestCdfNormalizedString& formatType, std::u16string_view keyword) noexcept;

/// The text of a value: a string's own text without a copy, else the platform's conversion to
/// a string. Throws _com_error when the value has no text form (an array, VT_NULL). The value
/// must outlive this object and stay unchanged.
class ValueText {
  public:
    explicit ValueText(const VARIANT& value);
    std::u16string_view View() const noexcept { return m_view; }

  private:
    _bstr_t m_converted;
    std::u16string_view m_view;
};

/// The text of a node's value as a _bstr_t: a string value's own string, taken over without a
/// copy; anything else converted by the platform (throws _com_error when it has no text form).
_bstr_t TakeText(_variant_t value);

/// A VT_BSTR value that lends `text` to a call taking a _variant_t, without copying it: the
/// text is neither copied nor freed, must outlive this object, and the callee must not change
/// the value.
class LentText {
  public:
    explicit LentText(BSTR text) noexcept {
        m_value.vt = VT_BSTR;
        m_value.bstrVal = text;
    }
    ~LentText() { m_value.Detach(); }
    LentText(const LentText&) = delete;
    LentText& operator=(const LentText&) = delete;
    const _variant_t& Get() const noexcept { return m_value; }

  private:
    _variant_t m_value;
};

/// The number of elements to allocate for a text: 0 unless `numeric`; else the number of
/// spaces plus 1 (1 for a text without spaces, the empty text included).
int CountValues(bool numeric, std::u16string_view text) noexcept;

/// CountValues of a text given as UTF-8 (spaces are single bytes: the same count).
int CountValues(bool numeric, std::string_view utf8) noexcept;

/// New VT_ARRAY|VT_VARIANT value of `count` VT_EMPTY elements, lower bound 0. Throws
/// _com_error(E_OUTOFMEMORY) when the array cannot be allocated.
_variant_t NewValueArray(ULONG count);

/// New one-element array holding a copy of `value`. Throws _com_error on failure.
_variant_t SingleValueArray(const VARIANT& value);

/// Splits `text` at spaces (a space in the first position is leading white space of the first
/// token, not a separator) and stores the tokens' numbers from index 0 of `array`
/// (VT_ARRAY|VT_VARIANT, elements VT_EMPTY). Tokens beyond the array's size are dropped;
/// elements no token reaches stay VT_EMPTY. Throws _com_error(E_INVALIDARG) when `array` is
/// no array of VARIANTs.
void FillNumbers(std::u16string_view text, NumberTyping typing, VARIANT& array);

/// FillNumbers of a text given as UTF-8 (the text's stored form in the DOM): the same elements
/// as FillNumbers of its UTF-16 form, without converting it.
void FillNumbersUtf8(std::string_view utf8, NumberTyping typing, VARIANT& array);

/// True when the text's first and last characters are both a double quote (a text of one
/// double quote counts; the empty text does not).
bool IsQuoted(std::u16string_view text) noexcept;

/// Resizes `array` (VT_ARRAY|VT_VARIANT) to the number of quoted strings in `text` and stores
/// them in order as VT_BSTR, quotes removed. Text outside a pair of quotes and a quote that is
/// never closed are ignored. Throws _com_error when memory runs out.
void PutQuotedStrings(std::u16string_view text, VARIANT& array);

/// The value text of a stored value: the elements in index order separated by one space; the
/// empty text for a value that is not VT_ARRAY|VT_VARIANT. An index the array cannot deliver
/// adds neither text nor separator.
///
/// With `quoteStrings` (format type "STRING") a string element without any double quote in it
/// is written between double quotes: the reader takes strings only from between quotes, so
/// unquoted strings would not survive being read back. A string holding a quote is written as
/// it stands. A double is written with "%.15g"; where that text has no '.' and would read back
/// as another number (an exponent form such as 1e-005, or a whole number beyond the 32-bit
/// range), ".0" goes before the exponent or at the end (1.0e-005).
_variant_t FormatValueList(const VARIANT& stored, ElementWriting writing, bool quoteStrings);

/// FormatValueList's text, byte for byte its UTF-8 form, handed to `consume` (valid for the
/// call only) without a detour through UTF-16: what the writers store in the DOM, which keeps
/// text as UTF-8. Throws _com_error when memory runs out.
void FormatValueListUtf8(const VARIANT& stored, ElementWriting writing, bool quoteStrings,
                         const std::function<void(std::string_view)>& consume);

}  // namespace detail
}  // namespace kest
