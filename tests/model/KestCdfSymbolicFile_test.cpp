// SYMBOLIC-FILE: CRC text parsing and formatting, reading, writing and round trips.
#include "model/KestCdfSymbolicFile.h"

#include <climits>
#include <cstring>

#include "ModelTestDom.h"

namespace kest {
namespace {

using test::ChildNamed;
using test::ExpectComError;
using test::ExpectDllError;
using test::Ns;
using test::Utf8;

struct AtohdRow {
    const char* text;
    int expected;
};

TEST(KestCdfSymbolicFile, AtohdReadsHexadecimalOnlyWithLowercaseX) {
    const AtohdRow rows[] = {
        {"0xFFFFFFFF", -1},
        {"0x80000000", INT_MIN},
        {"0x1a", 26},
        {"0x0000001A", 26},
        {" 0x10", 16},
        {"\t\n0x10", 16},
        {"ffx", 255},  // an 'x' anywhere selects hexadecimal
        {"1x", 1},
        {"0x", 0},
        {"0xg", 0},
        {"-0x1", -1},  // negated within 32 bits, as strtoul does
        {"+0x7F", 127},
        {"0x100000000", -1},  // beyond 32 bits
        {"0x123456789ABCDEF0123", -1},
        {"255", 255},
        {"12AB", 12},
        {"ABCD", 0},
        {"0X1A", 0},  // capital X alone reads as decimal
        {"  -42", -42},
        {"+7", 7},
        {"", 0},
        {"2147483647", INT_MAX},
        {"2147483648", INT_MAX},  // decimal saturates at the ends of the int range
        {"-2147483648", INT_MIN},
        {"-2147483649", INT_MIN},
        {"99999999999999999999999", INT_MAX},
        {nullptr, 0},
    };
    for (const AtohdRow& row : rows) {
        SCOPED_TRACE(row.text ? row.text : "(null)");
        EXPECT_EQ(KestCdfSymbolicFile::atohd(row.text), row.expected);
    }
}

TEST(KestCdfSymbolicFile, HdtoaWritesUppercaseDigitsIntoThePreparedBuffer) {
    const struct {
        unsigned int value;
        const char* expected;
    } rows[] = {
        {0u, "0x00000000"},          {26u, "0x0000001A"},         {0xFFFFFFFFu, "0xFFFFFFFF"},
        {0x80000000u, "0x80000000"}, {0xDEADBEEFu, "0xDEADBEEF"}, {0x00ABC000u, "0x00ABC000"},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.expected);
        char buffer[11] = "0x00000000";
        KestCdfSymbolicFile::hdtoa(row.value, buffer);
        EXPECT_STREQ(buffer, row.expected);
    }
    // Only the digit positions a value needs are written.
    char marked[11] = "0x????????";
    KestCdfSymbolicFile::hdtoa(0x1Au, marked);
    EXPECT_STREQ(marked, "0x??????1A");
}

struct RoundTripRow {
    const char* label;
    const char16_t* xml;
    const char* fileName;
    int crc;
    const char* written;
};

TEST(KestCdfSymbolicFile, RoundTripsThroughReadWriteRead) {
    const RoundTripRow rows[] = {
        {"plain", u"<SYMBOLIC-FILE crc32=\"0x0000001A\">app.a2l</SYMBOLIC-FILE>", "app.a2l", 26,
         "<SYMBOLIC-FILE crc32=\"0x0000001A\">app.a2l</SYMBOLIC-FILE>"},
        {"lowercase hex", u"<SYMBOLIC-FILE crc32=\"0xdeadbeef\">x</SYMBOLIC-FILE>", "x",
         static_cast<int>(0xDEADBEEFu), "<SYMBOLIC-FILE crc32=\"0xDEADBEEF\">x</SYMBOLIC-FILE>"},
        {"all bits", u"<SYMBOLIC-FILE crc32=\"0xFFFFFFFF\">f</SYMBOLIC-FILE>", "f", -1,
         "<SYMBOLIC-FILE crc32=\"0xFFFFFFFF\">f</SYMBOLIC-FILE>"},
        {"smallest int", u"<SYMBOLIC-FILE crc32=\"0x80000000\">f</SYMBOLIC-FILE>", "f", INT_MIN,
         "<SYMBOLIC-FILE crc32=\"0x80000000\">f</SYMBOLIC-FILE>"},
        {"decimal", u"<SYMBOLIC-FILE crc32=\"255\">d</SYMBOLIC-FILE>", "d", 255,
         "<SYMBOLIC-FILE crc32=\"0x000000FF\">d</SYMBOLIC-FILE>"},
        {"first attribute of any name",
         u"<SYMBOLIC-FILE other=\"0x10\" crc32=\"0x20\">n</SYMBOLIC-FILE>", "n", 16,
         "<SYMBOLIC-FILE crc32=\"0x00000010\">n</SYMBOLIC-FILE>"},
        {"tab kept", u"<SYMBOLIC-FILE crc32=\"0x1\">a&#9;b</SYMBOLIC-FILE>", "a\tb", 1,
         "<SYMBOLIC-FILE crc32=\"0x00000001\">a\tb</SYMBOLIC-FILE>"},
        {"comment wins", u"<SYMBOLIC-FILE crc32=\"0x1\">name<!--later--></SYMBOLIC-FILE>", "later",
         1, "<SYMBOLIC-FILE crc32=\"0x00000001\">later</SYMBOLIC-FILE>"},
        {"empty", u"<SYMBOLIC-FILE crc32=\"0\"/>", "", 0,
         "<SYMBOLIC-FILE crc32=\"0x00000000\"></SYMBOLIC-FILE>"},
    };
    for (const RoundTripRow& row : rows) {
        SCOPED_TRACE(row.label);
        IXMLDOMDocument2Ptr source;
        KestCdfSymbolicFile file;
        ASSERT_TRUE(file.ConvertSymbolicFileNode(test::RootOf(row.xml, source)));
        EXPECT_EQ(Utf8(file.GetSymbolicFile()), row.fileName);
        EXPECT_EQ(file.GetCrc(), row.crc);

        IXMLDOMDocument2Ptr target = test::NewDocument();
        IXMLDOMNodePtr parent = target->createElement(_bstr_t(u"CAL-LIST"));
        target->appendChild(parent);
        ASSERT_TRUE(file.ConvertSymbolicFileNodeToXML(parent, target.GetInterfacePtr(), Ns(u"")));
        IXMLDOMNodePtr written = ChildNamed(parent, u"SYMBOLIC-FILE");
        ASSERT_TRUE(written);
        EXPECT_EQ(test::XmlOf(written), row.written);

        KestCdfSymbolicFile again;
        again.ConvertSymbolicFileNode(written);
        EXPECT_EQ(Utf8(again.GetSymbolicFile()), row.fileName);
        EXPECT_EQ(again.GetCrc(), row.crc);
    }
}

TEST(KestCdfSymbolicFile, MalformedInputFailsWithItsReason) {
    IXMLDOMDocument2Ptr doc;
    IXMLDOMNodePtr bare = test::RootOf(u"<SYMBOLIC-FILE>f</SYMBOLIC-FILE>", doc);
    KestCdfSymbolicFile file;
    file.SetCrc(7);
    ExpectDllError([&] { file.ConvertSymbolicFileNode(bare); }, reason::kSymbolicFileAttribute);
    EXPECT_EQ(file.GetCrc(), 7);

    // A node that is no attribute, or none at all, is refused by both accessors.
    ExpectDllError([&] { file.GetNodeValue(bare); }, reason::kSymbolicFileAttribute);
    ExpectDllError([&] { file.GetNodeString(bare); }, reason::kSymbolicFileAttribute);
    ExpectDllError([&] { file.GetNodeString(IXMLDOMNodePtr()); }, reason::kSymbolicFileAttribute);

    // An element nested in the file name has no text.
    IXMLDOMNodePtr nested =
        test::RootOf(u"<SYMBOLIC-FILE crc32=\"0x1\">a<b/></SYMBOLIC-FILE>", doc);
    ExpectComError([&] { file.ConvertSymbolicFileNode(nested); }, DISP_E_TYPEMISMATCH);
    ExpectComError([&] { file.ConvertSymbolicFileNode(IXMLDOMNodePtr()); }, E_POINTER);
}

TEST(KestCdfSymbolicFile, GetNodeStringGivesTheAttributeText) {
    IXMLDOMDocument2Ptr doc;
    IXMLDOMNodePtr root = test::RootOf(u"<S crc32=\"0x1a&#9;z\"/>", doc);
    KestCdfSymbolicFile file;
    EXPECT_EQ(file.GetNodeString(root->Getattributes()->nextNode()).ToString(), "0x1a\tz");
}

TEST(KestCdfSymbolicFile, WriterNeedsAParentAndADocument) {
    IXMLDOMDocument2Ptr doc = test::NewDocument();
    KestCdfSymbolicFile file;
    ExpectComError(
        [&] {
            file.ConvertSymbolicFileNodeToXML(IXMLDOMNodePtr(), doc.GetInterfacePtr(), Ns(u""));
        },
        E_POINTER);
    IXMLDOMNodePtr parent = doc->createElement(_bstr_t(u"P"));
    ExpectComError([&] { file.ConvertSymbolicFileNodeToXML(parent, nullptr, Ns(u"")); }, E_POINTER);
    EXPECT_FALSE(parent->hasChildNodes());
}

}  // namespace
}  // namespace kest
