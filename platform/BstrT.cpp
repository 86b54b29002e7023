#include "BstrT.h"

#include <atomic>
#include <climits>
#include <cstdint>
#include <cstring>
#include <new>
#include <utility>

#include "ComError.h"

namespace kest {

// One shared string: the BSTR, its reference count and the UTF-8 form once someone asked
// for it. Copies of a _bstr_t share the Data; every change builds a new one (or works on
// the Data alone when no one else shares it).
struct _bstr_t::Data {
    explicit Data(BSTR owned) noexcept : wide(owned) {}
    ~Data() {
        SysFreeString(wide);
        delete[] narrow.load(std::memory_order_relaxed);
    }
    Data(const Data&) = delete;
    Data& operator=(const Data&) = delete;

    void DropNarrow() noexcept { delete[] narrow.exchange(nullptr, std::memory_order_acq_rel); }

    std::atomic<long> refs{1};
    BSTR wide;
    std::atomic<char*> narrow{nullptr};
};

namespace {

[[noreturn]] void ThrowOutOfMemory() { throw _com_error(E_OUTOFMEMORY); }

BSTR Checked(BSTR allocated) {
    if (!allocated) ThrowOutOfMemory();
    return allocated;
}

BSTR AllocView(std::u16string_view text) {
    if (text.size() > UINT_MAX) ThrowOutOfMemory();
    return Checked(SysAllocStringLen(text.data(), static_cast<UINT>(text.size())));
}

// The shared string, read without the unsharing that the non-const GetBSTR does.
BSTR WideOf(const _bstr_t& text) noexcept { return text.GetBSTR(); }

BSTR CopyOf(BSTR text) {
    if (!text) return nullptr;
    return Checked(
        SysAllocStringByteLen(reinterpret_cast<const char*>(text), SysStringByteLen(text)));
}

}  // namespace

namespace {

// Wraps an owned BSTR in a new Data; frees the BSTR if that fails. Null stays null.
template <class DataT>
DataT* Wrap(BSTR owned) {
    if (!owned) return nullptr;
    DataT* data = new (std::nothrow) DataT(owned);
    if (!data) {
        SysFreeString(owned);
        ThrowOutOfMemory();
    }
    return data;
}

template <class DataT>
void Unref(DataT* data) noexcept {
    if (data && data->refs.fetch_sub(1, std::memory_order_acq_rel) == 1) delete data;
}

}  // namespace

_bstr_t::_bstr_t(const _bstr_t& other) noexcept : m_data(other.m_data) {
    if (m_data) m_data->refs.fetch_add(1, std::memory_order_relaxed);
}

_bstr_t::_bstr_t(_bstr_t&& other) noexcept : m_data(std::exchange(other.m_data, nullptr)) {}

_bstr_t::_bstr_t(const char* utf8)
    : m_data(utf8 ? Wrap<Data>(Checked(SysAllocStringFromUtf8(utf8))) : nullptr) {}

_bstr_t::_bstr_t(const OLECHAR* text)
    : m_data(text ? Wrap<Data>(Checked(SysAllocString(text))) : nullptr) {}

_bstr_t::_bstr_t(std::u16string_view text) : m_data(Wrap<Data>(AllocView(text))) {}

_bstr_t::_bstr_t(const std::string& utf8)
    : m_data(Wrap<Data>(Checked(SysAllocStringFromUtf8(utf8)))) {}

_bstr_t::_bstr_t(const std::u16string& text) : m_data(Wrap<Data>(AllocView(text))) {}

_bstr_t::_bstr_t(BSTR text, bool copy) : m_data(Wrap<Data>(copy ? CopyOf(text) : text)) {}

_bstr_t::~_bstr_t() { Unref(m_data); }

_bstr_t& _bstr_t::operator=(const _bstr_t& other) noexcept {
    if (m_data != other.m_data) {
        if (other.m_data) other.m_data->refs.fetch_add(1, std::memory_order_relaxed);
        Unref(std::exchange(m_data, other.m_data));
    }
    return *this;
}

_bstr_t& _bstr_t::operator=(_bstr_t&& other) noexcept {
    if (this != &other) Unref(std::exchange(m_data, std::exchange(other.m_data, nullptr)));
    return *this;
}

_bstr_t& _bstr_t::operator=(const char* utf8) {
    _bstr_t replacement(utf8);
    std::swap(m_data, replacement.m_data);
    return *this;
}

_bstr_t& _bstr_t::operator=(const OLECHAR* text) {
    if (text != WideOf(*this)) {
        _bstr_t replacement(text);
        std::swap(m_data, replacement.m_data);
    }
    return *this;
}

_bstr_t& _bstr_t::operator+=(const _bstr_t& other) {
    BSTR left = WideOf(*this);
    BSTR right = WideOf(other);
    if (!left && !right) return *this;
    std::uint64_t total = static_cast<std::uint64_t>(SysStringLen(left)) + SysStringLen(right);
    if (total > UINT_MAX) ThrowOutOfMemory();
    BSTR joined = Checked(SysAllocStringLen(nullptr, static_cast<UINT>(total)));
    if (left) std::memcpy(joined, left, SysStringLen(left) * sizeof(OLECHAR));
    if (right) {
        std::memcpy(joined + SysStringLen(left), right, SysStringLen(right) * sizeof(OLECHAR));
    }
    Data* data = Wrap<Data>(joined);
    Unref(std::exchange(m_data, data));
    return *this;
}

_bstr_t _bstr_t::operator+(const _bstr_t& other) const {
    _bstr_t result(*this);
    result += other;
    return result;
}

KEST_API _bstr_t operator+(const char* left, const _bstr_t& right) {
    _bstr_t result(left);
    result += right;
    return result;
}

KEST_API _bstr_t operator+(const OLECHAR* left, const _bstr_t& right) {
    _bstr_t result(left);
    result += right;
    return result;
}

_bstr_t::operator const OLECHAR*() const noexcept { return GetBSTR(); }

_bstr_t::operator OLECHAR*() const noexcept { return GetBSTR(); }

_bstr_t::operator const char*() const { return static_cast<char*>(*this); }

_bstr_t::operator char*() const {
    if (!m_data || !m_data->wide) return nullptr;
    char* cached = m_data->narrow.load(std::memory_order_acquire);
    if (cached) return cached;
    std::string utf8;
    char* buffer = nullptr;
    try {
        utf8 = Utf16ToUtf8(BstrView(m_data->wide));
        buffer = new char[utf8.size() + 1];
    } catch (const std::bad_alloc&) {
        ThrowOutOfMemory();
    }
    std::memcpy(buffer, utf8.c_str(), utf8.size() + 1);
    // Two threads may convert at once; the first to publish wins.
    if (m_data->narrow.compare_exchange_strong(cached, buffer, std::memory_order_acq_rel)) {
        return buffer;
    }
    delete[] buffer;
    return cached;
}

bool _bstr_t::operator!() const noexcept { return GetBSTR() == nullptr; }

bool _bstr_t::operator==(const _bstr_t& other) const noexcept { return View() == other.View(); }

bool _bstr_t::operator<(const _bstr_t& other) const noexcept { return View() < other.View(); }

bool _bstr_t::operator==(const OLECHAR* text) const noexcept {
    return View() == (text ? std::u16string_view(text) : std::u16string_view());
}

bool _bstr_t::operator==(const char* utf8) const {
    if (!utf8) return View().empty();
    return View() == Utf8ToUtf16(utf8);
}

unsigned int _bstr_t::length() const noexcept { return SysStringLen(GetBSTR()); }

BSTR _bstr_t::copy(bool copy) const { return copy ? CopyOf(GetBSTR()) : GetBSTR(); }

BSTR _bstr_t::GetBSTR() const noexcept { return m_data ? m_data->wide : nullptr; }

BSTR& _bstr_t::GetBSTR() {
    // The caller may write through the reference, so this object needs a string of its own
    // and the cached UTF-8 form can no longer be trusted.
    if (!m_data) {
        m_data = new (std::nothrow) Data(nullptr);
        if (!m_data) ThrowOutOfMemory();
    } else if (m_data->refs.load(std::memory_order_acquire) > 1) {
        BSTR copy = CopyOf(m_data->wide);
        Data* own = new (std::nothrow) Data(copy);
        if (!own) {
            SysFreeString(copy);
            ThrowOutOfMemory();
        }
        Unref(std::exchange(m_data, own));
    } else {
        m_data->DropNarrow();
    }
    return m_data->wide;
}

void _bstr_t::Attach(BSTR text) {
    Data* data = Wrap<Data>(text);
    Unref(std::exchange(m_data, data));
}

BSTR _bstr_t::Detach() {
    if (!m_data) return nullptr;
    BSTR result;
    if (m_data->refs.load(std::memory_order_acquire) == 1) {
        result = std::exchange(m_data->wide, nullptr);
    } else {
        // Others still share the string: the caller gets a copy of its own.
        result = CopyOf(m_data->wide);
    }
    Unref(std::exchange(m_data, nullptr));
    return result;
}

void _bstr_t::Assign(BSTR text) {
    Data* data = Wrap<Data>(CopyOf(text));
    Unref(std::exchange(m_data, data));
}

std::u16string_view _bstr_t::View() const noexcept { return BstrView(GetBSTR()); }

}  // namespace kest
