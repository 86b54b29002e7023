#pragma once
// Shared by the value list tests: expected array elements, documents from text, reason codes.

#include <gtest/gtest.h>

#include <cmath>
#include <functional>
#include <string>
#include <vector>

#include "platform/KestCalmorphDLLError.h"
#include "platform/XmlDom.h"

namespace kest {
namespace test {

struct Element {
    VARTYPE vt;
    double number;
    std::u16string text;
};
inline Element I4(int v) { return {VT_I4, static_cast<double>(v), {}}; }
inline Element R8(double v) { return {VT_R8, v, {}}; }
inline Element Str(std::u16string v) { return {VT_BSTR, 0, std::move(v)}; }
inline Element Empty() { return {VT_EMPTY, 0, {}}; }

inline void ExpectElements(const _variant_t& value, const std::vector<Element>& expected) {
    ASSERT_EQ(VT_ARRAY | VT_VARIANT, value.vt);
    LONG lower = -1;
    ASSERT_EQ(S_OK, SafeArrayGetLBound(value.parray, 1, &lower));
    EXPECT_EQ(0, lower);
    ASSERT_EQ(expected.size(), value.parray->rgsabound[0].cElements);
    for (LONG i = 0; i < static_cast<LONG>(expected.size()); ++i) {
        SCOPED_TRACE("element " + std::to_string(i));
        _variant_t element;
        ASSERT_EQ(S_OK, SafeArrayGetElement(value.parray, &i, &element));
        const Element& want = expected[static_cast<std::size_t>(i)];
        ASSERT_EQ(want.vt, element.vt);
        if (want.vt == VT_I4) {
            EXPECT_EQ(want.number, element.lVal);
        } else if (want.vt == VT_R8 && std::isnan(want.number)) {
            EXPECT_TRUE(std::isnan(element.dblVal));
        } else if (want.vt == VT_R8) {
            EXPECT_EQ(want.number, element.dblVal);
            EXPECT_EQ(std::signbit(want.number), std::signbit(element.dblVal));
        } else if (want.vt == VT_BSTR) {
            EXPECT_EQ(want.text, std::u16string(BstrView(element.bstrVal)));
        }
    }
}

/// The elements of an array as expectations for ExpectElements (numbers compared exactly).
inline std::vector<Element> ElementsOf(const _variant_t& array) {
    std::vector<Element> result;
    for (LONG i = 0; i < static_cast<LONG>(array.parray->rgsabound[0].cElements); ++i) {
        _variant_t e;
        EXPECT_EQ(S_OK, SafeArrayGetElement(array.parray, &i, &e));
        result.push_back(e.vt == VT_R8   ? R8(e.dblVal)
                         : e.vt == VT_I4 ? I4(e.lVal)
                                         : Element{e.vt, 0, {}});
    }
    return result;
}

inline std::string Narrow(const std::u16string& text) { return Utf16ToUtf8(text); }

inline IXMLDOMDocument2Ptr LoadDocument(const std::string& xml) {
    IXMLDOMDocument2Ptr doc;
    EXPECT_EQ(S_OK, doc.CreateInstance(kProgIdDOMDocument40));
    doc->Putasync(VARIANT_FALSE);
    doc->PutvalidateOnParse(VARIANT_FALSE);
    EXPECT_EQ(VARIANT_TRUE, doc->loadXML(_bstr_t(xml))) << xml;
    return doc;
}

/// The reason code of the KestCalmorphDLLError the action throws, -1 when it throws none.
inline int ReasonOf(const std::function<void()>& action) {
    try {
        action();
    } catch (const KestCalmorphDLLError& error) {
        return error.GetReason();
    }
    return -1;
}

}  // namespace test
}  // namespace kest
