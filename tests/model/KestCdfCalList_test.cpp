// CAL-LIST: reading in any order, writing in a fixed order, reason codes of its own and of its
// children, and the sharing of file references and items between copies.
#include "model/KestCdfCalList.h"

#include <new>

#include "ModelTestDom.h"

namespace kest {
namespace {

using test::ChildNamed;
using test::ExpectComError;
using test::ExpectDllError;
using test::Ns;
using test::Utf8;

constexpr const char16_t* kSymbolic = u"<SYMBOLIC-FILE crc32=\"0x1A\">app.a2l</SYMBOLIC-FILE>";
constexpr const char16_t* kTarget = u"<TARGET-IMAGE crc32=\"0xff\">app.hex</TARGET-IMAGE>";
constexpr const char* kSymbolicOut = "<SYMBOLIC-FILE crc32=\"0x0000001A\">app.a2l</SYMBOLIC-FILE>";
constexpr const char* kTargetOut = "<TARGET-IMAGE crc32=\"0x000000FF\">app.hex</TARGET-IMAGE>";

std::u16string Item(const char16_t* name) {
    return u"<CAL-ITEM><NAME>" + std::u16string(name) +
           u"</NAME><VALUE sw-units-ref=\"\" format-type=\"NUMERIC\">1</VALUE></CAL-ITEM>";
}
std::string ItemOut(const char* name) {
    return "<CAL-ITEM><NAME>" + std::string(name) +
           "</NAME><VALUE sw-units-ref=\"\" format-type=\"NUMERIC\">1</VALUE></CAL-ITEM>";
}
std::u16string List(const std::u16string& body) { return u"<CAL-LIST>" + body + u"</CAL-LIST>"; }
std::string ListOut(const std::string& body) { return "<CAL-LIST>" + body + "</CAL-LIST>"; }

// Writes `list` under a fresh CAL-DATA element and returns that parent.
IXMLDOMNodePtr Write(KestCdfCalList& list, IXMLDOMDocument2Ptr& doc) {
    doc = test::NewDocument();
    IXMLDOMNodePtr parent = doc->createElement(_bstr_t(u"CAL-DATA"));
    doc->appendChild(parent);
    list.ConvertCalListNodeToXML(parent, doc.GetInterfacePtr(), Ns(u""));
    return parent;
}

TEST(KestCdfCalList, RoundTripsThroughReadWriteRead) {
    const std::string files = std::string(kSymbolicOut) + kTargetOut;
    const struct {
        const char* label;
        std::u16string xml;
        int itemSize;
        std::string written;
    } rows[] = {
        {"document order",
         List(u"<NAME>L</NAME>" + std::u16string(kSymbolic) + kTarget + u"<NOTE>n</NOTE>" +
              Item(u"a") + Item(u"b") + Item(u"c")),
         3,
         ListOut("<NAME>L</NAME>" + files + "<NOTE>n</NOTE>" + ItemOut("a") + ItemOut("b") +
                 ItemOut("c"))},
        {"any order in, fixed order out",
         List(Item(u"a") + u"<NOTE>n</NOTE>\n" + Item(u"b") + kTarget + u"<!--x--><OTHER/>" +
              Item(u"c") + kSymbolic + u"<NAME>L</NAME>"),
         3,
         ListOut("<NAME>L</NAME>" + files + "<NOTE>n</NOTE>" + ItemOut("a") + ItemOut("b") +
                 ItemOut("c"))},
        {"only direct CAL-ITEM children are items",
         List(u"<NAME>L</NAME>" + std::u16string(kSymbolic) + u"<X>" + Item(u"deep") + u"</X>"), 0,
         ListOut("<NAME>L</NAME>" + std::string(kSymbolicOut))},
        {"text rules",
         List(u"<NAME>L<!--c--></NAME><NOTE>t<!--c--></NOTE>" + std::u16string(kSymbolic)), 0,
         ListOut("<NAME>L</NAME>" + std::string(kSymbolicOut) + "<NOTE>c</NOTE>")},
        {"empty note is kept", List(u"<NAME>L</NAME><NOTE/>" + std::u16string(kSymbolic)), 0,
         ListOut("<NAME>L</NAME>" + std::string(kSymbolicOut) + "<NOTE></NOTE>")},
        {"a note naming an item stays a note",
         List(u"<NAME>L</NAME><NOTE>CAL-ITEM</NOTE>" + std::u16string(kSymbolic)), 0,
         ListOut("<NAME>L</NAME>" + std::string(kSymbolicOut) + "<NOTE>CAL-ITEM</NOTE>")},
        {"second symbolic file stands",
         List(u"<NAME>L</NAME><SYMBOLIC-FILE crc32=\"0x1\">old</SYMBOLIC-FILE>" +
              std::u16string(kSymbolic)),
         0, ListOut("<NAME>L</NAME>" + std::string(kSymbolicOut))},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        IXMLDOMDocument2Ptr source;
        KestCdfCalList list;
        ASSERT_TRUE(list.ConvertCalListNode(test::RootOf(row.xml, source)));
        EXPECT_EQ(list.GetCalItemSize(), row.itemSize);
        IXMLDOMDocument2Ptr target;
        IXMLDOMNodePtr written = ChildNamed(Write(list, target), u"CAL-LIST");
        ASSERT_TRUE(written);
        EXPECT_EQ(test::XmlOf(written), row.written);

        KestCdfCalList again;
        again.ConvertCalListNode(written);
        IXMLDOMDocument2Ptr second;
        EXPECT_EQ(test::XmlOf(ChildNamed(Write(again, second), u"CAL-LIST")), row.written);
    }
}

TEST(KestCdfCalList, ItemsFollowTheDocumentOrder) {
    IXMLDOMDocument2Ptr doc;
    KestCdfCalList list;
    list.ConvertCalListNode(
        test::RootOf(List(Item(u"first") + u"<NAME>L</NAME>" + Item(u"second")), doc));
    ASSERT_EQ(list.GetCalItemSize(), 2);
    EXPECT_EQ(Utf8(list.GetCalItems()[0].GetName()), "first");
    EXPECT_EQ(Utf8(list.GetCalItems()[1].GetName()), "second");
    EXPECT_EQ(Utf8(list.GetName()), "L");
    EXPECT_TRUE(list.GetNote() == nullptr);
    ExpectComError([&] { list.GetSymbolicFile(); }, E_POINTER);
    ExpectComError([&] { list.GetTargetImage(); }, E_POINTER);
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
        {"element first in the name", List(u"<NAME><b/></NAME>"), reason::kCalListReadFailed, ""},
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
        IXMLDOMDocument2Ptr doc;
        IXMLDOMNodePtr node = test::RootOf(row.xml, doc);
        KestCdfCalList list;
        ExpectDllError([&] { list.ConvertCalListNode(node); }, row.code, row.text);
    }
    KestCdfCalList list;
    ExpectComError([&] { list.ConvertCalListNode(IXMLDOMNodePtr()); }, E_POINTER);
}

TEST(KestCdfCalList, WriteErrorsLeaveWhatWasAppended) {
    IXMLDOMDocument2Ptr doc;
    IXMLDOMDocument2Ptr source;
    KestCdfCalList nameless;
    nameless.ConvertCalListNode(test::RootOf(List(u"<NAME/>" + std::u16string(kSymbolic)), source));
    EXPECT_TRUE(nameless.GetName().m_string == nullptr);
    ExpectDllError([&] { Write(nameless, doc); }, reason::kCalListNameMissing);
    EXPECT_EQ(test::XmlOf(doc->GetdocumentElement()), "<CAL-DATA><CAL-LIST/></CAL-DATA>");

    KestCdfCalList fileless;
    fileless.SetName(Ns(u"L"));
    ExpectDllError([&] { Write(fileless, doc); }, reason::kSymbolicFileMissing);
    EXPECT_EQ(test::XmlOf(doc->GetdocumentElement()),
              "<CAL-DATA><CAL-LIST><NAME>L</NAME></CAL-LIST></CAL-DATA>");

    // An item's error passes unchanged, with the item's name.
    KestCdfSymbolicFile file;
    fileless.SetSymbolicFile(&file);
    fileless.SetCalItemSize(1);
    fileless.CreateCalItems()[0].SetName(Ns(u"item"));
    ExpectDllError([&] { Write(fileless, doc); }, reason::kCalItemValueMissing, "item");

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
    EXPECT_TRUE(items[1].GetName().m_string == nullptr);
    EXPECT_EQ(items[1].GetAxisSize(), 0);

    // A default list with a name and a symbolic file writes no item.
    KestCdfCalList plain;
    KestCdfSymbolicFile file;
    plain.SetName(Ns(u"L"));
    plain.SetSymbolicFile(&file);
    IXMLDOMDocument2Ptr doc;
    EXPECT_EQ(test::ChildNames(ChildNamed(Write(plain, doc), u"CAL-LIST")), "NAME SYMBOLIC-FILE");
}

TEST(KestCdfCalList, CopiesShareReferencesAndItems) {
    IXMLDOMDocument2Ptr doc;
    KestCdfCalList* list = new KestCdfCalList;
    list->ConvertCalListNode(test::RootOf(
        List(u"<NAME>L</NAME>" + std::u16string(kSymbolic) + kTarget + Item(u"a")), doc));
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
