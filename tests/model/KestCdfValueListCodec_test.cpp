// The number reader and writer of the value list codec are checked against the C library in
// the C locale (the rules they promise), the tokenizer and the text builder on their own.
#include <gtest/gtest.h>

#include <locale.h>
#include <stdlib.h>
#include <climits>
#include <clocale>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <functional>
#include <limits>
#include <random>
#include <string>
#include <vector>

#include "model/detail/ValueListCodec.h"
#include "support/GermanLocale.h"

using namespace kest;
using namespace kest::detail;

namespace {

locale_t CLocale() {
    static const locale_t c = newlocale(LC_ALL_MASK, "C", static_cast<locale_t>(0));
    return c;
}

double ReferenceAtof(const std::string& token) {
    return strtod_l(token.c_str(), nullptr, CLocale());
}

// atoi, with the 32-bit narrowing made a saturation.
int ReferenceAtoi(const std::string& token) {
    long value = strtol_l(token.c_str(), nullptr, 10, CLocale());
    if (value > INT_MAX) return INT_MAX;
    if (value < INT_MIN) return INT_MIN;
    return static_cast<int>(value);
}

std::uint64_t Bits(double value) {
    std::uint64_t bits;
    std::memcpy(&bits, &value, sizeof bits);
    return bits;
}

// printf "%.15g" in the C locale, its exponent padded to three digits.
std::string ReferenceFormat(double value) {
    char buffer[64];
    std::snprintf(buffer, sizeof buffer, "%.15g", value);
    std::string text = buffer;
    std::size_t e = text.find('e');
    if (e != std::string::npos) {
        std::size_t digits = text.size() - (e + 2);
        if (digits < 3) text.insert(e + 2, 3 - digits, '0');
    }
    return text;
}

std::string Format(double value) {
    char buffer[kDoubleTextCapacity];
    return std::string(buffer, FormatDouble(value, buffer));
}

double Atof(const std::string& token) {
    return ParseDouble(token.data(), token.data() + token.size());
}
int Atoi(const std::string& token) { return ParseInt(token.data(), token.data() + token.size()); }

std::vector<std::string> TrickyTokens() {
    std::vector<std::string> tokens = {
        "",
        " ",
        "\t5",
        "\n\v\f\r7",
        "+",
        "-",
        "+-1",
        "-+1",
        ".",
        "-.",
        "+.e5",
        ".5",
        "5.",
        "-0",
        "+0.0",
        "-0.0e9",
        "1e",
        "1e+",
        "1e-",
        "1e-5",
        "1E5",
        "1e5x",
        "1.5e3.2",
        "1..2",
        "0x",
        "0x1p3",
        "0X1P-2",
        "-0x.8",
        "0x1p",
        "0xg",
        "0x1.fffffffffffff8p1023",
        "inf",
        "INF",
        "-Infinity",
        "infin",
        "infinityx",
        "in",
        "nan",
        "NaN(123)",
        "nan(",
        "nan()",
        "nan(a_b)",
        "-nan",
        "n",
        "1e400",
        "-1e400",
        "1e-400",
        "4.9e-324",
        "2.4703282292062328e-324",
        "2.2250738585072011e-308",
        "123456789012345678901234567890",
        "0.1",
        "9007199254740993",
        "1,5",
        "abc",
        "\x7f"
        "1",
        "00012",
        "1_000",
        "2147483647",
        "2147483648",
        "-2147483648",
        "-2147483649",
        "99999999999999999999",
        "-99999999999999999999",
        "  42abc",
        "1e5",
        "0.30000000000000004",
        "1.7976931348623157e308",
        "1.7976931348623159e308",
        "e5",
        "-e5",
        std::string("1\0"
                    "2",
                    3),
    };
    tokens.push_back(std::string(200, '0') + "1");
    tokens.push_back("1" + std::string(200, '0'));
    tokens.push_back("-" + std::string(300, '9'));
    tokens.push_back("0." + std::string(400, '0') + "123");
    tokens.push_back("0x" + std::string(300, 'f') + "p-1000");
    tokens.push_back(std::string(150, '1') + "." + std::string(150, '1') + "e-150");
    return tokens;
}

}  // namespace

TEST(KestCdfValueListCodec, ParsesTrickyTokensAsTheCLibraryDoes) {
    for (const std::string& token : TrickyTokens()) {
        SCOPED_TRACE("token \"" + token + "\"");
        EXPECT_EQ(Bits(ReferenceAtof(token)), Bits(Atof(token)));
        EXPECT_EQ(ReferenceAtoi(token), Atoi(token));
    }
}

TEST(KestCdfValueListCodec, ParsesRandomTokensAsTheCLibraryDoes) {
    static const char kAlphabet[] = "0123456789000111+-..eEeExXpPabcdfinINtyFa( )_\t\n";
    std::mt19937 random(20261206u);
    std::uniform_int_distribution<int> length(0, 14);
    std::uniform_int_distribution<int> pick(0, sizeof kAlphabet - 2);
    for (int i = 0; i < 200000; ++i) {
        std::string token;
        for (int n = length(random); n > 0; --n) token.push_back(kAlphabet[pick(random)]);
        const double expected = ReferenceAtof(token);
        const double actual = Atof(token);
        if (Bits(expected) != Bits(actual) || ReferenceAtoi(token) != Atoi(token)) {
            ADD_FAILURE() << "token \"" << token << "\": atof " << expected << " vs " << actual
                          << ", atoi " << ReferenceAtoi(token) << " vs " << Atoi(token);
            return;
        }
    }
}

TEST(KestCdfValueListCodec, ParsesRandomDecimalsExactly) {
    std::mt19937_64 random(42u);
    for (int i = 0; i < 100000; ++i) {
        double value;
        std::uint64_t bits = random();
        std::memcpy(&value, &bits, sizeof value);
        char text[64];
        std::snprintf(text, sizeof text, (i % 2) ? "%.17g" : "%.15g", value);
        ASSERT_EQ(Bits(ReferenceAtof(text)), Bits(Atof(text))) << text;
    }
}

TEST(KestCdfValueListCodec, IntegersOutside32BitsSaturate) {
    EXPECT_EQ(INT_MAX, Atoi("2147483648"));
    EXPECT_EQ(INT_MAX, Atoi("4294967297"));
    EXPECT_EQ(INT_MIN, Atoi("-2147483649"));
    EXPECT_EQ(INT_MIN, Atoi("-" + std::string(5000, '9')));
    EXPECT_EQ(INT_MAX, Atoi(std::string(5000, '9') + "x"));
}

TEST(KestCdfValueListCodec, FormatsLikePrintfWithThreeExponentDigits) {
    struct Row {
        double value;
        const char* text;
    } rows[] = {
        {1e20, "1e+020"},
        {1e-5, "1e-005"},
        {1e300, "1e+300"},
        {-1.5e-300, "-1.5e-300"},
        {0.1, "0.1"},
        {2.5, "2.5"},
        {3.0, "3"},
        {-0.0, "-0"},
        {123456789012345678.0, "1.23456789012346e+017"},
        {0.30000000000000004, "0.3"},
        {1e15, "1e+015"},
        {999999999999999.0, "999999999999999"},
        {0.0001, "0.0001"},
        {std::numeric_limits<double>::infinity(), "inf"},
        {-std::numeric_limits<double>::infinity(), "-inf"},
        {std::numeric_limits<double>::quiet_NaN(), "nan"},
        {-std::numeric_limits<double>::quiet_NaN(), "-nan"},
        {std::numeric_limits<double>::denorm_min(), "4.94065645841247e-324"},
        {1e-310, "9.99999999999997e-311"},
        {std::numeric_limits<double>::max(), "1.79769313486232e+308"},
        {std::numeric_limits<double>::min(), "2.2250738585072e-308"},
        {123456789012345.0, "123456789012345"},
        {1234567890123456.0, "1.23456789012346e+015"},
        {100000000000000.0, "100000000000000"},
        {0.000123, "0.000123"},
        {0.0000123, "1.23e-005"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.text);
        EXPECT_EQ(row.text, Format(row.value));
        EXPECT_EQ(ReferenceFormat(row.value), Format(row.value));
    }
}

TEST(KestCdfValueListCodec, FormatsRandomDoublesLikePrintf) {
    std::mt19937_64 random(7u);
    for (int i = 0; i < 100000; ++i) {
        double value;
        std::uint64_t bits = random();
        if (i % 3 == 0) bits &= 0x800FFFFFFFFFFFFFull | (std::uint64_t(1000 + i % 100) << 52);
        std::memcpy(&value, &bits, sizeof value);
        ASSERT_EQ(ReferenceFormat(value), Format(value)) << std::hexfloat << value;
    }
}

TEST(KestCdfValueListCodec, FormatsRandomShortDecimalsLikePrintf) {
    // Doubles read from texts of up to 17 digits at every magnitude, the values files hold.
    std::mt19937_64 random(11u);
    std::uniform_int_distribution<int> digits(1, 17);
    std::uniform_int_distribution<int> exponent(-30, 30);
    for (int i = 0; i < 200000; ++i) {
        char text[64];
        std::uint64_t mantissa = random() % 100000000000000000ull;
        if (i % 2) mantissa %= 1000;
        std::snprintf(text, sizeof text, "%s%.*llue%d", (i % 3) ? "" : "-", digits(random),
                      static_cast<unsigned long long>(mantissa), exponent(random));
        const double value = ReferenceAtof(text);
        ASSERT_EQ(ReferenceFormat(value), Format(value)) << text;
    }
}

// The formatter takes the fifteen digits from a scaled integer or from the shortest digits
// that read back, and falls back to exact rounding only on ties; every family of values where
// those shortcuts could go wrong is compared with printf bit for bit.
TEST(KestCdfValueListCodec, FormatsMillionsOfDoublesExactlyLikePrintf) {
    std::mt19937_64 random(20261206u);
    auto fromText = [](const char* text) { return ReferenceAtof(text); };
    auto withNeighbours = [](double value, const std::function<void(double)>& check) {
        check(value);
        check(-value);
        check(std::nextafter(value, 0.0));
        check(std::nextafter(value, std::numeric_limits<double>::infinity()));
    };
    struct Family {
        const char* name;
        std::function<void(const std::function<void(double)>&)> generate;
    } families[] = {
        {"any bit pattern",
         [&](const auto& check) {
             for (int i = 0; i < 3000000; ++i) {
                 const std::uint64_t bits = random();
                 double value;
                 std::memcpy(&value, &bits, sizeof value);
                 check(value);
             }
         }},
        {"any mantissa between 1e-12 and 1e21",
         [&](const auto& check) {
             for (int i = 0; i < 1000000; ++i) {
                 std::uint64_t bits = random() & 0x800FFFFFFFFFFFFFull;
                 bits |= std::uint64_t(1023 - 40 + random() % 110) << 52;
                 double value;
                 std::memcpy(&value, &bits, sizeof value);
                 check(value);
             }
         }},
        {"k/255 times powers of ten",
         [&](const auto& check) {
             for (int e = -25; e <= 25; ++e)
                 for (int k = 0; k <= 255 * 20; ++k) check(k / 255.0 * std::pow(10.0, e));
         }},
        {"fifteen-digit texts read back, and their neighbours",
         [&](const auto& check) {
             for (int e = -25; e <= 25; ++e)
                 for (int k = 0; k <= 2000; ++k) {
                     char text[64];
                     std::snprintf(text, sizeof text, "%.15g",
                                   k * (100.0 / 255) * std::pow(10.0, e));
                     withNeighbours(fromText(text), check);
                 }
         }},
        {"integers of every size",
         [&](const auto& check) {
             for (int i = 0; i < 250000; ++i)
                 check(static_cast<double>(static_cast<std::int64_t>(random() >> (random() % 64))));
         }},
        {"powers of ten and their neighbours",
         [&](const auto& check) {
             for (int e = -323; e <= 308; ++e) {
                 char text[16];
                 std::snprintf(text, sizeof text, "1e%d", e);
                 withNeighbours(fromText(text), check);
             }
         }},
        {"sixteen digits ending in 5 (ties in the digits), and their neighbours",
         [&](const auto& check) {
             for (int i = 0; i < 250000; ++i) {
                 char text[64];
                 const unsigned long long digits =
                     100000000000000ull + random() % 900000000000000ull;
                 const int exponent = i % 4 ? static_cast<int>(random() % 80) - 40
                                            : static_cast<int>(random() % 600) - 300;
                 std::snprintf(text, sizeof text, "%llu5e%d", digits, exponent);
                 withNeighbours(fromText(text), check);
             }
         }},
        {"subnormals",
         [&](const auto& check) {
             for (int i = 0; i < 100000; ++i) {
                 const std::uint64_t bits = random() & 0x800FFFFFFFFFFFFFull;
                 double value;
                 std::memcpy(&value, &bits, sizeof value);
                 check(value);
             }
         }},
    };
    for (const Family& family : families) {
        SCOPED_TRACE(family.name);
        long failures = 0;
        family.generate([&](double value) {
            if (failures > 10) return;
            const std::string expected = ReferenceFormat(value);
            const std::string actual = Format(value);
            if (expected != actual) {
                ++failures;
                ADD_FAILURE() << std::hexfloat << value << ": printf " << expected << ", got "
                              << actual;
            }
        });
    }
}

TEST(KestCdfValueListCodec, CountsSpacesOnlyForNumericText) {
    struct Row {
        bool numeric;
        std::u16string text;
        int count;
    } rows[] = {
        {true, u"", 1},        {true, u"1", 1},      {true, u"1 2 3", 3},
        {true, u" 1 2", 3},    {true, u"1  2", 3},   {true, u"1 2 ", 3},
        {true, u"1\t2\n3", 1}, {false, u"1 2 3", 0}, {false, u"", 0},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(std::string(row.text.begin(), row.text.end()));
        EXPECT_EQ(row.count, CountValues(row.numeric, row.text));
    }
}

namespace {

std::vector<_variant_t> Elements(const VARIANT& array) {
    std::vector<_variant_t> result;
    for (LONG i = 0; i < static_cast<LONG>(array.parray->rgsabound[0].cElements); ++i) {
        _variant_t element;
        EXPECT_EQ(S_OK, SafeArrayGetElement(array.parray, &i, &element));
        result.push_back(element);
    }
    return result;
}

}  // namespace

TEST(KestCdfValueListCodec, TokensOfAnyLengthParseByTheirLeadingCharacters) {
    const std::string zeros(300, '0');
    const std::u16string text = u"0" + std::u16string(zeros.begin(), zeros.end()) + u"7 " + u"1" +
                                std::u16string(zeros.begin(), zeros.end()) + u" 5";
    _variant_t array = NewValueArray(3);
    FillNumbers(text, NumberTyping::kWholeText, array);
    std::vector<_variant_t> elements = Elements(array);
    ASSERT_EQ(3u, elements.size());
    EXPECT_EQ(VT_I4, elements[0].vt);
    EXPECT_EQ(7, elements[0].lVal);
    EXPECT_EQ(VT_R8, elements[1].vt);  // beyond 32 bits: kept as a double
    EXPECT_EQ(1e300, elements[1].dblVal);
    EXPECT_EQ(5, elements[2].lVal);

    _variant_t doubles = NewValueArray(2);
    FillNumbers(u"1." + std::u16string(1000, u'5') + u" 0." + std::u16string(500, u'0') + u"1",
                NumberTyping::kWholeText, doubles);
    elements = Elements(doubles);
    EXPECT_EQ(VT_R8, elements[0].vt);
    EXPECT_DOUBLE_EQ(1.5555555555555556, elements[0].dblVal);
    EXPECT_EQ(VT_R8, elements[1].vt);
    EXPECT_EQ(0.0, elements[1].dblVal);  // 1e-501 underflows, as strtod has it
}

TEST(KestCdfValueListCodec, CharactersOutsideAsciiEndANumber) {
    _variant_t array = NewValueArray(3);
    FillNumbers(u"12\u00B34 \uFF15 7\u00A0", NumberTyping::kWholeText, array);
    std::vector<_variant_t> elements = Elements(array);
    EXPECT_EQ(12, elements[0].lVal);
    EXPECT_EQ(0, elements[1].lVal);
    EXPECT_EQ(7, elements[2].lVal);
}

TEST(KestCdfValueListCodec, TokensBeyondTheArrayAreDropped) {
    _variant_t array = NewValueArray(2);
    FillNumbers(u"1 2 3 4", NumberTyping::kPerToken, array);
    std::vector<_variant_t> elements = Elements(array);
    ASSERT_EQ(2u, elements.size());
    EXPECT_EQ(VT_R8, elements[0].vt);
    EXPECT_EQ(VT_I4, elements[1].vt);
    EXPECT_EQ(2, elements[1].lVal);
}

TEST(KestCdfValueListCodec, SplitsQuotedStrings) {
    struct Row {
        std::u16string text;
        std::vector<std::u16string> strings;
    } rows[] = {
        {u"\"a b\" \"c\"", {u"a b", u"c"}},
        {u"x\"a\"y\"\"z", {u"a", u""}},
        {u"\"open", {}},
        {u"\"a\" \"b", {u"a"}},
        {u"no quotes", {}},
        {u"\"", {}},
        {u"\"\"\"\"", {u"", u""}},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(std::string(row.text.begin(), row.text.end()));
        _variant_t array = NewValueArray(0);
        PutQuotedStrings(row.text, array);
        std::vector<_variant_t> elements = Elements(array);
        ASSERT_EQ(row.strings.size(), elements.size());
        for (std::size_t i = 0; i < elements.size(); ++i) {
            EXPECT_EQ(VT_BSTR, elements[i].vt);
            EXPECT_EQ(row.strings[i], std::u16string(BstrView(elements[i].bstrVal)));
        }
    }
}

TEST(KestCdfValueListCodec, RejectsATargetThatIsNoArray) {
    _variant_t number(1.0);
    EXPECT_THROW(FillNumbers(u"1", NumberTyping::kPerToken, number), _com_error);
    EXPECT_THROW(PutQuotedStrings(u"\"a\"", number), _com_error);
}

TEST(KestCdfValueListCodec, WritesElementsByEachClassRule) {
    _variant_t array = NewValueArray(7);
    VARIANT* data = nullptr;
    ASSERT_EQ(S_OK, SafeArrayAccessData(array.parray, reinterpret_cast<void**>(&data)));
    data[0].vt = VT_R8, data[0].dblVal = 1e20;
    data[1].vt = VT_R4, data[1].fltVal = 0.1f;
    data[2].vt = VT_I4, data[2].lVal = -42;
    data[3].vt = VT_BSTR, data[3].bstrVal = SysAllocString(u"a b");
    data[4].vt = VT_EMPTY;
    data[5].vt = VT_I2, data[5].iVal = 7;
    data[6].vt = VT_BOOL, data[6].boolVal = VARIANT_TRUE;
    ASSERT_EQ(S_OK, SafeArrayUnaccessData(array.parray));

    _variant_t axis = FormatValueList(array, ElementWriting::kAxis, false);
    ASSERT_EQ(VT_BSTR, axis.vt);
    EXPECT_EQ(u"1.0e+020 0.10000000149011612 -42 a b 0 7 -1",
              std::u16string(BstrView(axis.bstrVal)));
    _variant_t item = FormatValueList(array, ElementWriting::kCalItemValue, false);
    EXPECT_EQ(u"1.0e+020 0.1 -42 a b  7 True", std::u16string(BstrView(item.bstrVal)));
}

TEST(KestCdfValueListCodec, LongListsAreWrittenAndReadWhole) {
    // Far longer than any fixed buffer, so that the text grows on the heap, once of it in one
    // step larger than doubling.
    constexpr LONG kNumbers = 3000;
    const std::u16string longString(20000, u'x');
    _variant_t array = NewValueArray(kNumbers + 1);
    std::string expected;
    std::vector<double> numbers;
    VARIANT* data = nullptr;
    ASSERT_EQ(S_OK, SafeArrayAccessData(array.parray, reinterpret_cast<void**>(&data)));
    for (LONG i = 0; i < kNumbers; ++i) {
        if (i % 3 == 1) {
            data[i].vt = VT_I4;
            data[i].lVal = -i;
            expected += std::to_string(-i);
            numbers.push_back(-i);
        } else {
            data[i].vt = VT_R8;
            // Values whose "%.15g" text reads back, so that it is the text written.
            data[i].dblVal =
                ReferenceAtof(ReferenceFormat((i + 0.25) * (100.0 / 255) * (i % 3 ? 1e-9 : 1.0)));
            expected += ReferenceFormat(data[i].dblVal);
            numbers.push_back(ReferenceAtof(ReferenceFormat(data[i].dblVal)));
        }
        expected += ' ';
    }
    data[kNumbers].vt = VT_BSTR;
    data[kNumbers].bstrVal = SysAllocStringLen(longString.data(), longString.size());
    ASSERT_EQ(S_OK, SafeArrayUnaccessData(array.parray));

    _variant_t text = FormatValueList(array, ElementWriting::kAxis, true);
    const std::u16string_view written = BstrView(text.bstrVal);
    const std::u16string expectedText =
        std::u16string(expected.begin(), expected.end()) + u'"' + longString + u'"';
    ASSERT_EQ(expectedText, written);

    // Read back: the numbers' part as one text, narrowed in one piece.
    const std::u16string_view numbersText = written.substr(0, expected.size() - 1);
    _variant_t back = NewValueArray(static_cast<ULONG>(CountValues(true, numbersText)));
    FillNumbers(numbersText, NumberTyping::kPerToken, back);
    const std::vector<_variant_t> elements = Elements(back);
    ASSERT_EQ(numbers.size(), elements.size());
    for (std::size_t i = 0; i < elements.size(); ++i) {
        SCOPED_TRACE(i);
        const double value =
            elements[i].vt == VT_R8 ? elements[i].dblVal : static_cast<double>(elements[i].lVal);
        EXPECT_EQ(Bits(numbers[i]), Bits(value));
    }
}

TEST(KestCdfValueListCodec, WritesTheEmptyTextForNoArray) {
    for (const _variant_t& value : {_variant_t(), _variant_t(2.5), _variant_t(u"x")}) {
        _variant_t text = FormatValueList(value, ElementWriting::kAxis, false);
        ASSERT_EQ(VT_BSTR, text.vt);
        EXPECT_EQ(0u, SysStringLen(text.bstrVal));
    }
    _variant_t empty = FormatValueList(NewValueArray(0), ElementWriting::kCalItemValue, false);
    EXPECT_EQ(0u, SysStringLen(empty.bstrVal));
}

TEST(KestCdfValueListCodec, IndexesTheArrayCannotDeliverAddNothing) {
    // An array whose lower bound is 1: index 0 cannot be fetched, and adds no separator.
    SAFEARRAYBOUND bound{3, 1};
    _variant_t array;
    array.vt = VT_ARRAY | VT_VARIANT;
    array.parray = SafeArrayCreate(VT_VARIANT, 1, &bound);
    ASSERT_NE(nullptr, array.parray);
    for (LONG i = 1; i <= 3; ++i) {
        _variant_t element(static_cast<int>(i * 10));
        ASSERT_EQ(S_OK, SafeArrayPutElement(array.parray, &i, &element));
    }
    _variant_t text = FormatValueList(array, ElementWriting::kAxis, false);
    EXPECT_EQ(u"10 20", std::u16string(BstrView(text.bstrVal)));
}

TEST(KestCdfValueListCodec, IgnoresTheProcessLocale) {
    test::GermanLocale german;
    if (!german.Active())
        GTEST_SKIP() << "no German locale is installed and localedef could not build one";
    char printed[8];
    std::snprintf(printed, sizeof printed, "%.1f", 2.5);
    EXPECT_STREQ("2,5", printed) << "the locale does not change the C library's separator";
    EXPECT_EQ(2.5, Atof("2.5"));
    EXPECT_EQ(2.0, Atof("2,5"));
    EXPECT_EQ("2.5", Format(2.5));
    EXPECT_EQ("1.5e+020", Format(1.5e20));
    _variant_t array = NewValueArray(2);
    FillNumbers(u"0.25 1e-5", NumberTyping::kPerToken, array);
    _variant_t text = FormatValueList(array, ElementWriting::kCalItemValue, false);
    german.Restore();
    EXPECT_EQ(u"0.25 1", std::u16string(BstrView(text.bstrVal)));
}

namespace {

std::string Utf8List(const VARIANT& stored, ElementWriting writing, bool quoteStrings) {
    std::string text;
    FormatValueListUtf8(stored, writing, quoteStrings,
                        [&](std::string_view utf8) { text.assign(utf8); });
    return text;
}

_variant_t ArrayOf(const std::vector<_variant_t>& elements) {
    _variant_t array = NewValueArray(static_cast<ULONG>(elements.size()));
    for (LONG i = 0; i < static_cast<LONG>(elements.size()); ++i)
        EXPECT_EQ(S_OK,
                  SafeArrayPutElement(array.parray, &i, const_cast<_variant_t*>(&elements[i])));
    return array;
}

_variant_t Str(const std::u16string& text) {
    _variant_t value;
    value.vt = VT_BSTR;
    value.bstrVal = SysAllocStringLen(text.data(), static_cast<UINT>(text.size()));
    return value;
}

}  // namespace

TEST(KestCdfValueListCodec, Utf8ListIsTheUtf8OfTheUtf16List) {
    _variant_t r4;
    r4.vt = VT_R4, r4.fltVal = 0.1f;
    _variant_t boolean;
    boolean.vt = VT_BOOL, boolean.boolVal = VARIANT_TRUE;
    const std::vector<std::vector<_variant_t>> rows = {
        {},
        {_variant_t(1e20), _variant_t(1e-5), _variant_t(-0.0), _variant_t(3e9), _variant_t(2.5)},
        {_variant_t(-42), r4, boolean, _variant_t(), _variant_t(static_cast<short>(7))},
        {Str(u"plain"), Str(u"with \"quote\""), Str(u""), Str(u"\u00e9\u20ac")},
        // A pair, lone surrogates at either end of a string, a low one first.
        {Str(u"\U0001F600"), Str(std::u16string(1, u'\xD800')), Str(std::u16string(1, u'\xDC00')),
         Str(std::u16string(u"a") + u'\xDBFF'), Str(std::u16string(1, u'\xDFFF') + u"b")},
        {Str(std::u16string(5000, u'\u20ac')), _variant_t(1.5), Str(std::u16string(3000, u'x'))},
    };
    for (std::size_t row = 0; row < rows.size(); ++row) {
        const _variant_t array = ArrayOf(rows[row]);
        for (ElementWriting writing : {ElementWriting::kAxis, ElementWriting::kCalItemValue}) {
            for (bool quote : {false, true}) {
                SCOPED_TRACE(::testing::Message()
                             << "row " << row << " axis " << (writing == ElementWriting::kAxis)
                             << " quote " << quote);
                const _variant_t utf16 = FormatValueList(array, writing, quote);
                EXPECT_EQ(Utf8List(array, writing, quote), Utf16ToUtf8(BstrView(utf16.bstrVal)));
            }
        }
    }
    EXPECT_EQ(Utf8List(ArrayOf(rows[3]), ElementWriting::kAxis, true),
              "\"plain\" with \"quote\" \"\" \"\xC3\xA9\xE2\x82\xAC\"");
    EXPECT_EQ(Utf8List(_variant_t(2.5), ElementWriting::kAxis, false), "");
}

TEST(KestCdfValueListCodec, Utf8ListOfRandomStringsMatchesTheConversion) {
    // Random units, surrogates over-represented, so that every encoding length and every
    // unpaired position occurs; lists long enough to leave the builder's own buffer.
    std::mt19937 random(7);
    std::uniform_int_distribution<int> kind(0, 5);
    for (int round = 0; round < 200; ++round) {
        std::vector<_variant_t> elements;
        const int count = 1 + static_cast<int>(random() % 40);
        for (int e = 0; e < count; ++e) {
            std::u16string text;
            const int length = static_cast<int>(random() % (round % 10 == 0 ? 400 : 12));
            for (int i = 0; i < length; ++i) {
                switch (kind(random)) {
                    case 0:
                        text += static_cast<char16_t>(0x20 + random() % 0x5f);
                        break;
                    case 1:
                        text += static_cast<char16_t>(0x80 + random() % 0x780);
                        break;
                    case 2:
                        text += static_cast<char16_t>(0x800 + random() % 0xD000);
                        break;
                    case 3:
                        text += static_cast<char16_t>(0xD800 + random() % 0x400);
                        break;
                    case 4:
                        text += static_cast<char16_t>(0xDC00 + random() % 0x400);
                        break;
                    default:
                        text += static_cast<char16_t>(0xE000 + random() % 0x2000);
                        break;
                }
            }
            elements.push_back(e % 3 == 2 ? _variant_t(random() / 7.0) : Str(text));
        }
        const _variant_t array = ArrayOf(elements);
        SCOPED_TRACE(round);
        const _variant_t utf16 = FormatValueList(array, ElementWriting::kCalItemValue, true);
        ASSERT_EQ(Utf8List(array, ElementWriting::kCalItemValue, true),
                  Utf16ToUtf8(BstrView(utf16.bstrVal)));
    }
}

TEST(KestCdfValueListCodec, NumbersFromUtf8AreThoseFromUtf16) {
    const std::u16string longDigits = u"1." + std::u16string(300, u'0') + u"1";
    const std::vector<std::u16string> texts = {
        u"",
        u" ",
        u"  ",
        u"1",
        u"1 2.5 3",
        u" 1 2",
        u"1 2 ",
        u"1  2",
        u"1\t2 3\n4",
        u"\t5 \v6",
        u"\u00e9",
        u"\u20ac",
        u"\U0001F600",
        u"\u00e9 1",
        u"1\u00e9 2.5\u20ac",
        u"\u00a05 \u00855 \u30005",
        u"-\u00e91 +\u00e9.5",
        u"1.5\U0001F600e3 7",
        u"1e\u00e95 2",
        u"0x1\u00e9p3 0x\u00e9",
        u"inf\u00e9 nan(\u00e9) nan(a\u00e9b) in\u00e9f",
        u"\u00e9 \u00e9 \u00e9",
        longDigits + u"\u00e9 " + longDigits,
        u"1." + longDigits,
        std::u16string(u"1\0 2", 4),
        u"2147483648 -2147483649 1e400 4.9e-324",
        std::u16string(3000, u'\u20ac') + u" 8",
        std::u16string(1, u'\xD800') + u"5",
    };
    for (const std::u16string& text : texts) {
        const std::string utf8 = Utf16ToUtf8(text);
        ASSERT_EQ(CountValues(true, text), CountValues(true, utf8));
        EXPECT_EQ(0, CountValues(false, utf8));
        for (NumberTyping typing : {NumberTyping::kWholeText, NumberTyping::kPerToken}) {
            SCOPED_TRACE(utf8 + (typing == NumberTyping::kWholeText ? " (whole)" : " (token)"));
            const ULONG count = static_cast<ULONG>(CountValues(true, text));
            _variant_t fromUtf16 = NewValueArray(count);
            FillNumbers(text, typing, fromUtf16);
            _variant_t fromUtf8 = NewValueArray(count);
            FillNumbersUtf8(utf8, typing, fromUtf8);
            const std::vector<_variant_t> want = Elements(fromUtf16);
            const std::vector<_variant_t> got = Elements(fromUtf8);
            ASSERT_EQ(want.size(), got.size());
            for (std::size_t i = 0; i < want.size(); ++i) {
                SCOPED_TRACE(i);
                ASSERT_EQ(want[i].vt, got[i].vt);
                if (want[i].vt == VT_R8) {
                    EXPECT_EQ(Bits(want[i].dblVal), Bits(got[i].dblVal));
                } else if (want[i].vt == VT_I4) {
                    EXPECT_EQ(want[i].lVal, got[i].lVal);
                }
            }
        }
    }
    _variant_t number(1.0);
    EXPECT_THROW(FillNumbersUtf8("1", NumberTyping::kPerToken, number), _com_error);
}
