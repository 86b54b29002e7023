#pragma once
// Number text of the value lists: tokens read by the atoi and atof rules in the C locale, and
// doubles written as "%.15g" (or, where that text would read back as another number, as the
// shortest text that reads back exactly). One unit, so the reader and the writer agree.

#include <cstddef>

namespace kest {
namespace detail {

/// atoi in the C locale over [first, last): white space skipped, optional sign, decimal
/// digits, stopping at the first other character; 0 when there is no number. Values outside
/// the 32-bit range saturate at INT_MIN and INT_MAX.
int ParseInt(const char* first, const char* last) noexcept;

/// atof (strtod) in the C locale over [first, last): white space skipped, then a decimal or
/// hexadecimal floating-point number, "inf", "infinity", "nan" or "nan(...)" in any case,
/// stopping at the first character that does not fit; 0 when there is no number.
double ParseDouble(const char* first, const char* last) noexcept;

/// Room needed by FormatDouble.
constexpr std::size_t kDoubleTextCapacity = 32;
/// Writes printf "%.15g" of `value` in the C locale with an exponent of at least three digits
/// (1e+020, 1e-005); infinities and NaNs as printf writes them ("inf", "-inf", "nan",
/// "-nan"). `buffer` must hold kDoubleTextCapacity characters; returns the end of the text.
char* FormatDouble(double value, char* buffer) noexcept;

/// What one token of a value list gives.
struct TokenRead {
    bool isDouble = false;  ///< VT_R8 `number`; else VT_I4 `integer`
    int integer = 0;
    double number = 0.0;
    bool whole = false;     ///< a number was read and only white space follows it
    bool overflow = false;  ///< a finite text too large for a double, read as an infinity
};

/// Reads a token by the atoi rule. A number outside the 32-bit range is kept as the double of
/// its digits instead of saturating, so that it survives.
TokenRead ReadIntToken(const char* first, const char* last) noexcept;

/// Reads a token by the atof rule.
TokenRead ReadDoubleToken(const char* first, const char* last) noexcept;

/// True when the token, after white space and a sign, starts with "inf" or "nan" in any case:
/// a double by name, read as one whatever else the typing rule says.
bool NamesNonFinite(const char* first, const char* last) noexcept;

/// Writes a double as a value list writes it: the "%.15g" text where it reads back as the same
/// double, else the shortest text that does; with a ".0" before the exponent (or at the end)
/// where the text would otherwise read as an integer token of another value (1.0e-005,
/// 3000000000.0, -0.0). Infinities and NaNs as "inf", "-inf", "nan", "-nan", which the reader
/// takes back by name. `buffer` must hold kDoubleTextCapacity characters; returns the end.
char* WriteDouble(double value, char* buffer) noexcept;

}  // namespace detail
}  // namespace kest
