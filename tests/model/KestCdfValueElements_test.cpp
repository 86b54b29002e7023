// AXIS and VALUE: the two value elements share the value list codec, copies, reading and
// writing (typed tests); each keeps its own typing and writing rules (tables per class).
#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <limits>
#include <string>
#include <vector>

#include "ValueListTestUtil.h"
#include "model/KestCdfAxis.h"
#include "model/KestCdfCalItemValue.h"
#include "platform/KestCalmorphDLLError.h"
#include "platform/XmlDom.h"

using namespace kest;
using namespace kest::test;

namespace {

KestCdfNormalizedString Text(const char16_t* text) {
    return KestCdfNormalizedString(CComBSTR(text));
}

struct AxisRules {
    using Type = KestCdfAxis;
    static std::string Xml(const std::string& format, const std::string& body) {
        return "<AXIS size=\"3\" sw-units=\"rpm\" format-type=\"" + format + "\"" +
               (body.empty() ? "/>" : ">" + body + "</AXIS>");
    }
    static bool Read(Type& v, IXMLDOMNodePtr node) { return v.ConvertAxisNode(node); }
    static bool Write(Type& v, IXMLDOMNodePtr parent, IXMLDOMDocument* doc,
                      const char16_t* ns = u"") {
        return v.ConvertAxisNodeToXML(parent, doc, Text(ns));
    }
    static _variant_t Get(const Type& v) { return v.GetAxisValue(); }
    static void Set(Type& v, _variant_t value) { v.SetAxisValue(value); }
    static std::u16string Units(const Type& v) { return v.GetSwUnits().ToU16String(); }
    static void SetUnits(Type& v, const char16_t* units) { v.SetSwUnits(Text(units)); }
    // A value as the classes split NUMERIC text: a host axis splits it.
    static Type Fresh(const char16_t* format) {
        Type v;
        v.SetFormatType(Text(format));
        return v;
    }
    static constexpr int kEmptyReason = 26;  // the published code hosts receive
};

struct ValueRules {
    using Type = KestCdfCalItemValue;
    static std::string Xml(const std::string& format, const std::string& body) {
        return "<VALUE sw-units-ref=\"rpm\" format-type=\"" + format + "\"" +
               (body.empty() ? "/>" : ">" + body + "</VALUE>");
    }
    static bool Read(Type& v, IXMLDOMNodePtr node) { return v.ConvertCalItemValueNode(node); }
    static bool Write(Type& v, IXMLDOMNodePtr parent, IXMLDOMDocument* doc,
                      const char16_t* ns = u"") {
        return v.ConvertCalItemValueNodeToXML(parent, doc, Text(ns));
    }
    static _variant_t Get(const Type& v) { return v.GetValue(); }
    static void Set(Type& v, _variant_t value) { v.SetValue(value); }
    static std::u16string Units(const Type& v) { return v.GetUnits().ToU16String(); }
    static void SetUnits(Type& v, const char16_t* units) { v.SetUnits(Text(units)); }
    // Only a value read from a document splits NUMERIC text; a host's is kept whole.
    static Type Fresh(const char16_t* format) { return Fresh(true, format); }
    static Type Fresh(bool fromDocument, const char16_t* format) {
        Type v = fromDocument ? ReadAs<ValueRules>(Xml("LABEL", "seed")) : Type();
        v.SetFormatType(Text(format));
        return v;
    }
    static constexpr int kEmptyReason = 29;  // the published code hosts receive

    template <class Rules>
    static typename Rules::Type ReadAs(const std::string& xml) {
        IXMLDOMDocument2Ptr doc = LoadDocument(xml);
        typename Rules::Type v;
        EXPECT_TRUE(Rules::Read(v, doc->GetdocumentElement()));
        return v;
    }
};

template <class Rules>
typename Rules::Type Read(const std::string& xml) {
    return ValueRules::ReadAs<Rules>(xml);
}

// Writes under a fresh CAL-ITEM element and returns the new element.
template <class Rules>
IXMLDOMNodePtr WriteBelow(typename Rules::Type& v, IXMLDOMDocument2Ptr& doc,
                          const char16_t* ns = u"") {
    doc = LoadDocument("<CAL-ITEM/>");
    IXMLDOMNodePtr parent = doc->GetdocumentElement();
    EXPECT_TRUE(Rules::Write(v, parent, doc.GetInterfacePtr(), ns));
    return parent->GetlastChild();
}

template <class Rules>
std::u16string WrittenText(typename Rules::Type& v) {
    IXMLDOMDocument2Ptr doc;
    return WriteBelow<Rules>(v, doc)->Gettext().ToU16String();
}

template <class Rules>
std::string WrittenXml(typename Rules::Type& v) {
    IXMLDOMDocument2Ptr doc;
    return WriteBelow<Rules>(v, doc)->Getxml().ToString();
}

}  // namespace

template <class Rules>
class ValueElement : public ::testing::Test {};
using ValueElementTypes = ::testing::Types<AxisRules, ValueRules>;
TYPED_TEST_SUITE(ValueElement, ValueElementTypes);

TYPED_TEST(ValueElement, RejectsItsOwnValueAndKeepsIt) {
    using R = TypeParam;
    for (const char16_t* format : {u"NUMERIC", u"STRING", u"LABEL", u"other"}) {
        SCOPED_TRACE(Narrow(format));
        auto v = R::Fresh(u"LABEL");
        R::Set(v, _variant_t(u"x y"));
        v.SetFormatType(Text(format));
        EXPECT_THROW(R::Set(v, R::Get(v)), _com_error);
        ExpectElements(R::Get(v), {Str(u"x y")});
    }
}

TYPED_TEST(ValueElement, CopiesAreIndependent) {
    using R = TypeParam;
    auto v = R::Fresh(u"STRING");
    R::SetUnits(v, u"rpm");
    R::Set(v, _variant_t(u"\"a\" \"b\""));
    auto copy(v);
    decltype(v) assigned;
    assigned = v;
    R::Set(copy, _variant_t(u"\"c\""));
    assigned.SetFormatType(Text(u"NUMERIC"));
    R::Set(assigned, _variant_t(u"9.5"));
    ExpectElements(R::Get(v), {Str(u"a"), Str(u"b")});
    ExpectElements(R::Get(copy), {Str(u"c")});
    EXPECT_EQ(u"STRING", copy.GetFormatType().ToU16String());
    ExpectElements(R::Get(assigned), {R8(9.5)});
    EXPECT_EQ(u"rpm", R::Units(assigned));
    EXPECT_EQ(u"STRING", v.GetFormatType().ToU16String());
    auto& self = assigned;
    assigned = self;
    ExpectElements(R::Get(assigned), {R8(9.5)});
    // The getter hands out a copy: changing it leaves the element alone.
    EXPECT_NE(R::Get(v).parray, R::Get(v).parray);
}

TYPED_TEST(ValueElement, ReadsAnElementAndWritesItBackInTheGivenNamespace) {
    using R = TypeParam;
    const std::string xml = R::Xml("NUMERIC", "0.5 10 20");
    auto v = Read<R>(xml);
    EXPECT_EQ(u"rpm", R::Units(v));
    EXPECT_EQ(u"NUMERIC", v.GetFormatType().ToU16String());
    EXPECT_EQ(xml, WrittenXml<R>(v));
    IXMLDOMDocument2Ptr doc;
    const char16_t* ns = u"http://example.com/schemas/cdf/1.0";
    IXMLDOMNodePtr written = WriteBelow<R>(v, doc, ns);
    EXPECT_EQ(ns, written->GetnamespaceURI().ToU16String());
    EXPECT_EQ(u"0.5 10 20", written->Gettext().ToU16String());
    // A host's units are kept as given, tabs included.
    R::SetUnits(v, u"A\tB");
    EXPECT_EQ(u"A\tB", R::Units(v));
}

TYPED_TEST(ValueElement, TheLastChildDecides) {
    using R = TypeParam;
    ExpectElements(R::Get(Read<R>(R::Xml("NUMERIC", "1 2<!--3.5 4.5-->"))), {R8(3.5), R8(4.5)});
    ExpectElements(R::Get(Read<R>(R::Xml("STRING", "<![CDATA[\"<a>\" \"&\"]]>"))),
                   {Str(u"<a>"), Str(u"&")});
    EXPECT_EQ(VT_EMPTY, R::Get(Read<R>(R::Xml("NUMERIC", ""))).vt);
}

TYPED_TEST(ValueElement, WritingAnEmptyValueFailsAfterAppendingTheElement) {
    using R = TypeParam;
    auto v = Read<R>(R::Xml("NUMERIC", ""));
    IXMLDOMDocument2Ptr doc = LoadDocument("<CAL-ITEM/>");
    IXMLDOMNodePtr parent = doc->GetdocumentElement();
    EXPECT_EQ(R::kEmptyReason, ReasonOf([&] { R::Write(v, parent, doc.GetInterfacePtr()); }));
    ASSERT_TRUE(parent->GetlastChild());
    EXPECT_EQ(R::Xml("NUMERIC", ""), parent->GetlastChild()->Getxml().ToString());
}

TYPED_TEST(ValueElement, ReaderAndWriterFailures) {
    using R = TypeParam;
    typename R::Type v;
    try {
        R::Read(v, IXMLDOMNodePtr());
        ADD_FAILURE() << "no exception";
    } catch (const _com_error& error) {
        EXPECT_EQ(E_POINTER, error.Error());
    }
    // A child element has no text.
    IXMLDOMDocument2Ptr nested = LoadDocument(R::Xml("NUMERIC", "1<X/>"));
    EXPECT_THROW(R::Read(v, nested->GetdocumentElement()), _com_error);

    auto label = R::Fresh(u"LABEL");
    R::Set(label, _variant_t(u"x"));
    IXMLDOMDocument2Ptr doc = LoadDocument("<CAL-ITEM/>");
    EXPECT_THROW(R::Write(label, IXMLDOMNodePtr(), doc.GetInterfacePtr()), _com_error);
    EXPECT_THROW(R::Write(label, doc->GetdocumentElement(), nullptr), _com_error);
    EXPECT_FALSE(doc->GetdocumentElement()->hasChildNodes());
}

TYPED_TEST(ValueElement, NumericTextReadFromTheDocumentIsSplitAsSetValueSplitsIt) {
    using R = TypeParam;
    // The reader splits the DOM's UTF-8 text, SetValue the UTF-16 text: the same elements.
    const std::u16string longDigits = u"1." + std::u16string(300, u'0') + u"1";
    const std::vector<std::u16string> texts = {u"",
                                               u" ",
                                               u"  ",
                                               u"7",
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
                                               u"1\u00e9 2 \u20ac.5",
                                               u"\u00a05 \u00855 \u30005",
                                               u"-\u00e91 +\u00e9.5",
                                               u"1.5\U0001F600e3 7",
                                               u"1e\u00e95 2",
                                               u"1e5 2 3.5e-7",
                                               u"0x1\u00e9p3 0x\u00e9",
                                               u"inf\u00e9 nan(\u00e9) nan(a\u00e9b) in\u00e9f",
                                               u"\u00e9 \u00e9 \u00e9",
                                               longDigits + u"\u00e9 " + longDigits,
                                               u"1." + longDigits,
                                               u"2147483648 -2147483649 1e400 4.9e-324",
                                               std::u16string(400, u'9') + u" 0.25",
                                               std::u16string(3000, u'\u20ac') + u" 8"};
    for (const std::u16string& text : texts) {
        SCOPED_TRACE(Narrow(text));
        IXMLDOMDocument2Ptr doc = LoadDocument(R::Xml("NUMERIC", ""));
        IXMLDOMNodePtr element = doc->GetdocumentElement();
        IXMLDOMNodePtr child =
            doc->createNode(_variant_t(static_cast<int>(NODE_TEXT)), _bstr_t(u""), _bstr_t(u""));
        child->PutnodeValue(_variant_t(text));
        element->appendChild(child);
        typename R::Type read;
        ASSERT_TRUE(R::Read(read, element));
        auto expected = R::Fresh(u"NUMERIC");
        R::Set(expected, _variant_t(text));
        ExpectElements(R::Get(read), ElementsOf(R::Get(expected)));
    }
}

TEST(KestCdfAxis, SplitsTextByFormatTypeAndWritesItBack) {
    const double inf = std::numeric_limits<double>::infinity();
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
        {u"NUMERIC",
         u"4294967296 -4294967296",
         {R8(4294967296.0), R8(-4294967296.0)},
         u"4294967296.0 -4294967296.0"},
        {u"NUMERIC", u"inf -INFINITY 1. 0x1p3", {R8(inf), R8(-inf), R8(1), R8(8)}, u"inf -inf 1 8"},
        {u"NUMERIC", u"1." + std::u16string(200, u'0') + u"1 7", {R8(1.0), R8(7)}, u"1 7"},
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
        KestCdfAxis axis = AxisRules::Fresh(row.format);
        axis.SetAxisValue(_variant_t(row.text));
        ExpectElements(axis.GetAxisValue(), row.elements);
        EXPECT_EQ(row.written, WrittenText<AxisRules>(axis));
    }
}

TEST(KestCdfAxis, OtherFormatTypesKeepTheValue) {
    for (const char16_t* format : {u"numeric", u"", u"NUMERIC ", u"Label"}) {
        SCOPED_TRACE(Narrow(format));
        KestCdfAxis axis = AxisRules::Fresh(format);
        axis.SetAxisValue(_variant_t(u"1 2"));
        EXPECT_EQ(VT_EMPTY, axis.GetAxisValue().vt);
        KestCdfAxis numeric = AxisRules::Fresh(u"NUMERIC");
        numeric.SetAxisValue(_variant_t(u"4"));
        numeric.SetFormatType(Text(format));
        numeric.SetAxisValue(_variant_t(u"5 6"));
        ExpectElements(numeric.GetAxisValue(), {I4(4)});
    }
    KestCdfAxis axis = AxisRules::Fresh(u"NUMERIC");
    _variant_t null;
    null.vt = VT_NULL;
    EXPECT_THROW(axis.SetAxisValue(null), _com_error);
    EXPECT_EQ(VT_EMPTY, axis.GetAxisValue().vt);
    // Read under an unknown format type, nothing is stored, and writing fails.
    KestCdfAxis other = Read<AxisRules>(AxisRules::Xml("OTHER", "1 2"));
    IXMLDOMDocument2Ptr doc = LoadDocument("<CAL-ITEM/>");
    EXPECT_EQ(reason::kAxisValueEmpty, ReasonOf([&] {
                  AxisRules::Write(other, doc->GetdocumentElement(), doc.GetInterfacePtr());
              }));
}

TEST(KestCdfAxis, SplitsNumbersAsTheirPrintedText) {
    struct Row {
        const char16_t* format;
        _variant_t value;
        std::vector<Element> elements;
    } rows[] = {
        {u"NUMERIC", _variant_t(3.0), {I4(3)}},
        {u"NUMERIC", _variant_t(2.5), {R8(2.5)}},
        {u"NUMERIC", _variant_t(1e20), {R8(1e20)}},
        {u"NUMERIC", _variant_t(0.30000000000000004), {R8(0.30000000000000004)}},
        {u"NUMERIC", _variant_t(0.5f), {R8(0.5)}},
        {u"NUMERIC", _variant_t(-5), {I4(-5)}},
        {u"NUMERIC", _variant_t(), {I4(0)}},
        {u"LABEL", _variant_t(2.5), {R8(2.5)}},
        {u"STRING", _variant_t(2.5), {}},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.value.vt);
        KestCdfAxis axis = AxisRules::Fresh(row.format);
        axis.SetAxisValue(row.value);
        ExpectElements(axis.GetAxisValue(), row.elements);
    }
    KestCdfAxis label = AxisRules::Fresh(u"LABEL");
    label.SetAxisValue(_variant_t(2.5));
    EXPECT_EQ(u"2.5", WrittenText<AxisRules>(label));
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
        KestCdfAxis axis = Read<AxisRules>(std::string("<AXIS size=\"") + row.size +
                                           "\" sw-units=\"\" format-type=\"NUMERIC\">1 2 3</AXIS>");
        EXPECT_EQ(row.value, axis.GetSize());
        IXMLDOMDocument2Ptr doc;
        IXMLDOMElementPtr written = WriteBelow<AxisRules>(axis, doc);
        EXPECT_EQ(_bstr_t(row.written), _bstr_t(written->getAttribute(_bstr_t("size"))));
    }
    // A host axis is written with size 0.
    KestCdfAxis host = AxisRules::Fresh(u"NUMERIC");
    host.SetAxisValue(_variant_t(u"1.5 2"));
    EXPECT_EQ("<AXIS size=\"0\" sw-units=\"\" format-type=\"NUMERIC\">1.5 2</AXIS>",
              WrittenXml<AxisRules>(host));
}

TEST(KestCdfAxis, TakesAttributesByPositionAndFailsOnMissingOnes) {
    KestCdfAxis axis =
        Read<AxisRules>("<AXIS a=\"2\" b=\"A&#9;B&#10;C\" c=\"NUMERIC\" d=\"ignored\">1 2</AXIS>");
    EXPECT_EQ(2u, axis.GetSize());
    EXPECT_EQ(u"A B C", axis.GetSwUnits().ToU16String());
    ExpectElements(axis.GetAxisValue(), {I4(1), I4(2)});
    struct Row {
        const char* xml;
        int reason;
        unsigned int size;
        const char16_t* units;
    } rows[] = {
        {"<AXIS size=\"4\" sw-units=\"rpm\">1</AXIS>", reason::kAxisAttributeMissing, 4, u"rpm"},
        {"<AXIS size=\"4\">1</AXIS>", reason::kAxisAttributeMissing, 4, u"old"},
        {"<AXIS>1</AXIS>", reason::kAxisAttributeMissing, 9, u"old"},
        {"<AXIS size=\"abc\" sw-units=\"\" format-type=\"\"/>", -2, 9, u"old"},
        {"<AXIS format-type=\"NUMERIC\" size=\"3\" sw-units=\"x\">1</AXIS>", -2, 9, u"old"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.xml);
        IXMLDOMDocument2Ptr doc = LoadDocument(row.xml);
        KestCdfAxis failing;
        failing.SetSize(9);
        failing.SetSwUnits(Text(u"old"));
        if (row.reason == -2) {  // a size that is no number fails in the platform
            EXPECT_THROW(failing.ConvertAxisNode(doc->GetdocumentElement()), _com_error);
            continue;
        }
        EXPECT_EQ(row.reason,
                  ReasonOf([&] { failing.ConvertAxisNode(doc->GetdocumentElement()); }));
        EXPECT_EQ(row.size, failing.GetSize());
        EXPECT_EQ(row.units, failing.GetSwUnits().ToU16String());
        EXPECT_EQ(VT_EMPTY, failing.GetAxisValue().vt);
    }
    // A node without attribute map (a text node).
    IXMLDOMDocument2Ptr doc = LoadDocument("<AXIS>text</AXIS>");
    IXMLDOMNodePtr text = doc->GetdocumentElement()->GetfirstChild();
    EXPECT_EQ(reason::kAxisNoAttributeMap, ReasonOf([&] { axis.ConvertAxisNode(text); }));
}

TEST(KestCdfCalItemValue, StoresTextByFormatTypeAndOriginAndWritesItBack) {
    const std::u16string digits(400, u'9');
    const double inf = std::numeric_limits<double>::infinity();
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
        {true,
         u"NUMERIC",
         u"0." + std::u16string(300, u'0') + u"5 " + digits + u" -" + digits + u" 0" + digits +
             u".0",
         {R8(5e-301), R8(inf), R8(-inf), R8(inf)},
         u"5.0e-301 inf -inf inf"},
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
        {false, u"STRING", u"\"a b\" \"c\"", {Str(u"\"a b\" \"c\"")}, u"\"a b\" \"c\""},
        {false, u"", u"1 2", {Str(u"1 2")}, u"1 2"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE((row.fromDocument ? "read " : "host ") + Narrow(row.format) + " \"" +
                     Narrow(row.text) + "\"");
        KestCdfCalItemValue value = ValueRules::Fresh(row.fromDocument, row.format);
        value.SetValue(_variant_t(row.text));
        ExpectElements(value.GetValue(), row.elements);
        EXPECT_EQ(row.written, WrittenText<ValueRules>(value));
    }
    // Quoted text under an unknown format type keeps the value; so does a later format type.
    KestCdfCalItemValue other = ValueRules::Fresh(false, u"OTHER");
    other.SetValue(_variant_t(u"\"q\""));
    EXPECT_EQ(VT_EMPTY, other.GetValue().vt);
    KestCdfCalItemValue late = ValueRules::Fresh(u"LABEL");
    late.SetValue(_variant_t(u"1 2"));
    late.SetFormatType(Text(u"NUMERIC"));
    ExpectElements(late.GetValue(), {Str(u"1 2")});
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
        {false, u"LABEL", _variant_t(0.1f), {}, u"0.1"},  // a float is written as the platform does
        {false, u"STRING", _variant_t(7), {I4(7)}, u"7"},
        {false, u"STRING", _variant_t(1e20), {R8(1e20)}, u"1.0e+020"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE((row.fromDocument ? "read " : "host ") + Narrow(row.format));
        KestCdfCalItemValue value = ValueRules::Fresh(row.fromDocument, row.format);
        value.SetValue(row.given);
        if (!row.elements.empty()) ExpectElements(value.GetValue(), row.elements);
        EXPECT_EQ(row.written, WrittenText<ValueRules>(value));
    }
    // A host value keeps its origin through copies: its NUMERIC text stays whole.
    KestCdfCalItemValue host = ValueRules::Fresh(false, u"LABEL");
    KestCdfCalItemValue copy(host);
    copy.SetFormatType(Text(u"NUMERIC"));
    copy.SetValue(_variant_t(u"1 2"));
    ExpectElements(copy.GetValue(), {Str(u"1 2")});
}

TEST(KestCdfCalItemValue, TakesAttributesByPosition) {
    struct Row {
        const char* xml;
        const char16_t* units;
        const char16_t* format;
        const char* written;
    } rows[] = {
        {"<VALUE format-type=\"NUMERIC\" sw-units-ref=\"rpm\">1 2</VALUE>", u"NUMERIC", u"rpm",
         "<VALUE sw-units-ref=\"NUMERIC\" format-type=\"rpm\">1 2</VALUE>"},
        {"<VALUE>1 2</VALUE>", u"Error occured", u"Error occured",
         "<VALUE sw-units-ref=\"Error occured\" format-type=\"Error occured\">1 2</VALUE>"},
        {"<VALUE u=\"a&#9;b&#13;&#10;c\">\"q\"</VALUE>", u"a b  c", u"Error occured", ""},
        {"<VALUE u=\"\" f=\"LABEL\" x=\"y\">z</VALUE>", u"", u"LABEL",
         "<VALUE sw-units-ref=\"\" format-type=\"LABEL\">z</VALUE>"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.xml);
        KestCdfCalItemValue value = Read<ValueRules>(row.xml);
        EXPECT_EQ(row.units, value.GetUnits().ToU16String());
        EXPECT_EQ(row.format, value.GetFormatType().ToU16String());
        if (!*row.written) {  // quoted text under an unknown format type: nothing stored
            EXPECT_EQ(VT_EMPTY, value.GetValue().vt);
            continue;
        }
        EXPECT_EQ(row.written, WrittenXml<ValueRules>(value));
    }
}

TEST(KestCdfCalItemValue, EveryValueSurvivesAWriteAndARead) {
    // Doubles whose "%.15g" text has no '.' and strings would otherwise read back changed:
    // 1e-005 as the integer 1, 1e14 as 2147483647, unquoted strings as one element or none.
    struct Row {
        std::string xml;
        std::vector<Element> elements;
    } rows[] = {
        {ValueRules::Xml("NUMERIC",
                         "0.5 0.00001 1.0e20 100000000000000.0 123456789012345.0 -3.0e9"),
         {R8(0.5), R8(1e-5), R8(1e20), R8(1e14), R8(123456789012345.0), R8(-3e9)}},
        {ValueRules::Xml("STRING", "\"OFF\" \"a b\" \"\""), {Str(u"OFF"), Str(u"a b"), Str(u"")}},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.xml.substr(0, 80));
        KestCdfCalItemValue first = Read<ValueRules>(row.xml);
        ExpectElements(first.GetValue(), row.elements);
        KestCdfCalItemValue second = Read<ValueRules>(WrittenXml<ValueRules>(first));
        ExpectElements(second.GetValue(), row.elements);
    }
}
