#include "platform/VariantT.h"

#include <gtest/gtest.h>

#include "platform/ComError.h"

using namespace kest;

namespace {

template <class Action>
HRESULT ThrownCode(Action action) {
    try {
        action();
    } catch (const _com_error& error) {
        return error.Error();
    }
    return S_OK;
}

_variant_t ArrayOf(std::initializer_list<_variant_t> elements) {
    _variant_t result;
    result.vt = VT_ARRAY | VT_VARIANT;
    result.parray = SafeArrayCreateVector(VT_VARIANT, 0, static_cast<ULONG>(elements.size()));
    LONG index = 0;
    for (const _variant_t& element : elements) {
        ThrowIfFailed(SafeArrayPutElement(result.parray, &index, &element));
        ++index;
    }
    return result;
}

}  // namespace

TEST(VariantT, ConstructorsSetTheNaturalType) {
    EXPECT_EQ(_variant_t(short(3)).vt, VT_I2);
    EXPECT_EQ(_variant_t(3L).vt, VT_I4);
    EXPECT_EQ(_variant_t(1.5f).vt, VT_R4);
    EXPECT_EQ(_variant_t(true).boolVal, VARIANT_TRUE);
    EXPECT_EQ(BstrView(_variant_t("gr\xC3\xBCn").bstrVal), u"gr\u00FCn");
    _variant_t nullText(_bstr_t{});
    EXPECT_EQ(nullText.vt, VT_BSTR);
    EXPECT_EQ(nullText.bstrVal, nullptr);
    EXPECT_EQ(_variant_t(short(-1), VT_BOOL).boolVal, VARIANT_TRUE);
    EXPECT_EQ(_variant_t(5, VT_ERROR).scode, 5);

    EXPECT_EQ(ThrownCode([] { _variant_t bad(short(1), VT_R8); }), E_INVALIDARG);
    EXPECT_EQ(ThrownCode([] { _variant_t bad(1.0, VT_I4); }), E_INVALIDARG);
    EXPECT_EQ(ThrownCode([] { _variant_t bad(static_cast<const VARIANT*>(nullptr)); }), E_POINTER);
    if (sizeof(long) > 4) {
        EXPECT_EQ(ThrownCode([] { _variant_t bad(0x100000000L); }), DISP_E_OVERFLOW);
    }
}

TEST(VariantT, AssignmentsReplaceTypeAndValue) {
    _variant_t value(u"text");
    value = 7;
    EXPECT_EQ(value.vt, VT_I4);
    EXPECT_EQ(value.lVal, 7);
    value = "n";
    EXPECT_EQ(BstrView(value.bstrVal), u"n");

    _variant_t array = ArrayOf({_variant_t(1), _variant_t(u"two")});
    value = array;
    EXPECT_NE(value.parray, array.parray);
    EXPECT_TRUE(value == array);
    value = value;  // self-assignment keeps the value
    EXPECT_TRUE(value == array);
    // Assigning an element of its own array to the value itself.
    value = value.parray->pvData[1];
    EXPECT_EQ(BstrView(value.bstrVal), u"two");
}

TEST(VariantT, CopyIsDeepAndMoveTransfers) {
    _variant_t original = ArrayOf({_variant_t(u"a"), ArrayOf({_variant_t(2.5)})});
    _variant_t copy(original);
    ASSERT_NE(copy.parray, original.parray);
    _variant_t changed(u"b");
    LONG index = 0;
    ASSERT_EQ(SafeArrayPutElement(copy.parray, &index, &changed), S_OK);
    EXPECT_EQ(BstrView(original.parray->pvData[0].bstrVal), u"a");

    SAFEARRAY* storage = original.parray;
    _variant_t moved(std::move(original));
    EXPECT_EQ(moved.parray, storage);
    EXPECT_EQ(original.vt, VT_EMPTY);
    VARIANT raw = moved.Detach();
    EXPECT_EQ(moved.vt, VT_EMPTY);
    _variant_t attached(raw, false);
    EXPECT_EQ(attached.parray, storage);
}

TEST(VariantT, ConversionOperatorsThrowTheFailureCode) {
    const HRESULT mismatch = DISP_E_TYPEMISMATCH;
    struct Row {
        const char* label;
        _variant_t value;
        HRESULT toDouble, toInt, toText;
    } rows[] = {
        {"number text", _variant_t(u" 12.5 "), S_OK, S_OK, S_OK},
        {"word", _variant_t(u"abc"), mismatch, mismatch, S_OK},
        {"null text", _variant_t(_bstr_t{}), mismatch, mismatch, S_OK},
        {"huge", _variant_t(1e300), S_OK, DISP_E_OVERFLOW, S_OK},
        {"array", ArrayOf({_variant_t(1)}), mismatch, mismatch, mismatch},
        {"empty", _variant_t(), S_OK, S_OK, S_OK},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        EXPECT_EQ(ThrownCode([&] { (void)static_cast<double>(row.value); }), row.toDouble);
        EXPECT_EQ(ThrownCode([&] { (void)static_cast<int>(row.value); }), row.toInt);
        EXPECT_EQ(ThrownCode([&] { (void)static_cast<_bstr_t>(row.value); }), row.toText);
    }
    _variant_t text(u"12.5");
    EXPECT_EQ(static_cast<double>(text), 12.5);
    EXPECT_EQ(static_cast<int>(text), 12);  // half to even
    EXPECT_EQ(static_cast<long>(_variant_t(u"13.5")), 14);
    EXPECT_TRUE(static_cast<bool>(_variant_t(u"true")));
    EXPECT_EQ(static_cast<_bstr_t>(_variant_t(2.5)).View(), u"2.5");
    EXPECT_EQ(text.vt, VT_BSTR);  // conversions leave the value alone
}

TEST(VariantT, ChangeTypeInPlaceAndFromSource) {
    _variant_t value(u"42");
    value.ChangeType(VT_I4);
    EXPECT_EQ(value.lVal, 42);
    _variant_t source(2.5);
    value.ChangeType(VT_BSTR, &source);
    EXPECT_EQ(BstrView(value.bstrVal), u"2.5");
    EXPECT_EQ(source.vt, VT_R8);
    _variant_t word(u"word");
    EXPECT_EQ(ThrownCode([&] { word.ChangeType(VT_R8); }), DISP_E_TYPEMISMATCH);
    EXPECT_EQ(BstrView(word.bstrVal), u"word");
    EXPECT_EQ(word.GetAddress()->vt, VT_EMPTY);  // frees the old value for an out parameter
}

TEST(VariantT, EqualityComparesTypeAndValue) {
    struct Row {
        const char* label;
        _variant_t left, right;
        bool equal;
    } rows[] = {
        {"int vs double", _variant_t(1), _variant_t(1.0), false},
        {"null text vs empty", _variant_t(_bstr_t{}), _variant_t(u""), true},
        {"case", _variant_t(u"a"), _variant_t(u"A"), false},
        {"arrays", ArrayOf({_variant_t(1), _variant_t(u"x")}),
         ArrayOf({_variant_t(1), _variant_t(u"x")}), true},
        {"array lengths", ArrayOf({_variant_t(1)}), ArrayOf({_variant_t(1), _variant_t(1)}), false},
        {"array elements", ArrayOf({_variant_t(1)}), ArrayOf({_variant_t(2)}), false},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        EXPECT_EQ(row.left == row.right, row.equal);
        EXPECT_EQ(row.left != row.right, !row.equal);
    }
}

TEST(VariantT, AllocationFailureThrowsOutOfMemory) {
    _variant_t text(u"text");
    SysFailAllocationAfter(0);
    HRESULT copyCode = ThrownCode([&] { _variant_t copy(text); });
    SysFailAllocationAfter(0);
    HRESULT convertCode = ThrownCode([] { (void)static_cast<_bstr_t>(_variant_t(1)); });
    SysFailAllocationAfter(-1);
    EXPECT_EQ(copyCode, E_OUTOFMEMORY);
    EXPECT_EQ(convertCode, E_OUTOFMEMORY);
}
