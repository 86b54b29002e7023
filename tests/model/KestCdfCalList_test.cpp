// CAL-LIST: reading in any order, writing in a fixed order, reason codes of its own and of its
// children, and the sharing of file references and items between copies.
#include "model/KestCdfCalList.h"

#include <new>

#include "ModelTestDom.h"

namespace kest {
namespace {

using test::ExpectComError;
using test::ExpectDllError;
using test::Ns;
using test::Utf8;

const std::u16string kSymbolic = u"<SYMBOLIC-FILE crc32=\"0x1A\">app.a2l</SYMBOLIC-FILE>";
const std::u16string kTarget = u"<TARGET-IMAGE crc32=\"0xff\">app.hex</TARGET-IMAGE>";
const std::string kSymbolicOut = "<SYMBOLIC-FILE crc32=\"0x0000001A\">app.a2l</SYMBOLIC-FILE>";
const std::string kTargetOut = "<TARGET-IMAGE crc32=\"0x000000FF\">app.hex</TARGET-IMAGE>";

std::u16string Item(const char16_t* name) {
    return u"<CAL-ITEM><NAME>" + std::u16string(name) +
           u"</NAME><VALUE sw-units-ref=\"\" format-type=\"NUMERIC\">1</VALUE></CAL-ITEM>";
}
std::string ItemOut(const char16_t* name) { return Utf16ToUtf8(Item(name)); }
std::u16string List(const std::u16string& body) { return u"<CAL-LIST>" + body + u"</CAL-LIST>"; }
std::string ListOut(const std::string& body) { return "<CAL-LIST>" + body + "</CAL-LIST>"; }

auto Read = [](KestCdfCalList& list, IXMLDOMNodePtr node) {
    EXPECT_TRUE(list.ConvertCalListNode(node));
};
auto Write = [](KestCdfCalList& list, IXMLDOMNodePtr parent, IXMLDOMDocument2Ptr& doc) {
    EXPECT_TRUE(list.ConvertCalListNodeToXML(parent, doc.GetInterfacePtr(), Ns(u"")));
};

TEST(KestCdfCalList, RoundTripsThroughReadWriteRead) {
    const struct {
        const char* label;
        std::u16string xml;
        std::string written;
    } rows[] = {
        {"any order in, items in document order, fixed order out",
         List(Item(u"a") + u"<NOTE>n</NOTE>\n" + Item(u"b") + kTarget + u"<!--x--><OTHER/>" +
              Item(u"c") + kSymbolic + u"<NAME>L</NAME>"),
         ListOut("<NAME>L</NAME>" + kSymbolicOut + kTargetOut + "<NOTE>n</NOTE>" + ItemOut(u"a") +
                 ItemOut(u"b") + ItemOut(u"c"))},
        {"only direct CAL-ITEM children are items, second symbolic file stands",
         List(u"<NAME>L</NAME><SYMBOLIC-FILE crc32=\"0x1\">old</SYMBOLIC-FILE>" + kSymbolic +
              u"<X>" + Item(u"deep") + u"</X>"),
         ListOut("<NAME>L</NAME>" + kSymbolicOut)},
        {"first child text for the name, last for the note",
         List(u"<NAME>L<!--c--></NAME><NOTE>CAL-ITEM<!--c--></NOTE>" + kSymbolic),
         ListOut("<NAME>L</NAME>" + kSymbolicOut + "<NOTE>c</NOTE>")},
        {"empty note is kept", List(u"<NAME>L</NAME><NOTE/>" + kSymbolic),
         ListOut("<NAME>L</NAME>" + kSymbolicOut + "<NOTE></NOTE>")},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        test::ExpectRoundTrip<KestCdfCalList>(row.xml, row.written, Read, Write);
    }
}

TEST(KestCdfCalList, ReadErrorsKeepTheirReason) {
    const struct {
        const char* label;
        std::u16string xml;
        int code;
        const char* text;
    } rows[] = {
        {"element nested in the note", List(u"<NAME>L</NAME><NOTE>a<b/></NOTE>"),
         reason::kCalListReadFailed, ""},
        {"element nested in the symbolic file",
         List(u"<SYMBOLIC-FILE crc32=\"1\">a<b/></SYMBOLIC-FILE>"), reason::kCalListReadFailed, ""},
        {"symbolic file without attributes", List(u"<SYMBOLIC-FILE>a</SYMBOLIC-FILE>"),
         reason::kSymbolicFileAttribute, ""},
        {"item failure names the item",
         List(u"<NAME>L</NAME><CAL-ITEM><NAME>bad</NAME><NOTE><b/></NOTE></CAL-ITEM>"),
         reason::kCalItemReadFailed, "bad"},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        test::ExpectReadError<KestCdfCalList>(row.xml, Read, row.code, row.text);
    }
    KestCdfCalList list;
    ExpectComError([&] { list.ConvertCalListNode(IXMLDOMNodePtr()); }, E_POINTER);
    EXPECT_TRUE(list.GetNote() == nullptr);
    ExpectComError([&] { list.GetSymbolicFile(); }, E_POINTER);
    ExpectComError([&] { list.GetTargetImage(); }, E_POINTER);
}

TEST(KestCdfCalList, WriteErrorsLeaveWhatWasAppended) {
    IXMLDOMDocument2Ptr doc, source;
    KestCdfCalList nameless;
    nameless.ConvertCalListNode(test::RootOf(List(u"<NAME/>" + kSymbolic), source));
    ExpectDllError([&] { test::WriteBelow(nameless, doc, Write); }, reason::kCalListNameMissing);
    EXPECT_EQ(test::XmlOf(doc->GetdocumentElement()), "<PARENT><CAL-LIST/></PARENT>");

    KestCdfCalList fileless;
    fileless.SetName(Ns(u"L"));
    ExpectDllError([&] { test::WriteBelow(fileless, doc, Write); }, reason::kSymbolicFileMissing);
    EXPECT_EQ(test::XmlOf(doc->GetdocumentElement()),
              "<PARENT><CAL-LIST><NAME>L</NAME></CAL-LIST></PARENT>");

    // An item's error passes unchanged, with the item's name.
    KestCdfSymbolicFile file;
    fileless.SetSymbolicFile(&file);
    fileless.SetCalItemSize(1);
    fileless.CreateCalItems()[0].SetName(Ns(u"item"));
    ExpectDllError([&] { test::WriteBelow(fileless, doc, Write); }, reason::kCalItemValueMissing,
                   "item");
    ExpectComError(
        [&] { fileless.ConvertCalListNodeToXML(IXMLDOMNodePtr(), doc.GetInterfacePtr(), Ns(u"")); },
        E_POINTER);
}

TEST(KestCdfCalList, CreateCalItemsFollowsTheSize) {
    KestCdfCalList list;
    EXPECT_EQ(list.GetCalItemSize(), -1);
    ExpectDllError([&] { list.CreateCalItems(); }, reason::kCalItemSizeUnset);
    list.SetCalItemSize(-2);
    EXPECT_THROW(list.CreateCalItems(), std::bad_alloc);
    list.SetCalItemSize(2);
    KestCdfCalItem* items = list.CreateCalItems();
    EXPECT_EQ(list.GetCalItems(), items);
    EXPECT_EQ(items[1].GetAxisSize(), 0);

    // A default list with a name and a symbolic file writes no item.
    KestCdfCalList plain;
    KestCdfSymbolicFile file;
    plain.SetName(Ns(u"L"));
    plain.SetSymbolicFile(&file);
    IXMLDOMDocument2Ptr doc;
    EXPECT_EQ(test::ChildNames(test::WriteBelow(plain, doc, Write)), "NAME SYMBOLIC-FILE");
}

TEST(KestCdfCalList, CopiesShareReferencesAndItems) {
    IXMLDOMDocument2Ptr doc;
    KestCdfCalList* list = new KestCdfCalList;
    list->ConvertCalListNode(
        test::RootOf(List(u"<NAME>L</NAME>" + kSymbolic + kTarget + Item(u"a")), doc));
    KestCdfCalList copy = *list;
    KestCdfCalList mover;
    mover.SetCalItems(list->GetCalItems());
    mover.SetCalItemSize(1);
    list->GetCalItems()[0].SetNote(CComBSTR(u"seen by all"));
    delete list;
    EXPECT_EQ(Utf8(copy.GetCalItems()[0].GetNote()), "seen by all");
    EXPECT_EQ(copy.GetSymbolicFile().GetCrc(), 26);
    copy = KestCdfCalList();
    // The item array moved to another list survives the list that read it.
    EXPECT_EQ(Utf8(mover.GetCalItems()[0].GetName()), "a");

    // Host objects are borrowed, never freed.
    KestCdfSymbolicFile hostFile;
    KestCdfTargetImage hostImage;
    KestCdfCalItem hostItems[1];
    {
        KestCdfCalList borrowing;
        borrowing.SetSymbolicFile(&hostFile);
        borrowing.SetTargetImage(&hostImage);
        borrowing.SetCalItems(hostItems);
        KestCdfCalList second = borrowing;
    }
    hostFile.SetCrc(1);
    hostItems[0].SetName(Ns(u"mine"));
    EXPECT_EQ(hostFile.GetCrc(), 1);
}

}  // namespace
}  // namespace kest
