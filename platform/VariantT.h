#pragma once
// _variant_t: a VARIANT that clears itself on destruction and deep-copies on copy.
// Failing conversions throw _com_error with the failure code.

#include <string>

#include "BstrT.h"
#include "Export.h"
#include "Variant.h"

namespace kest {

class KEST_API _variant_t : public tagVARIANT {
  public:
    _variant_t() noexcept;
    _variant_t(const VARIANT& source);
    _variant_t(const VARIANT* source);
    _variant_t(const _variant_t& source);
    _variant_t(_variant_t&& source) noexcept;
    /// Takes `source` over without copying when `copy` is false.
    _variant_t(VARIANT& source, bool copy);
    _variant_t(short value, VARTYPE vt = VT_I2);
    _variant_t(int value, VARTYPE vt = VT_I4);
    _variant_t(long value, VARTYPE vt = VT_I4);
    _variant_t(float value);
    _variant_t(double value, VARTYPE vt = VT_R8);
    _variant_t(bool value);
    _variant_t(const _bstr_t& text);
    _variant_t(const OLECHAR* text);
    _variant_t(const char* utf8);
    _variant_t(const std::string& utf8);
    _variant_t(const std::u16string& text);
    ~_variant_t();

    _variant_t& operator=(const _variant_t& source);
    _variant_t& operator=(_variant_t&& source) noexcept;
    _variant_t& operator=(const VARIANT& source);
    _variant_t& operator=(int value);
    _variant_t& operator=(long value);
    _variant_t& operator=(short value);
    _variant_t& operator=(double value);
    _variant_t& operator=(float value);
    _variant_t& operator=(bool value);
    _variant_t& operator=(const _bstr_t& text);
    _variant_t& operator=(const OLECHAR* text);
    _variant_t& operator=(const char* utf8);

    /// Conversions through VariantChangeType; a failure throws _com_error.
    operator short() const;
    operator int() const;
    operator long() const;
    operator float() const;
    operator double() const;
    operator bool() const;
    operator _bstr_t() const;

    /// Converts in place (or from `source` when given); throws _com_error on failure.
    void ChangeType(VARTYPE vt, const _variant_t* source = nullptr);
    /// Frees what the value holds; it becomes VT_EMPTY.
    void Clear();
    void Attach(VARIANT& source);
    VARIANT Detach();
    VARIANT& GetVARIANT() noexcept { return *this; }
    VARIANT* GetAddress();

    /// Equality of type and value (arrays: element by element).
    bool operator==(const _variant_t& other) const noexcept;
    bool operator!=(const _variant_t& other) const noexcept { return !(*this == other); }
};

}  // namespace kest
