#include "CComBSTR.h"

#include <climits>
#include <cstdint>
#include <cstring>
#include <memory>
#include <utility>

#include "AtlException.h"
#include "BstrT.h"

namespace kest {

namespace {

BSTR CheckedAlloc(BSTR allocated) {
    if (!allocated) throw CAtlException(E_OUTOFMEMORY);
    return allocated;
}

BSTR AllocView(std::u16string_view text) {
    if (text.size() > UINT_MAX) throw CAtlException(E_OUTOFMEMORY);
    return CheckedAlloc(SysAllocStringLen(text.data(), static_cast<UINT>(text.size())));
}

// Byte-exact copy (an odd byte length survives); null for null.
BSTR CopyOf(BSTR text) noexcept {
    if (!text) return nullptr;
    return SysAllocStringByteLen(reinterpret_cast<const char*>(text), SysStringByteLen(text));
}

std::size_t ZeroTerminatedLength(const OLECHAR* text) noexcept {
    std::size_t length = 0;
    while (text[length]) ++length;
    return length;
}

}  // namespace

CComBSTR::CComBSTR(int length) {
    if (length < 0) throw CAtlException(E_INVALIDARG);
    if (length > 0) m_str = CheckedAlloc(SysAllocStringLen(nullptr, static_cast<UINT>(length)));
}

CComBSTR::CComBSTR(int length, const OLECHAR* text) {
    if (length < 0) throw CAtlException(E_INVALIDARG);
    if (length > 0) m_str = CheckedAlloc(SysAllocStringLen(text, static_cast<UINT>(length)));
}

CComBSTR::CComBSTR(const OLECHAR* text) {
    if (text) m_str = CheckedAlloc(SysAllocString(text));
}

CComBSTR::CComBSTR(const char* utf8) {
    if (utf8) m_str = CheckedAlloc(SysAllocStringFromUtf8(utf8));
}

CComBSTR::CComBSTR(std::u16string_view text) : m_str(AllocView(text)) {}

CComBSTR::CComBSTR(const _bstr_t& text)
    : m_str(static_cast<const OLECHAR*>(text) ? AllocView(text.View()) : nullptr) {}

CComBSTR::CComBSTR(const std::string& utf8) : m_str(CheckedAlloc(SysAllocStringFromUtf8(utf8))) {}

CComBSTR::CComBSTR(const CComBSTR& other) : m_str(other.Copy()) {}

CComBSTR::CComBSTR(CComBSTR&& other) noexcept : m_str(std::exchange(other.m_str, nullptr)) {}

CComBSTR::~CComBSTR() { SysFreeString(m_str); }

CComBSTR& CComBSTR::operator=(const CComBSTR& other) {
    if (m_str != other.m_str) {
        BSTR copy = other.Copy();
        SysFreeString(m_str);
        m_str = copy;
    }
    return *this;
}

CComBSTR& CComBSTR::operator=(CComBSTR&& other) noexcept {
    if (this != std::addressof(other)) {
        SysFreeString(m_str);
        m_str = std::exchange(other.m_str, nullptr);
    }
    return *this;
}

CComBSTR& CComBSTR::operator=(const OLECHAR* text) {
    if (text != m_str) {
        BSTR copy = text ? CheckedAlloc(SysAllocString(text)) : nullptr;
        SysFreeString(m_str);
        m_str = copy;
    }
    return *this;
}

CComBSTR& CComBSTR::operator=(const char* utf8) {
    BSTR copy = utf8 ? CheckedAlloc(SysAllocStringFromUtf8(utf8)) : nullptr;
    SysFreeString(m_str);
    m_str = copy;
    return *this;
}

BSTR CComBSTR::Copy() const {
    if (!m_str) return nullptr;
    return CheckedAlloc(CopyOf(m_str));
}

HRESULT CComBSTR::CopyTo(BSTR* target) const noexcept {
    if (!target) return E_POINTER;
    *target = CopyOf(m_str);
    if (m_str && !*target) return E_OUTOFMEMORY;
    return S_OK;
}

void CComBSTR::Attach(BSTR text) noexcept {
    if (text != m_str) {
        SysFreeString(m_str);
        m_str = text;
    }
}

BSTR CComBSTR::Detach() noexcept { return std::exchange(m_str, nullptr); }

void CComBSTR::Empty() noexcept {
    SysFreeString(m_str);
    m_str = nullptr;
}

HRESULT CComBSTR::Append(const CComBSTR& text) { return AppendBSTR(text.m_str); }

HRESULT CComBSTR::Append(const OLECHAR* text) {
    if (!text) return S_OK;
    std::size_t length = ZeroTerminatedLength(text);
    if (length > INT_MAX) return E_OUTOFMEMORY;
    return Append(text, static_cast<int>(length));
}

HRESULT CComBSTR::Append(const OLECHAR* text, int length) {
    if (!text || (m_str && length == 0)) return S_OK;
    if (length < 0) return E_INVALIDARG;
    std::uint64_t total = static_cast<std::uint64_t>(Length()) + static_cast<unsigned>(length);
    if (total > UINT_MAX) return E_OUTOFMEMORY;
    // `text` may point into m_str, so the old string is freed only after the copy.
    BSTR joined = SysAllocStringLen(nullptr, static_cast<UINT>(total));
    if (!joined) return E_OUTOFMEMORY;
    if (m_str) std::memcpy(joined, m_str, Length() * sizeof(OLECHAR));
    std::memcpy(joined + Length(), text, static_cast<std::size_t>(length) * sizeof(OLECHAR));
    SysFreeString(m_str);
    m_str = joined;
    return S_OK;
}

HRESULT CComBSTR::Append(const char* utf8) {
    if (!utf8) return S_OK;
    std::u16string wide = Utf8ToUtf16(utf8);
    if (wide.size() > INT_MAX) return E_OUTOFMEMORY;
    return Append(wide.data(), static_cast<int>(wide.size()));
}

HRESULT CComBSTR::Append(OLECHAR ch) { return Append(&ch, 1); }

HRESULT CComBSTR::AppendBSTR(BSTR text) {
    if (!text) return S_OK;
    UINT length = SysStringLen(text);
    if (length > INT_MAX) return E_OUTOFMEMORY;
    return Append(text, static_cast<int>(length));
}

CComBSTR& CComBSTR::operator+=(const CComBSTR& text) {
    HRESULT hr = AppendBSTR(text.m_str);
    if (FAILED(hr)) throw CAtlException(hr);
    return *this;
}

CComBSTR& CComBSTR::operator+=(const OLECHAR* text) {
    HRESULT hr = Append(text);
    if (FAILED(hr)) throw CAtlException(hr);
    return *this;
}

bool CComBSTR::operator==(const CComBSTR& other) const noexcept { return View() == other.View(); }

bool CComBSTR::operator==(const OLECHAR* text) const noexcept {
    std::u16string_view right = text ? std::u16string_view(text) : std::u16string_view();
    return View() == right;
}

bool CComBSTR::operator<(const CComBSTR& other) const noexcept { return View() < other.View(); }

}  // namespace kest
