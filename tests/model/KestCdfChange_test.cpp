// CHANGE: one change entry, read in any order, written in a fixed order.
#include "model/KestCdfChange.h"

#include "ModelTestDom.h"

namespace kest {
namespace {

using test::ChildNamed;
using test::Ns;
using test::Utf8;

// Writes `change` under a fresh parent and returns the CHANGE element.
IXMLDOMNodePtr Write(KestCdfChange& change, IXMLDOMDocument2Ptr& doc, const char16_t* ns = u"") {
    doc = test::NewDocument();
    IXMLDOMNodePtr parent = doc->createElement(_bstr_t(u"CHANGE-HISTORY"));
    doc->appendChild(parent);
    EXPECT_TRUE(change.ConvertChangeToXML(parent, doc.GetInterfacePtr(), Ns(ns)));
    return ChildNamed(parent, u"CHANGE");
}

TEST(KestCdfChange, RoundTripsThroughReadWriteRead) {
    const struct {
        const char* label;
        const char16_t* xml;
        const char* written;
    } rows[] = {
        {"every field",
         u"<CHANGE><USERNAME>ann</USERNAME><DATE>2024-05-06T07:08:09</DATE><TOOL>ed 1.0</TOOL>"
         u"<NOTE>first</NOTE><DATA-VERSION>V1</DATA-VERSION></CHANGE>",
         "<CHANGE><USERNAME>ann</USERNAME><DATE>2024-05-06T07:08:09</DATE><TOOL>ed 1.0</TOOL>"
         "<NOTE>first</NOTE><DATA-VERSION>V1</DATA-VERSION></CHANGE>"},
        {"any order in, fixed order out",
         u"<CHANGE><NOTE>n</NOTE><TOOL>t</TOOL><DATE>1999-12-31T23:59:59Z</DATE>"
         u"<USERNAME>u</USERNAME></CHANGE>",
         "<CHANGE><USERNAME>u</USERNAME><DATE>1999-12-31T23:59:59</DATE><TOOL>t</TOOL>"
         "<NOTE>n</NOTE></CHANGE>"},
        {"empty optional elements are dropped",
         u"<CHANGE><USERNAME/><DATE>2001-01-01T00:00:00</DATE><TOOL/><NOTE/><DATA-VERSION/>"
         u"</CHANGE>",
         "<CHANGE><USERNAME></USERNAME><DATE>2001-01-01T00:00:00</DATE></CHANGE>"},
        {"first child node for the user, last for the others",
         u"<CHANGE><USERNAME>who<!--c1--></USERNAME><DATE>2001-01-01T00:00:00</DATE>"
         u"<NOTE>text<!--c2--></NOTE><DATA-VERSION>a<!--v--></DATA-VERSION></CHANGE>",
         "<CHANGE><USERNAME>who</USERNAME><DATE>2001-01-01T00:00:00</DATE><NOTE>c2</NOTE>"
         "<DATA-VERSION>v</DATA-VERSION></CHANGE>"},
        {"repeated elements overwrite, unknown ones are ignored",
         u"<CHANGE><TOOL>a</TOOL><x:TOOL xmlns:x=\"urn:x\">p</x:TOOL><OTHER>o</OTHER>"
         u"<DATE>2001-01-01T00:00:00</DATE><TOOL>b</TOOL><?TOOL pi?></CHANGE>",
         "<CHANGE><USERNAME></USERNAME><DATE>2001-01-01T00:00:00</DATE><TOOL>b</TOOL></CHANGE>"},
        {"whitespace is kept verbatim",
         u"<CHANGE><USERNAME> a&#9;b </USERNAME><DATE>2001-01-01T00:00:00</DATE>"
         u"<DATA-VERSION>1&#10;2</DATA-VERSION></CHANGE>",
         "<CHANGE><USERNAME> a\tb </USERNAME><DATE>2001-01-01T00:00:00</DATE>"
         "<DATA-VERSION>1\n2</DATA-VERSION></CHANGE>"},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        IXMLDOMDocument2Ptr source;
        KestCdfChange change;
        EXPECT_TRUE(change.ConvertChangeNode(test::RootOf(row.xml, source)));
        IXMLDOMDocument2Ptr target;
        IXMLDOMNodePtr written = Write(change, target);
        ASSERT_TRUE(written);
        EXPECT_EQ(test::XmlOf(written), row.written);

        KestCdfChange again;
        EXPECT_TRUE(again.ConvertChangeNode(written));
        IXMLDOMDocument2Ptr second;
        EXPECT_EQ(test::XmlOf(Write(again, second)), row.written);
    }
}

TEST(KestCdfChange, FailureInsideOneChildEndsTheEntryQuietly) {
    const struct {
        const char* label;
        const char16_t* xml;
        const char* user;
        const char* tool;
    } rows[] = {
        {"month 13",
         u"<CHANGE><USERNAME>u</USERNAME><DATE>2024-13-01T00:00:00</DATE>"
         u"<TOOL>t</TOOL></CHANGE>",
         "u", ""},
        {"short date", u"<CHANGE><DATE>2024-01-01</DATE><USERNAME>u</USERNAME></CHANGE>", "", ""},
        {"element in a text", u"<CHANGE><TOOL>a<b/></TOOL><USERNAME>u</USERNAME></CHANGE>", "", ""},
        {"element first in the user name",
         u"<CHANGE><USERNAME><b/></USERNAME><TOOL>t</TOOL>"
         u"</CHANGE>",
         "", ""},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        IXMLDOMDocument2Ptr source;
        KestCdfChange change;
        const CComBSTR created = change.GetDate().CreateTimeString();
        EXPECT_FALSE(change.ConvertChangeNode(test::RootOf(row.xml, source)));
        EXPECT_EQ(Utf8(change.GetUserNameW()), row.user);
        EXPECT_EQ(Utf8(change.GetTool()), row.tool);
        EXPECT_TRUE(change.GetTool() == nullptr);  // the failing or skipped field keeps null
        EXPECT_EQ(Utf8(change.GetDate().CreateTimeString()), Utf8(created));
    }
}

TEST(KestCdfChange, DefaultsToTheCurrentTimeAndWritesOnlyWhatIsSet) {
    KestCdfDate before;
    KestCdfChange change;
    KestCdfDate after;
    const std::string date = Utf8(change.GetDate().CreateTimeString());
    EXPECT_LE(Utf8(before.CreateTimeString()), date);
    EXPECT_LE(date, Utf8(after.CreateTimeString()));
    EXPECT_TRUE(change.GetUserNameW().m_string == nullptr);

    change.SetTool(CComBSTR(u""));
    change.SetUserName(Ns(u"a\tb"));
    IXMLDOMDocument2Ptr doc;
    IXMLDOMNodePtr written = Write(change, doc, u"urn:cdf");
    EXPECT_EQ(test::ChildNames(written), "USERNAME DATE TOOL");
    EXPECT_EQ(written->GetnamespaceURI().ToString(), "urn:cdf");
    EXPECT_EQ(ChildNamed(written, u"TOOL")->GetnamespaceURI().ToString(), "urn:cdf");
    EXPECT_EQ(ChildNamed(written, u"USERNAME")->Gettext().ToString(), "a\tb");
}

TEST(KestCdfChange, WriterNeedsAParentAndADocument) {
    KestCdfChange change;
    IXMLDOMDocument2Ptr doc = test::NewDocument();
    test::ExpectComError(
        [&] { change.ConvertChangeToXML(IXMLDOMNodePtr(), doc.GetInterfacePtr(), Ns(u"")); },
        E_POINTER);
    test::ExpectComError([&] { change.ConvertChangeNode(IXMLDOMNodePtr()); }, E_POINTER);
}

}  // namespace
}  // namespace kest
