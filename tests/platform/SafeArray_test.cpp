#include "platform/SafeArray.h"

#include <gtest/gtest.h>

#include "platform/Variant.h"

using namespace kest;

namespace {

VARIANT Text(const char16_t* text) {
    VARIANT value;
    VariantInit(&value);
    value.vt = VT_BSTR;
    value.bstrVal = SysAllocString(text);
    return value;
}

VARIANT Long(LONG number) {
    VARIANT value;
    VariantInit(&value);
    value.vt = VT_I4;
    value.lVal = number;
    return value;
}

// Stores a copy of `value` and frees the original.
HRESULT PutAndClear(SAFEARRAY* array, LONG index, VARIANT value) {
    HRESULT hr = SafeArrayPutElement(array, &index, &value);
    VariantClear(&value);
    return hr;
}

std::u16string TextAt(SAFEARRAY* array, ULONG offset) {
    return std::u16string(BstrView(array->pvData[offset].bstrVal));
}

}  // namespace

TEST(SafeArray, OnlyOneDimensionOfVariantsWithCheckedBounds) {
    SAFEARRAYBOUND bounds[2] = {{2, 0}, {2, 0}};
    EXPECT_EQ(SafeArrayCreateVector(VT_I4, 0, 3), nullptr);
    EXPECT_EQ(SafeArrayCreate(VT_VARIANT, 2, bounds), nullptr);
    EXPECT_EQ(SafeArrayCreate(VT_VARIANT, 1, nullptr), nullptr);
    // The upper bound must be representable.
    EXPECT_EQ(SafeArrayCreateVector(VT_VARIANT, 0x7FFFFFFF, 2), nullptr);
    EXPECT_EQ(SafeArrayDestroy(nullptr), E_INVALIDARG);
    LONG bound, index = 0;
    VARIANT value = Long(1), out;
    EXPECT_EQ(SafeArrayGetLBound(nullptr, 1, &bound), E_INVALIDARG);
    EXPECT_EQ(SafeArrayPutElement(nullptr, &index, &value), E_INVALIDARG);

    struct Row {
        LONG lower;
        ULONG count;
    } rows[] = {{0, 0}, {1, 2}, {-5, 3}};
    for (const Row& row : rows) {
        SCOPED_TRACE(testing::Message() << "lower " << row.lower << " count " << row.count);
        SAFEARRAY* array = SafeArrayCreateVector(VT_VARIANT, row.lower, row.count);
        ASSERT_NE(array, nullptr);
        EXPECT_EQ(SafeArrayGetDim(array), 1u);
        LONG lower = 99, upper = 99;
        EXPECT_EQ(SafeArrayGetLBound(array, 1, &lower), S_OK);
        EXPECT_EQ(SafeArrayGetUBound(array, 1, &upper), S_OK);
        EXPECT_EQ(lower, row.lower);
        EXPECT_EQ(upper, row.lower + static_cast<LONG>(row.count) - 1);
        EXPECT_EQ(SafeArrayGetLBound(array, 2, &lower), DISP_E_BADINDEX);
        EXPECT_EQ(SafeArrayGetUBound(array, 0, &upper), DISP_E_BADINDEX);
        for (LONG bad : {row.lower - 1, upper + 1, LONG(0x7FFFFFFF), LONG(-0x7FFFFFFF - 1)}) {
            SCOPED_TRACE(bad);
            EXPECT_EQ(PutAndClear(array, bad, Long(7)), DISP_E_BADINDEX);
            out.vt = VT_I2;  // must stay untouched
            EXPECT_EQ(SafeArrayGetElement(array, &bad, &out), DISP_E_BADINDEX);
            EXPECT_EQ(out.vt, VT_I2);
        }
        for (index = row.lower; index <= upper; ++index) {
            EXPECT_EQ(array->pvData[index - row.lower].vt, VT_EMPTY);
            EXPECT_EQ(PutAndClear(array, index, Long(index * 10)), S_OK);
            VariantInit(&out);
            ASSERT_EQ(SafeArrayGetElement(array, &index, &out), S_OK);
            EXPECT_EQ(out.lVal, index * 10);
        }
        EXPECT_EQ(SafeArrayDestroy(array), S_OK);
    }
}

TEST(SafeArray, ElementsAreCopiesInBothDirections) {
    SAFEARRAY* array = SafeArrayCreateVector(VT_VARIANT, 0, 1);
    VARIANT text = Text(u"first"), out;
    LONG index = 0;
    ASSERT_EQ(SafeArrayPutElement(array, &index, &text), S_OK);
    EXPECT_NE(array->pvData[0].bstrVal, text.bstrVal);
    VariantClear(&text);
    // Overwriting frees the old element (LeakSanitizer checks this).
    ASSERT_EQ(PutAndClear(array, 0, Text(u"second")), S_OK);
    VariantInit(&out);
    ASSERT_EQ(SafeArrayGetElement(array, &index, &out), S_OK);
    EXPECT_EQ(BstrView(out.bstrVal), u"second");
    EXPECT_NE(out.bstrVal, array->pvData[0].bstrVal);
    VariantClear(&out);
    EXPECT_EQ(SafeArrayDestroy(array), S_OK);
}

TEST(SafeArray, RedimKeepsElementsBelowAndClearsRemoved) {
    SAFEARRAY* array = SafeArrayCreateVector(VT_VARIANT, 0, 0);
    for (LONG i = 0; i < 5; ++i) {
        SAFEARRAYBOUND bound{static_cast<ULONG>(i + 1), 0};
        ASSERT_EQ(SafeArrayRedim(array, &bound), S_OK);
        ASSERT_EQ(PutAndClear(array, i, Text(i % 2 ? u"odd" : u"even")), S_OK);
    }
    SAFEARRAYBOUND shrink{2, 0}, grow{4, 0};
    ASSERT_EQ(SafeArrayRedim(array, &shrink), S_OK);
    LONG upper;
    SafeArrayGetUBound(array, 1, &upper);
    EXPECT_EQ(upper, 1);
    // Growing again gives empty elements, not the removed ones.
    ASSERT_EQ(SafeArrayRedim(array, &grow), S_OK);
    EXPECT_EQ(array->pvData[2].vt, VT_EMPTY);
    EXPECT_EQ(array->pvData[3].vt, VT_EMPTY);
    EXPECT_EQ(TextAt(array, 0) + TextAt(array, 1), u"evenodd");
    EXPECT_EQ(SafeArrayRedim(array, nullptr), E_INVALIDARG);
    EXPECT_EQ(SafeArrayDestroy(array), S_OK);
}

TEST(SafeArray, CopyIsDeep) {
    VARIANT nested;
    VariantInit(&nested);
    nested.vt = VT_ARRAY | VT_VARIANT;
    nested.parray = SafeArrayCreateVector(VT_VARIANT, 0, 1);
    PutAndClear(nested.parray, 0, Text(u"nested"));
    SAFEARRAY* array = SafeArrayCreateVector(VT_VARIANT, 3, 2);
    PutAndClear(array, 3, Text(u"text"));
    PutAndClear(array, 4, nested);
    SAFEARRAY* copy = nullptr;
    ASSERT_EQ(SafeArrayCopy(array, &copy), S_OK);
    EXPECT_EQ(copy->rgsabound[0].lLbound, 3);
    EXPECT_EQ(copy->rgsabound[0].cElements, 2u);
    EXPECT_NE(copy->pvData[0].bstrVal, array->pvData[0].bstrVal);
    EXPECT_NE(copy->pvData[1].parray, array->pvData[1].parray);
    EXPECT_EQ(SafeArrayDestroy(array), S_OK);
    // The copy survives the original.
    EXPECT_EQ(TextAt(copy, 0) + TextAt(copy->pvData[1].parray, 0), u"textnested");
    EXPECT_EQ(SafeArrayDestroy(copy), S_OK);
    SAFEARRAY* none = reinterpret_cast<SAFEARRAY*>(1);
    EXPECT_EQ(SafeArrayCopy(nullptr, &none), E_INVALIDARG);
    EXPECT_EQ(none, nullptr);
}

TEST(SafeArray, LockedArrayCannotBeDestroyedOrResized) {
    SAFEARRAY* array = SafeArrayCreateVector(VT_VARIANT, 0, 2);
    void* data = nullptr;
    ASSERT_EQ(SafeArrayAccessData(array, &data), S_OK);
    EXPECT_EQ(data, array->pvData);
    ASSERT_EQ(SafeArrayAccessData(array, &data), S_OK);
    SAFEARRAYBOUND bound{4, 0};
    EXPECT_EQ(SafeArrayRedim(array, &bound), DISP_E_ARRAYISLOCKED);
    VARIANT holder;
    VariantInit(&holder);
    holder.vt = VT_ARRAY | VT_VARIANT;
    holder.parray = array;
    EXPECT_EQ(VariantClear(&holder), DISP_E_ARRAYISLOCKED);
    EXPECT_EQ(holder.vt, VT_ARRAY | VT_VARIANT);
    EXPECT_EQ(SafeArrayUnaccessData(array), S_OK);
    EXPECT_EQ(SafeArrayDestroy(array), DISP_E_ARRAYISLOCKED);  // still locked once
    EXPECT_EQ(SafeArrayUnaccessData(array), S_OK);
    EXPECT_EQ(SafeArrayUnaccessData(array), E_UNEXPECTED);
    EXPECT_EQ(VariantClear(&holder), S_OK);
}
