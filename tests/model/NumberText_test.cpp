// WriteDouble against the C library: the "%.15g" text wherever strtod reads it back as the same
// double (so files written before keep their bytes), else a text strtod reads back exactly.
#include <gtest/gtest.h>

#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <random>
#include <string>

#include "model/detail/NumberText.h"

namespace kest {
namespace detail {
namespace {

std::string Written(double value) {
    char buffer[kDoubleTextCapacity];
    return std::string(buffer, WriteDouble(value, buffer));
}

TEST(NumberText, WritesPrintfWhereItReadsBackElseAnExactText) {
    std::mt19937_64 random(20261207);
    for (int i = 0; i < 100000; ++i) {
        double value;
        const std::uint64_t bits = random();
        std::memcpy(&value, &bits, sizeof value);
        if (i % 2) value = std::ldexp(static_cast<double>(bits >> 11), -53) * 1e3;  // short ones
        if (!std::isfinite(value)) continue;
        char printf15[64];
        std::snprintf(printf15, sizeof printf15, "%.15g", value);
        const std::string text = Written(value);
        SCOPED_TRACE(printf15);
        const double back = std::strtod(text.c_str(), nullptr);
        ASSERT_EQ(std::signbit(value), std::signbit(back)) << text;
        ASSERT_EQ(value, back) << text;
        if (std::strtod(printf15, nullptr) != value) continue;
        // printf's text, with the exponent widened to three digits and ".0" where it has no '.'
        // and is no integer token of the same value.
        std::string expected = printf15;
        const std::size_t e = expected.find('e');
        if (e != std::string::npos && expected.size() - e == 4) expected.insert(e + 2, "0");
        if (expected.find('.') == std::string::npos &&
            (e != std::string::npos || std::fabs(value) > 2147483647.0 || value == 0.0 ||
             value < -2147483648.0))
            expected.insert(e == std::string::npos ? expected.size() : e, ".0");
        if (value == 0.0 && !std::signbit(value)) expected = "0";
        ASSERT_EQ(expected, text);
    }
}

}  // namespace
}  // namespace detail
}  // namespace kest
