#include <gtest/gtest.h>

#include <climits>
#include <functional>
#include <limits>
#include <string>
#include <vector>

#include "ValueListTestUtil.h"
#include "model/KestCdfCalItemValue.h"
#include "platform/KestCalmorphDLLError.h"
#include "platform/XmlDom.h"

using namespace kest;
using namespace kest::test;

namespace {

KestCdfCalItemValue ReadValue(const std::string& xml) {
    IXMLDOMDocument2Ptr doc = LoadDocument(xml);
    KestCdfCalItemValue value;
    EXPECT_TRUE(value.ConvertCalItemValueNode(doc->GetdocumentElement()));
    return value;
}

// Writes the value under a fresh CAL-ITEM element and returns the new VALUE element.
IXMLDOMNodePtr WriteValue(KestCdfCalItemValue& value, IXMLDOMDocument2Ptr& doc) {
    doc = LoadDocument("<CAL-ITEM/>");
    IXMLDOMNodePtr parent = doc->GetdocumentElement();
    EXPECT_TRUE(value.ConvertCalItemValueNodeToXML(parent, doc.GetInterfacePtr(),
                                                   KestCdfNormalizedString()));
    return parent->GetlastChild();
}

std::u16string WrittenText(KestCdfCalItemValue& value) {
    IXMLDOMDocument2Ptr doc;
    return WriteValue(value, doc)->Gettext().ToU16String();
}

KestCdfNormalizedString Text(const char16_t* text) {
    return KestCdfNormalizedString(CComBSTR(text));
}

// A value as a host builds it (flag 0) or as a reader leaves it (flag 1, holding "seed").
KestCdfCalItemValue MakeValue(bool fromDocument, const char16_t* formatType) {
    KestCdfCalItemValue value =
        fromDocument ? ReadValue("<VALUE sw-units-ref=\"\" format-type=\"LABEL\">seed</VALUE>")
                     : KestCdfCalItemValue();
    value.SetFormatType(Text(formatType));
    return value;
}

}  // namespace

TEST(KestCdfCalItemValue, StoresTextByFormatTypeAndOriginAndWritesItBack) {
    struct Row {
        bool fromDocument;
        const char16_t* format;
        std::u16string text;
        std::vector<Element> elements;
        std::u16string written;
    } rows[] = {
        {true, u"NUMERIC", u"1 2.5 3", {R8(1), R8(2.5), I4(3)}, u"1 2.5 3"},
        {true, u"NUMERIC", u"1 2 3", {R8(1), I4(2), I4(3)}, u"1 2 3"},
        {true, u"NUMERIC", u"1  2", {R8(1), I4(0), I4(2)}, u"1 0 2"},
        {true, u"NUMERIC", u"1 2 ", {R8(1), I4(2), I4(0)}, u"1 2 0"},
        {true, u"NUMERIC", u" 1 2", {R8(1), I4(2), Empty()}, u"1 2 "},
        {true, u"NUMERIC", u"", {R8(0)}, u"0"},
        {true, u"NUMERIC", u"7", {R8(7)}, u"7"},
        {true, u"NUMERIC", u"1e5 2", {R8(1e5), I4(2)}, u"100000 2"},
        {true, u"NUMERIC", u"2 1e5 3.5e-7", {R8(2), I4(1), R8(3.5e-7)}, u"2 1 3.5e-007"},
        {true,
         u"NUMERIC",
         u"1e20 -9999999999",
         {R8(1e20), R8(-9999999999.0)},
         u"1.0e+020 -9999999999.0"},
        {true,
         u"NUMERIC",
         u"0.1 x 0.30000000000000004",
         {R8(0.1), I4(0), R8(0.30000000000000004)},
         u"0.1 0 0.30000000000000004"},
        {true, u"NUMERIC", u"1.5 2,5", {R8(1.5), I4(2)}, u"1.5 2"},
        {true, u"STRING", u"\"a b\" \"c\"", {Str(u"a b"), Str(u"c")}, u"\"a b\" \"c\""},
        {true, u"STRING", u"\"\"", {Str(u"")}, u"\"\""},
        {true, u"STRING", u"\"", {}, u""},
        {true, u"STRING", u"\"a b", {Str(u"\"a b")}, u"\"a b"},
        {true, u"STRING", u"plain text", {Str(u"plain text")}, u"\"plain text\""},
        {true, u"LABEL", u"\"x\" y", {Str(u"\"x\" y")}, u"\"x\" y"},
        {true,
         u"STRING",
         u"\"\u00e9 \U0001F600\" \"\u20ac\"",
         {Str(u"\u00e9 \U0001F600"), Str(u"\u20ac")},
         u"\"\u00e9 \U0001F600\" \"\u20ac\""},
        {false, u"LABEL", u"\u00e9\u20ac", {Str(u"\u00e9\u20ac")}, u"\u00e9\u20ac"},
        {true, u"OTHER", u"1 2", {Str(u"1 2")}, u"1 2"},
        {true, u"OTHER", u"\"q\"", {Str(u"seed")}, u"seed"},
        {false, u"NUMERIC", u"1 2 3", {Str(u"1 2 3")}, u"1 2 3"},
        {false, u"NUMERIC", u"", {Str(u"")}, u""},
        {false, u"STRING", u"\"a b\" \"c\"", {Str(u"\"a b\" \"c\"")}, u"\"a b\" \"c\""},
        {false, u"STRING", u"\"a b", {Str(u"\"a b")}, u"\"a b"},
        {false, u"LABEL", u"a", {Str(u"a")}, u"a"},
        {false, u"", u"1 2", {Str(u"1 2")}, u"1 2"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE((row.fromDocument ? "read " : "host ") + Narrow(row.format) + " \"" +
                     Narrow(row.text) + "\"");
        KestCdfCalItemValue value = MakeValue(row.fromDocument, row.format);
        value.SetValue(_variant_t(row.text));
        ExpectElements(value.GetValue(), row.elements);
        EXPECT_EQ(row.written, WrittenText(value));
    }
}

TEST(KestCdfCalItemValue, QuotedTextUnderAnUnknownFormatTypeKeepsTheValue) {
    KestCdfCalItemValue value = MakeValue(false, u"OTHER");
    value.SetValue(_variant_t(u"\"q\""));
    EXPECT_EQ(VT_EMPTY, value.GetValue().vt);
}

TEST(KestCdfCalItemValue, StoresNumbersGivenByTheHost) {
    struct Row {
        bool fromDocument;
        const char16_t* format;
        _variant_t given;
        std::vector<Element> elements;
        std::u16string written;
    } rows[] = {
        {false, u"NUMERIC", _variant_t(2.5), {Empty()}, u""},
        {true, u"NUMERIC", _variant_t(2.5), {R8(2.5)}, u"2.5"},
        {true, u"NUMERIC", _variant_t(3), {R8(3)}, u"3"},
        {true, u"NUMERIC", _variant_t(0.1f), {R8(0.1)}, u"0.1"},
        {false, u"LABEL", _variant_t(2.5), {R8(2.5)}, u"2.5"},
        {false, u"STRING", _variant_t(7), {I4(7)}, u"7"},
        {false, u"STRING", _variant_t(1e20), {R8(1e20)}, u"1.0e+020"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE((row.fromDocument ? "read " : "host ") + Narrow(row.format));
        KestCdfCalItemValue value = MakeValue(row.fromDocument, row.format);
        value.SetValue(row.given);
        ExpectElements(value.GetValue(), row.elements);
        EXPECT_EQ(row.written, WrittenText(value));
    }
    // A float kept as one element is written as the platform writes it.
    KestCdfCalItemValue label = MakeValue(false, u"LABEL");
    label.SetValue(_variant_t(0.1f));
    EXPECT_EQ(u"0.1", WrittenText(label));
}

TEST(KestCdfCalItemValue, RejectsItsOwnValueAndKeepsIt) {
    for (bool fromDocument : {false, true}) {
        for (const char16_t* format : {u"NUMERIC", u"STRING", u"LABEL", u"other"}) {
            SCOPED_TRACE(Narrow(format));
            KestCdfCalItemValue value = MakeValue(fromDocument, u"LABEL");
            value.SetValue(_variant_t(u"x y"));
            value.SetFormatType(Text(format));
            EXPECT_THROW(value.SetValue(value.GetValue()), _com_error);
            ExpectElements(value.GetValue(), {Str(u"x y")});
        }
    }
}

TEST(KestCdfCalItemValue, TheFormatTypeMustComeFirst) {
    KestCdfCalItemValue value = MakeValue(true, u"LABEL");
    value.SetValue(_variant_t(u"1 2"));
    value.SetFormatType(Text(u"NUMERIC"));
    ExpectElements(value.GetValue(), {Str(u"1 2")});
}

TEST(KestCdfCalItemValue, CopiesAreIndependentAndKeepTheOrigin) {
    KestCdfCalItemValue read =
        ReadValue("<VALUE sw-units-ref=\"Nm\" format-type=\"STRING\">\"a\" \"b\"</VALUE>");
    KestCdfCalItemValue copy(read);
    KestCdfCalItemValue assigned;
    assigned = read;
    copy.SetFormatType(Text(u"NUMERIC"));
    copy.SetValue(_variant_t(u"1 2"));
    ExpectElements(copy.GetValue(), {R8(1), I4(2)});
    assigned.SetValue(_variant_t(u"\"c\""));
    ExpectElements(assigned.GetValue(), {Str(u"c")});
    ExpectElements(read.GetValue(), {Str(u"a"), Str(u"b")});
    EXPECT_EQ(u"Nm", assigned.GetUnits().ToU16String());
    EXPECT_NE(read.GetValue().parray, read.GetValue().parray);
}

TEST(KestCdfCalItemValue, ReadsAValueElementAndWritesItBack) {
    const char* xml = "<VALUE sw-units-ref=\"km/h\" format-type=\"NUMERIC\">1 2 3</VALUE>";
    KestCdfCalItemValue value = ReadValue(xml);
    EXPECT_EQ(u"km/h", value.GetUnits().ToU16String());
    EXPECT_EQ(u"NUMERIC", value.GetFormatType().ToU16String());
    ExpectElements(value.GetValue(), {R8(1), I4(2), I4(3)});
    IXMLDOMDocument2Ptr doc;
    EXPECT_EQ(xml, WriteValue(value, doc)->Getxml().ToString());
}

TEST(KestCdfCalItemValue, TakesAttributesByPosition) {
    struct Row {
        const char* xml;
        const char16_t* units;
        const char16_t* format;
        std::vector<Element> elements;
        const char* written;
    } rows[] = {
        {"<VALUE format-type=\"NUMERIC\" sw-units-ref=\"rpm\">1 2</VALUE>",
         u"NUMERIC",
         u"rpm",
         {Str(u"1 2")},
         "<VALUE sw-units-ref=\"NUMERIC\" format-type=\"rpm\">1 2</VALUE>"},
        {"<VALUE>1 2</VALUE>",
         u"Error occured",
         u"Error occured",
         {Str(u"1 2")},
         "<VALUE sw-units-ref=\"Error occured\" format-type=\"Error occured\">1 2</VALUE>"},
        {"<VALUE u=\"a&#9;b&#13;&#10;c\">\"q\"</VALUE>", u"a b  c", u"Error occured", {}, ""},
        {"<VALUE u=\"\" f=\"LABEL\" x=\"y\">z</VALUE>",
         u"",
         u"LABEL",
         {Str(u"z")},
         "<VALUE sw-units-ref=\"\" format-type=\"LABEL\">z</VALUE>"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.xml);
        KestCdfCalItemValue value = ReadValue(row.xml);
        EXPECT_EQ(row.units, value.GetUnits().ToU16String());
        EXPECT_EQ(row.format, value.GetFormatType().ToU16String());
        if (!*row.written) {  // quoted text under an unknown format type: nothing stored
            EXPECT_EQ(VT_EMPTY, value.GetValue().vt);
            continue;
        }
        ExpectElements(value.GetValue(), row.elements);
        IXMLDOMDocument2Ptr doc;
        EXPECT_EQ(row.written, WriteValue(value, doc)->Getxml().ToString());
    }
    KestCdfCalItemValue host;
    host.SetUnits(KestCdfNormalizedString(_bstr_t(u"a\tb")));
    EXPECT_EQ(u"a\tb", host.GetUnits().ToU16String());
}

TEST(KestCdfCalItemValue, TheLastChildDecides) {
    KestCdfCalItemValue value =
        ReadValue("<VALUE sw-units-ref=\"\" format-type=\"NUMERIC\">1 2<!--3 4.5--></VALUE>");
    ExpectElements(value.GetValue(), {R8(3), R8(4.5)});
    KestCdfCalItemValue cdata = ReadValue(
        "<VALUE sw-units-ref=\"\" format-type=\"STRING\"><![CDATA[\"<a>\" \"&\"]]></VALUE>");
    ExpectElements(cdata.GetValue(), {Str(u"<a>"), Str(u"&")});
}

TEST(KestCdfCalItemValue, AnEmptyElementIsNotWritable) {
    KestCdfCalItemValue value =
        ReadValue("<VALUE sw-units-ref=\"u\" format-type=\"NUMERIC\"></VALUE>");
    EXPECT_EQ(VT_EMPTY, value.GetValue().vt);
    // Not read from a document: a host text is still kept whole.
    value.SetValue(_variant_t(u"1 2"));
    ExpectElements(value.GetValue(), {Str(u"1 2")});

    KestCdfCalItemValue empty = ReadValue("<VALUE sw-units-ref=\"u\" format-type=\"NUMERIC\"/>");
    IXMLDOMDocument2Ptr doc = LoadDocument("<CAL-ITEM/>");
    IXMLDOMNodePtr parent = doc->GetdocumentElement();
    EXPECT_EQ(reason::kCalItemValueMissing, ReasonOf([&] {
                  empty.ConvertCalItemValueNodeToXML(parent, doc.GetInterfacePtr(),
                                                     KestCdfNormalizedString());
              }));
    ASSERT_TRUE(parent->GetlastChild());
    EXPECT_EQ("<VALUE sw-units-ref=\"u\" format-type=\"NUMERIC\"/>",
              parent->GetlastChild()->Getxml().ToString());
}

TEST(KestCdfCalItemValue, ReaderAndWriterFailures) {
    KestCdfCalItemValue value;
    try {
        value.ConvertCalItemValueNode(IXMLDOMNodePtr());
        ADD_FAILURE() << "no exception";
    } catch (const _com_error& error) {
        EXPECT_EQ(E_POINTER, error.Error());
    }
    IXMLDOMDocument2Ptr nested =
        LoadDocument("<VALUE sw-units-ref=\"\" format-type=\"NUMERIC\">1<X/></VALUE>");
    EXPECT_THROW(value.ConvertCalItemValueNode(nested->GetdocumentElement()), _com_error);

    KestCdfCalItemValue label = MakeValue(false, u"LABEL");
    label.SetValue(_variant_t(u"x"));
    IXMLDOMDocument2Ptr doc = LoadDocument("<CAL-ITEM/>");
    EXPECT_THROW(label.ConvertCalItemValueNodeToXML(IXMLDOMNodePtr(), doc.GetInterfacePtr(),
                                                    KestCdfNormalizedString()),
                 _com_error);
    EXPECT_THROW(label.ConvertCalItemValueNodeToXML(doc->GetdocumentElement(), nullptr,
                                                    KestCdfNormalizedString()),
                 _com_error);
    const char16_t* ns = u"http://example.com/schemas/cdf/1.0";
    label.ConvertCalItemValueNodeToXML(doc->GetdocumentElement(), doc.GetInterfacePtr(),
                                       KestCdfNormalizedString(CComBSTR(ns)));
    EXPECT_EQ(ns, doc->GetdocumentElement()->GetlastChild()->GetnamespaceURI().ToU16String());
}

TEST(KestCdfCalItemValue, LongAndOverflowingTokens) {
    const std::u16string digits(400, u'9');
    KestCdfCalItemValue value = MakeValue(true, u"NUMERIC");
    value.SetValue(_variant_t(u"0." + std::u16string(300, u'0') + u"5 " + digits + u" -" + digits +
                              u" 0" + digits + u".0"));
    ExpectElements(value.GetValue(), {R8(5e-301), R8(std::numeric_limits<double>::infinity()),
                                      R8(-std::numeric_limits<double>::infinity()),
                                      R8(std::numeric_limits<double>::infinity())});
}

TEST(KestCdfCalItemValue, EveryValueSurvivesAWriteAndARead) {
    // Doubles whose "%.15g" text has no '.' and strings would otherwise read back changed:
    // 1e-005 as the integer 1, 1e14 as 2147483647, unquoted strings as one element or none.
    struct Row {
        const char* xml;
        std::vector<Element> elements;
    } rows[] = {
        {"<VALUE sw-units-ref=\"\" format-type=\"NUMERIC\">0.5 0.00001 1.0e20 100000000000000.0"
         " 123456789012345.0 -3.0e9</VALUE>",
         {R8(0.5), R8(1e-5), R8(1e20), R8(1e14), R8(123456789012345.0), R8(-3e9)}},
        {"<VALUE sw-units-ref=\"\" format-type=\"STRING\">\"OFF\" \"a b\" \"\"</VALUE>",
         {Str(u"OFF"), Str(u"a b"), Str(u"")}},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.xml);
        KestCdfCalItemValue first = ReadValue(row.xml);
        ExpectElements(first.GetValue(), row.elements);
        IXMLDOMDocument2Ptr doc;
        KestCdfCalItemValue second = ReadValue(WriteValue(first, doc)->Getxml().ToString());
        ExpectElements(second.GetValue(), row.elements);
    }
}

TEST(KestCdfCalItemValue, NumericTextReadFromTheDocumentIsSplitAsSetValueSplitsIt) {
    for (const std::u16string& text : std::vector<std::u16string>{
             u"", u" ", u"\u00e9", u"\U0001F600", u"7", u" 1 2", u"1 2.5 3", u"1\u00e9 2 \u20ac.5",
             u"\t3 4\n", u"1e5 2 3.5e-7", std::u16string(400, u'9') + u" 0.25"}) {
        SCOPED_TRACE(Narrow(text));
        IXMLDOMDocument2Ptr doc =
            LoadDocument("<VALUE sw-units-ref=\"u\" format-type=\"NUMERIC\"/>");
        IXMLDOMNodePtr element = doc->GetdocumentElement();
        IXMLDOMNodePtr child =
            doc->createNode(_variant_t(static_cast<int>(NODE_TEXT)), _bstr_t(u""), _bstr_t(u""));
        child->PutnodeValue(_variant_t(text));
        element->appendChild(child);
        KestCdfCalItemValue read;
        ASSERT_TRUE(read.ConvertCalItemValueNode(element));

        KestCdfCalItemValue expected = MakeValue(true, u"NUMERIC");
        expected.SetValue(_variant_t(text));
        const _variant_t want = expected.GetValue();
        const _variant_t got = read.GetValue();
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
