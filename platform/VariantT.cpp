#include "VariantT.h"

#include <climits>
#include <cstring>
#include <limits>

#include "ComError.h"

namespace kest {

namespace {

constexpr VARTYPE kVariantArray = VT_ARRAY | VT_VARIANT;

void Check(HRESULT hr) {
    if (FAILED(hr)) throw _com_error(hr);
}

BSTR CheckedAlloc(BSTR allocated) {
    if (!allocated) throw _com_error(E_OUTOFMEMORY);
    return allocated;
}

// Converts `value` to type vt into a new VARIANT that the caller must clear.
VARIANT Converted(const VARIANT& value, VARTYPE vt) {
    VARIANT result;
    VariantInit(&result);
    Check(VariantChangeType(&result, &value, 0, vt));
    return result;
}

LONG CheckedLong(long value) {
    if (value < std::numeric_limits<LONG>::min() || value > std::numeric_limits<LONG>::max()) {
        throw _com_error(DISP_E_OVERFLOW);
    }
    return static_cast<LONG>(value);
}

// Fills a cleared VARIANT with a 32-bit integer typed vt (VT_I4, VT_ERROR or VT_BOOL).
void SetLong(VARIANT& target, LONG value, VARTYPE vt) {
    switch (vt) {
        case VT_I4:
            target.lVal = value;
            break;
        case VT_ERROR:
            target.scode = value;
            break;
        case VT_BOOL:
            target.boolVal = value ? VARIANT_TRUE : VARIANT_FALSE;
            break;
        default:
            throw _com_error(E_INVALIDARG);
    }
    target.vt = vt;
}

bool ValuesEqual(const VARIANT& left, const VARIANT& right) noexcept;

bool ArraysEqual(SAFEARRAY* left, SAFEARRAY* right) noexcept {
    if (left == right) return true;
    if (!left || !right) return false;
    if (left->rgsabound[0].cElements != right->rgsabound[0].cElements ||
        left->rgsabound[0].lLbound != right->rgsabound[0].lLbound) {
        return false;
    }
    for (ULONG i = 0; i < left->rgsabound[0].cElements; ++i) {
        if (!ValuesEqual(left->pvData[i], right->pvData[i])) return false;
    }
    return true;
}

bool ValuesEqual(const VARIANT& left, const VARIANT& right) noexcept {
    if (left.vt != right.vt) return false;
    switch (left.vt) {
        case VT_EMPTY:
        case VT_NULL:
            return true;
        case VT_I2:
            return left.iVal == right.iVal;
        case VT_I4:
            return left.lVal == right.lVal;
        case VT_R4:
            return left.fltVal == right.fltVal;
        case VT_R8:
            return left.dblVal == right.dblVal;
        case VT_BSTR:
            return BstrView(left.bstrVal) == BstrView(right.bstrVal);
        case VT_ERROR:
            return left.scode == right.scode;
        case VT_BOOL:
            return left.boolVal == right.boolVal;
        case kVariantArray:
            return ArraysEqual(left.parray, right.parray);
        default:
            return false;
    }
}

}  // namespace

_variant_t::_variant_t() noexcept { VariantInit(this); }

_variant_t::_variant_t(const VARIANT& source) {
    VariantInit(this);
    Check(VariantCopy(this, &source));
}

_variant_t::_variant_t(const VARIANT* source) {
    if (!source) throw _com_error(E_POINTER);
    VariantInit(this);
    Check(VariantCopy(this, source));
}

_variant_t::_variant_t(const _variant_t& source) : tagVARIANT() {
    VariantInit(this);
    Check(VariantCopy(this, &source));
}

_variant_t::_variant_t(_variant_t&& source) noexcept : tagVARIANT(source) { VariantInit(&source); }

_variant_t::_variant_t(VARIANT& source, bool copy) {
    VariantInit(this);
    if (copy) {
        Check(VariantCopy(this, &source));
    } else {
        static_cast<VARIANT&>(*this) = source;
        VariantInit(&source);
    }
}

_variant_t::_variant_t(short value, VARTYPE vt) {
    VariantInit(this);
    if (vt == VT_I2) {
        iVal = value;
    } else if (vt == VT_BOOL) {
        boolVal = value ? VARIANT_TRUE : VARIANT_FALSE;
    } else {
        throw _com_error(E_INVALIDARG);
    }
    this->vt = vt;
}

_variant_t::_variant_t(int value, VARTYPE vt) {
    VariantInit(this);
    SetLong(*this, value, vt);
}

_variant_t::_variant_t(long value, VARTYPE vt) {
    VariantInit(this);
    SetLong(*this, CheckedLong(value), vt);
}

_variant_t::_variant_t(float value) {
    VariantInit(this);
    vt = VT_R4;
    fltVal = value;
}

_variant_t::_variant_t(double value, VARTYPE vt) {
    VariantInit(this);
    if (vt != VT_R8) throw _com_error(E_INVALIDARG);
    this->vt = VT_R8;
    dblVal = value;
}

_variant_t::_variant_t(bool value) {
    VariantInit(this);
    vt = VT_BOOL;
    boolVal = value ? VARIANT_TRUE : VARIANT_FALSE;
}

_variant_t::_variant_t(const _bstr_t& text) {
    VariantInit(this);
    bstrVal = text.copy();
    vt = VT_BSTR;
}

_variant_t::_variant_t(const OLECHAR* text) {
    VariantInit(this);
    bstrVal = text ? CheckedAlloc(SysAllocString(text)) : nullptr;
    vt = VT_BSTR;
}

_variant_t::_variant_t(const char* utf8) {
    VariantInit(this);
    bstrVal = utf8 ? CheckedAlloc(SysAllocStringFromUtf8(utf8)) : nullptr;
    vt = VT_BSTR;
}

_variant_t::_variant_t(const std::string& utf8) {
    VariantInit(this);
    bstrVal = CheckedAlloc(SysAllocStringFromUtf8(utf8));
    vt = VT_BSTR;
}

_variant_t::_variant_t(const std::u16string& text) {
    VariantInit(this);
    if (text.size() > UINT_MAX) throw _com_error(E_OUTOFMEMORY);
    bstrVal = CheckedAlloc(SysAllocStringLen(text.data(), static_cast<UINT>(text.size())));
    vt = VT_BSTR;
}

_variant_t::~_variant_t() {
    // A locked array cannot be freed; it is left to its lock holder.
    VariantClear(this);
}

_variant_t& _variant_t::operator=(const _variant_t& source) {
    return *this = static_cast<const VARIANT&>(source);
}

_variant_t& _variant_t::operator=(_variant_t&& source) noexcept {
    if (this != &source) {
        VariantClear(this);
        static_cast<VARIANT&>(*this) = static_cast<VARIANT&>(source);
        VariantInit(&source);
    }
    return *this;
}

_variant_t& _variant_t::operator=(const VARIANT& source) {
    // VariantCopy builds the copy before it clears the target, so a failure leaves this
    // value as it was, and assigning an element of this value's own array is safe.
    Check(VariantCopy(this, &source));
    return *this;
}

_variant_t& _variant_t::operator=(int value) {
    Clear();
    SetLong(*this, value, VT_I4);
    return *this;
}

_variant_t& _variant_t::operator=(long value) {
    LONG checked = CheckedLong(value);
    Clear();
    SetLong(*this, checked, VT_I4);
    return *this;
}

_variant_t& _variant_t::operator=(short value) {
    Clear();
    vt = VT_I2;
    iVal = value;
    return *this;
}

_variant_t& _variant_t::operator=(double value) {
    Clear();
    vt = VT_R8;
    dblVal = value;
    return *this;
}

_variant_t& _variant_t::operator=(float value) {
    Clear();
    vt = VT_R4;
    fltVal = value;
    return *this;
}

_variant_t& _variant_t::operator=(bool value) {
    Clear();
    vt = VT_BOOL;
    boolVal = value ? VARIANT_TRUE : VARIANT_FALSE;
    return *this;
}

_variant_t& _variant_t::operator=(const _bstr_t& text) {
    BSTR copy = text.copy();
    VARIANT replacement;
    VariantInit(&replacement);
    replacement.vt = VT_BSTR;
    replacement.bstrVal = copy;
    _variant_t owner(replacement, false);
    return *this = std::move(owner);
}

_variant_t& _variant_t::operator=(const OLECHAR* text) { return *this = _variant_t(text); }

_variant_t& _variant_t::operator=(const char* utf8) { return *this = _variant_t(utf8); }

_variant_t::operator short() const {
    if (vt == VT_I2) return iVal;
    return Converted(*this, VT_I2).iVal;
}

_variant_t::operator int() const {
    if (vt == VT_I4) return lVal;
    return Converted(*this, VT_I4).lVal;
}

_variant_t::operator long() const { return static_cast<int>(*this); }

_variant_t::operator float() const {
    if (vt == VT_R4) return fltVal;
    return Converted(*this, VT_R4).fltVal;
}

_variant_t::operator double() const {
    if (vt == VT_R8) return dblVal;
    return Converted(*this, VT_R8).dblVal;
}

_variant_t::operator bool() const {
    if (vt == VT_BOOL) return boolVal != VARIANT_FALSE;
    return Converted(*this, VT_BOOL).boolVal != VARIANT_FALSE;
}

_variant_t::operator _bstr_t() const {
    if (vt == VT_BSTR) return _bstr_t(bstrVal, true);
    VARIANT text = Converted(*this, VT_BSTR);
    return _bstr_t(text.bstrVal, false);
}

void _variant_t::ChangeType(VARTYPE type, const _variant_t* source) {
    Check(VariantChangeType(this, source ? source : this, 0, type));
}

void _variant_t::Clear() { Check(VariantClear(this)); }

void _variant_t::Attach(VARIANT& source) {
    Clear();
    static_cast<VARIANT&>(*this) = source;
    VariantInit(&source);
}

VARIANT _variant_t::Detach() {
    VARIANT result = *this;
    VariantInit(this);
    return result;
}

VARIANT* _variant_t::GetAddress() {
    Clear();
    return this;
}

bool _variant_t::operator==(const _variant_t& other) const noexcept {
    return ValuesEqual(*this, other);
}

}  // namespace kest
