// SYMBOLIC-FILE: CRC text parsing and formatting, round trips and the reader's refusals.
#include "model/KestCdfSymbolicFile.h"

#include <climits>
#include <cstdio>

#include "ModelTestDom.h"

namespace kest {
namespace {

using test::ExpectComError;
using test::ExpectDllError;
using test::Ns;

TEST(KestCdfSymbolicFile, AtohdReadsHexadecimalOnlyWithLowercaseX) {
    // An 'x' anywhere selects hexadecimal, a capital X alone reads as decimal.
    const struct {
        const char* text;
        int expected;
    } rows[] = {
        {"0xFFFFFFFF", -1},
        {"0x80000000", INT_MIN},
        {"0x1a", 26},
        {"\t\n0x10", 16},
        {"ffx", 255},
        {"0xg", 0},
        {"-0x1", -1},
        {"0x100000000", -1},
        {"255", 255},
        {"12AB", 12},
        {"0X1A", 0},
        {"  -42", -42},
        {"", 0},
        {"2147483648", INT_MIN},  // decimal over the whole unsigned range
        {"4294967295", -1},
        {"4294967296", -1},
        {"-2147483649", INT_MAX},
        {nullptr, 0},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.text ? row.text : "(null)");
        EXPECT_EQ(KestCdfSymbolicFile::atohd(row.text), row.expected);
    }
}

TEST(KestCdfSymbolicFile, HdtoaWritesUppercaseDigitsIntoThePreparedBuffer) {
    for (unsigned int value : {0u, 0xDEADBEEFu, 0x00ABC000u}) {
        char buffer[11] = "0x00000000";
        char expected[11];
        snprintf(expected, sizeof expected, "0x%08X", value);
        KestCdfSymbolicFile::hdtoa(value, buffer);
        EXPECT_STREQ(buffer, expected);
    }
    // Only the digit positions a value needs are written.
    char marked[11] = "0x????????";
    KestCdfSymbolicFile::hdtoa(0x1Au, marked);
    EXPECT_STREQ(marked, "0x??????1A");
}

TEST(KestCdfSymbolicFile, RoundTripsThroughReadWriteRead) {
    const struct {
        const char* label;
        const char16_t* xml;
        const char* written;
    } rows[] = {
        {"lowercase hex", u"<SYMBOLIC-FILE crc32=\"0xdeadbeef\">x</SYMBOLIC-FILE>",
         "<SYMBOLIC-FILE crc32=\"0xDEADBEEF\">x</SYMBOLIC-FILE>"},
        {"decimal", u"<SYMBOLIC-FILE crc32=\"255\">d</SYMBOLIC-FILE>",
         "<SYMBOLIC-FILE crc32=\"0x000000FF\">d</SYMBOLIC-FILE>"},
        {"first attribute of any name",
         u"<SYMBOLIC-FILE other=\"0x10\" crc32=\"0x20\">a&#9;b</SYMBOLIC-FILE>",
         "<SYMBOLIC-FILE crc32=\"0x00000010\">a\tb</SYMBOLIC-FILE>"},
        {"last child text wins", u"<SYMBOLIC-FILE crc32=\"0x1\">name<!--later--></SYMBOLIC-FILE>",
         "<SYMBOLIC-FILE crc32=\"0x00000001\">later</SYMBOLIC-FILE>"},
        {"empty", u"<SYMBOLIC-FILE crc32=\"0\"/>",
         "<SYMBOLIC-FILE crc32=\"0x00000000\"></SYMBOLIC-FILE>"},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        test::ExpectRoundTrip<KestCdfSymbolicFile>(
            row.xml, row.written,
            [](auto& f, auto node) { EXPECT_TRUE(f.ConvertSymbolicFileNode(node)); },
            [](auto& f, auto parent, auto& doc) {
                EXPECT_TRUE(f.ConvertSymbolicFileNodeToXML(parent, doc.GetInterfacePtr(), Ns(u"")));
            });
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
    IXMLDOMNodePtr root = test::RootOf(u"<S crc32=\"0x1a&#9;z\"/>", doc);
    EXPECT_EQ(file.GetNodeString(root->Getattributes()->nextNode()).ToString(), "0x1a\tz");

    // An element nested in the file name has no text.
    IXMLDOMNodePtr nested =
        test::RootOf(u"<SYMBOLIC-FILE crc32=\"0x1\">a<b/></SYMBOLIC-FILE>", doc);
    ExpectComError([&] { file.ConvertSymbolicFileNode(nested); }, DISP_E_TYPEMISMATCH);
    ExpectComError([&] { file.ConvertSymbolicFileNode(IXMLDOMNodePtr()); }, E_POINTER);

    doc = test::NewDocument();
    IXMLDOMNodePtr parent = doc->createElement(_bstr_t(u"P"));
    ExpectComError(
        [&] { file.ConvertSymbolicFileNodeToXML(nullptr, doc.GetInterfacePtr(), Ns(u"")); },
        E_POINTER);
    ExpectComError([&] { file.ConvertSymbolicFileNodeToXML(parent, nullptr, Ns(u"")); }, E_POINTER);
    EXPECT_FALSE(parent->hasChildNodes());
}

}  // namespace
}  // namespace kest
