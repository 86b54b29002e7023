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

}  // namespace

TEST(Variant, DoubleToTextIsShortestRoundTrip) {
    struct Row {
        double number;
        const char16_t* text;
    } rows[] = {
        {0.0, u"0"},
        {-0.0, u"-0"},
        {1.0, u"1"},
        {-2.5, u"-2.5"},
        {0.1, u"0.1"},
        {1.0 / 3.0, u"0.3333333333333333"},
        {123456789012345678.0, u"123456789012345680"},
        {1e20, u"1e+20"},
        {1e21, u"1e+21"},
        {1e-5, u"1e-05"},
        {0.0001, u"1e-04"},
        {0.001, u"0.001"},  // a tie in length keeps fixed notation
        {1234.5, u"1234.5"},
        {1.5e-300, u"1.5e-300"},
        {5e-324, u"5e-324"},
        {std::numeric_limits<double>::max(), u"1.7976931348623157e+308"},
        {0.30000000000000004, u"0.30000000000000004"},
        {std::numeric_limits<double>::quiet_NaN(), u"NaN"},
        {std::numeric_limits<double>::infinity(), u"Infinity"},
        {-std::numeric_limits<double>::infinity(), u"-Infinity"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(testing::Message() << row.number);
        EXPECT_EQ(TextOfDouble(row.number), row.text);
    }
}

TEST(Variant, OtherTypesToText) {
    struct Row {
        const char* label;
        VARTYPE vt;
        double number;
        const char16_t* text;
    } rows[] = {
        {"empty", VT_EMPTY, 0, u""},
        {"short", VT_I2, -32768, u"-32768"},
        {"long", VT_I4, 2147483647, u"2147483647"},
        {"negative long", VT_I4, -2147483648.0, u"-2147483648"},
        {"float shortest at float precision", VT_R4, 0.1f, u"0.1"},
        {"float large", VT_R4, 3.0e38f, u"3e+38"},
        {"true", VT_BOOL, -1, u"True"},
        {"false", VT_BOOL, 0, u"False"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        Var source, target;
        source.vt = row.vt;
        switch (row.vt) {
        case VT_I2: source.iVal = static_cast<SHORT>(row.number); break;
        case VT_I4: source.lVal = static_cast<LONG>(row.number); break;
        case VT_R4: source.fltVal = static_cast<float>(row.number); break;
        case VT_BOOL: source.boolVal = row.number ? VARIANT_TRUE : VARIANT_FALSE; break;
        default: break;
        }
        ASSERT_EQ(VariantChangeType(&target, &source, 0, VT_BSTR), S_OK);
        ASSERT_EQ(target.vt, VT_BSTR);
        ASSERT_NE(target.bstrVal, nullptr);
        EXPECT_EQ(BstrView(target.bstrVal), row.text);
    }
}

TEST(Variant, TypesWithoutTextFormAreRefused) {
    Var null, error, array, target;
    null.vt = VT_NULL;
    error.vt = VT_ERROR;
    error.scode = E_FAIL;
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
    Var number;
    SetDouble(number, 1.0);
    EXPECT_EQ(VariantChangeType(&target, &number, 0, VT_ARRAY | VT_VARIANT), DISP_E_TYPEMISMATCH);
    EXPECT_EQ(VariantChangeType(&target, &number, 0, VT_ERROR), DISP_E_TYPEMISMATCH);
    EXPECT_EQ(VariantChangeType(&target, &number, 0, 77), DISP_E_BADVARTYPE);
    number.vt = 77;
    EXPECT_EQ(VariantChangeType(&target, &number, 0, VT_BSTR), DISP_E_BADVARTYPE);
    number.vt = VT_R8;
}

TEST(Variant, TextToNumbers) {
    constexpr HRESULT ok = S_OK;
    struct Row {
        const char16_t* text;
        HRESULT hr;
        double number;
    } rows[] = {
        {u"0", ok, 0},
        {u"42", ok, 42},
        {u"-42", ok, -42},
        {u"+42", ok, 42},
        {u"2.5", ok, 2.5},
        {u".5", ok, 0.5},
        {u"5.", ok, 5},
        {u"-.5e1", ok, -5},
        {u"1e5", ok, 1e5},
        {u"1E+05", ok, 1e5},
        {u"1.5e-3", ok, 0.0015},
        {u" \t\r\n12.25 \n", ok, 12.25},
        {u"0.1", ok, 0.1},
        {u"1.7976931348623157e308", ok, std::numeric_limits<double>::max()},
        {u"1e-400", ok, 0},
        {u"0.0000001e-320", ok, 0},
        {u"4.9e-324", ok, 5e-324},
        {u"0e999999", ok, 0},
        {u"1e309", DISP_E_OVERFLOW, 0},
        {u"-1e309", DISP_E_OVERFLOW, 0},
        {u"123456789e301", DISP_E_OVERFLOW, 0},
        {u"", DISP_E_TYPEMISMATCH, 0},
        {nullptr, DISP_E_TYPEMISMATCH, 0},
        {u"   ", DISP_E_TYPEMISMATCH, 0},
        {u"abc", DISP_E_TYPEMISMATCH, 0},
        {u"12abc", DISP_E_TYPEMISMATCH, 0},
        {u"1 2", DISP_E_TYPEMISMATCH, 0},
        {u"inf", DISP_E_TYPEMISMATCH, 0},
        {u"Infinity", DISP_E_TYPEMISMATCH, 0},
        {u"nan", DISP_E_TYPEMISMATCH, 0},
        {u"NaN", DISP_E_TYPEMISMATCH, 0},
        {u"0x10", DISP_E_TYPEMISMATCH, 0},
        {u"1,5", DISP_E_TYPEMISMATCH, 0},
        {u"1e", DISP_E_TYPEMISMATCH, 0},
        {u"1e+", DISP_E_TYPEMISMATCH, 0},
        {u"+", DISP_E_TYPEMISMATCH, 0},
        {u"-", DISP_E_TYPEMISMATCH, 0},
        {u".", DISP_E_TYPEMISMATCH, 0},
        {u"+-1", DISP_E_TYPEMISMATCH, 0},
        {u"--1", DISP_E_TYPEMISMATCH, 0},
        {u"1..2", DISP_E_TYPEMISMATCH, 0},
        {u"\u00A01", DISP_E_TYPEMISMATCH, 0},
        {u"\u0661", DISP_E_TYPEMISMATCH, 0},
        {u"1\v", DISP_E_TYPEMISMATCH, 0},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.text ? Utf16ToUtf8(row.text) : std::string("(null)"));
        Var source, target;
        SetText(source, row.text);
        target.vt = VT_I2;
        target.iVal = 7;
        EXPECT_EQ(VariantChangeType(&target, &source, 0, VT_R8), row.hr);
        if (row.hr == S_OK) {
            EXPECT_EQ(target.vt, VT_R8);
            EXPECT_EQ(target.dblVal, row.number);
        } else {
            // A text that is no number never turns into a silent value.
            EXPECT_EQ(target.vt, VT_I2);
            EXPECT_EQ(target.iVal, 7);
        }
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
        std::u16string text(BstrView(value.bstrVal));
        ASSERT_EQ(VariantChangeType(&value, &value, 0, VT_R8), S_OK) << Utf16ToUtf8(text);
        ASSERT_EQ(std::memcmp(&value.dblVal, &number, sizeof number), 0) << Utf16ToUtf8(text);
    }
}

TEST(Variant, IntegerTargetsRoundHalfToEvenAndCheckRange) {
    struct Row {
        double number;
        VARTYPE vt;
        HRESULT hr;
        LONG expected;
    } rows[] = {
        {2.5, VT_I4, S_OK, 2},
        {3.5, VT_I4, S_OK, 4},
        {-2.5, VT_I4, S_OK, -2},
        {-3.5, VT_I4, S_OK, -4},
        {2.4999999, VT_I4, S_OK, 2},
        {2.5000001, VT_I4, S_OK, 3},
        {0.5, VT_I4, S_OK, 0},
        {1.5, VT_I4, S_OK, 2},
        {2147483647.0, VT_I4, S_OK, 2147483647},
        {2147483647.4, VT_I4, S_OK, 2147483647},
        {2147483647.5, VT_I4, DISP_E_OVERFLOW, 0},
        {-2147483648.0, VT_I4, S_OK, -2147483647 - 1},
        {-2147483648.5, VT_I4, S_OK, -2147483647 - 1},
        {-2147483649.0, VT_I4, DISP_E_OVERFLOW, 0},
        {1e300, VT_I4, DISP_E_OVERFLOW, 0},
        {std::numeric_limits<double>::quiet_NaN(), VT_I4, DISP_E_OVERFLOW, 0},
        {std::numeric_limits<double>::infinity(), VT_I4, DISP_E_OVERFLOW, 0},
        {32767.0, VT_I2, S_OK, 32767},
        {32767.5, VT_I2, DISP_E_OVERFLOW, 0},
        {-32768.5, VT_I2, S_OK, -32768},
        {-32769.0, VT_I2, DISP_E_OVERFLOW, 0},
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
        // The same rules through text.
        char narrow[64];
        std::snprintf(narrow, sizeof narrow, "%.17g", row.number);
        if (!std::isfinite(row.number)) continue;
        Var text;
        SetText(text, Utf8ToUtf16(narrow).c_str());
        Var fromText;
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

    struct Row {
        const char16_t* text;
        HRESULT hr;
        VARIANT_BOOL value;
    } rows[] = {
        {u"True", S_OK, VARIANT_TRUE},   {u"true", S_OK, VARIANT_TRUE},
        {u" TRUE ", S_OK, VARIANT_TRUE}, {u"False", S_OK, VARIANT_FALSE},
        {u"fAlSe", S_OK, VARIANT_FALSE}, {u"-1", S_OK, VARIANT_TRUE},
        {u"0", S_OK, VARIANT_FALSE},     {u"2.5", S_OK, VARIANT_TRUE},
        {u"yes", DISP_E_TYPEMISMATCH, 0}, {u"", DISP_E_TYPEMISMATCH, 0},
        {u"Truee", DISP_E_TYPEMISMATCH, 0},
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
    Var empty, target;
    struct Row {
        VARTYPE vt;
        const char16_t* text;
    } rows[] = {{VT_I2, u"0"}, {VT_I4, u"0"}, {VT_R4, u"0"}, {VT_R8, u"0"},
                {VT_BOOL, u"False"}, {VT_BSTR, u""}};
    for (const Row& row : rows) {
        SCOPED_TRACE(row.vt);
        target.vt = VT_I4;
        target.lVal = 123;
        ASSERT_EQ(VariantChangeType(&target, &empty, 0, row.vt), S_OK);
        EXPECT_EQ(target.vt, row.vt);
        ASSERT_EQ(VariantChangeType(&target, &target, 0, VT_BSTR), S_OK);
        EXPECT_EQ(BstrView(target.bstrVal), row.text);
        VariantClear(&target);
    }
    ASSERT_EQ(VariantChangeType(&target, &empty, 0, VT_NULL), S_OK);
    EXPECT_EQ(target.vt, VT_NULL);
    Var number;
    SetDouble(number, 1);
    EXPECT_EQ(VariantChangeType(&target, &number, 0, VT_NULL), DISP_E_TYPEMISMATCH);
    ASSERT_EQ(VariantChangeType(&number, &number, 0, VT_EMPTY), S_OK);
    EXPECT_EQ(number.vt, VT_EMPTY);
}

TEST(Variant, ChangeTypeInPlaceFreesTheOldValue) {
    Var value;
    SetText(value, u"  17.5 ");
    ASSERT_EQ(VariantChangeType(&value, &value, 0, VT_R8), S_OK);
    EXPECT_EQ(value.vt, VT_R8);
    EXPECT_EQ(value.dblVal, 17.5);
    ASSERT_EQ(VariantChangeType(&value, &value, 0, VT_BSTR), S_OK);
    EXPECT_EQ(BstrView(value.bstrVal), u"17.5");
    ASSERT_EQ(VariantChangeType(&value, &value, 0, VT_BSTR), S_OK);
    EXPECT_EQ(BstrView(value.bstrVal), u"17.5");
    EXPECT_EQ(VariantChangeType(&value, &value, 0, VT_I2), S_OK);
    EXPECT_EQ(value.iVal, 18);
    SetText(value, u"oops");
    EXPECT_EQ(VariantChangeType(&value, &value, 0, VT_I4), DISP_E_TYPEMISMATCH);
    EXPECT_EQ(BstrView(value.bstrVal), u"oops");
}

TEST(Variant, CopyAndClear) {
    Var array, copy;
    array.vt = VT_ARRAY | VT_VARIANT;
    array.parray = SafeArrayCreateVector(VT_VARIANT, 0, 2);
    SetText(array.parray->pvData[0], u"element");
    SetDouble(array.parray->pvData[1], 2.5);
    ASSERT_EQ(VariantCopy(&copy, &array), S_OK);
    ASSERT_NE(copy.parray, array.parray);
    EXPECT_NE(copy.parray->pvData[0].bstrVal, array.parray->pvData[0].bstrVal);
    EXPECT_EQ(BstrView(copy.parray->pvData[0].bstrVal), u"element");
    EXPECT_EQ(copy.parray->pvData[1].dblVal, 2.5);
    ASSERT_EQ(VariantChangeType(&copy, &copy, 0, VT_ARRAY | VT_VARIANT), S_OK);
    EXPECT_EQ(BstrView(copy.parray->pvData[0].bstrVal), u"element");

    // Copying an element of the target's own array into the target.
    ASSERT_EQ(VariantCopy(&copy, &copy.parray->pvData[0]), S_OK);
    EXPECT_EQ(copy.vt, VT_BSTR);
    EXPECT_EQ(BstrView(copy.bstrVal), u"element");

    Var nullText;
    nullText.vt = VT_BSTR;
    nullText.bstrVal = nullptr;
    ASSERT_EQ(VariantCopy(&copy, &nullText), S_OK);
    EXPECT_EQ(copy.vt, VT_BSTR);
    EXPECT_EQ(copy.bstrVal, nullptr);

    Var bad;
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
            if (dir.empty()) return;
            int status = std::system(("rm -rf '" + dir + "'").c_str());
            static_cast<void>(status);
        }
    } removeDir{dir};
    if (std::string(std::setlocale(LC_ALL, nullptr)) != name) {
        GTEST_SKIP() << "no German locale is installed and localedef could not build one";
    }
    char probe[16];
    std::snprintf(probe, sizeof probe, "%.1f", 2.5);
    bool commaLocale = std::string(probe) == "2,5";

    std::u16string text = TextOfDouble(1234.5);
    Var source, target;
    SetText(source, u"1234.5");
    HRESULT dotHr = VariantChangeType(&target, &source, 0, VT_R8);
    double dotValue = target.dblVal;
    SetText(source, u"1234,5");
    HRESULT commaHr = VariantChangeType(&target, &source, 0, VT_R8);
    std::setlocale(LC_ALL, previous.c_str());

    ASSERT_TRUE(commaLocale) << "the German locale did not switch printf to ','";
    EXPECT_EQ(text, u"1234.5");
    EXPECT_EQ(dotHr, S_OK);
    EXPECT_EQ(dotValue, 1234.5);
    EXPECT_EQ(commaHr, DISP_E_TYPEMISMATCH);
}
