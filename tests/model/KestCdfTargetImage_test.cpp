// TARGET-IMAGE: the twin of SYMBOLIC-FILE, lenient where the element lacks its attribute.
#include "model/KestCdfTargetImage.h"

#include "ModelTestDom.h"

namespace kest {
namespace {

using test::ExpectDllError;

TEST(KestCdfTargetImage, RoundTripsThroughReadWriteRead) {
    const struct {
        const char* label;
        const char16_t* xml;
        const char* written;
    } rows[] = {
        {"all bits", u"<TARGET-IMAGE crc32=\"0xffffffff\">i</TARGET-IMAGE>",
         "<TARGET-IMAGE crc32=\"0xFFFFFFFF\">i</TARGET-IMAGE>"},
        {"first attribute of any name", u"<TARGET-IMAGE a=\"12AB\">n</TARGET-IMAGE>",
         "<TARGET-IMAGE crc32=\"0x0000000C\">n</TARGET-IMAGE>"},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.label);
        test::ExpectRoundTrip<KestCdfTargetImage>(
            row.xml, row.written,
            [](auto& image, auto node) { EXPECT_TRUE(image.ConvertTargetImageFileNode(node)); },
            [](auto& image, auto parent, auto& doc) {
                EXPECT_TRUE(image.ConvertTargetImageFileNodeToXML(parent, doc.GetInterfacePtr(),
                                                                  test::Ns(u"")));
            });
    }
}

TEST(KestCdfTargetImage, AccessorsDifferFromTheSymbolicFileOnlyWhereDocumented) {
    IXMLDOMDocument2Ptr doc;
    KestCdfTargetImage image;
    image.SetCrc(99);
    EXPECT_TRUE(
        image.ConvertTargetImageFileNode(test::RootOf(u"<TARGET-IMAGE>b</TARGET-IMAGE>", doc)));
    EXPECT_EQ(image.GetCrc(), 0);  // no attribute reads as CRC 0
    EXPECT_EQ(test::Utf8(image.GetTargetImage()), "b");

    IXMLDOMNodePtr element = test::RootOf(u"<TARGET-IMAGE crc32=\"0x10\">t</TARGET-IMAGE>", doc);
    // A missing node is no error here...
    EXPECT_EQ(image.GetNodeValue(IXMLDOMNodePtr()), 0);
    EXPECT_EQ(image.GetNodeString(IXMLDOMNodePtr()).ToString(), "Error occured");
    // ...but a node of the wrong kind is, with the target image's own code.
    ExpectDllError([&] { image.GetNodeValue(element); }, reason::kTargetImageNotAttribute);
    ExpectDllError([&] { image.GetNodeString(element); }, reason::kTargetImageNotAttribute);
    IXMLDOMNodePtr attribute = element->Getattributes()->nextNode();
    EXPECT_EQ(image.GetNodeValue(attribute), 16);
    EXPECT_EQ(image.GetNodeString(attribute).ToString(), "0x10");
}

}  // namespace
}  // namespace kest
