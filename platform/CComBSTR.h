#pragma once
// CComBSTR: owns one BSTR and deep-copies it. Allocation failure throws CAtlException.

#include <string>
#include <string_view>

#include "BStr.h"
#include "Export.h"

namespace kest {

class _bstr_t;

class KEST_API CComBSTR {
  public:
    CComBSTR() noexcept = default;
    /// A string of `length` zero characters.
    explicit CComBSTR(int length);
    CComBSTR(int length, const OLECHAR* text);
    CComBSTR(const OLECHAR* text);  // null gives a null string
    CComBSTR(const char* utf8);     // null gives a null string
    CComBSTR(std::u16string_view text);
    /// A copy of the text of a _bstr_t (null gives a null string).
    CComBSTR(const _bstr_t& text);
    explicit CComBSTR(const std::string& utf8);
    CComBSTR(const CComBSTR& other);
    CComBSTR(CComBSTR&& other) noexcept;
    ~CComBSTR();

    CComBSTR& operator=(const CComBSTR& other);
    CComBSTR& operator=(CComBSTR&& other) noexcept;
    CComBSTR& operator=(const OLECHAR* text);
    CComBSTR& operator=(const char* utf8);

    /// The owned BSTR (may be null).
    operator BSTR() const noexcept { return m_str; }
    BSTR* operator&() noexcept { return &m_str; }
    bool operator!() const noexcept { return m_str == nullptr; }

    /// Length in UTF-16 code units; 0 for null.
    unsigned int Length() const noexcept { return SysStringLen(m_str); }
    unsigned int ByteLength() const noexcept { return SysStringByteLen(m_str); }
    /// A new BSTR with a copy of the text (null for null); the caller frees it.
    BSTR Copy() const;
    HRESULT CopyTo(BSTR* target) const noexcept;
    void Attach(BSTR text) noexcept;
    BSTR Detach() noexcept;
    void Empty() noexcept;
    HRESULT Append(const CComBSTR& text);
    HRESULT Append(const OLECHAR* text);
    HRESULT Append(const OLECHAR* text, int length);
    HRESULT Append(const char* utf8);
    HRESULT Append(OLECHAR ch);
    HRESULT AppendBSTR(BSTR text);
    CComBSTR& operator+=(const CComBSTR& text);
    CComBSTR& operator+=(const OLECHAR* text);

    /// Ordinal comparisons; a null string equals the empty one.
    bool operator==(const CComBSTR& other) const noexcept;
    bool operator!=(const CComBSTR& other) const noexcept { return !(*this == other); }
    bool operator==(const OLECHAR* text) const noexcept;
    bool operator!=(const OLECHAR* text) const noexcept { return !(*this == text); }
    bool operator==(std::nullptr_t) const noexcept { return m_str == nullptr; }
    bool operator!=(std::nullptr_t) const noexcept { return m_str != nullptr; }
    bool operator<(const CComBSTR& other) const noexcept;

    /// Host conversions.
    std::u16string ToU16String() const { return std::u16string(BstrView(m_str)); }
    std::string ToString() const { return Utf16ToUtf8(BstrView(m_str)); }
    std::u16string_view View() const noexcept { return BstrView(m_str); }

    BSTR m_str = nullptr;
};

}  // namespace kest
