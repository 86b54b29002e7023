// TARGET-IMAGE: the twin of SYMBOLIC-FILE, lenient where the element lacks its attribute.
#include "model/KestCdfTargetImage.h"

#include "ModelTestDom.h"

namespace kest {
namespace {

using test::ChildNamed;
using test::ExpectDllError;
using test::Ns;
using test::Utf8;

TEST(KestCdfTargetImage, RoundTripsThroughReadWriteRead) {
    const struct {
        const char* label;
        const char16_t* xml;
        const char* fileName;
        int crc;
        const char* written;
    } rows[] = {
        {"plain", u"<TARGET-IMAGE crc32=\"0x0000001A\">image.hex</TARGET-IMAGE>", "image.hex", 26,
         "<TARGET-IMAGE crc32=\"0x0000001A\">image.hex</TARGET-IMAGE>"},
        {"all bits", u"<TARGET-IMAGE crc32=\"0xffffffff\">i</TARGET-IMAGE>", "i", -1,
         "<TARGET-IMAGE crc32=\"0xFFFFFFFF\">i</TARGET-IMAGE>"},
        {"no attribute gives CRC 0", u"<TARGET-IMAGE>bare</TARGET-IMAGE>", "bare", 0,
         "<TARGET-IMAGE crc32=\"0x00000000\">bare</TARGET-IMAGE>"},
        {"first attribute of any name", u"<TARGET-IMAGE a=\"12AB\">n</TARGET-IMAGE>", "n", 12,
         "<TARGET-IMAGE crc32=\"0x0000000C\">n</TARGET-IMAGE>"},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        IXMLDOMDocument2Ptr source;
        KestCdfTargetImage image;
        image.SetCrc(99);
        ASSERT_TRUE(image.ConvertTargetImageFileNode(test::RootOf(row.xml, source)));
        EXPECT_EQ(Utf8(image.GetTargetImage()), row.fileName);
        EXPECT_EQ(image.GetCrc(), row.crc);

        IXMLDOMDocument2Ptr target = test::NewDocument();
        IXMLDOMNodePtr parent = target->createElement(_bstr_t(u"CAL-LIST"));
        target->appendChild(parent);
        ASSERT_TRUE(
            image.ConvertTargetImageFileNodeToXML(parent, target.GetInterfacePtr(), Ns(u"")));
        IXMLDOMNodePtr written = ChildNamed(parent, u"TARGET-IMAGE");
        ASSERT_TRUE(written);
        EXPECT_EQ(test::XmlOf(written), row.written);

        KestCdfTargetImage again;
        again.ConvertTargetImageFileNode(written);
        EXPECT_EQ(Utf8(again.GetTargetImage()), row.fileName);
        EXPECT_EQ(again.GetCrc(), row.crc);
    }
}

TEST(KestCdfTargetImage, AccessorsDifferFromTheSymbolicFileOnlyWhereDocumented) {
    IXMLDOMDocument2Ptr doc;
    IXMLDOMNodePtr element = test::RootOf(u"<TARGET-IMAGE crc32=\"0x10\">t</TARGET-IMAGE>", doc);
    KestCdfTargetImage image;
    // A missing node is no error here...
    EXPECT_EQ(image.GetNodeValue(IXMLDOMNodePtr()), 0);
    EXPECT_EQ(image.GetNodeString(IXMLDOMNodePtr()).ToString(), "Error occured");
    // ...but a node of the wrong kind is, with the target image's own code.
    ExpectDllError([&] { image.GetNodeValue(element); }, reason::kTargetImageNotAttribute);
    ExpectDllError([&] { image.GetNodeString(element); }, reason::kTargetImageNotAttribute);
    IXMLDOMNodePtr attribute = element->Getattributes()->nextNode();
    EXPECT_EQ(image.GetNodeValue(attribute), 16);
    EXPECT_EQ(image.GetNodeString(attribute).ToString(), "0x10");
    EXPECT_EQ(KestCdfTargetImage::atohd("0x1a"), 26);
    char buffer[11] = "0x00000000";
    KestCdfTargetImage::hdtoa(0xABCu, buffer);
    EXPECT_STREQ(buffer, "0x00000ABC");
}

}  // namespace
}  // namespace kest
