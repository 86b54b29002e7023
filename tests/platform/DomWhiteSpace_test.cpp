#include <gtest/gtest.h>

#include "platform/XmlDom.h"

using namespace kest;

namespace {

std::string Load(const char* xml, bool preserve) {
    IXMLDOMDocument2Ptr doc;
    EXPECT_EQ(doc.CreateInstance(kProgIdDOMDocument40), S_OK);
    doc->PutvalidateOnParse(VARIANT_FALSE);
    doc->PutpreserveWhiteSpace(preserve ? VARIANT_TRUE : VARIANT_FALSE);
    EXPECT_EQ(doc->loadXML(_bstr_t(xml)), VARIANT_TRUE) << xml;
    return static_cast<const char*>(doc->GetdocumentElement()->Getxml());
}

}  // namespace

TEST(DomWhiteSpace, OnlyBlanksBesideElementsAreDroppedWhenNotPreserved) {
    struct Row {
        const char* xml;
        const char* dropped;  // Getxml of the root without preserveWhiteSpace
    } rows[] = {
        {"<a>\n  <b/>\n  <c>x</c>\n</a>", "<a><b/><c>x</c></a>"},
        {"<a> </a>", "<a> </a>"},                                  // text-only content stays
        {"<a><v> 1 2 </v></a>", "<a><v> 1 2 </v></a>"},            // blanks inside text stay
        {"<a>\n<!--c-->\n</a>", "<a>\n<!--c-->\n</a>"},            // beside a comment: kept
        {"<a>t <b/> u</a>", "<a>t <b/> u</a>"},                    // mixed text is not blank
        {"<a><![CDATA[ ]]><b/></a>", "<a><![CDATA[ ]]><b/></a>"},  // CDATA is never dropped
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.xml);
        EXPECT_EQ(Load(row.xml, false), row.dropped);
        // A new document keeps every character.
        IXMLDOMDocument2Ptr doc;
        ASSERT_EQ(doc.CreateInstance(kProgIdDOMDocument40), S_OK);
        EXPECT_EQ(doc->GetpreserveWhiteSpace(), VARIANT_TRUE);
        EXPECT_EQ(Load(row.xml, true), row.xml);
    }
}
