#include "KestCdfNormalizedString.h"

#include <string>

namespace kest {

namespace {

// A verbatim copy of the text: null stays null, embedded zeros survive.
CComBSTR CopyOf(const _bstr_t& text) {
    CComBSTR copy;
    copy.Attach(text.copy());
    return copy;
}

}  // namespace

KestCdfNormalizedString::KestCdfNormalizedString(const _bstr_t& text) : m_string(CopyOf(text)) {}

KestCdfNormalizedString& KestCdfNormalizedString::operator=(const KestCdfNormalizedString& other) {
    if (m_string.m_str != other.m_string.m_str) {
        m_string.Empty();
        m_string.Attach(other.m_string.Copy());
    }
    return *this;
}

KestCdfNormalizedString& KestCdfNormalizedString::operator=(const _bstr_t& text) {
    CComBSTR value = IsValid(text) ? CopyOf(text) : CopyOf(ConvertString(text));
    m_string.Attach(value.Detach());
    return *this;
}

bool KestCdfNormalizedString::IsValid(const _bstr_t& text) {
    std::u16string_view view = text.View();
    return view.find(u'\n') == std::u16string_view::npos &&
           view.find(u'\r') == std::u16string_view::npos &&
           view.find(u'\t') == std::u16string_view::npos;
}

_bstr_t KestCdfNormalizedString::ConvertString(const _bstr_t& text) {
    std::u16string converted = text.ToU16String();
    for (char16_t& c : converted) {
        if (c == u'\n' || c == u'\r' || c == u'\t') c = u' ';
    }
    return _bstr_t(converted);
}

}  // namespace kest
