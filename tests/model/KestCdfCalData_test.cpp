// CAL-DATA: root attributes by position, header texts, the write order and its attributes,
// reason codes, whole-document round trips and the sharing of the tree between copies.
#include "model/KestCdfCalData.h"

#include <new>

#include "ModelTestDom.h"

namespace kest {
namespace {

using test::ExpectComError;
using test::ExpectDllError;
using test::Ns;
using test::Utf8;

std::u16string Root(
    const std::u16string& body,
    const std::u16string& attributes =
        u" xmlns=\"urn:cdf\" xmlns:xsi=\"xsi\" xsi:schemaLocation=\"urn:cdf cdf.xsd\"") {
    return u"<CAL-DATA" + attributes + u">" + body + u"</CAL-DATA>";
}

// Reads attributes and content of CAL-DATA text into `data`.
void Read(KestCdfCalData& data, const std::u16string& xml) {
    IXMLDOMDocument2Ptr doc;
    IXMLDOMNodePtr root = test::RootOf(xml, doc);
    data.SetNodeAttributes(root->Getattributes());
    EXPECT_TRUE(data.ConvertCalDataNode(root));
}

// Builds `data` into a fresh document and returns the document element.
IXMLDOMNodePtr Write(KestCdfCalData& data, IXMLDOMDocument2Ptr& doc,
                     const char16_t* comment = u"") {
    doc = test::NewDocument();
    EXPECT_TRUE(data.ConvertCalDataNodeToXML(doc.GetInterfacePtr(), CComBSTR(comment)));
    return doc->GetdocumentElement();
}

TEST(KestCdfCalData, ReadsTheFirstThreeAttributesByPosition) {
    const struct {
        const char* label;
        const char16_t* attributes;
        const char* read;  // namespace|instance|location
        int code;          // 0: no error
    } rows[] = {
        {"names do not matter", u" xsi:schemaLocation=\"loc\" a=\"b\" c=\"d\" e=\"f\"", "loc|b|d",
         0},
        {"whitespace becomes spaces", u" a=\"x&#9;y\" b=\"1&#10;&#13;2\" c=\"  z  \"",
         "x y|1  2|  z  ", 0},
        {"two attributes", u" xmlns=\"n\" xmlns:xsi=\"i\"", "n|i|",
         reason::kCalDataAttributeMissing},
        {"no attribute", u"", "||", reason::kCalDataAttributeMissing},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        IXMLDOMDocument2Ptr doc;
        IXMLDOMNodePtr root = test::RootOf(Root(u"", row.attributes), doc);
        KestCdfCalData data;
        if (row.code == 0) {
            data.SetNodeAttributes(root->Getattributes());
        } else {
            ExpectDllError([&] { data.SetNodeAttributes(root->Getattributes()); }, row.code);
        }
        EXPECT_EQ(Utf8(data.GetNamespace()) + "|" + Utf8(data.GetSchemaInstance()) + "|" +
                      Utf8(data.GetSchemaLocation()),
                  row.read);
    }
    KestCdfCalData data;
    ExpectDllError([&] { data.SetNodeAttributes(IXMLDOMNamedNodeMapPtr()); },
                   reason::kCalDataNoAttributeMap);
}

TEST(KestCdfCalData, ReadsHeaderTextsVerbatimInAnyOrder) {
    KestCdfCalData data;
    Read(data, Root(u"\n  <!--c--><NOTE>first</NOTE><OTHER><NOTE>deep</NOTE></OTHER>"
                    u"<COMPANY-INFO>a&#9;b</COMPANY-INFO><?NOTE pi?><FILENAME>CAL-LIST</FILENAME>"
                    u"<NOTE>x<!--second--></NOTE><p:NOTE xmlns:p=\"urn:p\">prefixed</p:NOTE>\n"));
    EXPECT_EQ(Utf8(data.GetNote()), "second");
    EXPECT_EQ(Utf8(data.GetCompany()), "a\tb");
    EXPECT_EQ(Utf8(data.GetFileName()), "CAL-LIST");
    EXPECT_EQ(data.GetCalListSize(), 0);
    EXPECT_NE(data.GetCalLists(), nullptr);
    ExpectComError([&] { data.GetCalList(); }, DISP_E_BADINDEX);

    KestCdfCalData empty;
    Read(empty, Root(u"<NOTE/><COMPANY-INFO/>"));
    EXPECT_TRUE(empty.GetNote() != nullptr && empty.GetCompany().m_string != nullptr);
    EXPECT_TRUE(empty.GetFileName().m_string == nullptr);
}

TEST(KestCdfCalData, WritesTheFixedRootOrNamesTheMissingPiece) {
    KestCdfCalData data;
    IXMLDOMDocument2Ptr doc;
    auto write = [&] { Write(data, doc); };
    ExpectDllError(write, reason::kSchemaInstanceMissing);
    data.SetSchemaInstance(Ns(u"i"));
    ExpectDllError(write, reason::kSchemaLocationMissing);
    data.SetSchemaLocation(Ns(u"l"));
    EXPECT_EQ(test::XmlOf(Write(data, doc)),
              "<CAL-DATA xmlns=\"\" xmlns:xsi=\"i\" xsi:noNamespaceSchemaLocation=\"l\">"
              "<CHANGE-HISTORY/><FILENAME></FILENAME></CAL-DATA>");
    data.SetCalListSize(1);  // no list array
    ExpectComError(write, E_POINTER);
    data.CreateCalList(1);
    ExpectDllError(write, reason::kCalListNameMissing);
    ExpectComError([&] { data.ConvertCalDataNodeToXML(nullptr, CComBSTR()); }, E_POINTER);
}

TEST(KestCdfCalData, ReadErrorsKeepTheirReason) {
    const struct {
        const char* label;
        std::u16string body;
        int code;
        const char* text;
    } rows[] = {
        {"element nested in the file name", u"<FILENAME><b/></FILENAME>",
         reason::kCalDataReadFailed, ""},
        {"list failure", u"<CAL-LIST><NOTE>a<b/></NOTE></CAL-LIST>", reason::kCalListReadFailed,
         ""},
        {"item failure", u"<CAL-LIST><CAL-ITEM><NAME>it</NAME><AXIS/></CAL-ITEM></CAL-LIST>",
         reason::kAxisAttributeMissing, "it"},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        test::ExpectReadError<KestCdfCalData>(
            Root(row.body), [](auto& data, auto node) { data.ConvertCalDataNode(node); }, row.code,
            row.text);
    }
    // A bad change entry is no error of the document.
    KestCdfCalData data;
    Read(data, Root(u"<CHANGE-HISTORY><CHANGE><DATE>bad</DATE></CHANGE></CHANGE-HISTORY>"));
    EXPECT_EQ(data.GetChangeHistory().GetChangeArraySize(), 1);
    ExpectComError([&] { data.ConvertCalDataNode(IXMLDOMNodePtr()); }, E_POINTER);
}

const std::u16string kDocument = Root(
    u"\n <CHANGE-HISTORY>\n"
    u"  <CHANGE><USERNAME>ann</USERNAME><DATE>2024-05-06T07:08:09</DATE><TOOL>t</TOOL></CHANGE>\n"
    u"  <CHANGE><USERNAME>bob</USERNAME><DATE>2025-01-02T03:04:05</DATE></CHANGE>\n"
    u" </CHANGE-HISTORY>\n"
    u" <FILENAME>engine.cdf</FILENAME><COMPANY-INFO>Kest</COMPANY-INFO><NOTE>n&amp;</NOTE>\n"
    u" <CAL-LIST><NAME>L1</NAME><SYMBOLIC-FILE crc32=\"0xDEADBEEF\">a.a2l</SYMBOLIC-FILE>\n"
    u"  <TARGET-IMAGE crc32=\"0x1\">a.hex</TARGET-IMAGE><NOTE>list note</NOTE>\n"
    u"  <CAL-ITEM><NAME>map</NAME>\n"
    u"   <AXIS size=\"3\" sw-units=\"rpm\" format-type=\"NUMERIC\">0 1000 2000</AXIS>\n"
    u"   <VALUE sw-units-ref=\"Nm\" format-type=\"NUMERIC\">1.5 -2 3e+20</VALUE>\n"
    u"   <ANNOTATION>a</ANNOTATION><NOTE>item note</NOTE></CAL-ITEM>\n"
    u"  <CAL-ITEM><NAME>label</NAME><VALUE sw-units-ref=\"\" "
    u"format-type=\"LABEL\">ON</VALUE></CAL-ITEM>\n"
    u" </CAL-LIST>\n"
    u" <CAL-LIST><NAME>L2</NAME><SYMBOLIC-FILE crc32=\"0x0\">b.a2l</SYMBOLIC-FILE></CAL-LIST>\n");

TEST(KestCdfCalData, WholeDocumentRoundTripsInTheFixedOrderAndNamespace) {
    KestCdfCalData first, second;
    IXMLDOMDocument2Ptr doc;
    Read(first, kDocument);
    ASSERT_EQ(first.GetCalListSize(), 2);
    IXMLDOMNodePtr root = Write(first, doc, u"comment");
    EXPECT_EQ(test::ChildNames(root),
              "CHANGE-HISTORY FILENAME COMPANY-INFO NOTE CAL-LIST CAL-LIST");
    const std::string once = test::XmlOf(root);
    Read(second, Utf8ToUtf16(once));
    EXPECT_EQ(test::XmlOf(Write(second, doc, u"comment")), once);
    for (const char* part :
         {"<CAL-DATA xmlns=\"urn:cdf\" xmlns:xsi=\"xsi\" xsi:schemaLocation=\"urn:cdf cdf.xsd\">"
          "<!--comment--><CHANGE-HISTORY><CHANGE><USERNAME>ann</USERNAME>",
          "<NOTE>n&amp;</NOTE>", "crc32=\"0xDEADBEEF\">a.a2l", "<NAME>L2</NAME>",
          "format-type=\"LABEL\">ON<", "<NOTE>item note</NOTE>"}) {
        EXPECT_NE(once.find(part), std::string::npos) << part;
    }
    // Every element below the root is in its namespace, declared once on the root.
    EXPECT_EQ(once.find("xmlns="), once.rfind("xmlns="));
}

TEST(KestCdfCalData, CopiesShareTheTree) {
    KestCdfCalData* original = new KestCdfCalData;
    Read(*original, kDocument);
    KestCdfCalData copy = *original;
    KestCdfCalData assigned;
    assigned = copy;
    original->GetCalLists()[1].SetNote(CComBSTR(u"shared"));
    original->SetNote(CComBSTR(u"own"));
    delete original;
    EXPECT_EQ(Utf8(copy.GetCalLists()[1].GetNote()), "shared");
    EXPECT_EQ(Utf8(copy.GetNote()), "n&");

    // SetCalList assigns into list 0, which every copy sees.
    assigned.SetCalList(copy.GetCalLists()[1]);
    EXPECT_EQ(Utf8(copy.GetCalList().GetName()), "L2");

    // A library array handed to another root lives as long as any holder.
    KestCdfCalData other;
    other.SetCalLists(copy.GetCalLists());
    other.SetCalListSize(2);
    copy = KestCdfCalData();
    assigned = KestCdfCalData();
    EXPECT_EQ(Utf8(other.GetCalLists()[1].GetNote()), "shared");

    // A host array is borrowed: the model never frees it.
    KestCdfCalList hostLists[2];
    {
        KestCdfCalData borrowing;
        borrowing.SetCalLists(hostLists);
        borrowing.SetCalListSize(2);
        borrowing.SetCalList(other.GetCalLists()[0]);
        KestCdfCalData second = borrowing;
    }
    EXPECT_EQ(Utf8(hostLists[0].GetName()), "L2");  // list 0 was replaced above

    KestCdfCalData none;
    ExpectComError([&] { none.GetCalList(); }, E_POINTER);
    EXPECT_THROW(none.CreateCalList(-1), std::bad_alloc);
    KestCdfCalList* created = none.CreateCalList(3);
    EXPECT_EQ(created, none.GetCalLists());
    EXPECT_EQ(none.GetCalListSize(), 0);

    // The change history is held by value; its entries are shared.
    KestCdfChangeHistory history;
    history.SetChangeArraySize(1);
    history.CreateChangeList()[0].SetUserName(Ns(u"u"));
    none.SetChangeHistory(history);
    history.SetChangeArraySize(0);
    EXPECT_EQ(none.GetChangeHistory().GetChangeArraySize(), 1);
    EXPECT_EQ(none.GetChangeHistory().GetChange(), history.GetChange());
}

}  // namespace
}  // namespace kest
