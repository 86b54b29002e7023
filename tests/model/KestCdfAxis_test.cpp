#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <functional>
#include <limits>
#include <string>
#include <vector>

#include "ValueListTestUtil.h"
#include "model/KestCdfAxis.h"
#include "platform/KestCalmorphDLLError.h"
#include "platform/XmlDom.h"

using namespace kest;
using namespace kest::test;

namespace {

KestCdfAxis ReadAxis(const char* xml) {
    IXMLDOMDocument2Ptr doc = LoadDocument(xml);
    KestCdfAxis axis;
    EXPECT_TRUE(axis.ConvertAxisNode(doc->GetdocumentElement()));
    return axis;
}

// Writes the axis under a fresh CAL-ITEM element and returns the new AXIS element.
IXMLDOMNodePtr WriteAxis(KestCdfAxis& axis, IXMLDOMDocument2Ptr& doc) {
    doc = LoadDocument("<CAL-ITEM/>");
    IXMLDOMNodePtr parent = doc->GetdocumentElement();
    EXPECT_TRUE(
        axis.ConvertAxisNodeToXML(parent, doc.GetInterfacePtr(), KestCdfNormalizedString()));
    return parent->GetlastChild();
}

std::u16string WrittenText(KestCdfAxis& axis) {
    IXMLDOMDocument2Ptr doc;
    return WriteAxis(axis, doc)->Gettext().ToU16String();
}

KestCdfAxis AxisWithFormat(const char16_t* formatType) {
    KestCdfAxis axis;
    axis.SetFormatType(KestCdfNormalizedString(CComBSTR(formatType)));
    return axis;
}

}  // namespace

TEST(KestCdfAxis, SplitsTextByFormatTypeAndWritesItBack) {
    const double inf = std::numeric_limits<double>::infinity();
    const std::u16string longToken = u"1." + std::u16string(200, u'0') + u"1";
    struct Row {
        const char16_t* format;
        std::u16string text;
        std::vector<Element> elements;
        std::u16string written;
    } rows[] = {
        {u"NUMERIC", u"1 2 3", {I4(1), I4(2), I4(3)}, u"1 2 3"},
        {u"NUMERIC", u"1 2.5 3", {R8(1), R8(2.5), R8(3)}, u"1 2.5 3"},
        {u"NUMERIC", u"1  2", {I4(1), I4(0), I4(2)}, u"1 0 2"},
        {u"NUMERIC", u"1 2 ", {I4(1), I4(2), I4(0)}, u"1 2 0"},
        {u"NUMERIC", u" 1 2", {I4(1), I4(2), Empty()}, u"1 2 0"},
        {u"NUMERIC", u" ", {I4(0), Empty()}, u"0 0"},
        {u"NUMERIC", u"", {I4(0)}, u"0"},
        {u"NUMERIC", u"1e5 2", {I4(1), I4(2)}, u"1 2"},
        {u"NUMERIC", u"1e20 0.5", {R8(1e20), R8(0.5)}, u"1.0e+020 0.5"},
        {u"NUMERIC", u"0.00001 -0.0", {R8(1e-5), R8(-0.0)}, u"1.0e-005 -0.0"},
        {u"NUMERIC", u"1\t2\n3", {I4(1)}, u"1"},
        {u"NUMERIC", u"-7 +8 x 0x1A", {I4(-7), I4(8), I4(0), I4(0)}, u"-7 8 0 0"},
        {u"NUMERIC",
         u"4294967296 -4294967296",
         {R8(4294967296.0), R8(-4294967296.0)},
         u"4294967296.0 -4294967296.0"},
        {u"NUMERIC", u"inf -INFINITY 1. 0x1p3", {R8(inf), R8(-inf), R8(1), R8(8)}, u"inf -inf 1 8"},
        {u"NUMERIC", u"nan 0.1", {R8(std::nan("")), R8(0.1)}, u"nan 0.1"},
        {u"NUMERIC", longToken + u" 7", {R8(1.0), R8(7)}, u"1 7"},
        {u"NUMERIC",
         u"0.1 0.30000000000000004",
         {R8(0.1), R8(0.30000000000000004)},
         u"0.1 0.30000000000000004"},
        {u"STRING", u"\"a b\" \"c\"", {Str(u"a b"), Str(u"c")}, u"\"a b\" \"c\""},
        {u"STRING", u"\"\" x \"y", {Str(u"")}, u"\"\""},
        {u"STRING", u"a b", {}, u""},
        {u"STRING", u"\"a b", {}, u""},
        {u"LABEL", u"1 2 \"x\"", {Str(u"1 2 \"x\"")}, u"1 2 \"x\""},
        {u"LABEL", u"", {Str(u"")}, u""},
        {u"STRING",
         u"\"\u00e9\" \"\U0001F600 \u20ac\"",
         {Str(u"\u00e9"), Str(u"\U0001F600 \u20ac")},
         u"\"\u00e9\" \"\U0001F600 \u20ac\""},
        {u"LABEL", u"\u00e9 1", {Str(u"\u00e9 1")}, u"\u00e9 1"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(Narrow(row.format) + " \"" + Narrow(row.text) + "\"");
        KestCdfAxis axis = AxisWithFormat(row.format);
        axis.SetAxisValue(_variant_t(row.text));
        ExpectElements(axis.GetAxisValue(), row.elements);
        EXPECT_EQ(row.written, WrittenText(axis));
    }
}

TEST(KestCdfAxis, OtherFormatTypesKeepTheValue) {
    for (const char16_t* format : {u"numeric", u"", u"NUMERIC ", u"Label"}) {
        SCOPED_TRACE(Narrow(format));
        KestCdfAxis axis = AxisWithFormat(format);
        axis.SetAxisValue(_variant_t(u"1 2"));
        EXPECT_EQ(VT_EMPTY, axis.GetAxisValue().vt);

        KestCdfAxis numeric = AxisWithFormat(u"NUMERIC");
        numeric.SetAxisValue(_variant_t(u"4"));
        numeric.SetFormatType(KestCdfNormalizedString(CComBSTR(format)));
        numeric.SetAxisValue(_variant_t(u"5 6"));
        ExpectElements(numeric.GetAxisValue(), {I4(4)});
    }
}

TEST(KestCdfAxis, SplitsNumbersAsTheirPrintedText) {
    struct Row {
        _variant_t value;
        std::vector<Element> elements;
    } rows[] = {
        {_variant_t(3.0), {I4(3)}},
        {_variant_t(2.5), {R8(2.5)}},
        {_variant_t(1e20), {R8(1e20)}},
        {_variant_t(0.30000000000000004), {R8(0.30000000000000004)}},
        {_variant_t(0.5f), {R8(0.5)}},
        {_variant_t(-5), {I4(-5)}},
        {_variant_t(), {I4(0)}},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.value.vt);
        KestCdfAxis axis = AxisWithFormat(u"NUMERIC");
        axis.SetAxisValue(row.value);
        ExpectElements(axis.GetAxisValue(), row.elements);
    }
    KestCdfAxis label = AxisWithFormat(u"LABEL");
    label.SetAxisValue(_variant_t(2.5));
    ExpectElements(label.GetAxisValue(), {R8(2.5)});
    EXPECT_EQ(u"2.5", WrittenText(label));
    KestCdfAxis strings = AxisWithFormat(u"STRING");
    strings.SetAxisValue(_variant_t(2.5));
    ExpectElements(strings.GetAxisValue(), {});
}

TEST(KestCdfAxis, RejectsItsOwnValueAndKeepsIt) {
    for (const char16_t* format : {u"NUMERIC", u"STRING", u"LABEL", u"other"}) {
        SCOPED_TRACE(Narrow(format));
        KestCdfAxis axis = AxisWithFormat(u"LABEL");
        axis.SetAxisValue(_variant_t(u"x y"));
        axis.SetFormatType(KestCdfNormalizedString(CComBSTR(format)));
        EXPECT_THROW(axis.SetAxisValue(axis.GetAxisValue()), _com_error);
        ExpectElements(axis.GetAxisValue(), {Str(u"x y")});
    }
    KestCdfAxis axis = AxisWithFormat(u"NUMERIC");
    _variant_t null;
    null.vt = VT_NULL;
    EXPECT_THROW(axis.SetAxisValue(null), _com_error);
    EXPECT_EQ(VT_EMPTY, axis.GetAxisValue().vt);
}

TEST(KestCdfAxis, CopiesAreIndependent) {
    KestCdfAxis axis = AxisWithFormat(u"STRING");
    axis.SetSize(2);
    axis.SetSwUnits(KestCdfNormalizedString(CComBSTR(u"rpm")));
    axis.SetAxisValue(_variant_t(u"\"a\" \"b\""));
    KestCdfAxis copy(axis);
    KestCdfAxis assigned;
    assigned = axis;
    copy.SetAxisValue(_variant_t(u"\"c\""));
    assigned.SetFormatType(KestCdfNormalizedString(CComBSTR(u"NUMERIC")));
    assigned.SetAxisValue(_variant_t(u"9"));
    ExpectElements(axis.GetAxisValue(), {Str(u"a"), Str(u"b")});
    ExpectElements(copy.GetAxisValue(), {Str(u"c")});
    ExpectElements(assigned.GetAxisValue(), {I4(9)});
    EXPECT_EQ(2u, copy.GetSize());
    EXPECT_EQ(u"rpm", assigned.GetSwUnits().ToU16String());
    EXPECT_EQ(u"STRING", axis.GetFormatType().ToU16String());
    assigned = assigned;
    ExpectElements(assigned.GetAxisValue(), {I4(9)});
    // The getter hands out a copy: changing it leaves the axis alone.
    _variant_t value = axis.GetAxisValue();
    EXPECT_NE(value.parray, axis.GetAxisValue().parray);
}

TEST(KestCdfAxis, ReadsAnAxisElementAndWritesItBack) {
    const char* xml = "<AXIS size=\"3\" sw-units=\"rpm\" format-type=\"NUMERIC\">0 10 20</AXIS>";
    KestCdfAxis axis = ReadAxis(xml);
    EXPECT_EQ(3u, axis.GetSize());
    EXPECT_EQ(u"rpm", axis.GetSwUnits().ToU16String());
    EXPECT_EQ(u"NUMERIC", axis.GetFormatType().ToU16String());
    ExpectElements(axis.GetAxisValue(), {I4(0), I4(10), I4(20)});

    IXMLDOMDocument2Ptr doc;
    IXMLDOMNodePtr written = WriteAxis(axis, doc);
    EXPECT_EQ(xml, written->Getxml().ToString());
}

TEST(KestCdfAxis, WritesInTheGivenNamespace) {
    KestCdfAxis axis = ReadAxis("<AXIS size=\"1\" sw-units=\"\" format-type=\"LABEL\">x</AXIS>");
    IXMLDOMDocument2Ptr doc = LoadDocument("<CAL-ITEM/>");
    IXMLDOMNodePtr parent = doc->GetdocumentElement();
    const char16_t* ns = u"http://example.com/schemas/cdf/1.0";
    axis.ConvertAxisNodeToXML(parent, doc.GetInterfacePtr(), KestCdfNormalizedString(CComBSTR(ns)));
    IXMLDOMNodePtr written = parent->GetlastChild();
    EXPECT_EQ(u"AXIS", written->GetnodeName().ToU16String());
    EXPECT_EQ(ns, written->GetnamespaceURI().ToU16String());
    EXPECT_EQ(u"x", written->Gettext().ToU16String());
}

TEST(KestCdfAxis, ReadsTheSizeAsATruncatedNumber) {
    struct Row {
        const char* size;
        unsigned int value;
        const char* written;
    } rows[] = {
        {"3", 3, "3"},
        {"3.9", 3, "3"},
        {"-3.9", 4294967293u, "-3"},
        {"-1", 4294967295u, "-1"},
        {" 7 ", 7, "7"},
        {"2147483648", 2147483648u, "-2147483648"},
        {"4294967296", 0, "0"},
        {"4294967301", 5, "5"},
        {"1e30", 4294967295u, "-1"},  // beyond 64 bits: saturates, low 32 bits kept
        {"-1e30", 0, "0"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.size);
        const std::string xml = std::string("<AXIS size=\"") + row.size +
                                "\" sw-units=\"\" format-type=\"NUMERIC\">1 2 3</AXIS>";
        KestCdfAxis axis = ReadAxis(xml.c_str());
        EXPECT_EQ(row.value, axis.GetSize());
        IXMLDOMDocument2Ptr doc;
        IXMLDOMElementPtr written = WriteAxis(axis, doc);
        EXPECT_EQ(_bstr_t(row.written), _bstr_t(written->getAttribute(_bstr_t("size"))));
    }
}

TEST(KestCdfAxis, TakesAttributesByPosition) {
    KestCdfAxis axis =
        ReadAxis("<AXIS a=\"2\" b=\"A&#9;B&#10;C\" c=\"NUMERIC\" d=\"ignored\">1 2</AXIS>");
    EXPECT_EQ(2u, axis.GetSize());
    EXPECT_EQ(u"A B C", axis.GetSwUnits().ToU16String());
    ExpectElements(axis.GetAxisValue(), {I4(1), I4(2)});

    axis.SetSwUnits(KestCdfNormalizedString(_bstr_t(u"A\tB")));
    EXPECT_EQ(u"A\tB", axis.GetSwUnits().ToU16String());

    IXMLDOMDocument2Ptr doc =
        LoadDocument("<AXIS format-type=\"NUMERIC\" size=\"3\" sw-units=\"x\">1</AXIS>");
    KestCdfAxis swapped;
    EXPECT_THROW(swapped.ConvertAxisNode(doc->GetdocumentElement()), _com_error);
}

TEST(KestCdfAxis, FailsOnMissingAttributesAfterSettingTheEarlierOnes) {
    struct Row {
        const char* xml;
        int reason;
        unsigned int size;
        const char16_t* units;
    } rows[] = {
        {"<AXIS size=\"4\" sw-units=\"rpm\">1</AXIS>", reason::kAxisAttributeMissing, 4, u"rpm"},
        {"<AXIS size=\"4\">1</AXIS>", reason::kAxisAttributeMissing, 4, u"old"},
        {"<AXIS>1</AXIS>", reason::kAxisAttributeMissing, 9, u"old"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.xml);
        IXMLDOMDocument2Ptr doc = LoadDocument(row.xml);
        KestCdfAxis axis;
        axis.SetSize(9);
        axis.SetSwUnits(KestCdfNormalizedString(CComBSTR(u"old")));
        EXPECT_EQ(row.reason, ReasonOf([&] { axis.ConvertAxisNode(doc->GetdocumentElement()); }));
        EXPECT_EQ(row.size, axis.GetSize());
        EXPECT_EQ(row.units, axis.GetSwUnits().ToU16String());
        EXPECT_EQ(VT_EMPTY, axis.GetAxisValue().vt);
    }
    IXMLDOMDocument2Ptr doc = LoadDocument("<AXIS size=\"abc\" sw-units=\"\" format-type=\"\"/>");
    KestCdfAxis axis;
    EXPECT_THROW(axis.ConvertAxisNode(doc->GetdocumentElement()), _com_error);
}

TEST(KestCdfAxis, ReaderFailures) {
    KestCdfAxis axis;
    try {
        axis.ConvertAxisNode(IXMLDOMNodePtr());
        ADD_FAILURE() << "no exception";
    } catch (const _com_error& error) {
        EXPECT_EQ(E_POINTER, error.Error());
    }
    // A node without attribute map (a text node).
    IXMLDOMDocument2Ptr doc = LoadDocument("<AXIS>text</AXIS>");
    IXMLDOMNodePtr text = doc->GetdocumentElement()->GetfirstChild();
    EXPECT_EQ(reason::kAxisNoAttributeMap, ReasonOf([&] { axis.ConvertAxisNode(text); }));
    // A child element has no text.
    IXMLDOMDocument2Ptr nested =
        LoadDocument("<AXIS size=\"1\" sw-units=\"\" format-type=\"NUMERIC\">1<X/></AXIS>");
    EXPECT_THROW(axis.ConvertAxisNode(nested->GetdocumentElement()), _com_error);
}

TEST(KestCdfAxis, TheLastChildDecides) {
    KestCdfAxis axis =
        ReadAxis("<AXIS size=\"1\" sw-units=\"\" format-type=\"NUMERIC\">1 2<!--3.5 4--></AXIS>");
    ExpectElements(axis.GetAxisValue(), {R8(3.5), R8(4)});
    KestCdfAxis empty = ReadAxis("<AXIS size=\"1\" sw-units=\"\" format-type=\"NUMERIC\"/>");
    EXPECT_EQ(VT_EMPTY, empty.GetAxisValue().vt);
}

TEST(KestCdfAxis, WritingAnEmptyValueFailsAfterAppendingTheElement) {
    for (const char* xml : {"<AXIS size=\"2\" sw-units=\"u\" format-type=\"NUMERIC\"/>",
                            "<AXIS size=\"2\" sw-units=\"u\" format-type=\"OTHER\">1 2</AXIS>"}) {
        SCOPED_TRACE(xml);
        KestCdfAxis axis = ReadAxis(xml);
        IXMLDOMDocument2Ptr doc = LoadDocument("<CAL-ITEM/>");
        IXMLDOMNodePtr parent = doc->GetdocumentElement();
        EXPECT_EQ(reason::kAxisValueEmpty, ReasonOf([&] {
                      axis.ConvertAxisNodeToXML(parent, doc.GetInterfacePtr(),
                                                KestCdfNormalizedString());
                  }));
        IXMLDOMElementPtr written = parent->GetlastChild();
        ASSERT_TRUE(written);
        EXPECT_EQ(3, written->Getattributes()->Getlength());
        EXPECT_EQ(_bstr_t("2"), _bstr_t(written->getAttribute(_bstr_t("size"))));
        EXPECT_FALSE(written->hasChildNodes());
    }
}

TEST(KestCdfAxis, WriterFailures) {
    KestCdfAxis axis = AxisWithFormat(u"NUMERIC");
    axis.SetAxisValue(_variant_t(u"1"));
    IXMLDOMDocument2Ptr doc = LoadDocument("<CAL-ITEM/>");
    EXPECT_THROW(axis.ConvertAxisNodeToXML(IXMLDOMNodePtr(), doc.GetInterfacePtr(),
                                           KestCdfNormalizedString()),
                 _com_error);
    EXPECT_THROW(
        axis.ConvertAxisNodeToXML(doc->GetdocumentElement(), nullptr, KestCdfNormalizedString()),
        _com_error);
    EXPECT_FALSE(doc->GetdocumentElement()->hasChildNodes());
}

TEST(KestCdfAxis, AHostAxisIsWrittenWithSizeZero) {
    KestCdfAxis axis = AxisWithFormat(u"NUMERIC");
    axis.SetAxisValue(_variant_t(u"1.5 2"));
    IXMLDOMDocument2Ptr doc;
    IXMLDOMNodePtr written = WriteAxis(axis, doc);
    EXPECT_EQ("<AXIS size=\"0\" sw-units=\"\" format-type=\"NUMERIC\">1.5 2</AXIS>",
              written->Getxml().ToString());
}

TEST(KestCdfAxis, NumericTextReadFromTheDocumentIsSplitAsSetAxisValueSplitsIt) {
    for (const std::u16string& text : std::vector<std::u16string>{
             u"", u" ", u"\u00e9", u"\U0001F600", u"7", u" 1 2", u"1 2.5 3", u"1\u00e9 2 \u20ac.5",
             u"\t3 4\n", u"1e5 2 3.5e-7", std::u16string(400, u'9') + u" 0.25"}) {
        SCOPED_TRACE(Narrow(text));
        IXMLDOMDocument2Ptr doc =
            LoadDocument("<AXIS size=\"3\" sw-units=\"rpm\" format-type=\"NUMERIC\"/>");
        IXMLDOMNodePtr element = doc->GetdocumentElement();
        IXMLDOMNodePtr child =
            doc->createNode(_variant_t(static_cast<int>(NODE_TEXT)), _bstr_t(u""), _bstr_t(u""));
        child->PutnodeValue(_variant_t(text));
        element->appendChild(child);
        KestCdfAxis read;
        ASSERT_TRUE(read.ConvertAxisNode(element));

        KestCdfAxis expected = AxisWithFormat(u"NUMERIC");
        expected.SetAxisValue(_variant_t(text));
        const _variant_t want = expected.GetAxisValue();
        const _variant_t got = read.GetAxisValue();
        ASSERT_EQ(want.vt, got.vt);
        ASSERT_EQ(want.parray->rgsabound[0].cElements, got.parray->rgsabound[0].cElements);
        for (LONG i = 0; i < static_cast<LONG>(want.parray->rgsabound[0].cElements); ++i) {
            _variant_t a, b;
            ASSERT_EQ(S_OK, SafeArrayGetElement(want.parray, &i, &a));
            ASSERT_EQ(S_OK, SafeArrayGetElement(got.parray, &i, &b));
            ASSERT_EQ(a.vt, b.vt) << i;
            if (a.vt == VT_R8) {
                EXPECT_EQ(a.dblVal, b.dblVal) << i;
            } else if (a.vt == VT_I4) {
                EXPECT_EQ(a.lVal, b.lVal) << i;
            }
        }
    }
}
