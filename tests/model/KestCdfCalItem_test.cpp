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

const std::u16string kAxis1 =
    u"<AXIS size=\"3\" sw-units=\"rpm\" format-type=\"NUMERIC\">0 10 20</AXIS>";
const std::u16string kAxis2 =
    u"<AXIS size=\"2\" sw-units=\"K\" format-type=\"NUMERIC\">1.5 2.5</AXIS>";
const std::u16string kValue = u"<VALUE sw-units-ref=\"Nm\" format-type=\"NUMERIC\">1 2 3</VALUE>";
const std::string kOut1 = Utf16ToUtf8(kAxis1), kOut2 = Utf16ToUtf8(kAxis2),
                  kValueOut = Utf16ToUtf8(kValue);

std::u16string Item(const std::u16string& body) { return u"<CAL-ITEM>" + body + u"</CAL-ITEM>"; }
std::string ItemOut(const std::string& body) { return "<CAL-ITEM>" + body + "</CAL-ITEM>"; }

auto Read = [](KestCdfCalItem& item, IXMLDOMNodePtr node) {
    EXPECT_TRUE(item.ConvertCalItemNode(node));
};
auto Write = [](KestCdfCalItem& item, IXMLDOMNodePtr parent, IXMLDOMDocument2Ptr& doc) {
    EXPECT_TRUE(item.ConvertCalItemNodeToXML(parent, doc.GetInterfacePtr(), Ns(u"")));
};

TEST(KestCdfCalItem, RoundTripsThroughReadWriteRead) {
    const struct {
        const char* label;
        std::u16string xml;
        std::string written;
    } rows[] = {
        {"any order in, axes in document order, fixed order out",
         Item(u"<NOTE>n</NOTE>" + kAxis1 + u"<ANNOTATION>a</ANNOTATION>" + kValue + kAxis2 +
              u"\n <NAME>map</NAME><!--c--><OTHER/>"),
         ItemOut("<NAME>map</NAME>" + kOut1 + kOut2 + kValueOut +
                 "<ANNOTATION>a</ANNOTATION><NOTE>n</NOTE>")},
        {"nested and prefixed axes are not axes",
         Item(u"<NAME>v</NAME><X>" + kAxis1 + u"</X><p:AXIS xmlns:p=\"urn:p\"/>" + kValue),
         ItemOut("<NAME>v</NAME>" + kValueOut)},
        {"last child text for the name, first for the others, verbatim",
         Item(u"<NAME>text<!--name--></NAME>" + kValue +
              u"<ANNOTATION>text<!--c--></ANNOTATION><NOTE>x&#10;y<!--n--></NOTE>"),
         ItemOut("<NAME>name</NAME>" + kValueOut +
                 "<ANNOTATION>text</ANNOTATION><NOTE>x\ny</NOTE>")},
        {"empty elements", Item(u"<NAME/>" + kValue + u"<ANNOTATION/><NOTE/>"),
         ItemOut("<NAME></NAME>" + kValueOut + "<NOTE></NOTE>")},
        {"names of other children are only text, second value stands",
         Item(u"<NAME>AXIS</NAME><NOTE>NAME</NOTE>"
              u"<VALUE sw-units-ref=\"a\" format-type=\"NUMERIC\">9</VALUE>" +
              kValue),
         ItemOut("<NAME>AXIS</NAME>" + kValueOut + "<NOTE>NAME</NOTE>")},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        test::ExpectRoundTrip<KestCdfCalItem>(row.xml, row.written, Read, Write);
    }
}

TEST(KestCdfCalItem, ReadErrorsCarryTheNameReadSoFar) {
    const struct {
        const char* label;
        std::u16string xml;
        int code;
        const char* text;
    } rows[] = {
        {"axis without attributes after the name",
         Item(u"<NAME>N1</NAME>" + kAxis1 + u"<AXIS>1</AXIS>"), reason::kAxisAttributeMissing,
         "N1"},
        {"axis lacking its third attribute before the name",
         Item(u"<AXIS size=\"1\" sw-units=\"u\">1</AXIS><NAME>N1</NAME>"),
         reason::kAxisAttributeMissing, ""},
        {"element first in the note", Item(u"<NAME>N2</NAME><NOTE><b/>a</NOTE>"),
         reason::kCalItemReadFailed, "N2"},
        {"element nested in the name", Item(u"<NAME>a<b/></NAME>"), reason::kCalItemReadFailed, ""},
        {"element nested in the value",
         Item(u"<NAME>N4</NAME><VALUE sw-units-ref=\"\" format-type=\"NUMERIC\">1<b/></VALUE>"),
         reason::kCalItemReadFailed, "N4"},
        {"axis size that is no number",
         Item(u"<NAME>N5</NAME><AXIS format-type=\"NUMERIC\" size=\"1\" sw-units=\"\">1</AXIS>"),
         reason::kCalItemReadFailed, "N5"},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        test::ExpectReadError<KestCdfCalItem>(row.xml, Read, row.code, row.text);
    }
    KestCdfCalItem item;
    ExpectComError([&] { item.ConvertCalItemNode(IXMLDOMNodePtr()); }, E_POINTER);
}

TEST(KestCdfCalItem, WriteErrorsCarryTheItemsName) {
    IXMLDOMDocument2Ptr doc;
    KestCdfCalItem nameless;
    nameless.SetCalItemValue(nullptr);
    ExpectDllError([&] { test::WriteBelow(nameless, doc, Write); }, reason::kCalItemNameMissing,
                   "");

    // Without a value the item fails after its name and all its axes were appended.
    IXMLDOMDocument2Ptr source;
    KestCdfCalItem valueless;
    valueless.ConvertCalItemNode(
        test::RootOf(Item(u"<NAME>curve</NAME>" + kAxis1 + kAxis2), source));
    IXMLDOMNodePtr written;
    ExpectDllError([&] { written = test::WriteBelow(valueless, doc, Write); },
                   reason::kCalItemValueMissing, "curve");
    EXPECT_EQ(test::ChildNames(doc->GetdocumentElement()->GetfirstChild()), "NAME AXIS AXIS");

    // Errors of the value and the axes get the name too.
    KestCdfCalItemValue emptyValue;
    KestCdfCalItem emptyValued;
    emptyValued.SetName(Ns(u"v"));
    emptyValued.SetCalItemValue(&emptyValue);
    ExpectDllError([&] { test::WriteBelow(emptyValued, doc, Write); }, reason::kCalItemValueMissing,
                   "v");
    KestCdfAxis emptyAxis[1];
    emptyValued.SetAxis(emptyAxis);
    emptyValued.SetAxisSize(1);
    ExpectDllError([&] { test::WriteBelow(emptyValued, doc, Write); }, reason::kAxisValueEmpty,
                   "v");

    KestCdfCalItem any;
    ExpectComError([&] { any.GetCalItemValue(); }, E_POINTER);
    any.SetName(Ns(u"x"));
    ExpectComError(
        [&] { any.ConvertCalItemNodeToXML(IXMLDOMNodePtr(), doc.GetInterfacePtr(), Ns(u"")); },
        E_POINTER);
}

TEST(KestCdfCalItem, CopiesShareValueAndAxes) {
    IXMLDOMDocument2Ptr doc;
    KestCdfCalItem* item = new KestCdfCalItem;
    item->ConvertCalItemNode(test::RootOf(Item(u"<NAME>n</NAME>" + kAxis1 + kValue), doc));
    KestCdfCalItem copy = *item;
    KestCdfCalItem assigned;
    assigned = copy;
    item->GetAxis()[0].SetSize(42);
    item->SetName(Ns(u"renamed"));  // owned strings are not shared
    delete item;
    EXPECT_EQ(copy.GetAxis()[0].GetSize(), 42u);
    EXPECT_EQ(test::Utf8(assigned.GetCalItemValue().GetUnits()), "Nm");
    EXPECT_EQ(test::Utf8(copy.GetName()), "n");

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
