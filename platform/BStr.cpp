#include "BStr.h"

#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <cstring>

namespace kest {

namespace {

// Layout of one BSTR block: a 4-byte byte count, the text, then two zero bytes (three when the
// byte count is odd, so that the code unit holding the last byte is followed by a full zero
// code unit). The BSTR points just past the count.
constexpr std::size_t kPrefix = sizeof(std::uint32_t);
constexpr std::size_t kTerminator = 3;
// Largest byte count whose block size still fits the 32-bit prefix arithmetic.
constexpr std::uint64_t kMaxBytes = 0xFFFFFFFFu - kPrefix - kTerminator - 8;

std::atomic<long> g_allocationCountdown{-1};

bool AllocationMustFail() noexcept {
    long countdown = g_allocationCountdown.load(std::memory_order_relaxed);
    if (countdown < 0) return false;
    // Only one thread may consume the failing allocation.
    while (countdown >= 0) {
        if (g_allocationCountdown.compare_exchange_weak(countdown, countdown - 1,
                                                        std::memory_order_relaxed)) {
            return countdown == 0;
        }
    }
    return false;
}

char* BlockOf(BSTR text) noexcept { return reinterpret_cast<char*>(text) - kPrefix; }

std::uint32_t StoredBytes(BSTR text) noexcept {
    std::uint32_t bytes;
    std::memcpy(&bytes, BlockOf(text), sizeof bytes);
    return bytes;
}

// An uninitialised BSTR of `bytes` bytes with its prefix and terminator in place.
BSTR AllocateBytes(std::uint64_t bytes) noexcept {
    if (bytes > kMaxBytes || AllocationMustFail()) return nullptr;
    char* block = static_cast<char*>(std::malloc(kPrefix + bytes + kTerminator));
    if (!block) return nullptr;
    std::uint32_t prefix = static_cast<std::uint32_t>(bytes);
    std::memcpy(block, &prefix, sizeof prefix);
    std::memset(block + kPrefix + bytes, 0, kTerminator);
    return reinterpret_cast<BSTR>(block + kPrefix);
}

// Shrinks a BSTR allocated for more code units than were written.
BSTR ShrinkTo(BSTR text, std::size_t units) noexcept {
    std::size_t bytes = units * sizeof(OLECHAR);
    char* block = BlockOf(text);
    std::uint32_t prefix = static_cast<std::uint32_t>(bytes);
    std::memcpy(block, &prefix, sizeof prefix);
    std::memset(block + kPrefix + bytes, 0, kTerminator);
    // Shrinking never fails in practice; if it does, the larger block is still valid.
    if (char* smaller = static_cast<char*>(std::realloc(block, kPrefix + bytes + kTerminator))) {
        block = smaller;
    }
    return reinterpret_cast<BSTR>(block + kPrefix);
}

std::size_t ZeroTerminatedLength(const OLECHAR* text) noexcept {
    const OLECHAR* end = text;
    while (*end) ++end;
    return static_cast<std::size_t>(end - text);
}

constexpr char16_t kReplacement = 0xFFFD;

bool IsContinuation(unsigned char byte) noexcept { return (byte & 0xC0u) == 0x80u; }

// True when the eight bytes at `p` are all ASCII.
inline bool EightAscii(const unsigned char* p) noexcept {
    std::uint64_t word;
    std::memcpy(&word, p, sizeof word);
    return (word & 0x8080808080808080ull) == 0;
}

// True when the four code units at `p` are all ASCII.
inline bool FourAscii(const char16_t* p) noexcept {
    std::uint64_t word;
    std::memcpy(&word, p, sizeof word);
    return (word & 0xFF80FF80FF80FF80ull) == 0;
}

// Decodes UTF-8 into `out`, which has room for at least utf8.size() code units (UTF-16 never
// needs more units than UTF-8 has bytes). Returns the number of units written.
//
// Ill-formed input follows the Unicode recommendation: each maximal subpart of an ill-formed
// sequence becomes one U+FFFD. A lead byte is checked against the range its second byte must
// be in (this catches overlongs, encoded surrogates and values above U+10FFFF at the second
// byte), so a bad second byte replaces the lead alone and decoding resumes at that byte.
std::size_t DecodeUtf8(std::string_view utf8, char16_t* out) noexcept {
    const unsigned char* p = reinterpret_cast<const unsigned char*>(utf8.data());
    const unsigned char* end = p + utf8.size();
    char16_t* o = out;
    while (p < end) {
        while (end - p >= 8 && EightAscii(p)) {
            for (int i = 0; i < 8; ++i) o[i] = p[i];
            o += 8;
            p += 8;
        }
        if (p == end) break;
        unsigned char lead = *p;
        if (lead < 0x80) {
            *o++ = lead;
            ++p;
            continue;
        }
        int trail;
        unsigned char low = 0x80, high = 0xBF;
        std::uint32_t code;
        if (lead >= 0xC2 && lead <= 0xDF) {
            trail = 1;
            code = lead & 0x1Fu;
        } else if (lead >= 0xE0 && lead <= 0xEF) {
            trail = 2;
            code = lead & 0x0Fu;
            if (lead == 0xE0)
                low = 0xA0;  // overlong
            else if (lead == 0xED)
                high = 0x9F;  // surrogates
        } else if (lead >= 0xF0 && lead <= 0xF4) {
            trail = 3;
            code = lead & 0x07u;
            if (lead == 0xF0)
                low = 0x90;  // overlong
            else if (lead == 0xF4)
                high = 0x8F;  // above U+10FFFF
        } else {
            // Stray continuation byte, overlong lead C0/C1, or F5..FF.
            *o++ = kReplacement;
            ++p;
            continue;
        }
        ++p;
        if (p == end || *p < low || *p > high) {
            *o++ = kReplacement;
            continue;
        }
        code = (code << 6) | (*p++ & 0x3Fu);
        int done = 1;
        while (done < trail && p < end && IsContinuation(*p)) {
            code = (code << 6) | (*p++ & 0x3Fu);
            ++done;
        }
        if (done < trail) {
            *o++ = kReplacement;
            continue;
        }
        if (code < 0x10000) {
            *o++ = static_cast<char16_t>(code);
        } else {
            code -= 0x10000;
            *o++ = static_cast<char16_t>(0xD800 + (code >> 10));
            *o++ = static_cast<char16_t>(0xDC00 + (code & 0x3FFu));
        }
    }
    return static_cast<std::size_t>(o - out);
}

}  // namespace

void SysFailAllocationAfter(long count) noexcept {
    g_allocationCountdown.store(count, std::memory_order_relaxed);
}

BSTR SysAllocString(const OLECHAR* text) noexcept {
    if (!text) return nullptr;
    std::size_t length = ZeroTerminatedLength(text);
    BSTR result = AllocateBytes(static_cast<std::uint64_t>(length) * sizeof(OLECHAR));
    if (result) std::memcpy(result, text, length * sizeof(OLECHAR));
    return result;
}

BSTR SysAllocStringLen(const OLECHAR* text, UINT length) noexcept {
    std::uint64_t bytes = static_cast<std::uint64_t>(length) * sizeof(OLECHAR);
    BSTR result = AllocateBytes(bytes);
    if (!result) return nullptr;
    if (text) {
        std::memmove(result, text, bytes);
    } else {
        std::memset(result, 0, bytes);
    }
    return result;
}

BSTR SysAllocStringByteLen(const char* data, UINT bytes) noexcept {
    BSTR result = AllocateBytes(bytes);
    if (!result) return nullptr;
    if (data) {
        std::memmove(result, data, bytes);
    } else {
        std::memset(result, 0, bytes);
    }
    return result;
}

void SysFreeString(BSTR text) noexcept {
    if (text) std::free(BlockOf(text));
}

bool SysReAllocString(BSTR* target, const OLECHAR* text) noexcept {
    if (!target) return false;
    // The new text may lie inside the old one, so the old block is freed last.
    BSTR copy = SysAllocString(text);
    if (text && !copy) return false;
    SysFreeString(*target);
    *target = copy;
    return true;
}

UINT SysStringLen(BSTR text) noexcept { return text ? StoredBytes(text) / sizeof(OLECHAR) : 0; }

UINT SysStringByteLen(BSTR text) noexcept { return text ? StoredBytes(text) : 0; }

HRESULT VarBstrCmp(BSTR left, BSTR right, LCID, ULONG) noexcept {
    int order = BstrView(left).compare(BstrView(right));
    if (order < 0) return VARCMP_LT;
    if (order > 0) return VARCMP_GT;
    return VARCMP_EQ;
}

std::u16string Utf8ToUtf16(std::string_view utf8) {
    std::u16string result(utf8.size(), u'\0');
    result.resize(DecodeUtf8(utf8, result.data()));
    return result;
}

char* Utf16ToUtf8(std::u16string_view utf16, char* out) noexcept {
    const char16_t* p = utf16.data();
    const char16_t* end = p + utf16.size();
    char* o = out;
    while (p < end) {
        if (end - p >= 4 && FourAscii(p)) {
            o[0] = static_cast<char>(p[0]);
            o[1] = static_cast<char>(p[1]);
            o[2] = static_cast<char>(p[2]);
            o[3] = static_cast<char>(p[3]);
            o += 4;
            p += 4;
            continue;
        }
        std::uint32_t code = *p++;
        if (code < 0x80) {
            *o++ = static_cast<char>(code);
            continue;
        }
        if (code >= 0xD800 && code <= 0xDFFF) {
            if (code <= 0xDBFF && p < end && *p >= 0xDC00 && *p <= 0xDFFF) {
                code = 0x10000 + ((code - 0xD800) << 10) + (*p - 0xDC00);
                ++p;
            } else {
                code = kReplacement;
            }
        }
        if (code < 0x800) {
            *o++ = static_cast<char>(0xC0 | (code >> 6));
            *o++ = static_cast<char>(0x80 | (code & 0x3F));
        } else if (code < 0x10000) {
            *o++ = static_cast<char>(0xE0 | (code >> 12));
            *o++ = static_cast<char>(0x80 | ((code >> 6) & 0x3F));
            *o++ = static_cast<char>(0x80 | (code & 0x3F));
        } else {
            *o++ = static_cast<char>(0xF0 | (code >> 18));
            *o++ = static_cast<char>(0x80 | ((code >> 12) & 0x3F));
            *o++ = static_cast<char>(0x80 | ((code >> 6) & 0x3F));
            *o++ = static_cast<char>(0x80 | (code & 0x3F));
        }
    }
    return o;
}

std::string Utf16ToUtf8(std::u16string_view utf16) {
    const char16_t* const end = utf16.data() + utf16.size();
    // Exact size first: one pass over the units is cheaper than growing the string.
    std::size_t size = 0;
    for (const char16_t* q = utf16.data(); q < end;) {
        if (end - q >= 4 && FourAscii(q)) {
            size += 4;
            q += 4;
            continue;
        }
        char16_t unit = *q++;
        if (unit < 0x80) {
            size += 1;
        } else if (unit < 0x800) {
            size += 2;
        } else if (unit >= 0xD800 && unit <= 0xDBFF && q < end && *q >= 0xDC00 && *q <= 0xDFFF) {
            size += 4;
            ++q;
        } else {
            size += 3;  // BMP character, or an unpaired surrogate written as U+FFFD
        }
    }
    std::string result(size, '\0');
    Utf16ToUtf8(utf16, result.data());
    return result;
}

BSTR SysAllocStringFromUtf8(std::string_view utf8) noexcept {
    BSTR result = AllocateBytes(static_cast<std::uint64_t>(utf8.size()) * sizeof(OLECHAR));
    if (!result) return nullptr;
    std::size_t units = DecodeUtf8(utf8, result);
    return units == utf8.size() ? result : ShrinkTo(result, units);
}

}  // namespace kest
