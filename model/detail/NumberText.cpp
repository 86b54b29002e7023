#include "NumberText.h"

#include <locale.h>
#include <stdlib.h>
#include <algorithm>
#include <cfloat>
#include <charconv>
#include <climits>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <string>
#include <system_error>

namespace kest {
namespace detail {

namespace {
// The white-space set of isspace in the C locale; the host's locale must not change what a
// file means.
inline bool IsCSpace(char c) noexcept { return c == ' ' || (c >= '\t' && c <= '\r'); }

inline bool IsDigit(char c) noexcept { return c >= '0' && c <= '9'; }

inline char LowerAscii(char c) noexcept { return static_cast<char>(c | 0x20); }

// The rare forms (hexadecimal, infinities, NaNs, results out of range) go to the C library's
// own parser in the C locale, which is the reference these rules follow.
double ParseDoubleSlow(const char* first, const char* last, const char*& end) noexcept {
    static const locale_t cLocale = newlocale(LC_ALL_MASK, "C", static_cast<locale_t>(0));
    char small[64];
    std::string large;
    const std::size_t length = static_cast<std::size_t>(last - first);
    const char* text;
    if (length < sizeof small) {
        std::memcpy(small, first, length);
        small[length] = '\0';
        text = small;
    } else {
        try {
            large.assign(first, last);
        } catch (...) {
            end = first;
            return 0.0;  // no memory for a copy of an absurd token: read it as no number
        }
        text = large.c_str();
    }
    char* stop = nullptr;
    const double value = cLocale ? strtod_l(text, &stop, cLocale) : strtod(text, &stop);
    end = first + (stop - text);
    return value;
}

}  // namespace

int ParseInt(const char* first, const char* last) noexcept {
    while (first != last && IsCSpace(*first)) ++first;
    bool negative = false;
    if (first != last && (*first == '+' || *first == '-')) {
        negative = *first == '-';
        ++first;
    }
    // Stop growing just past the 32-bit range; the digits that follow only saturate further.
    constexpr long long kLimit = static_cast<long long>(INT_MAX) + 2;
    long long value = 0;
    for (; first != last && IsDigit(*first); ++first) {
        if (value < kLimit) value = value * 10 + (*first - '0');
    }
    if (negative) value = -value;
    if (value > INT_MAX) return INT_MAX;
    if (value < INT_MIN) return INT_MIN;
    return static_cast<int>(value);
}

namespace {

// ParseDouble, also telling where the number ends (`first` when there is none).
double ParseDoubleAt(const char* first, const char* last, const char*& end) noexcept {
    end = first;
    while (first != last && IsCSpace(*first)) ++first;
    if (first == last) return 0.0;
    const char* p = first;
    bool negative = false;
    if (*p == '+' || *p == '-') {
        negative = *p == '-';
        ++p;
    }
    if (p == last) return 0.0;
    if (IsDigit(*p) || *p == '.') {
        const bool hex = *p == '0' && last - p > 1 && LowerAscii(p[1]) == 'x';
        if (!hex) {
            double value = 0.0;
            const std::from_chars_result result =
                std::from_chars(p, last, value, std::chars_format::general);
            if (result.ec == std::errc()) {
                end = result.ptr;
                return negative ? -value : value;
            }
            if (result.ec == std::errc::invalid_argument) return 0.0;
            // Out of range: the C library decides between infinity, zero and a subnormal.
        }
        return ParseDoubleSlow(first, last, end);
    }
    const char c = LowerAscii(*p);
    if (c == 'i' || c == 'n') return ParseDoubleSlow(first, last, end);
    return 0.0;
}

// True when only white space stands in [first, last).
bool OnlySpace(const char* first, const char* last) noexcept {
    for (; first != last; ++first)
        if (!IsCSpace(*first)) return false;
    return true;
}

}  // namespace

double ParseDouble(const char* first, const char* last) noexcept {
    const char* end;
    return ParseDoubleAt(first, last, end);
}

bool NamesNonFinite(const char* first, const char* last) noexcept {
    while (first != last && IsCSpace(*first)) ++first;
    if (first != last && (*first == '+' || *first == '-')) ++first;
    if (last - first < 3) return false;
    const char a = LowerAscii(first[0]), b = LowerAscii(first[1]), c = LowerAscii(first[2]);
    return (a == 'i' && b == 'n' && c == 'f') || (a == 'n' && b == 'a' && c == 'n');
}

TokenRead ReadDoubleToken(const char* first, const char* last) noexcept {
    TokenRead read;
    read.isDouble = true;
    const char* end;
    read.number = ParseDoubleAt(first, last, end);
    read.whole = end != first && OnlySpace(end, last);
    read.overflow = std::isinf(read.number) && !NamesNonFinite(first, last);
    return read;
}

TokenRead ReadIntToken(const char* first, const char* last) noexcept {
    TokenRead read;
    const char* p = first;
    while (p != last && IsCSpace(*p)) ++p;
    const char* const sign = p;
    if (p != last && (*p == '+' || *p == '-')) ++p;
    const char* const digits = p;
    while (p != last && IsDigit(*p)) ++p;
    read.whole = p != digits && OnlySpace(p, last);
    read.integer = ParseInt(sign, p);
    // Saturated: the digits are kept as a double (strtod rounds them correctly).
    if (read.integer == INT_MAX || read.integer == INT_MIN) {
        const double wide = ParseDouble(sign, p);
        if (wide != static_cast<double>(read.integer)) {
            read.isDouble = true;
            read.number = wide;
            read.overflow = std::isinf(wide);
        }
    }
    return read;
}

namespace {

// The exponent is written with at least three digits, as the files have always had it.
char* WidenExponent(char* buffer, char* end) noexcept {
    char* e = static_cast<char*>(std::memchr(buffer, 'e', static_cast<std::size_t>(end - buffer)));
    if (!e) return end;
    char* digits = e + 2;  // past the exponent's sign
    const std::ptrdiff_t count = end - digits;
    if (count >= 3) return end;
    const std::ptrdiff_t shift = 3 - count;
    std::memmove(digits + shift, digits, static_cast<std::size_t>(count));
    std::memset(digits, '0', static_cast<std::size_t>(shift));
    return end + shift;
}

// The C library's own rounding at fifteen digits: exact, but several times slower than the
// shortest form, so kept for the values where the shortest digits cannot decide.
char* FormatDoubleExact(double value, char* buffer) noexcept {
    char* end =
        std::to_chars(buffer, buffer + kDoubleTextCapacity, value, std::chars_format::general, 15)
            .ptr;
    return WidenExponent(buffer, end);
}

constexpr int kPrecision = 15;

// Powers of ten that doubles hold exactly.
constexpr double kExactPowersOfTen[] = {1e0,  1e1,  1e2,  1e3,  1e4,  1e5,  1e6,  1e7,
                                        1e8,  1e9,  1e10, 1e11, 1e12, 1e13, 1e14, 1e15,
                                        1e16, 1e17, 1e18, 1e19, 1e20, 1e21, 1e22};
constexpr int kLargestExactPower = 22;

constexpr char kDigitPairs[] =
    "00010203040506070809101112131415161718192021222324252627282930313233343536373839"
    "40414243444546474849505152535455565758596061626364656667686970717273747576777879"
    "8081828384858687888990919293949596979899";

// "%g" layout of the significant digits d0.d1d2... times 10^exponent: positional when
// -4 <= exponent < 15, else with an exponent of three digits or more. `count` excludes
// trailing zeros.
char* WriteGeneral(char* out, bool negative, const char* digits, int count, int exponent) noexcept {
    if (negative) *out++ = '-';
    if (exponent < -4 || exponent >= kPrecision) {
        *out++ = digits[0];
        if (count > 1) {
            *out++ = '.';
            std::memcpy(out, digits + 1, static_cast<std::size_t>(count - 1));
            out += count - 1;
        }
        *out++ = 'e';
        *out++ = exponent < 0 ? '-' : '+';
        const int e = exponent < 0 ? -exponent : exponent;
        *out++ = static_cast<char>('0' + e / 100);
        *out++ = static_cast<char>('0' + e / 10 % 10);
        *out++ = static_cast<char>('0' + e % 10);
    } else if (exponent >= 0) {
        const int whole = exponent + 1;  // digits before the point
        if (count <= whole) {
            std::memcpy(out, digits, static_cast<std::size_t>(count));
            out += count;
            std::memset(out, '0', static_cast<std::size_t>(whole - count));
            out += whole - count;
        } else {
            std::memcpy(out, digits, static_cast<std::size_t>(whole));
            out += whole;
            *out++ = '.';
            std::memcpy(out, digits + whole, static_cast<std::size_t>(count - whole));
            out += count - whole;
        }
    } else {
        *out++ = '0';
        *out++ = '.';
        const int zeros = -exponent - 1;
        std::memset(out, '0', static_cast<std::size_t>(zeros));
        out += zeros;
        std::memcpy(out, digits, static_cast<std::size_t>(count));
        out += count;
    }
    return out;
}

// For a normal double the distance to its neighbours is below a unit in the fifteenth digit,
// so at most one fifteen-digit decimal reads back as the double, and when one does it is the
// correctly rounded fifteen-digit form: that is what printf writes.
//
// The quick way to find it: scale by an exact power of ten, round to an integer and check
// that the integer, scaled back (one correctly rounded operation), gives the value again.
// Values read from texts of up to fifteen digits, which is what files hold, all pass.
bool FormatScaled(double magnitude, bool negative, char*& out) noexcept {
    // The decimal exponent, from the binary one: floor(log10(2^e)) or one more.
    std::uint64_t bits;
    std::memcpy(&bits, &magnitude, sizeof bits);
    const int binaryExponent = static_cast<int>(bits >> 52) - 1023;  // normal: 2^e <= magnitude
    int exponent = (binaryExponent * 78913) >> 18;                   // floor(e * log10(2))
    const int scale = kPrecision - 1 - exponent;  // makes fifteen digits before the point
    if (scale < -kLargestExactPower + 1 || scale > kLargestExactPower) return false;
    double scaled =
        scale >= 0 ? magnitude * kExactPowersOfTen[scale] : magnitude / kExactPowersOfTen[-scale];
    int usedScale = scale;
    // The estimate is one too small when the value reaches the next power of ten (or rounds
    // to it). The scaling is not exact; a wrong guess only fails the check below.
    if (scaled >= 1e15 - 0.5) {
        ++exponent;
        --usedScale;
        if (usedScale < -kLargestExactPower) return false;
        scaled = usedScale >= 0 ? magnitude * kExactPowersOfTen[usedScale]
                                : magnitude / kExactPowersOfTen[-usedScale];
    }
    std::uint64_t integer = static_cast<std::uint64_t>(scaled + 0.5);
    const double back = usedScale >= 0
                            ? static_cast<double>(integer) / kExactPowersOfTen[usedScale]
                            : static_cast<double>(integer) * kExactPowersOfTen[-usedScale];
    if (back != magnitude) return false;
    if (integer >= 1000000000000000ull) {  // rounded up into the next decade: 10^15
        integer /= 10;
        ++exponent;
    }
    if (integer < 100000000000000ull) return false;  // not fifteen digits: leave it to the slow way
    char digits[kPrecision + 1];
    // Two digits at a time from two halves that fit 32 bits.
    std::uint32_t high = static_cast<std::uint32_t>(integer / 100000000u);  // 7 digits
    std::uint32_t low = static_cast<std::uint32_t>(integer % 100000000u);   // 8 digits
    for (int i = kPrecision - 1; i > 7; i -= 2) {
        std::memcpy(digits + i - 1, kDigitPairs + 2 * (low % 100), 2);
        low /= 100;
    }
    for (int i = 6; i > 0; i -= 2) {
        std::memcpy(digits + i - 1, kDigitPairs + 2 * (high % 100), 2);
        high /= 100;
    }
    digits[0] = static_cast<char>('0' + high);
    int count = kPrecision;
    while (count > 1 && digits[count - 1] == '0') --count;
    out = WriteGeneral(out, negative, digits, count, exponent);
    return true;
}

}  // namespace

namespace {

// Digits and decimal exponent of the shortest text that reads back as `magnitude` (finite, > 0).
int ShortestDigits(double magnitude, char* digits, int& exponent) noexcept {
    char text[kDoubleTextCapacity];
    const char* const end =
        std::to_chars(text, text + sizeof text, magnitude, std::chars_format::scientific).ptr;
    const char* p = text;
    int count = 0;
    digits[count++] = *p++;
    if (*p == '.') {
        ++p;
        while (*p != 'e') digits[count++] = *p++;
    }
    ++p;  // 'e'
    const bool negativeExponent = *p++ == '-';
    exponent = 0;
    for (; p != end; ++p) exponent = exponent * 10 + (*p - '0');
    if (negativeExponent) exponent = -exponent;
    return count;
}

// FormatDouble; `readsBack` tells whether the text is known to read back as the value (the
// whole-number and scaled paths check that as they go; the rounded shortest digits may not).
char* FormatDouble15(double value, char* buffer, bool& readsBack) noexcept {
    readsBack = true;
    const double magnitude = std::fabs(value);
    if (magnitude < 1e15 && value == std::trunc(value) && !(value == 0.0 && std::signbit(value))) {
        // Whole numbers below 10^15 (axis points, counts) are written by "%.15g" as the plain
        // integer.
        return std::to_chars(buffer, buffer + kDoubleTextCapacity, static_cast<long long>(value))
            .ptr;
    }
    // Infinities, NaNs and subnormals: a subnormal's neighbours are so far apart, relative to
    // its size, that its shortest digits say nothing about its fifteenth digit.
    if (!(magnitude >= DBL_MIN && magnitude <= DBL_MAX)) {
        if (value == 0.0) {  // negative zero
            std::memcpy(buffer, "-0", 2);
            return buffer + 2;
        }
        readsBack = false;
        return FormatDoubleExact(value, buffer);
    }
    const bool negative = std::signbit(value);
    char* out = buffer;
    if (FormatScaled(magnitude, negative, out)) return out;

    // Otherwise from the shortest digits that read back as the value (the closest such when
    // several are). With at most fifteen of them they are the fifteen-digit form (above).
    // With sixteen or seventeen, rounding the digit string gives the rounding of the exact
    // value unless the tail is exactly "5": a fifteen-digit rounding boundary strictly
    // between the value and its shortest digits would itself read back as the value while
    // being shorter, or as short and closer.
    char digits[20];
    int exponent = 0;
    int count = ShortestDigits(magnitude, digits, exponent);

    if (count > kPrecision) {
        readsBack = false;
        if (count == kPrecision + 1 && digits[kPrecision] == '5')
            return FormatDoubleExact(value, buffer);  // a tie in the digits; the binary decides
        const bool up = digits[kPrecision] >= '5';
        count = kPrecision;
        if (up) {
            int i = kPrecision - 1;
            while (i >= 0 && digits[i] == '9') digits[i--] = '0';
            if (i >= 0) {
                ++digits[i];
            } else {  // 9.99...9 became 10.00...0
                digits[0] = '1';
                ++exponent;
            }
        }
    }
    while (count > 1 && digits[count - 1] == '0') --count;
    return WriteGeneral(buffer, negative, digits, count, exponent);
}

}  // namespace

char* FormatDouble(double value, char* buffer) noexcept {
    bool readsBack;
    return FormatDouble15(value, buffer, readsBack);
}

namespace {

bool SameDouble(double a, double b) noexcept {
    return a == b && std::signbit(a) == std::signbit(b);
}

}  // namespace

char* WriteDouble(double value, char* buffer) noexcept {
    bool readsBack;
    char* last = FormatDouble15(value, buffer, readsBack);
    if (!std::isfinite(value)) return last;  // "inf", "-inf", "nan", "-nan": read back by name
    if (!readsBack && !SameDouble(ParseDouble(buffer, last), value)) {
        char digits[20];
        int exponent = 0;
        const int count = ShortestDigits(std::fabs(value), digits, exponent);
        last = WriteGeneral(buffer, std::signbit(value), digits, count, exponent);
    }
    // A text without '.' reads as an integer token where the typing decides so: keep it a
    // double unless the integer is the same number.
    if (std::find(buffer, last, '.') != last) return last;
    char* exponentMark = std::find(buffer, last, 'e');
    if (exponentMark == last && value >= -2147483648.0 && value <= 2147483647.0 &&
        !(value == 0.0 && std::signbit(value)))
        return last;
    std::memmove(exponentMark + 2, exponentMark, static_cast<std::size_t>(last - exponentMark));
    exponentMark[0] = '.';
    exponentMark[1] = '0';
    return last + 2;
}

}  // namespace detail
}  // namespace kest
