#include "platform/Variant.h"
#include "support/GermanLocale.h"

#include <gtest/gtest.h>

#include <clocale>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <random>
#include <string>

#include <unistd.h>

#include "platform/BStr.h"

using namespace kest;

namespace {

// A VARIANT that clears itself, so that failing assertions do not leak.
struct Var : VARIANT {
    Var() { VariantInit(this); }
    explicit Var(double number) : Var() { vt = VT_R8, dblVal = number; }
    explicit Var(const char16_t* text) : Var() { vt = VT_BSTR, bstrVal = SysAllocString(text); }
    ~Var() { VariantClear(this); }
    Var(const Var&) = delete;
    Var& operator=(const Var&) = delete;
    std::u16string_view Text() const { return BstrView(vt == VT_BSTR ? bstrVal : nullptr); }
};

// Converts `source` to `vt` and then to text, as far as the conversions succeed.
HRESULT Convert(const VARIANT& source, VARTYPE vt, std::u16string* text = nullptr) {
    Var target;
    HRESULT hr = VariantChangeType(&target, &source, 0, vt);
    if (SUCCEEDED(hr) && text) hr = VariantChangeType(&target, &target, 0, VT_BSTR);
    if (text) *text = target.Text();
    return hr;
}

std::u16string TextOf(const VARIANT& source) {
    std::u16string text;
    EXPECT_EQ(Convert(source, VT_BSTR, &text), S_OK);
    return text;
}

constexpr double kInf = std::numeric_limits<double>::infinity();
constexpr HRESULT kMismatch = DISP_E_TYPEMISMATCH;
constexpr HRESULT kOverflow = DISP_E_OVERFLOW;

}  // namespace

TEST(Variant, NumbersToTextAreShortestRoundTrip) {
    struct Row {
        double number;
        const char16_t* text;
    } rows[] = {
        {0.0, u"0"},
        {-0.0, u"-0"},
        {1.0 / 3.0, u"0.3333333333333333"},
        {123456789012345678.0, u"123456789012345680"},
        {1e21, u"1e+21"},
        {1e-5, u"1e-05"},
        {0.0001, u"1e-04"},
        {0.001, u"0.001"},  // a tie in length keeps fixed notation
        {5e-324, u"5e-324"},
        {std::numeric_limits<double>::max(), u"1.7976931348623157e+308"},
        {std::numeric_limits<double>::quiet_NaN(), u"NaN"},
        {-kInf, u"-Infinity"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(testing::Message() << row.number);
        EXPECT_EQ(TextOf(Var(row.number)), row.text);
    }
    Var other;
    EXPECT_EQ(TextOf(other), u"");
    other.vt = VT_I2, other.iVal = -32768;
    EXPECT_EQ(TextOf(other), u"-32768");
    other.vt = VT_R4, other.fltVal = 0.1f;  // shortest at float precision
    EXPECT_EQ(TextOf(other), u"0.1");
    other.vt = VT_BOOL, other.boolVal = VARIANT_TRUE;
    EXPECT_EQ(TextOf(other), u"True");
}

TEST(Variant, TypesWithoutTextFormAreRefused) {
    Var null, error, array, target(u"unchanged"), number(1.0);
    null.vt = VT_NULL;
    error.vt = VT_ERROR;
    array.vt = VT_ARRAY | VT_VARIANT;
    array.parray = SafeArrayCreateVector(VT_VARIANT, 0, 1);
    for (VARIANT* source : {static_cast<VARIANT*>(&null), static_cast<VARIANT*>(&error),
                            static_cast<VARIANT*>(&array)}) {
        SCOPED_TRACE(source->vt);
        EXPECT_EQ(VariantChangeType(&target, source, 0, VT_BSTR), kMismatch);
        EXPECT_EQ(VariantChangeType(&target, source, 0, VT_R8), kMismatch);
        EXPECT_EQ(target.Text(), u"unchanged");
    }
    EXPECT_EQ(Convert(number, VT_ARRAY | VT_VARIANT), kMismatch);
    EXPECT_EQ(Convert(number, VT_NULL), kMismatch);
    EXPECT_EQ(Convert(number, 77), DISP_E_BADVARTYPE);
    number.vt = 77;
    EXPECT_EQ(Convert(number, VT_BSTR), DISP_E_BADVARTYPE);
    number.vt = VT_R8;
}

TEST(Variant, TextToNumbers) {
    struct Row {
        const char16_t* text;
        HRESULT hr;
        double number;
    } rows[] = {
        {u"+42", S_OK, 42},
        {u".5", S_OK, 0.5},
        {u"5.", S_OK, 5},
        {u"-.5e1", S_OK, -5},
        {u"1E+05", S_OK, 1e5},
        {u" \t\r\n12.25 \n", S_OK, 12.25},
        {u"1.7976931348623157e308", S_OK, std::numeric_limits<double>::max()},
        {u"1e-400", S_OK, 0},
        {u"4.9e-324", S_OK, 5e-324},
        {u"0e999999", S_OK, 0},
        {u"-1e309", kOverflow, 0},
        {u"123456789e301", kOverflow, 0},
        {u"", kMismatch, 0},
        {nullptr, kMismatch, 0},
        {u"   ", kMismatch, 0},
        {u"12abc", kMismatch, 0},
        {u"1 2", kMismatch, 0},
        {u"inf", kMismatch, 0},
        {u"NaN", kMismatch, 0},
        {u"0x10", kMismatch, 0},
        {u"1,5", kMismatch, 0},
        {u"1e+", kMismatch, 0},
        {u"-", kMismatch, 0},
        {u".", kMismatch, 0},
        {u"+-1", kMismatch, 0},
        {u"1..2", kMismatch, 0},
        {u"\u00A01", kMismatch, 0},
        {u"\u0661", kMismatch, 0},
        {u"1\v", kMismatch, 0},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.text ? Utf16ToUtf8(row.text) : std::string("(null)"));
        Var source(row.text), target(7.0);
        EXPECT_EQ(VariantChangeType(&target, &source, 0, VT_R8), row.hr);
        // A text that is no number never turns into a silent value.
        EXPECT_EQ(target.dblVal, row.hr == S_OK ? row.number : 7.0);
    }
}

TEST(Variant, DoubleTextRoundTripsExactly) {
    std::mt19937_64 random(20261206);
    for (int i = 0; i < 20000; ++i) {
        std::uint64_t bits = random();
        Var value;
        value.vt = VT_R8;
        std::memcpy(&value.dblVal, &bits, sizeof bits);
        if (!std::isfinite(value.dblVal)) continue;
        ASSERT_EQ(VariantChangeType(&value, &value, 0, VT_BSTR), S_OK);
        std::string text = Utf16ToUtf8(value.Text());
        ASSERT_EQ(VariantChangeType(&value, &value, 0, VT_R8), S_OK) << text;
        ASSERT_EQ(std::memcmp(&value.dblVal, &bits, sizeof bits), 0) << text;
    }
}

TEST(Variant, IntegerTargetsRoundHalfToEvenAndCheckRange) {
    struct Row {
        double number;
        VARTYPE vt;
        HRESULT hr;
        const char16_t* text;
    } rows[] = {
        {2.5, VT_I4, S_OK, u"2"},
        {3.5, VT_I4, S_OK, u"4"},
        {-2.5, VT_I4, S_OK, u"-2"},
        {2.5000001, VT_I4, S_OK, u"3"},
        {2147483647.4, VT_I4, S_OK, u"2147483647"},
        {2147483647.5, VT_I4, kOverflow, u""},
        {-2147483648.5, VT_I4, S_OK, u"-2147483648"},
        {-2147483649.0, VT_I4, kOverflow, u""},
        {kInf, VT_I4, kOverflow, u""},
        {std::numeric_limits<double>::quiet_NaN(), VT_I4, kOverflow, u""},
        {32767.5, VT_I2, kOverflow, u""},
        {-32768.5, VT_I2, S_OK, u"-32768"},
        {4.5, VT_I2, S_OK, u"4"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(testing::Message() << row.number << " to vt " << row.vt);
        std::u16string text;
        EXPECT_EQ(Convert(Var(row.number), row.vt, &text), row.hr);
        EXPECT_EQ(text, row.text);
        if (!std::isfinite(row.number)) continue;
        // The same rules through text.
        char narrow[64];
        std::snprintf(narrow, sizeof narrow, "%.17g", row.number);
        EXPECT_EQ(Convert(Var(Utf8ToUtf16(narrow).c_str()), row.vt, &text), row.hr) << narrow;
    }
}

TEST(Variant, FloatBoolEmptyAndNullTargets) {
    EXPECT_EQ(Convert(Var(1e39), VT_R4), kOverflow);
    EXPECT_EQ(Convert(Var(u"3.5e38"), VT_R4), kOverflow);
    std::u16string text;
    EXPECT_EQ(Convert(Var(-3.4e38), VT_R4, &text), S_OK);
    EXPECT_EQ(text, u"-3.4e+38");
    struct Row {
        const char16_t* text;
        HRESULT hr;
        const char16_t* result;
    } rows[] = {
        {u" TRUE ", S_OK, u"True"}, {u"fAlSe", S_OK, u"False"}, {u"-1", S_OK, u"True"},
        {u"0", S_OK, u"False"},     {u"2.5", S_OK, u"True"},    {u"yes", kMismatch, u""},
        {u"", kMismatch, u""},      {u"Truee", kMismatch, u""},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(Utf16ToUtf8(row.text));
        EXPECT_EQ(Convert(Var(row.text), VT_BOOL, &text), row.hr);
        EXPECT_EQ(text, row.result);
    }
    Var flag, empty;
    flag.vt = VT_BOOL, flag.boolVal = VARIANT_TRUE;
    EXPECT_EQ(Convert(flag, VT_I4, &text), S_OK);
    EXPECT_EQ(text, u"-1");
    EXPECT_EQ(Convert(empty, VT_NULL), S_OK);
    for (VARTYPE vt : {VT_I2, VT_R8, VT_BOOL, VT_EMPTY}) {
        SCOPED_TRACE(vt);
        EXPECT_EQ(Convert(empty, vt, &text), S_OK);
        EXPECT_EQ(text, vt == VT_BOOL ? u"False" : vt == VT_EMPTY ? u"" : u"0");
    }
}

TEST(Variant, ChangeTypeInPlaceKeepsTheValueOnFailure) {
    Var value(u"17.5");
    ASSERT_EQ(VariantChangeType(&value, &value, 0, VT_BSTR), S_OK);
    EXPECT_EQ(value.Text(), u"17.5");
    EXPECT_EQ(VariantChangeType(&value, &value, 0, VT_I2), S_OK);
    EXPECT_EQ(value.iVal, 18);
    Var word(u"oops");
    EXPECT_EQ(VariantChangeType(&word, &word, 0, VT_I4), kMismatch);
    EXPECT_EQ(word.Text(), u"oops");
}

TEST(Variant, CopyAndClear) {
    Var array, copy, nullText, bad;
    array.vt = VT_ARRAY | VT_VARIANT;
    array.parray = SafeArrayCreateVector(VT_VARIANT, 0, 1);
    array.parray->pvData[0].vt = VT_BSTR;
    array.parray->pvData[0].bstrVal = SysAllocString(u"element");
    ASSERT_EQ(VariantCopy(&copy, &array), S_OK);
    ASSERT_NE(copy.parray, array.parray);
    EXPECT_NE(copy.parray->pvData[0].bstrVal, array.parray->pvData[0].bstrVal);
    // Copying an element of the target's own array into the target.
    ASSERT_EQ(VariantCopy(&copy, &copy.parray->pvData[0]), S_OK);
    EXPECT_EQ(copy.Text(), u"element");
    nullText.vt = VT_BSTR, nullText.bstrVal = nullptr;
    ASSERT_EQ(VariantCopy(&copy, &nullText), S_OK);
    EXPECT_EQ(copy.vt, VT_BSTR);
    EXPECT_EQ(copy.bstrVal, nullptr);
    bad.vt = 99;
    EXPECT_EQ(VariantCopy(&copy, &bad), DISP_E_BADVARTYPE);
    EXPECT_EQ(VariantClear(&bad), DISP_E_BADVARTYPE);
    bad.vt = VT_EMPTY;
    EXPECT_EQ(VariantClear(nullptr), E_INVALIDARG);
    SysFailAllocationAfter(0);
    EXPECT_EQ(VariantCopy(&copy, &array), E_OUTOFMEMORY);
    SysFailAllocationAfter(-1);
}

TEST(Variant, ConversionIgnoresTheProcessLocale) {
    test::GermanLocale german;  // ',' as decimal separator
    if (!german.Active())
        GTEST_SKIP() << "no German locale is installed and localedef could not build one";
    char probe[16];
    std::snprintf(probe, sizeof probe, "%.1f", 2.5);
    std::u16string text = TextOf(Var(1234.5)), dotText, commaText;
    HRESULT dotHr = Convert(Var(u"1234.5"), VT_R8, &dotText);
    HRESULT commaHr = Convert(Var(u"1234,5"), VT_R8, &commaText);
    german.Restore();

    ASSERT_STREQ(probe, "2,5") << "the German locale did not switch printf to ','";
    EXPECT_EQ(text, u"1234.5");
    EXPECT_EQ(dotHr, S_OK);
    EXPECT_EQ(dotText, u"1234.5");
    EXPECT_EQ(commaHr, kMismatch);
}
