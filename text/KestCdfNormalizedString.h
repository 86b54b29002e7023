#pragma once
// KestCdfNormalizedString: the string type of the document model. Only the assignment from a
// _bstr_t applies the normalizedString rule (tab, line feed, carriage return become spaces);
// construction and copying keep the text verbatim.

#include "../platform/BstrT.h"
#include "../platform/CComBSTR.h"
#include "../platform/Export.h"

namespace kest {

class KEST_API KestCdfNormalizedString {
  public:
    /// Empty value (null string).
    KestCdfNormalizedString() = default;
    KestCdfNormalizedString(const KestCdfNormalizedString& other) = default;
    /// Verbatim copies.
    KestCdfNormalizedString(const CComBSTR& text) : m_string(text) {}
    KestCdfNormalizedString(const _bstr_t& text);
    ~KestCdfNormalizedString() = default;

    /// Verbatim copy; self-assignment leaves the text unchanged.
    KestCdfNormalizedString& operator=(const KestCdfNormalizedString& other);
    /// Normalising assignment: every tab, line feed and carriage return becomes one space.
    KestCdfNormalizedString& operator=(const _bstr_t& text);

    /// Host conversions (null reads as empty).
    std::string ToString() const { return m_string.ToString(); }
    std::u16string ToU16String() const { return m_string.ToU16String(); }

    /// The wrapped text; null means empty.
    CComBSTR m_string;

  private:
    static bool IsValid(const _bstr_t& text);
    static _bstr_t ConvertString(const _bstr_t& text);
};

}  // namespace kest
