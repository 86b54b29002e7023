// CHANGE: one change entry, read in any order, written in a fixed order.
#include "model/KestCdfChange.h"

#include "ModelTestDom.h"

namespace kest {
namespace {

using test::Ns;
using test::Utf8;

auto Read = [](KestCdfChange& change, IXMLDOMNodePtr node) {
    EXPECT_TRUE(change.ConvertChangeNode(node));
};
auto Write = [](KestCdfChange& change, IXMLDOMNodePtr parent, IXMLDOMDocument2Ptr& doc) {
    EXPECT_TRUE(change.ConvertChangeToXML(parent, doc.GetInterfacePtr(), Ns(u"")));
};

TEST(KestCdfChange, RoundTripsThroughReadWriteRead) {
    const struct {
        const char* label;
        const char16_t* xml;
        const char* written;  // the CHANGE element after its start tag
    } rows[] = {
        {"every field, whitespace verbatim",
         u"<CHANGE><USERNAME> a&#9;b </USERNAME><DATE>2024-05-06T07:08:09</DATE><TOOL>ed</TOOL>"
         u"<NOTE>first</NOTE><DATA-VERSION>1&#10;2</DATA-VERSION></CHANGE>",
         "<USERNAME> a\tb </USERNAME><DATE>2024-05-06T07:08:09</DATE><TOOL>ed</TOOL>"
         "<NOTE>first</NOTE><DATA-VERSION>1\n2</DATA-VERSION></CHANGE>"},
        {"any order in, fixed order out",
         u"<CHANGE><NOTE>n</NOTE><TOOL>t</TOOL><DATE>1999-12-31T23:59:59Z</DATE>"
         u"<USERNAME>u</USERNAME></CHANGE>",
         "<USERNAME>u</USERNAME><DATE>1999-12-31T23:59:59</DATE><TOOL>t</TOOL><NOTE>n</NOTE>"
         "</CHANGE>"},
        {"empty optional elements are dropped",
         u"<CHANGE><USERNAME/><DATE>2001-01-01T00:00:00</DATE><TOOL/><NOTE/><DATA-VERSION/>"
         u"</CHANGE>",
         "<USERNAME></USERNAME><DATE>2001-01-01T00:00:00</DATE></CHANGE>"},
        {"first child node for the user, last for the others",
         u"<CHANGE><USERNAME>who<!--c1--></USERNAME><DATE>2001-01-01T00:00:00</DATE>"
         u"<NOTE>text<!--c2--></NOTE><DATA-VERSION>a<!--v--></DATA-VERSION></CHANGE>",
         "<USERNAME>who</USERNAME><DATE>2001-01-01T00:00:00</DATE><NOTE>c2</NOTE>"
         "<DATA-VERSION>v</DATA-VERSION></CHANGE>"},
        {"repeated elements overwrite, unknown ones are ignored",
         u"<CHANGE><TOOL>a</TOOL><x:TOOL xmlns:x=\"urn:x\">p</x:TOOL><OTHER>o</OTHER>"
         u"<DATE>2001-01-01T00:00:00</DATE><TOOL>b</TOOL><?TOOL pi?></CHANGE>",
         "<USERNAME></USERNAME><DATE>2001-01-01T00:00:00</DATE><TOOL>b</TOOL></CHANGE>"},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        test::ExpectRoundTrip<KestCdfChange>(row.xml, std::string("<CHANGE>") + row.written, Read,
                                             Write);
    }
}

TEST(KestCdfChange, FailureInsideOneChildEndsTheEntryQuietly) {
    const struct {
        const char* label;
        const char16_t* xml;
        const char* user;
    } rows[] = {
        {"month 13",
         u"<CHANGE><USERNAME>u</USERNAME><DATE>2024-13-01T00:00:00</DATE><TOOL>t</TOOL>"
         u"</CHANGE>",
         "u"},
        {"short date", u"<CHANGE><DATE>2024-01-01</DATE><USERNAME>u</USERNAME></CHANGE>", ""},
        {"element first in the user name",
         u"<CHANGE><USERNAME><b/></USERNAME><TOOL>t</TOOL></CHANGE>", ""},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        IXMLDOMDocument2Ptr source;
        KestCdfChange change;
        const CComBSTR created = change.GetDate().CreateTimeString();
        EXPECT_FALSE(change.ConvertChangeNode(test::RootOf(row.xml, source)));
        EXPECT_EQ(Utf8(change.GetUserNameW()), row.user);
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

    change.SetTool(CComBSTR(u""));
    IXMLDOMDocument2Ptr doc;
    IXMLDOMNodePtr written = test::WriteBelow(change, doc, Write);
    EXPECT_EQ(test::ChildNames(written), "USERNAME DATE TOOL");

    test::ExpectComError(
        [&] { change.ConvertChangeToXML(IXMLDOMNodePtr(), doc.GetInterfacePtr(), Ns(u"")); },
        E_POINTER);
    test::ExpectComError([&] { change.ConvertChangeNode(IXMLDOMNodePtr()); }, E_POINTER);
}

}  // namespace
}  // namespace kest
