#include "platform/Variant.h"

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
    ~Var() { VariantClear(this); }
    Var(const Var&) = delete;
    Var& operator=(const Var&) = delete;
};

void SetText(VARIANT& value, const char16_t* text) {
    VariantClear(&value);
    value.vt = VT_BSTR;
    value.bstrVal = text ? SysAllocString(text) : nullptr;
}

void SetDouble(VARIANT& value, double number) {
    VariantClear(&value);
    value.vt = VT_R8;
    value.dblVal = number;
}

std::u16string TextOfDouble(double number) {
    Var source, target;
    SetDouble(source, number);
    EXPECT_EQ(VariantChangeType(&target, &source, 0, VT_BSTR), S_OK);
    return std::u16string(BstrView(target.bstrVal));
}

constexpr double kInf = std::numeric_limits<double>::infinity();

}  // namespace

TEST(Variant, DoubleToTextIsShortestRoundTrip) {
    struct Row { double number; const char16_t* text; } rows[] = {
        {0.0, u"0"}, {-0.0, u"-0"}, {-2.5, u"-2.5"}, {1.0 / 3.0, u"0.3333333333333333"},
        {123456789012345678.0, u"123456789012345680"}, {1e21, u"1e+21"}, {1e-5, u"1e-05"},
        {0.0001, u"1e-04"}, {0.001, u"0.001"},  // a tie in length keeps fixed notation
        {5e-324, u"5e-324"}, {std::numeric_limits<double>::max(), u"1.7976931348623157e+308"},
        {std::numeric_limits<double>::quiet_NaN(), u"NaN"}, {kInf, u"Infinity"},
        {-kInf, u"-Infinity"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(testing::Message() << row.number);
        EXPECT_EQ(TextOfDouble(row.number), row.text);
    }
}

TEST(Variant, OtherTypesToText) {
    struct Row { VARTYPE vt; double number; const char16_t* text; } rows[] = {
        {VT_EMPTY, 0, u""}, {VT_I2, -32768, u"-32768"}, {VT_I4, -2147483648.0, u"-2147483648"},
        {VT_R4, 0.1f, u"0.1"},  // shortest at float precision
        {VT_BOOL, -1, u"True"}, {VT_BOOL, 0, u"False"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(testing::Message() << row.vt << " " << row.number);
        Var source, target;
        source.vt = row.vt;
        if (row.vt == VT_I2) source.iVal = static_cast<SHORT>(row.number);
        if (row.vt == VT_I4) source.lVal = static_cast<LONG>(row.number);
        if (row.vt == VT_R4) source.fltVal = static_cast<float>(row.number);
        if (row.vt == VT_BOOL) source.boolVal = row.number ? VARIANT_TRUE : VARIANT_FALSE;
        ASSERT_EQ(VariantChangeType(&target, &source, 0, VT_BSTR), S_OK);
        ASSERT_EQ(target.vt, VT_BSTR);
        ASSERT_NE(target.bstrVal, nullptr);
        EXPECT_EQ(BstrView(target.bstrVal), row.text);
    }
}

TEST(Variant, TypesWithoutTextFormAreRefused) {
    Var null, error, array, target, number;
    null.vt = VT_NULL;
    error.vt = VT_ERROR;
    array.vt = VT_ARRAY | VT_VARIANT;
    array.parray = SafeArrayCreateVector(VT_VARIANT, 0, 1);
    SetText(target, u"unchanged");
    for (VARIANT* source : {static_cast<VARIANT*>(&null), static_cast<VARIANT*>(&error),
                            static_cast<VARIANT*>(&array)}) {
        SCOPED_TRACE(source->vt);
        EXPECT_EQ(VariantChangeType(&target, source, 0, VT_BSTR), DISP_E_TYPEMISMATCH);
        EXPECT_EQ(VariantChangeType(&target, source, 0, VT_R8), DISP_E_TYPEMISMATCH);
        EXPECT_EQ(BstrView(target.bstrVal), u"unchanged");
    }
    SetDouble(number, 1.0);
    EXPECT_EQ(VariantChangeType(&target, &number, 0, VT_ARRAY | VT_VARIANT), DISP_E_TYPEMISMATCH);
    EXPECT_EQ(VariantChangeType(&target, &number, 0, 77), DISP_E_BADVARTYPE);
    number.vt = 77;
    EXPECT_EQ(VariantChangeType(&target, &number, 0, VT_BSTR), DISP_E_BADVARTYPE);
    number.vt = VT_R8;
}

TEST(Variant, TextToNumbers) {
    const HRESULT ok = S_OK, bad = DISP_E_TYPEMISMATCH, over = DISP_E_OVERFLOW;
    struct Row { const char16_t* text; HRESULT hr; double number; } rows[] = {
        {u"+42", ok, 42}, {u".5", ok, 0.5}, {u"5.", ok, 5}, {u"-.5e1", ok, -5},
        {u"1E+05", ok, 1e5}, {u" \t\r\n12.25 \n", ok, 12.25}, {u"0.1", ok, 0.1},
        {u"1.7976931348623157e308", ok, std::numeric_limits<double>::max()},
        {u"1e-400", ok, 0}, {u"4.9e-324", ok, 5e-324}, {u"0e999999", ok, 0},
        {u"1e309", over, 0}, {u"-1e309", over, 0}, {u"123456789e301", over, 0},
        {u"", bad, 0}, {nullptr, bad, 0}, {u"   ", bad, 0}, {u"12abc", bad, 0},
        {u"1 2", bad, 0}, {u"inf", bad, 0}, {u"NaN", bad, 0}, {u"0x10", bad, 0},
        {u"1,5", bad, 0}, {u"1e+", bad, 0}, {u"-", bad, 0}, {u".", bad, 0}, {u"+-1", bad, 0},
        {u"1..2", bad, 0}, {u"\u00A01", bad, 0}, {u"\u0661", bad, 0}, {u"1\v", bad, 0},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.text ? Utf16ToUtf8(row.text) : std::string("(null)"));
        Var source, target;
        SetText(source, row.text);
        target.vt = VT_I2;
        target.iVal = 7;
        EXPECT_EQ(VariantChangeType(&target, &source, 0, VT_R8), row.hr);
        // A text that is no number never turns into a silent value.
        EXPECT_EQ(target.vt, row.hr == S_OK ? VT_R8 : VT_I2);
        EXPECT_EQ(row.hr == S_OK ? target.dblVal : target.iVal, row.hr == S_OK ? row.number : 7);
    }
}

TEST(Variant, DoubleTextRoundTripsExactly) {
    std::mt19937_64 random(20261206);
    for (int i = 0; i < 20000; ++i) {
        std::uint64_t bits = random();
        double number;
        std::memcpy(&number, &bits, sizeof number);
        if (!std::isfinite(number)) continue;
        Var value;
        SetDouble(value, number);
        ASSERT_EQ(VariantChangeType(&value, &value, 0, VT_BSTR), S_OK);
        std::string text = Utf16ToUtf8(BstrView(value.bstrVal));
        ASSERT_EQ(VariantChangeType(&value, &value, 0, VT_R8), S_OK) << text;
        ASSERT_EQ(std::memcmp(&value.dblVal, &number, sizeof number), 0) << text;
    }
}

TEST(Variant, IntegerTargetsRoundHalfToEvenAndCheckRange) {
    const HRESULT over = DISP_E_OVERFLOW;
    struct Row { double number; VARTYPE vt; HRESULT hr; LONG expected; } rows[] = {
        {2.5, VT_I4, S_OK, 2}, {3.5, VT_I4, S_OK, 4}, {-2.5, VT_I4, S_OK, -2},
        {2.5000001, VT_I4, S_OK, 3}, {2147483647.4, VT_I4, S_OK, 2147483647},
        {2147483647.5, VT_I4, over, 0}, {-2147483648.5, VT_I4, S_OK, -2147483647 - 1},
        {-2147483649.0, VT_I4, over, 0}, {std::numeric_limits<double>::quiet_NaN(), VT_I4, over, 0},
        {kInf, VT_I4, over, 0}, {32767.5, VT_I2, over, 0}, {-32768.5, VT_I2, S_OK, -32768},
        {4.5, VT_I2, S_OK, 4},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(testing::Message() << row.number << " to vt " << row.vt);
        Var source, target;
        SetDouble(source, row.number);
        ASSERT_EQ(VariantChangeType(&target, &source, 0, row.vt), row.hr);
        if (row.hr == S_OK) {
            EXPECT_EQ(target.vt, row.vt);
            EXPECT_EQ(row.vt == VT_I4 ? target.lVal : target.iVal, row.expected);
        }
        if (!std::isfinite(row.number)) continue;
        // The same rules through text.
        char narrow[64];
        std::snprintf(narrow, sizeof narrow, "%.17g", row.number);
        Var text, fromText;
        SetText(text, Utf8ToUtf16(narrow).c_str());
        EXPECT_EQ(VariantChangeType(&fromText, &text, 0, row.vt), row.hr) << narrow;
    }
}

TEST(Variant, FloatAndBoolTargets) {
    Var source, target;
    SetDouble(source, 1e39);
    EXPECT_EQ(VariantChangeType(&target, &source, 0, VT_R4), DISP_E_OVERFLOW);
    SetDouble(source, -3.4e38);
    ASSERT_EQ(VariantChangeType(&target, &source, 0, VT_R4), S_OK);
    EXPECT_EQ(target.fltVal, -3.4e38f);
    SetText(source, u"3.5e38");
    EXPECT_EQ(VariantChangeType(&target, &source, 0, VT_R4), DISP_E_OVERFLOW);

    const HRESULT bad = DISP_E_TYPEMISMATCH;
    struct Row { const char16_t* text; HRESULT hr; VARIANT_BOOL value; } rows[] = {
        {u" TRUE ", S_OK, VARIANT_TRUE}, {u"fAlSe", S_OK, VARIANT_FALSE},
        {u"-1", S_OK, VARIANT_TRUE}, {u"0", S_OK, VARIANT_FALSE}, {u"2.5", S_OK, VARIANT_TRUE},
        {u"yes", bad, 0}, {u"", bad, 0}, {u"Truee", bad, 0},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(Utf16ToUtf8(row.text));
        SetText(source, row.text);
        VariantClear(&target);
        ASSERT_EQ(VariantChangeType(&target, &source, 0, VT_BOOL), row.hr);
        if (row.hr == S_OK) {
            EXPECT_EQ(target.boolVal, row.value);
        }
    }
    Var flag;
    flag.vt = VT_BOOL;
    flag.boolVal = VARIANT_TRUE;
    ASSERT_EQ(VariantChangeType(&target, &flag, 0, VT_I4), S_OK);
    EXPECT_EQ(target.lVal, -1);
    ASSERT_EQ(VariantChangeType(&target, &flag, 0, VT_BSTR), S_OK);
    ASSERT_EQ(VariantChangeType(&target, &target, 0, VT_BOOL), S_OK);
    EXPECT_EQ(target.boolVal, VARIANT_TRUE);
}

TEST(Variant, EmptyAndNullConversions) {
    Var empty, target, number;
    struct Row {
        VARTYPE vt;
        const char16_t* text;
    } rows[] = {{VT_I2, u"0"}, {VT_R4, u"0"}, {VT_R8, u"0"}, {VT_BOOL, u"False"}, {VT_BSTR, u""}};
    for (const Row& row : rows) {
        SCOPED_TRACE(row.vt);
        target.vt = VT_I4;
        ASSERT_EQ(VariantChangeType(&target, &empty, 0, row.vt), S_OK);
        EXPECT_EQ(target.vt, row.vt);
        ASSERT_EQ(VariantChangeType(&target, &target, 0, VT_BSTR), S_OK);
        EXPECT_EQ(BstrView(target.bstrVal), row.text);
        VariantClear(&target);
    }
    ASSERT_EQ(VariantChangeType(&target, &empty, 0, VT_NULL), S_OK);
    EXPECT_EQ(target.vt, VT_NULL);
    SetDouble(number, 1);
    EXPECT_EQ(VariantChangeType(&target, &number, 0, VT_NULL), DISP_E_TYPEMISMATCH);
    ASSERT_EQ(VariantChangeType(&number, &number, 0, VT_EMPTY), S_OK);
    EXPECT_EQ(number.vt, VT_EMPTY);
}

TEST(Variant, ChangeTypeInPlaceFreesTheOldValue) {
    Var value;
    SetText(value, u"  17.5 ");
    ASSERT_EQ(VariantChangeType(&value, &value, 0, VT_R8), S_OK);
    EXPECT_EQ(value.dblVal, 17.5);
    ASSERT_EQ(VariantChangeType(&value, &value, 0, VT_BSTR), S_OK);
    ASSERT_EQ(VariantChangeType(&value, &value, 0, VT_BSTR), S_OK);
    EXPECT_EQ(BstrView(value.bstrVal), u"17.5");
    EXPECT_EQ(VariantChangeType(&value, &value, 0, VT_I2), S_OK);
    EXPECT_EQ(value.iVal, 18);
    SetText(value, u"oops");
    EXPECT_EQ(VariantChangeType(&value, &value, 0, VT_I4), DISP_E_TYPEMISMATCH);
    EXPECT_EQ(BstrView(value.bstrVal), u"oops");
}

TEST(Variant, CopyAndClear) {
    Var array, copy, nullText, bad;
    array.vt = VT_ARRAY | VT_VARIANT;
    array.parray = SafeArrayCreateVector(VT_VARIANT, 0, 2);
    SetText(array.parray->pvData[0], u"element");
    SetDouble(array.parray->pvData[1], 2.5);
    ASSERT_EQ(VariantCopy(&copy, &array), S_OK);
    ASSERT_NE(copy.parray, array.parray);
    EXPECT_NE(copy.parray->pvData[0].bstrVal, array.parray->pvData[0].bstrVal);
    EXPECT_EQ(BstrView(copy.parray->pvData[0].bstrVal), u"element");
    EXPECT_EQ(copy.parray->pvData[1].dblVal, 2.5);
    // Copying an element of the target's own array into the target.
    ASSERT_EQ(VariantCopy(&copy, &copy.parray->pvData[0]), S_OK);
    EXPECT_EQ(BstrView(copy.bstrVal), u"element");

    nullText.vt = VT_BSTR;
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
    // A locale with ',' as its decimal separator; built on the fly if it is not installed.
    const char* name = "de_DE.UTF-8";
    std::string previous = std::setlocale(LC_ALL, nullptr);
    std::string dir;
    if (!std::setlocale(LC_ALL, name)) {
        // One folder per process: test runs in parallel must not write the same files.
        dir = testing::TempDir() + "kest-locales-" + std::to_string(getpid());
        std::string command = "mkdir -p '" + dir + "' && localedef -i de_DE -f UTF-8 '" + dir +
                              "/" + name + "' >/dev/null 2>&1";
        if (std::system(command.c_str()) == 0) {
            setenv("LOCPATH", dir.c_str(), 1);
            std::setlocale(LC_ALL, name);
        }
    }
    struct RemoveDir {
        const std::string& dir;
        ~RemoveDir() {
            if (!dir.empty()) static_cast<void>(std::system(("rm -rf '" + dir + "'").c_str()));
        }
    } removeDir{dir};
    if (std::string(std::setlocale(LC_ALL, nullptr)) != name) {
        GTEST_SKIP() << "no German locale is installed and localedef could not build one";
    }
    char probe[16];
    std::snprintf(probe, sizeof probe, "%.1f", 2.5);
    std::u16string text = TextOfDouble(1234.5);
    Var source, target;
    SetText(source, u"1234.5");
    HRESULT dotHr = VariantChangeType(&target, &source, 0, VT_R8);
    double dotValue = target.dblVal;
    SetText(source, u"1234,5");
    HRESULT commaHr = VariantChangeType(&target, &source, 0, VT_R8);
    std::setlocale(LC_ALL, previous.c_str());

    ASSERT_STREQ(probe, "2,5") << "the German locale did not switch printf to ','";
    EXPECT_EQ(text, u"1234.5");
    EXPECT_EQ(dotHr, S_OK);
    EXPECT_EQ(dotValue, 1234.5);
    EXPECT_EQ(commaHr, DISP_E_TYPEMISMATCH);
}
