// CHANGE-HISTORY: counting, reading and writing the change entries, and sharing them.
#include "model/KestCdfChangeHistory.h"

#include <new>

#include "ModelTestDom.h"

namespace kest {
namespace {

using test::Ns;
using test::Utf8;

auto Read = [](KestCdfChangeHistory& history, IXMLDOMNodePtr node) {
    EXPECT_TRUE(history.ConvertChangeHistoryNode(node));
};
auto Write = [](KestCdfChangeHistory& history, IXMLDOMNodePtr parent, IXMLDOMDocument2Ptr& doc) {
    EXPECT_TRUE(history.ConvertChangeHistoryToXML(parent, doc.GetInterfacePtr(), Ns(u"")));
};

TEST(KestCdfChangeHistory, RoundTripsThroughReadWriteRead) {
    const struct {
        const char* label;
        const char16_t* xml;
        const char* written;
    } rows[] = {
        {"empty", u"<CHANGE-HISTORY/>", "<CHANGE-HISTORY/>"},
        {"two entries keep their own dates",
         u"<CHANGE-HISTORY>\n <CHANGE><USERNAME>a</USERNAME><DATE>2020-01-02T03:04:05</DATE>"
         u"</CHANGE>\n <CHANGE><USERNAME>b</USERNAME><DATE>2021-06-07T08:09:10</DATE></CHANGE>\n"
         u"</CHANGE-HISTORY>",
         "<CHANGE-HISTORY><CHANGE><USERNAME>a</USERNAME><DATE>2020-01-02T03:04:05</DATE></CHANGE>"
         "<CHANGE><USERNAME>b</USERNAME><DATE>2021-06-07T08:09:10</DATE></CHANGE>"
         "</CHANGE-HISTORY>"},
        {"only CHANGE elements count",
         u"<CHANGE-HISTORY><?CHANGE pi?><!--CHANGE--><OTHER/><p:CHANGE xmlns:p=\"urn:p\"/>"
         u"<X><CHANGE/></X><CHANGE><USERNAME>c</USERNAME><DATE>2020-01-01T00:00:00</DATE>"
         u"</CHANGE></CHANGE-HISTORY>",
         "<CHANGE-HISTORY><CHANGE><USERNAME>c</USERNAME><DATE>2020-01-01T00:00:00</DATE></CHANGE>"
         "</CHANGE-HISTORY>"},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        test::ExpectRoundTrip<KestCdfChangeHistory>(row.xml, row.written, Read, Write);
    }
}

TEST(KestCdfChangeHistory, BadEntryKeepsWhatWasReadAndDoesNotStopTheOthers) {
    IXMLDOMDocument2Ptr doc;
    KestCdfChangeHistory history;
    Read(
        history,
        test::RootOf(
            u"<CHANGE-HISTORY><CHANGE><USERNAME>a</USERNAME><DATE>2020-13-01T00:00:00</DATE>"
            u"<TOOL>t</TOOL></CHANGE><CHANGE><USERNAME>b</USERNAME><DATE>2020-02-02T00:00:00</DATE>"
            u"<TOOL>u</TOOL></CHANGE></CHANGE-HISTORY>",
            doc));
    ASSERT_EQ(history.GetChangeArraySize(), 2);
    const KestCdfChange* changes = history.GetChange();
    EXPECT_EQ(Utf8(changes[0].GetUserNameW()), "a");
    EXPECT_TRUE(changes[0].GetTool() == nullptr);
    EXPECT_EQ(Utf8(changes[1].GetTool()), "u");
    EXPECT_EQ(Utf8(changes[1].GetDate().CreateTimeString()), "2020-02-02T00:00:00");
}

TEST(KestCdfChangeHistory, CreateChangeListFollowsTheCount) {
    KestCdfChangeHistory history;
    history.SetChangeArraySize(-1);
    test::ExpectDllError([&] { history.CreateChangeList(); }, reason::kChangeCountUnset);
    history.SetChangeArraySize(-2);
    EXPECT_THROW(history.CreateChangeList(), std::bad_alloc);
    EXPECT_EQ(history.GetChange(), nullptr);

    // Counted entries without an array are refused, not dereferenced.
    history.SetChangeArraySize(1);
    IXMLDOMDocument2Ptr doc = test::NewDocument();
    IXMLDOMNodePtr parent = doc->createElement(_bstr_t(u"P"));
    test::ExpectComError(
        [&] { history.ConvertChangeHistoryToXML(parent, doc.GetInterfacePtr(), Ns(u"")); },
        E_POINTER);
    test::ExpectComError([&] { history.ConvertChangeHistoryNode(IXMLDOMNodePtr()); }, E_POINTER);

    history.SetChangeArraySize(3);
    KestCdfChange* changes = history.CreateChangeList();
    ASSERT_EQ(history.GetChange(), changes);
    changes[0].SetUserName(Ns(u"first"));
    // The writer emits exactly the count, even when the array is longer.
    history.SetChangeArraySize(2);
    IXMLDOMNodePtr written = test::WriteBelow(history, doc, Write);
    EXPECT_EQ(test::ChildNames(written), "CHANGE CHANGE");
    EXPECT_EQ(test::ChildNamed(written, u"CHANGE")->Gettext().ToString().substr(0, 5), "first");
}

TEST(KestCdfChangeHistory, CopiesShareTheEntriesAndLeaveHostArraysAlone) {
    KestCdfChangeHistory* history = new KestCdfChangeHistory;
    history->SetChangeArraySize(1);
    history->CreateChangeList()[0].SetUserName(Ns(u"before"));
    KestCdfChangeHistory copy(*history);
    KestCdfChangeHistory assigned;
    assigned = *history;
    history->GetChange()[0].SetUserName(Ns(u"after"));
    delete history;  // the copies keep the entries alive
    EXPECT_EQ(Utf8(copy.GetChange()[0].GetUserNameW()), "after");
    EXPECT_EQ(Utf8(assigned.GetChange()[0].GetUserNameW()), "after");

    KestCdfChange hostChanges[2];
    {
        KestCdfChangeHistory borrowed;
        borrowed.SetChange(hostChanges);
        borrowed.SetChangeArraySize(2);
        KestCdfChangeHistory other = borrowed;
    }
    hostChanges[1].SetNote(CComBSTR(u"still mine"));  // freed by the model: ASan reports it
    EXPECT_EQ(Utf8(hostChanges[1].GetNote()), "still mine");
}

}  // namespace
}  // namespace kest
