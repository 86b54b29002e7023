// CAL-DATA: root attributes by position, header texts, the write order and its attributes,
// reason codes, whole-document round trips and the sharing of the tree between copies.
#include "model/KestCdfCalData.h"

#include <new>

#include "ModelTestDom.h"

namespace kest {
namespace {

using test::ChildNamed;
using test::ExpectComError;
using test::ExpectDllError;
using test::Ns;
using test::Utf8;

constexpr const char16_t* kAttributes =
    u" xmlns=\"urn:cdf\" xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\""
    u" xsi:schemaLocation=\"urn:cdf cdf.xsd\"";

std::u16string Root(const std::u16string& body, const char16_t* attributes = kAttributes) {
    return u"<CAL-DATA" + std::u16string(attributes) + u">" + body + u"</CAL-DATA>";
}

// Reads attributes and content of CAL-DATA text into `data`.
void Read(KestCdfCalData& data, const std::u16string& xml) {
    IXMLDOMDocument2Ptr doc;
    IXMLDOMNodePtr root = test::RootOf(xml, doc);
    data.SetNodeAttributes(root->Getattributes());
    EXPECT_TRUE(data.ConvertCalDataNode(root));
}

// Builds `data` into a fresh document and returns the document's XML.
std::string Written(KestCdfCalData& data, const char16_t* comment = u"") {
    IXMLDOMDocument2Ptr doc = test::NewDocument();
    EXPECT_TRUE(data.ConvertCalDataNodeToXML(doc.GetInterfacePtr(), CComBSTR(comment)));
    return test::XmlOf(doc->GetdocumentElement());
}

TEST(KestCdfCalData, ReadsTheFirstThreeAttributesByPosition) {
    const struct {
        const char* label;
        const char16_t* attributes;
        const char* ns;
        const char* instance;
        const char* location;
        int code;  // -1: no error
    } rows[] = {
        {"conventional", kAttributes, "urn:cdf", "http://www.w3.org/2001/XMLSchema-instance",
         "urn:cdf cdf.xsd", -1},
        {"names do not matter", u" xsi:schemaLocation=\"loc\" a=\"b\" c=\"d\" e=\"f\"", "loc", "b",
         "d", -1},
        {"whitespace becomes spaces", u" a=\"x&#9;y\" b=\"1&#10;&#13;2\" c=\"  z  \"", "x y",
         "1  2", "  z  ", -1},
        {"two attributes", u" xmlns=\"n\" xmlns:xsi=\"i\"", "n", "i", "", 42},
        {"no attribute", u"", "", "", "", 42},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        IXMLDOMDocument2Ptr doc;
        IXMLDOMNodePtr root = test::RootOf(Root(u"", row.attributes), doc);
        KestCdfCalData data;
        if (row.code < 0) {
            data.SetNodeAttributes(root->Getattributes());
        } else {
            ExpectDllError([&] { data.SetNodeAttributes(root->Getattributes()); }, row.code);
        }
        EXPECT_EQ(Utf8(data.GetNamespace()), row.ns);
        EXPECT_EQ(Utf8(data.GetSchemaInstance()), row.instance);
        EXPECT_EQ(Utf8(data.GetSchemaLocation()), row.location);
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
    EXPECT_TRUE(empty.GetNote() != nullptr);
    EXPECT_EQ(Utf8(empty.GetNote()), "");
    EXPECT_TRUE(empty.GetCompany().m_string != nullptr);
    EXPECT_TRUE(empty.GetFileName().m_string == nullptr);
}

TEST(KestCdfCalData, WritesTheFixedFormOfTheRoot) {
    const struct {
        const char* label;
        const char16_t* ns;
        const char16_t* company;  // null: not set
        const char16_t* note;
        const char16_t* comment;
        const char* written;
    } rows[] = {
        {"defaults", nullptr, nullptr, nullptr, u"",
         "<CAL-DATA xmlns=\"\" xmlns:xsi=\"xsi\" xsi:noNamespaceSchemaLocation=\"loc\">"
         "<CHANGE-HISTORY/><FILENAME></FILENAME></CAL-DATA>"},
        {"namespace, texts and comment", u"urn:cdf", u"", u"n&", u"made by test",
         "<CAL-DATA xmlns=\"urn:cdf\" xmlns:xsi=\"xsi\" xsi:schemaLocation=\"loc\">"
         "<!--made by test--><CHANGE-HISTORY/><FILENAME></FILENAME><COMPANY-INFO></COMPANY-INFO>"
         "<NOTE>n&amp;</NOTE></CAL-DATA>"},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        KestCdfCalData data;
        if (row.ns) data.SetNamespace(Ns(row.ns));
        if (row.company) data.SetCompany(Ns(row.company));
        if (row.note) data.SetNote(CComBSTR(row.note));
        data.SetSchemaInstance(Ns(u"xsi"));
        data.SetSchemaLocation(Ns(u"loc"));
        EXPECT_EQ(Written(data, row.comment), row.written);
    }
}

TEST(KestCdfCalData, WritesEveryElementBelowTheRootInTheNamespace) {
    KestCdfCalData data;
    Read(data, Root(u"<FILENAME>f</FILENAME><NOTE>n</NOTE><CAL-LIST><NAME>L</NAME>"
                    u"<SYMBOLIC-FILE crc32=\"0x1\">s</SYMBOLIC-FILE></CAL-LIST>"));
    IXMLDOMDocument2Ptr doc = test::NewDocument();
    data.ConvertCalDataNodeToXML(doc.GetInterfacePtr(), CComBSTR());
    IXMLDOMNodePtr root = doc->GetdocumentElement();
    EXPECT_EQ(root->GetnamespaceURI().ToString(), "");
    IXMLDOMNodeListPtr children = root->GetchildNodes();
    int elements = 0;
    while (IXMLDOMNodePtr child = children->nextNode()) {
        SCOPED_TRACE(child->GetnodeName().ToString());
        EXPECT_EQ(child->GetnamespaceURI().ToString(), "urn:cdf");
        ++elements;
    }
    EXPECT_EQ(elements, 4);
    EXPECT_EQ(ChildNamed(ChildNamed(root, u"CAL-LIST"), u"NAME")->GetnamespaceURI().ToString(),
              "urn:cdf");
    // Saved and loaded again, the document shows the elements without a prefix.
    std::string xml = test::XmlOf(root);
    EXPECT_EQ(xml.find("xmlns=\"urn:cdf\""), xml.rfind("xmlns="));
}

TEST(KestCdfCalData, WriteErrorsNameTheMissingPiece) {
    KestCdfCalData data;
    IXMLDOMDocument2Ptr doc = test::NewDocument();
    ExpectDllError([&] { data.ConvertCalDataNodeToXML(doc.GetInterfacePtr(), CComBSTR()); },
                   reason::kSchemaInstanceMissing);
    data.SetSchemaInstance(Ns(u"i"));
    doc = test::NewDocument();
    ExpectDllError([&] { data.ConvertCalDataNodeToXML(doc.GetInterfacePtr(), CComBSTR()); },
                   reason::kSchemaLocationMissing);
    data.SetSchemaLocation(Ns(u"l"));
    data.SetCalListSize(1);  // no list array
    doc = test::NewDocument();
    ExpectComError([&] { data.ConvertCalDataNodeToXML(doc.GetInterfacePtr(), CComBSTR()); },
                   E_POINTER);
    data.CreateCalList(1);
    doc = test::NewDocument();
    ExpectDllError([&] { data.ConvertCalDataNodeToXML(doc.GetInterfacePtr(), CComBSTR()); },
                   reason::kCalListNameMissing);
    ExpectComError([&] { data.ConvertCalDataNodeToXML(nullptr, CComBSTR()); }, E_POINTER);
}

TEST(KestCdfCalData, ReadErrorsKeepTheirReason) {
    const struct {
        const char* label;
        std::u16string body;
        int code;
        const char* text;
    } rows[] = {
        {"element nested in the note", u"<NOTE>a<b/></NOTE>", reason::kCalDataReadFailed, ""},
        {"element nested in the file name", u"<FILENAME><b/></FILENAME>",
         reason::kCalDataReadFailed, ""},
        {"list failure", u"<CAL-LIST><NOTE>a<b/></NOTE></CAL-LIST>", reason::kCalListReadFailed,
         ""},
        {"symbolic file failure", u"<CAL-LIST><SYMBOLIC-FILE/></CAL-LIST>",
         reason::kSymbolicFileAttribute, ""},
        {"item failure", u"<CAL-LIST><CAL-ITEM><NAME>it</NAME><AXIS/></CAL-ITEM></CAL-LIST>",
         reason::kAxisAttributeMissing, "it"},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        IXMLDOMDocument2Ptr doc;
        IXMLDOMNodePtr root = test::RootOf(Root(row.body), doc);
        KestCdfCalData data;
        ExpectDllError([&] { data.ConvertCalDataNode(root); }, row.code, row.text);
    }
    // A bad change entry is no error of the document.
    KestCdfCalData data;
    Read(data, Root(u"<CHANGE-HISTORY><CHANGE><DATE>bad</DATE></CHANGE></CHANGE-HISTORY>"));
    EXPECT_EQ(data.GetChangeHistory().GetChangeArraySize(), 1);
    ExpectComError([&] { data.ConvertCalDataNode(IXMLDOMNodePtr()); }, E_POINTER);
}

constexpr const char16_t* kDocument =
    u"<CAL-DATA xmlns=\"urn:cdf\" xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\""
    u" xsi:schemaLocation=\"urn:cdf cdf.xsd\">\n"
    u" <CHANGE-HISTORY>\n"
    u"  <CHANGE><USERNAME>ann</USERNAME><DATE>2024-05-06T07:08:09</DATE><TOOL>t</TOOL></CHANGE>\n"
    u"  <CHANGE><USERNAME>bob</USERNAME><DATE>2025-01-02T03:04:05</DATE></CHANGE>\n"
    u" </CHANGE-HISTORY>\n"
    u" <FILENAME>engine.cdf</FILENAME><COMPANY-INFO>Kest</COMPANY-INFO><NOTE>n</NOTE>\n"
    u" <CAL-LIST><NAME>L1</NAME><SYMBOLIC-FILE crc32=\"0xDEADBEEF\">a.a2l</SYMBOLIC-FILE>\n"
    u"  <TARGET-IMAGE crc32=\"0x1\">a.hex</TARGET-IMAGE><NOTE>list note</NOTE>\n"
    u"  <CAL-ITEM><NAME>map</NAME>\n"
    u"   <AXIS size=\"3\" sw-units=\"rpm\" format-type=\"NUMERIC\">0 1000 2000</AXIS>\n"
    u"   <VALUE sw-units-ref=\"Nm\" format-type=\"NUMERIC\">1.5 -2 3e+20</VALUE>\n"
    u"   <ANNOTATION>a</ANNOTATION><NOTE>item note</NOTE></CAL-ITEM>\n"
    u"  <CAL-ITEM><NAME>label</NAME><VALUE sw-units-ref=\"\" format-type=\"LABEL\">ON</VALUE>"
    u"</CAL-ITEM>\n"
    u" </CAL-LIST>\n"
    u" <CAL-LIST><NAME>L2</NAME><SYMBOLIC-FILE crc32=\"0x0\">b.a2l</SYMBOLIC-FILE></CAL-LIST>\n"
    u"</CAL-DATA>";

TEST(KestCdfCalData, WholeDocumentRoundTrips) {
    KestCdfCalData first;
    Read(first, kDocument);
    ASSERT_EQ(first.GetCalListSize(), 2);
    EXPECT_EQ(Utf8(first.GetCalList().GetName()), "L1");
    EXPECT_EQ(first.GetCalLists()[0].GetCalItemSize(), 2);
    EXPECT_EQ(Utf8(first.GetCalLists()[1].GetName()), "L2");
    EXPECT_EQ(first.GetChangeHistory().GetChangeArraySize(), 2);
    const std::string once = Written(first, u"comment");

    KestCdfCalData second;
    Read(second, Utf8ToUtf16(once));
    const std::string twice = Written(second, u"comment");
    EXPECT_EQ(once, twice);
    EXPECT_NE(once.find("<CHANGE><USERNAME>bob</USERNAME><DATE>2025-01-02T03:04:05</DATE>"),
              std::string::npos);
    EXPECT_NE(once.find("crc32=\"0xDEADBEEF\""), std::string::npos);
}

TEST(KestCdfCalData, CopiesShareTheTree) {
    KestCdfCalData* original = new KestCdfCalData;
    Read(*original, kDocument);
    KestCdfCalData copy = *original;
    KestCdfCalData assigned;
    assigned = copy;
    EXPECT_EQ(copy.GetCalLists(), original->GetCalLists());
    original->GetCalLists()[1].SetNote(CComBSTR(u"shared"));
    original->SetNote(CComBSTR(u"own"));
    delete original;
    EXPECT_EQ(Utf8(copy.GetCalLists()[1].GetNote()), "shared");
    EXPECT_EQ(Utf8(copy.GetNote()), "n");

    // SetCalList assigns into list 0, which every copy sees.
    KestCdfCalList replacement = copy.GetCalLists()[1];
    assigned.SetCalList(replacement);
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
}

TEST(KestCdfCalData, ChangeHistoryIsHeldByValueAndSharesItsEntries) {
    KestCdfChangeHistory history;
    history.SetChangeArraySize(1);
    history.CreateChangeList()[0].SetUserName(Ns(u"u"));
    KestCdfCalData data;
    data.SetChangeHistory(history);
    history.SetChangeArraySize(0);  // the root holds its own copy of the count
    EXPECT_EQ(data.GetChangeHistory().GetChangeArraySize(), 1);
    EXPECT_EQ(data.GetChangeHistory().GetChange(), history.GetChange());
    data.SetSchemaInstance(Ns(u"i"));
    data.SetSchemaLocation(Ns(u"l"));
    EXPECT_NE(Written(data).find("<USERNAME>u</USERNAME>"), std::string::npos);
}

}  // namespace
}  // namespace kest
