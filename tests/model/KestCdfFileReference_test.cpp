// SYMBOLIC-FILE and TARGET-IMAGE: twins (CRC text, round trips) tested as one typed suite;
// the target image is lenient where the element lacks its attribute.
#include <climits>
#include <cstdio>
#include <type_traits>

#include "ModelTestDom.h"
#include "model/KestCdfSymbolicFile.h"
#include "model/KestCdfTargetImage.h"

namespace kest {
namespace {

using test::ExpectComError;
using test::ExpectDllError;
using test::Ns;

struct SymbolicFileRules {
    using Type = KestCdfSymbolicFile;
    static constexpr const char16_t* kName = u"SYMBOLIC-FILE";
    static bool Read(Type& f, IXMLDOMNodePtr node) { return f.ConvertSymbolicFileNode(node); }
    static bool Write(Type& f, IXMLDOMNodePtr parent, IXMLDOMDocument* doc) {
        return f.ConvertSymbolicFileNodeToXML(parent, doc, Ns(u""));
    }
};

struct TargetImageRules {
    using Type = KestCdfTargetImage;
    static constexpr const char16_t* kName = u"TARGET-IMAGE";
    static bool Read(Type& f, IXMLDOMNodePtr node) { return f.ConvertTargetImageFileNode(node); }
    static bool Write(Type& f, IXMLDOMNodePtr parent, IXMLDOMDocument* doc) {
        return f.ConvertTargetImageFileNodeToXML(parent, doc, Ns(u""));
    }
};

template <class Rules>
class FileReference : public ::testing::Test {};
using FileReferenceTypes = ::testing::Types<SymbolicFileRules, TargetImageRules>;
TYPED_TEST_SUITE(FileReference, FileReferenceTypes);

TYPED_TEST(FileReference, AtohdReadsHexadecimalOnlyWithLowercaseX) {
    // An 'x' anywhere selects hexadecimal, a capital X alone reads as decimal.
    const struct {
        const char* text;
        int expected;
    } rows[] = {{"0xFFFFFFFF", -1},
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
                {"2147483648", INT_MIN},  // a 32-bit pattern: 0x80000000
                {"-2147483649", INT_MAX},
                {nullptr, 0}};
    for (const auto& row : rows) {
        SCOPED_TRACE(row.text ? row.text : "(null)");
        EXPECT_EQ(TypeParam::Type::atohd(row.text), row.expected);
    }
}

TYPED_TEST(FileReference, HdtoaWritesUppercaseDigitsIntoThePreparedBuffer) {
    for (unsigned int value : {0u, 0xDEADBEEFu, 0x00ABC000u}) {
        char buffer[11] = "0x00000000";
        char expected[11];
        snprintf(expected, sizeof expected, "0x%08X", value);
        TypeParam::Type::hdtoa(value, buffer);
        EXPECT_STREQ(buffer, expected);
    }
    // Only the digit positions a value needs are written.
    char marked[11] = "0x????????";
    TypeParam::Type::hdtoa(0x1Au, marked);
    EXPECT_STREQ(marked, "0x??????1A");
}

TYPED_TEST(FileReference, RoundTripsThroughReadWriteRead) {
    const std::u16string name = TypeParam::kName;
    const std::string utf8 = Utf16ToUtf8(name);
    const struct {
        const char16_t* attributes;
        const char16_t* content;
        const char* written;
    } rows[] = {
        {u"crc32=\"0xdeadbeef\"", u"x", "crc32=\"0xDEADBEEF\">x"},
        {u"crc32=\"255\"", u"d", "crc32=\"0x000000FF\">d"},
        {u"a=\"12AB\"", u"n", "crc32=\"0x0000000C\">n"},
        {u"other=\"0x10\" crc32=\"0x20\"", u"a&#9;b", "crc32=\"0x00000010\">a\tb"},
        {u"crc32=\"0x1\"", u"name<!--later-->", "crc32=\"0x00000001\">later"},
        {u"crc32=\"0\"", u"", "crc32=\"0x00000000\">"},
    };
    for (const auto& row : rows) {
        const std::u16string xml =
            u"<" + name + u" " + row.attributes + u">" + row.content + u"</" + name + u">";
        SCOPED_TRACE(Utf16ToUtf8(xml));
        test::ExpectRoundTrip<typename TypeParam::Type>(
            xml, "<" + utf8 + " " + row.written + "</" + utf8 + ">",
            [](auto& f, auto node) { EXPECT_TRUE(TypeParam::Read(f, node)); },
            [](auto& f, auto parent, auto& doc) {
                EXPECT_TRUE(TypeParam::Write(f, parent, doc.GetInterfacePtr()));
            });
    }
}

TYPED_TEST(FileReference, ReaderAndWriterFailures) {
    IXMLDOMDocument2Ptr doc;
    typename TypeParam::Type file;
    EXPECT_EQ(file.GetCrc(), 0);  // a host's new reference starts without a CRC
    const std::u16string name = TypeParam::kName;
    // An element nested in the file name has no text.
    IXMLDOMNodePtr nested =
        test::RootOf(u"<" + name + u" crc32=\"0x1\">a<b/></" + name + u">", doc);
    ExpectComError([&] { TypeParam::Read(file, nested); }, DISP_E_TYPEMISMATCH);
    ExpectComError([&] { TypeParam::Read(file, IXMLDOMNodePtr()); }, E_POINTER);

    doc = test::NewDocument();
    IXMLDOMNodePtr parent = doc->createElement(_bstr_t(u"P"));
    ExpectComError([&] { TypeParam::Write(file, nullptr, doc.GetInterfacePtr()); }, E_POINTER);
    ExpectComError([&] { TypeParam::Write(file, parent, nullptr); }, E_POINTER);
    EXPECT_FALSE(parent->hasChildNodes());

    // A node that is no attribute is refused by both accessors; an attribute is read.
    IXMLDOMNodePtr root = test::RootOf(u"<S crc32=\"0x1a&#9;z\"/>", doc);
    // The published codes hosts receive: 18 for the symbolic file, 17 for the target image.
    const int code = std::is_same<TypeParam, SymbolicFileRules>::value ? 18 : 17;
    ExpectDllError([&] { file.GetNodeValue(root); }, code);
    ExpectDllError([&] { file.GetNodeString(root); }, code);
    EXPECT_EQ(file.GetNodeString(root->Getattributes()->nextNode()).ToString(), "0x1a\tz");
    EXPECT_EQ(file.GetNodeValue(root->Getattributes()->nextNode()), 26);
}

TEST(KestCdfSymbolicFile, AnElementWithoutAttributeFails) {
    IXMLDOMDocument2Ptr doc;
    KestCdfSymbolicFile file;
    file.SetCrc(7);
    ExpectDllError(
        [&] {
            file.ConvertSymbolicFileNode(test::RootOf(u"<SYMBOLIC-FILE>f</SYMBOLIC-FILE>", doc));
        },
        reason::kSymbolicFileAttribute);
    EXPECT_EQ(file.GetCrc(), 7);
    ExpectDllError([&] { file.GetNodeString(IXMLDOMNodePtr()); }, reason::kSymbolicFileAttribute);
}

TEST(KestCdfTargetImage, AnElementWithoutAttributeReadsAsCrcZero) {
    IXMLDOMDocument2Ptr doc;
    KestCdfTargetImage image;
    image.SetCrc(99);
    EXPECT_TRUE(
        image.ConvertTargetImageFileNode(test::RootOf(u"<TARGET-IMAGE>b</TARGET-IMAGE>", doc)));
    EXPECT_EQ(image.GetCrc(), 0);
    EXPECT_EQ(test::Utf8(image.GetTargetImage()), "b");
    // A missing node is no error here.
    EXPECT_EQ(image.GetNodeValue(IXMLDOMNodePtr()), 0);
    EXPECT_EQ(image.GetNodeString(IXMLDOMNodePtr()).ToString(), "Error occured");
}

}  // namespace
}  // namespace kest
