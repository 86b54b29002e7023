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

#include "ValueListTestUtil.h"
#include "model/detail/ValueListCodec.h"
#include "support/GermanLocale.h"

using namespace kest;
using namespace kest::detail;
using namespace kest::test;

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

double FromBits(std::uint64_t bits) {
    double value;
    std::memcpy(&value, &bits, sizeof value);
    return value;
}

std::u16string Text(const _variant_t& text) {
    EXPECT_EQ(VT_BSTR, text.vt);
    return text.vt == VT_BSTR ? std::u16string(BstrView(text.bstrVal)) : u"?";
}

_variant_t R4(float value) {
    _variant_t v;
    v.vt = VT_R4, v.fltVal = value;
    return v;
}

_variant_t True() {
    _variant_t v;
    v.vt = VT_BOOL, v.boolVal = VARIANT_TRUE;
    return v;
}

_variant_t Bstr(const std::u16string& text) {
    _variant_t value;
    value.vt = VT_BSTR;
    value.bstrVal = SysAllocStringLen(text.data(), static_cast<UINT>(text.size()));
    return value;
}

_variant_t ArrayOf(const std::vector<_variant_t>& elements) {
    _variant_t array = NewValueArray(static_cast<ULONG>(elements.size()));
    for (LONG i = 0; i < static_cast<LONG>(elements.size()); ++i)
        EXPECT_EQ(S_OK,
                  SafeArrayPutElement(array.parray, &i, const_cast<_variant_t*>(&elements[i])));
    return array;
}

std::string Utf8List(const VARIANT& stored, ElementWriting writing, bool quoteStrings) {
    std::string text;
    FormatValueListUtf8(stored, writing, quoteStrings,
                        [&](std::string_view utf8) { text.assign(utf8); });
    return text;
}

std::vector<std::string> TrickyTokens() {
    std::vector<std::string> tokens = {"",
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
                                       "4294967297",
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
                                                   3)};
    tokens.push_back(std::string(200, '0') + "1");
    tokens.push_back("1" + std::string(200, '0'));
    tokens.push_back("-" + std::string(5000, '9'));
    tokens.push_back(std::string(5000, '9') + "x");
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

TEST(KestCdfValueListCodec, FormatsLikePrintfWithThreeExponentDigits) {
    const double inf = std::numeric_limits<double>::infinity();
    const double nan = std::numeric_limits<double>::quiet_NaN();
    struct Row {
        double value;
        const char* text;
    } rows[] = {{1e20, "1e+020"},
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
                {inf, "inf"},
                {-inf, "-inf"},
                {nan, "nan"},
                {-nan, "-nan"},
                {std::numeric_limits<double>::denorm_min(), "4.94065645841247e-324"},
                {1e-310, "9.99999999999997e-311"},
                {std::numeric_limits<double>::max(), "1.79769313486232e+308"},
                {std::numeric_limits<double>::min(), "2.2250738585072e-308"},
                {123456789012345.0, "123456789012345"},
                {1234567890123456.0, "1.23456789012346e+015"},
                {100000000000000.0, "100000000000000"},
                {0.000123, "0.000123"},
                {0.0000123, "1.23e-005"}};
    for (const Row& row : rows) {
        SCOPED_TRACE(row.text);
        EXPECT_EQ(row.text, Format(row.value));
        EXPECT_EQ(ReferenceFormat(row.value), Format(row.value));
    }
}

// The formatter takes the fifteen digits from a scaled integer or from the shortest digits
// that read back, and falls back to exact rounding only on ties; every family of values where
// those shortcuts could go wrong is compared with printf bit for bit.
TEST(KestCdfValueListCodec, FormatsMillionsOfDoublesExactlyLikePrintf) {
    std::mt19937_64 random(20261206u);
    using Check = std::function<void(double)>;
    auto withNeighbours = [](double value, const Check& check) {
        for (double v : {value, -value, std::nextafter(value, 0.0),
                         std::nextafter(value, std::numeric_limits<double>::infinity())})
            check(v);
    };
    auto randomBits = [&](int count, std::uint64_t mask, int exponentBase, int exponentSpan) {
        return [&random, count, mask, exponentBase, exponentSpan](const Check& check) {
            for (int i = 0; i < count; ++i) {
                std::uint64_t bits = random() & mask;
                if (exponentSpan)
                    bits |= std::uint64_t(exponentBase + random() % exponentSpan) << 52;
                check(FromBits(bits));
            }
        };
    };
    const std::uint64_t kNoExponent = 0x800FFFFFFFFFFFFFull;
    struct Family {
        const char* name;
        std::function<void(const Check&)> generate;
    } families[] = {
        {"any bit pattern", randomBits(3000000, ~0ull, 0, 0)},
        {"any mantissa between 1e-12 and 1e21", randomBits(1000000, kNoExponent, 1023 - 40, 110)},
        {"subnormals", randomBits(100000, kNoExponent, 0, 0)},
        {"k/255 times powers of ten",
         [&](const Check& check) {
             for (int e = -25; e <= 25; ++e)
                 for (int k = 0; k <= 255 * 20; ++k) check(k / 255.0 * std::pow(10.0, e));
         }},
        {"fifteen-digit texts read back, and their neighbours",
         [&](const Check& check) {
             for (int e = -25; e <= 25; ++e)
                 for (int k = 0; k <= 2000; ++k) {
                     char text[64];
                     std::snprintf(text, sizeof text, "%.15g",
                                   k * (100.0 / 255) * std::pow(10.0, e));
                     withNeighbours(ReferenceAtof(text), check);
                 }
         }},
        {"integers of every size",
         [&](const Check& check) {
             for (int i = 0; i < 250000; ++i)
                 check(static_cast<double>(static_cast<std::int64_t>(random() >> (random() % 64))));
         }},
        {"powers of ten and their neighbours",
         [&](const Check& check) {
             for (int e = -323; e <= 308; ++e)
                 withNeighbours(ReferenceAtof("1e" + std::to_string(e)), check);
         }},
        {"sixteen digits ending in 5 (ties in the digits), and their neighbours",
         [&](const Check& check) {
             for (int i = 0; i < 250000; ++i) {
                 char text[64];
                 const unsigned long long digits =
                     100000000000000ull + random() % 900000000000000ull;
                 const int exponent = i % 4 ? static_cast<int>(random() % 80) - 40
                                            : static_cast<int>(random() % 600) - 300;
                 std::snprintf(text, sizeof text, "%llu5e%d", digits, exponent);
                 withNeighbours(ReferenceAtof(text), check);
             }
         }},
    };
    for (const Family& family : families) {
        SCOPED_TRACE(family.name);
        long failures = 0;
        family.generate([&](double value) {
            const std::string expected = ReferenceFormat(value);
            if (failures <= 10 && expected != Format(value) && ++failures)
                ADD_FAILURE() << std::hexfloat << value << ": printf " << expected << ", got "
                              << Format(value);
        });
    }
}

TEST(KestCdfValueListCodec, CountsSpacesOnlyForNumericText) {
    struct Row {
        bool numeric;
        std::u16string text;
        int count;
    } rows[] = {{true, u"", 1},        {true, u"1", 1},      {true, u"1 2 3", 3},
                {true, u" 1 2", 3},    {true, u"1  2", 3},   {true, u"1 2 ", 3},
                {true, u"1\t2\n3", 1}, {false, u"1 2 3", 0}, {false, u"", 0}};
    for (const Row& row : rows) {
        SCOPED_TRACE(Utf16ToUtf8(row.text));
        EXPECT_EQ(row.count, CountValues(row.numeric, row.text));
    }
}

TEST(KestCdfValueListCodec, FillsNumbersFromTheTokensThatFitTheArray) {
    const std::u16string zeros(300, u'0');
    struct Row {
        std::u16string text;
        NumberTyping typing;
        ULONG size;
        std::vector<Element> elements;
    } rows[] = {
        // Tokens of any length parse by their leading characters; 1e-501 underflows.
        {u"0" + zeros + u"7 1" + zeros + u" 5",
         NumberTyping::kWholeText,
         3,
         {I4(7), R8(1e300), I4(5)}},  // beyond 32 bits: a double
        {u"1." + std::u16string(1000, u'5') + u" 0." + std::u16string(500, u'0') + u"1",
         NumberTyping::kWholeText,
         2,
         {R8(1.5555555555555556), R8(0.0)}},
        // Characters outside ASCII end a number.
        {u"12\u00B34 \uFF15 7\u00A0", NumberTyping::kWholeText, 3, {I4(12), I4(0), I4(7)}},
        // Tokens beyond the array are dropped; elements no token reaches stay empty.
        {u"1 2 3 4", NumberTyping::kPerToken, 2, {R8(1), I4(2)}},
        {u"1 2.5", NumberTyping::kPerToken, 3, {R8(1), R8(2.5), Empty()}},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(Utf16ToUtf8(row.text.substr(0, 20)));
        _variant_t array = NewValueArray(row.size);
        FillNumbers(row.text, row.typing, array);
        ExpectElements(array, row.elements);
    }
}

TEST(KestCdfValueListCodec, SplitsQuotedStrings) {
    struct Row {
        std::u16string text;
        std::vector<Element> strings;
    } rows[] = {{u"\"a b\" \"c\"", {Str(u"a b"), Str(u"c")}},
                {u"x\"a\"y\"\"z", {Str(u"a"), Str(u"")}},
                {u"\"open", {}},
                {u"\"a\" \"b", {Str(u"a")}},
                {u"no quotes", {}},
                {u"\"", {}},
                {u"\"\"\"\"", {Str(u""), Str(u"")}}};
    for (const Row& row : rows) {
        SCOPED_TRACE(Utf16ToUtf8(row.text));
        _variant_t array = NewValueArray(0);
        PutQuotedStrings(row.text, array);
        ExpectElements(array, row.strings);
    }
}

TEST(KestCdfValueListCodec, RejectsATargetThatIsNoArray) {
    _variant_t number(1.0);
    EXPECT_THROW(FillNumbers(u"1", NumberTyping::kPerToken, number), _com_error);
    EXPECT_THROW(FillNumbersUtf8("1", NumberTyping::kPerToken, number), _com_error);
    EXPECT_THROW(PutQuotedStrings(u"\"a\"", number), _com_error);
}

TEST(KestCdfValueListCodec, WritesElementsByEachClassRule) {
    const _variant_t array = ArrayOf({_variant_t(1e20), R4(0.1f), _variant_t(-42), Bstr(u"a b"),
                                      _variant_t(), _variant_t(short(7)), True()});
    EXPECT_EQ(u"1.0e+020 0.10000000149011612 -42 a b 0 7 -1",
              Text(FormatValueList(array, ElementWriting::kAxis, false)));
    EXPECT_EQ(u"1.0e+020 0.1 -42 a b  7 True",
              Text(FormatValueList(array, ElementWriting::kCalItemValue, false)));
    // No array gives the empty text; so does an index the array cannot deliver (lower bound 1).
    for (const _variant_t& value : {_variant_t(), _variant_t(2.5), _variant_t(u"x")})
        EXPECT_EQ(u"", Text(FormatValueList(value, ElementWriting::kAxis, false)));
    EXPECT_EQ(u"", Text(FormatValueList(NewValueArray(0), ElementWriting::kCalItemValue, false)));
    SAFEARRAYBOUND bound{3, 1};
    _variant_t based;
    based.vt = VT_ARRAY | VT_VARIANT;
    based.parray = SafeArrayCreate(VT_VARIANT, 1, &bound);
    for (LONG i = 1; i <= 3; ++i) {
        _variant_t element(static_cast<int>(i * 10));
        ASSERT_EQ(S_OK, SafeArrayPutElement(based.parray, &i, &element));
    }
    EXPECT_EQ(u"10 20", Text(FormatValueList(based, ElementWriting::kAxis, false)));
}

TEST(KestCdfValueListCodec, LongListsAreWrittenAndReadWhole) {
    // Far longer than any fixed buffer, so that the text grows on the heap, once of it in one
    // step larger than doubling.
    constexpr int kNumbers = 3000;
    const std::u16string longString(20000, u'x');
    std::vector<_variant_t> values;
    std::vector<Element> numbers;
    std::string expected;
    for (int i = 0; i < kNumbers; ++i) {
        values.push_back(i % 3 == 1 ? _variant_t(-i)
                                    // Values whose "%.15g" text reads back, so that it is the text
                                    // written.
                                    : _variant_t(ReferenceAtof(ReferenceFormat(
                                          (i + 0.25) * (100.0 / 255) * (i % 3 ? 1e-9 : 1.0)))));
        const std::string token =
            i % 3 == 1 ? std::to_string(-i) : ReferenceFormat(values.back().dblVal);
        expected += token + ' ';
        // Read back, the first token is always a double, a later one when it holds a '.'.
        numbers.push_back(i == 0 || token.find('.') != std::string::npos
                              ? R8(ReferenceAtof(token))
                              : I4(ReferenceAtoi(token)));
    }
    values.push_back(Bstr(longString));
    const _variant_t text = FormatValueList(ArrayOf(values), ElementWriting::kAxis, true);
    const std::u16string_view written = BstrView(text.bstrVal);
    ASSERT_EQ(std::u16string(expected.begin(), expected.end()) + u'"' + longString + u'"', written);

    const std::u16string_view numbersText = written.substr(0, expected.size() - 1);
    _variant_t back = NewValueArray(static_cast<ULONG>(CountValues(true, numbersText)));
    FillNumbers(numbersText, NumberTyping::kPerToken, back);
    ExpectElements(back, numbers);
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
    EXPECT_EQ(u"0.25 1", Text(text));
}

TEST(KestCdfValueListCodec, Utf8ListIsTheUtf8OfTheUtf16List) {
    const std::vector<std::vector<_variant_t>> rows = {
        {},
        {_variant_t(1e20), _variant_t(1e-5), _variant_t(-0.0), _variant_t(3e9), _variant_t(2.5)},
        {_variant_t(-42), R4(0.1f), True(), _variant_t(), _variant_t(short(7))},
        {Bstr(u"plain"), Bstr(u"with \"quote\""), Bstr(u""), Bstr(u"\u00e9\u20ac")},
        // A pair, lone surrogates at either end of a string, a low one first.
        {Bstr(u"\U0001F600"), Bstr(std::u16string(1, u'\xD800')),
         Bstr(std::u16string(1, u'\xDC00')), Bstr(std::u16string(u"a") + u'\xDBFF'),
         Bstr(std::u16string(1, u'\xDFFF') + u"b")},
        {Bstr(std::u16string(5000, u'\u20ac')), _variant_t(1.5), Bstr(std::u16string(3000, u'x'))},
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
