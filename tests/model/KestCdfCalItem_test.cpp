// CAL-ITEM: reading in any order, writing in a fixed order, the item's name on every library
// error, and the sharing of its value and axes between copies.
#include "model/KestCdfCalItem.h"

#include <new>

#include "ModelTestDom.h"

namespace kest {
namespace {

using test::ExpectComError;
using test::ExpectDllError;
using test::Ns;
using test::Utf8;

constexpr const char16_t* kAxis1 =
    u"<AXIS size=\"3\" sw-units=\"rpm\" format-type=\"NUMERIC\">0 10 20</AXIS>";
constexpr const char16_t* kAxis2 =
    u"<AXIS size=\"2\" sw-units=\"K\" format-type=\"NUMERIC\">1.5 2.5</AXIS>";
constexpr const char16_t* kValue =
    u"<VALUE sw-units-ref=\"Nm\" format-type=\"NUMERIC\">1 2 3</VALUE>";
constexpr const char* kAxis1Out =
    "<AXIS size=\"3\" sw-units=\"rpm\" format-type=\"NUMERIC\">0 10 20</AXIS>";
constexpr const char* kAxis2Out =
    "<AXIS size=\"2\" sw-units=\"K\" format-type=\"NUMERIC\">1.5 2.5</AXIS>";
constexpr const char* kValueOut =
    "<VALUE sw-units-ref=\"Nm\" format-type=\"NUMERIC\">1 2 3</VALUE>";

std::u16string Item(const std::u16string& body) { return u"<CAL-ITEM>" + body + u"</CAL-ITEM>"; }
std::string ItemOut(const std::string& body) { return "<CAL-ITEM>" + body + "</CAL-ITEM>"; }

IXMLDOMNodePtr Write(KestCdfCalItem& item, IXMLDOMDocument2Ptr& doc,
                     IXMLDOMNodePtr* parentOut = nullptr) {
    doc = test::NewDocument();
    IXMLDOMNodePtr parent = doc->createElement(_bstr_t(u"CAL-LIST"));
    doc->appendChild(parent);
    if (parentOut) *parentOut = parent;
    item.ConvertCalItemNodeToXML(parent, doc.GetInterfacePtr(), Ns(u""));
    return test::ChildNamed(parent, u"CAL-ITEM");
}

TEST(KestCdfCalItem, RoundTripsThroughReadWriteRead) {
    const std::string axes = std::string(kAxis1Out) + kAxis2Out;
    const struct {
        const char* label;
        std::u16string xml;
        int axisSize;
        std::string written;
    } rows[] = {
        {"document order",
         Item(u"<NAME>map</NAME>" + std::u16string(kAxis1) + kAxis2 + kValue +
              u"<ANNOTATION>a</ANNOTATION><NOTE>n</NOTE>"),
         2,
         ItemOut("<NAME>map</NAME>" + axes + kValueOut +
                 "<ANNOTATION>a</ANNOTATION><NOTE>n</NOTE>")},
        {"any order in, fixed order out",
         Item(u"<NOTE>n</NOTE>" + std::u16string(kAxis1) + u"<ANNOTATION>a</ANNOTATION>" + kValue +
              kAxis2 + u"\n <NAME>map</NAME><!--c--><OTHER/>"),
         2,
         ItemOut("<NAME>map</NAME>" + axes + kValueOut +
                 "<ANNOTATION>a</ANNOTATION><NOTE>n</NOTE>")},
        {"no axes", Item(u"<NAME>v</NAME>" + std::u16string(kValue)), 0,
         ItemOut("<NAME>v</NAME>" + std::string(kValueOut))},
        {"nested and prefixed axes are not axes",
         Item(u"<NAME>v</NAME><X>" + std::u16string(kAxis1) + u"</X><p:AXIS xmlns:p=\"urn:p\"/>" +
              kValue),
         0, ItemOut("<NAME>v</NAME>" + std::string(kValueOut))},
        {"three text rules",
         Item(u"<NAME>text<!--name--></NAME>" + std::u16string(kValue) +
              u"<ANNOTATION>text<!--c--></ANNOTATION><NOTE>text<!--c--></NOTE>"),
         0,
         ItemOut("<NAME>name</NAME>" + std::string(kValueOut) +
                 "<ANNOTATION>text</ANNOTATION><NOTE>text</NOTE>")},
        {"empty elements", Item(u"<NAME/>" + std::u16string(kValue) + u"<ANNOTATION/><NOTE/>"), 0,
         ItemOut("<NAME></NAME>" + std::string(kValueOut) + "<NOTE></NOTE>")},
        {"names of other children are only text",
         Item(u"<NAME>AXIS</NAME><ANNOTATION>VALUE</ANNOTATION><NOTE>NAME</NOTE>" +
              std::u16string(kValue)),
         0,
         ItemOut("<NAME>AXIS</NAME>" + std::string(kValueOut) +
                 "<ANNOTATION>VALUE</ANNOTATION><NOTE>NAME</NOTE>")},
        {"second value stands",
         Item(u"<NAME>v</NAME><VALUE sw-units-ref=\"a\" format-type=\"NUMERIC\">9</VALUE>" +
              std::u16string(kValue)),
         0, ItemOut("<NAME>v</NAME>" + std::string(kValueOut))},
        {"text kept verbatim",
         Item(u"<NAME> a&#9;b </NAME>" + std::u16string(kValue) + u"<NOTE>x&#10;y</NOTE>"), 0,
         ItemOut("<NAME> a\tb </NAME>" + std::string(kValueOut) + "<NOTE>x\ny</NOTE>")},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        IXMLDOMDocument2Ptr source;
        KestCdfCalItem item;
        ASSERT_TRUE(item.ConvertCalItemNode(test::RootOf(row.xml, source)));
        EXPECT_EQ(item.GetAxisSize(), row.axisSize);
        EXPECT_NE(item.GetAxis(), nullptr);
        IXMLDOMDocument2Ptr target;
        IXMLDOMNodePtr written = Write(item, target);
        ASSERT_TRUE(written);
        EXPECT_EQ(test::XmlOf(written), row.written);

        KestCdfCalItem again;
        again.ConvertCalItemNode(written);
        IXMLDOMDocument2Ptr second;
        EXPECT_EQ(test::XmlOf(Write(again, second)), row.written);
    }
}

TEST(KestCdfCalItem, AxesFollowTheDocumentOrder) {
    IXMLDOMDocument2Ptr doc;
    KestCdfCalItem item;
    item.ConvertCalItemNode(
        test::RootOf(Item(std::u16string(kAxis2) + u"<NAME>n</NAME>" + kAxis1 + kValue), doc));
    ASSERT_EQ(item.GetAxisSize(), 2);
    EXPECT_EQ(item.GetAxis()[0].GetSize(), 2u);
    EXPECT_EQ(Utf8(item.GetAxis()[0].GetSwUnits()), "K");
    EXPECT_EQ(item.GetAxis()[1].GetSize(), 3u);
    EXPECT_EQ(Utf8(item.GetCalItemValue().GetUnits()), "Nm");
    EXPECT_EQ(Utf8(item.GetName()), "n");
    EXPECT_TRUE(item.GetAnnotation() == nullptr);
    EXPECT_TRUE(item.GetNote() == nullptr);
}

TEST(KestCdfCalItem, ReadErrorsCarryTheNameReadSoFar) {
    const struct {
        const char* label;
        std::u16string xml;
        int code;
        const char* text;
    } rows[] = {
        {"axis without attributes after the name",
         Item(u"<NAME>N1</NAME>" + std::u16string(kAxis1) + u"<AXIS>1</AXIS>"),
         reason::kAxisAttributeMissing, "N1"},
        {"axis lacking its third attribute before the name",
         Item(u"<AXIS size=\"1\" sw-units=\"u\">1</AXIS><NAME>N1</NAME>"),
         reason::kAxisAttributeMissing, ""},
        {"element first in the note", Item(u"<NAME>N2</NAME><NOTE><b/>a</NOTE>"),
         reason::kCalItemReadFailed, "N2"},
        {"element nested in the name", Item(u"<NAME>a<b/></NAME>"), reason::kCalItemReadFailed, ""},
        {"element first in the annotation", Item(u"<NAME>N3</NAME><ANNOTATION><b/></ANNOTATION>"),
         reason::kCalItemReadFailed, "N3"},
        {"element nested in the value",
         Item(u"<NAME>N4</NAME><VALUE sw-units-ref=\"\" format-type=\"NUMERIC\">1<b/></VALUE>"),
         reason::kCalItemReadFailed, "N4"},
        {"axis size that is no number",
         Item(u"<NAME>N5</NAME><AXIS format-type=\"NUMERIC\" size=\"1\" sw-units=\"\">1</AXIS>"),
         reason::kCalItemReadFailed, "N5"},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        IXMLDOMDocument2Ptr doc;
        IXMLDOMNodePtr node = test::RootOf(row.xml, doc);
        KestCdfCalItem item;
        ExpectDllError([&] { item.ConvertCalItemNode(node); }, row.code, row.text);
    }
    KestCdfCalItem item;
    ExpectComError([&] { item.ConvertCalItemNode(IXMLDOMNodePtr()); }, E_POINTER);
}

TEST(KestCdfCalItem, WriteErrorsCarryTheItemsName) {
    IXMLDOMDocument2Ptr doc;
    IXMLDOMNodePtr parent;

    KestCdfCalItem nameless;
    nameless.SetCalItemValue(nullptr);
    ExpectDllError([&] { Write(nameless, doc); }, reason::kCalItemNameMissing, "");

    // Without a value the item fails after its name and all its axes were appended.
    IXMLDOMDocument2Ptr source;
    KestCdfCalItem valueless;
    valueless.ConvertCalItemNode(
        test::RootOf(Item(u"<NAME>curve</NAME>" + std::u16string(kAxis1) + kAxis2), source));
    ExpectDllError([&] { Write(valueless, doc, &parent); }, reason::kCalItemValueMissing, "curve");
    EXPECT_EQ(test::ChildNames(test::ChildNamed(parent, u"CAL-ITEM")), "NAME AXIS AXIS");

    // Errors of the value and the axes get the name too.
    KestCdfCalItemValue emptyValue;
    KestCdfCalItem emptyValued;
    emptyValued.SetName(Ns(u"v"));
    emptyValued.SetCalItemValue(&emptyValue);
    ExpectDllError([&] { Write(emptyValued, doc); }, reason::kCalItemValueMissing, "v");

    KestCdfAxis emptyAxis[1];
    emptyValued.SetAxis(emptyAxis);
    emptyValued.SetAxisSize(1);
    ExpectDllError([&] { Write(emptyValued, doc); }, reason::kAxisValueEmpty, "v");

    KestCdfCalItem any;
    ExpectComError([&] { any.GetCalItemValue(); }, E_POINTER);
    any.SetName(Ns(u"x"));
    IXMLDOMDocument2Ptr fresh = test::NewDocument();
    ExpectComError(
        [&] { any.ConvertCalItemNodeToXML(IXMLDOMNodePtr(), fresh.GetInterfacePtr(), Ns(u"")); },
        E_POINTER);
}

TEST(KestCdfCalItem, WritesEveryElementInTheNamespace) {
    IXMLDOMDocument2Ptr source;
    KestCdfCalItem item;
    item.ConvertCalItemNode(test::RootOf(
        Item(u"<NAME>n</NAME>" + std::u16string(kAxis1) + kValue + u"<NOTE>x</NOTE>"), source));
    IXMLDOMDocument2Ptr doc = test::NewDocument();
    IXMLDOMNodePtr parent =
        doc->createNode(_variant_t(1), _bstr_t(u"CAL-LIST"), _bstr_t(u"urn:cdf"));
    doc->appendChild(parent);
    item.ConvertCalItemNodeToXML(parent, doc.GetInterfacePtr(), Ns(u"urn:cdf"));
    IXMLDOMNodePtr written = test::ChildNamed(parent, u"CAL-ITEM");
    EXPECT_EQ(written->GetnamespaceURI().ToString(), "urn:cdf");
    IXMLDOMNodeListPtr children = written->GetchildNodes();
    int count = 0;
    while (IXMLDOMNodePtr child = children->nextNode()) {
        SCOPED_TRACE(child->GetnodeName().ToString());
        EXPECT_EQ(child->GetnamespaceURI().ToString(), "urn:cdf");
        ++count;
    }
    EXPECT_EQ(count, 4);
}

TEST(KestCdfCalItem, CopiesShareValueAndAxes) {
    IXMLDOMDocument2Ptr doc;
    KestCdfCalItem* item = new KestCdfCalItem;
    item->ConvertCalItemNode(
        test::RootOf(Item(u"<NAME>n</NAME>" + std::u16string(kAxis1) + kValue), doc));
    KestCdfCalItem copy = *item;
    KestCdfCalItem assigned;
    assigned = copy;
    EXPECT_EQ(copy.GetAxis(), item->GetAxis());
    item->GetAxis()[0].SetSize(42);
    item->SetName(Ns(u"renamed"));  // owned strings are not shared
    delete item;
    EXPECT_EQ(copy.GetAxis()[0].GetSize(), 42u);
    EXPECT_EQ(Utf8(assigned.GetCalItemValue().GetUnits()), "Nm");
    EXPECT_EQ(Utf8(copy.GetName()), "n");

    // Objects the host gives stay the host's; library objects given to another item are shared.
    KestCdfCalItemValue hostValue;
    KestCdfAxis hostAxes[2];
    KestCdfCalItem other;
    {
        KestCdfCalItem borrowing;
        borrowing.SetCalItemValue(&hostValue);
        borrowing.SetAxis(hostAxes);
        other.SetCalItemValue(nullptr);
        other.SetAxis(copy.GetAxis());
        KestCdfCalItem second = borrowing;
    }
    copy = KestCdfCalItem();
    assigned = KestCdfCalItem();
    EXPECT_EQ(other.GetAxis()[0].GetSize(), 42u);  // survives the items that allocated it
    hostAxes[1].SetSize(7);

    EXPECT_THROW(other.CreateAxisArray(-1), std::bad_alloc);
    KestCdfAxis* created = other.CreateAxisArray(2);
    EXPECT_EQ(other.GetAxis(), created);
    EXPECT_EQ(other.GetAxisSize(), 0);
}

}  // namespace
}  // namespace kest
