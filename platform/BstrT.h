#pragma once
// _bstr_t: shares one reference-counted BSTR between copies and converts it on demand to
// UTF-8. Failures throw _com_error (E_OUTOFMEMORY).

#include <string>
#include <string_view>

#include "BStr.h"
#include "Export.h"

namespace kest {

class KEST_API _bstr_t {
  public:
    _bstr_t() noexcept = default;
    _bstr_t(const _bstr_t& other) noexcept;
    _bstr_t(_bstr_t&& other) noexcept;
    _bstr_t(const char* utf8);     // null gives a null string
    _bstr_t(const OLECHAR* text);  // null gives a null string
    _bstr_t(std::u16string_view text);
    _bstr_t(const std::string& utf8);
    _bstr_t(const std::u16string& text);
    /// Takes a copy of `text`, or takes ownership of it when `copy` is false.
    _bstr_t(BSTR text, bool copy);
    ~_bstr_t();

    _bstr_t& operator=(const _bstr_t& other) noexcept;
    _bstr_t& operator=(_bstr_t&& other) noexcept;
    _bstr_t& operator=(const char* utf8);
    _bstr_t& operator=(const OLECHAR* text);

    _bstr_t& operator+=(const _bstr_t& other);
    _bstr_t operator+(const _bstr_t& other) const;
    friend _bstr_t operator+(const char* left, const _bstr_t& right);
    friend _bstr_t operator+(const OLECHAR* left, const _bstr_t& right);

    /// The wide text (null for a null string).
    operator const OLECHAR*() const noexcept;
    operator OLECHAR*() const noexcept;
    /// The text as UTF-8, converted once and cached; null for a null string.
    operator const char*() const;
    operator char*() const;

    bool operator!() const noexcept;
    /// Ordinal comparisons; null equals empty.
    bool operator==(const _bstr_t& other) const noexcept;
    bool operator!=(const _bstr_t& other) const noexcept { return !(*this == other); }
    bool operator<(const _bstr_t& other) const noexcept;
    bool operator==(const OLECHAR* text) const noexcept;
    bool operator!=(const OLECHAR* text) const noexcept { return !(*this == text); }
    bool operator==(const char* utf8) const;
    bool operator!=(const char* utf8) const { return !(*this == utf8); }

    /// Length in UTF-16 code units; 0 for null.
    unsigned int length() const noexcept;
    /// A new BSTR copy (copy true) or the shared BSTR itself (copy false).
    BSTR copy(bool copy = true) const;
    /// The shared BSTR, owned by this object.
    BSTR GetBSTR() const noexcept;
    /// The BSTR for writing: a shared string is first copied, so that writes through the
    /// reference reach this object alone, and the cached UTF-8 form is dropped.
    BSTR& GetBSTR();
    /// Takes ownership of `text`, dropping this object's share of the old one.
    void Attach(BSTR text);
    /// Gives up the BSTR, which the caller now owns.
    BSTR Detach();
    void Assign(BSTR text);

    std::u16string_view View() const noexcept;
    std::u16string ToU16String() const { return std::u16string(View()); }
    std::string ToString() const { return Utf16ToUtf8(View()); }

  private:
    struct Data;
    Data* m_data = nullptr;
};

}  // namespace kest
