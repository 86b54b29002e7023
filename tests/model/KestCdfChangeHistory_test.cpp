// CHANGE-HISTORY: counting, reading and writing the change entries, and sharing them.
#include "model/KestCdfChangeHistory.h"

#include <new>

#include "ModelTestDom.h"

namespace kest {
namespace {

using test::ExpectDllError;
using test::Ns;
using test::Utf8;

IXMLDOMNodePtr Write(KestCdfChangeHistory& history, IXMLDOMDocument2Ptr& doc) {
    doc = test::NewDocument();
    IXMLDOMNodePtr parent = doc->createElement(_bstr_t(u"CAL-DATA"));
    doc->appendChild(parent);
    EXPECT_TRUE(history.ConvertChangeHistoryToXML(parent, doc.GetInterfacePtr(), Ns(u"")));
    return test::ChildNamed(parent, u"CHANGE-HISTORY");
}

TEST(KestCdfChangeHistory, RoundTripsThroughReadWriteRead) {
    const struct {
        const char* label;
        const char16_t* xml;
        int count;
        const char* written;
    } rows[] = {
        {"empty", u"<CHANGE-HISTORY/>", 0, "<CHANGE-HISTORY/>"},
        {"two entries keep their own dates",
         u"<CHANGE-HISTORY>\n <CHANGE><USERNAME>a</USERNAME><DATE>2020-01-02T03:04:05</DATE>"
         u"</CHANGE>\n <CHANGE><USERNAME>b</USERNAME><DATE>2021-06-07T08:09:10</DATE></CHANGE>\n"
         u"</CHANGE-HISTORY>",
         2,
         "<CHANGE-HISTORY><CHANGE><USERNAME>a</USERNAME><DATE>2020-01-02T03:04:05</DATE></CHANGE>"
         "<CHANGE><USERNAME>b</USERNAME><DATE>2021-06-07T08:09:10</DATE></CHANGE>"
         "</CHANGE-HISTORY>"},
        {"only CHANGE elements count",
         u"<CHANGE-HISTORY><?CHANGE pi?><!--CHANGE--><OTHER/><p:CHANGE xmlns:p=\"urn:p\"/>"
         u"<X><CHANGE/></X><CHANGE><USERNAME>c</USERNAME><DATE>2020-01-01T00:00:00</DATE>"
         u"</CHANGE></CHANGE-HISTORY>",
         1,
         "<CHANGE-HISTORY><CHANGE><USERNAME>c</USERNAME><DATE>2020-01-01T00:00:00</DATE></CHANGE>"
         "</CHANGE-HISTORY>"},
        {"a bad entry does not stop the others",
         u"<CHANGE-HISTORY><CHANGE><USERNAME>a</USERNAME><DATE>2020-13-01T00:00:00</DATE>"
         u"<TOOL>t</TOOL></CHANGE><CHANGE><USERNAME>b</USERNAME><DATE>2020-02-02T00:00:00</DATE>"
         u"<TOOL>u</TOOL></CHANGE></CHANGE-HISTORY>",
         2, nullptr},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        IXMLDOMDocument2Ptr source;
        KestCdfChangeHistory history;
        EXPECT_TRUE(history.ConvertChangeHistoryNode(test::RootOf(row.xml, source)));
        ASSERT_EQ(history.GetChangeArraySize(), row.count);
        ASSERT_NE(history.GetChange(), nullptr);
        IXMLDOMDocument2Ptr target;
        IXMLDOMNodePtr written = Write(history, target);
        if (row.written) {
            EXPECT_EQ(test::XmlOf(written), row.written);
        }

        KestCdfChangeHistory again;
        again.ConvertChangeHistoryNode(written);
        IXMLDOMDocument2Ptr second;
        EXPECT_EQ(test::XmlOf(Write(again, second)), test::XmlOf(written));
    }
}

TEST(KestCdfChangeHistory, BadEntryKeepsWhatWasReadBeforeTheFailure) {
    IXMLDOMDocument2Ptr doc;
    KestCdfChangeHistory history;
    history.ConvertChangeHistoryNode(test::RootOf(
        u"<CHANGE-HISTORY><CHANGE><USERNAME>a</USERNAME><DATE>2020-13-01T00:00:00</DATE>"
        u"<TOOL>t</TOOL></CHANGE><CHANGE><USERNAME>b</USERNAME><DATE>2020-02-02T00:00:00</DATE>"
        u"<TOOL>u</TOOL></CHANGE></CHANGE-HISTORY>",
        doc));
    const KestCdfChange* changes = history.GetChange();
    EXPECT_EQ(Utf8(changes[0].GetUserNameW()), "a");
    EXPECT_TRUE(changes[0].GetTool() == nullptr);
    EXPECT_EQ(Utf8(changes[1].GetTool()), "u");
    EXPECT_EQ(Utf8(changes[1].GetDate().CreateTimeString()), "2020-02-02T00:00:00");
}

TEST(KestCdfChangeHistory, CreateChangeListFollowsTheCount) {
    KestCdfChangeHistory history;
    history.SetChangeArraySize(-1);
    ExpectDllError([&] { history.CreateChangeList(); }, reason::kChangeCountUnset);
    history.SetChangeArraySize(-2);
    EXPECT_THROW(history.CreateChangeList(), std::bad_alloc);
    EXPECT_EQ(history.GetChange(), nullptr);

    history.SetChangeArraySize(3);
    KestCdfChange* changes = history.CreateChangeList();
    ASSERT_EQ(history.GetChange(), changes);
    changes[0].SetUserName(Ns(u"first"));
    changes[1].SetUserName(Ns(u"second"));
    changes[2].SetUserName(Ns(u"third"));
    // The writer emits exactly the count, even when the array is longer.
    history.SetChangeArraySize(2);
    IXMLDOMDocument2Ptr doc;
    IXMLDOMNodePtr written = Write(history, doc);
    EXPECT_EQ(test::ChildNames(written), "CHANGE CHANGE");
    EXPECT_EQ(test::ChildNamed(written, u"CHANGE")->Gettext().ToString().substr(0, 5), "first");
}

TEST(KestCdfChangeHistory, CopiesShareTheEntries) {
    KestCdfChangeHistory* history = new KestCdfChangeHistory;
    history->SetChangeArraySize(1);
    history->CreateChangeList()[0].SetUserName(Ns(u"before"));
    KestCdfChangeHistory copy(*history);
    KestCdfChangeHistory assigned;
    assigned = *history;
    ASSERT_EQ(copy.GetChange(), history->GetChange());
    history->GetChange()[0].SetUserName(Ns(u"after"));
    EXPECT_EQ(Utf8(copy.GetChange()[0].GetUserNameW()), "after");
    delete history;  // the copies keep the entries alive
    EXPECT_EQ(Utf8(copy.GetChange()[0].GetUserNameW()), "after");
    EXPECT_EQ(Utf8(assigned.GetChange()[0].GetUserNameW()), "after");

    // An array the host owns is never freed by the model.
    KestCdfChange hostChanges[2];
    {
        KestCdfChangeHistory borrowed;
        borrowed.SetChange(hostChanges);
        borrowed.SetChangeArraySize(2);
        KestCdfChangeHistory other = borrowed;
    }
    hostChanges[1].SetNote(CComBSTR(u"still mine"));
    EXPECT_EQ(Utf8(hostChanges[1].GetNote()), "still mine");
}

TEST(KestCdfChangeHistory, WriterNeedsTheEntriesItCounts) {
    KestCdfChangeHistory history;
    history.SetChangeArraySize(1);
    IXMLDOMDocument2Ptr doc = test::NewDocument();
    IXMLDOMNodePtr parent = doc->createElement(_bstr_t(u"P"));
    test::ExpectComError(
        [&] { history.ConvertChangeHistoryToXML(parent, doc.GetInterfacePtr(), Ns(u"")); },
        E_POINTER);
    test::ExpectComError([&] { history.ConvertChangeHistoryNode(IXMLDOMNodePtr()); }, E_POINTER);
}

}  // namespace
}  // namespace kest
