#include <gtest/gtest.h>

#include <chrono>
#include <cstring>
#include <string>

#include "DomTestUtil.h"
#include "platform/XmlDom.h"

using namespace kest;
using namespace kest::testing;

namespace {

std::string Nested(long depth) {
    std::string xml;
    xml.reserve(static_cast<std::size_t>(depth) * 7);
    for (long i = 0; i < depth; ++i) xml += "<a>";
    for (long i = 0; i < depth; ++i) xml += "</a>";
    return xml;
}

const char* const kBillionLaughs =
    "<?xml version=\"1.0\"?>\n<!DOCTYPE lolz [\n <!ENTITY lol \"lol\">\n"
    " <!ENTITY lol1 \"&lol;&lol;&lol;&lol;&lol;&lol;&lol;&lol;&lol;&lol;\">\n"
    " <!ENTITY lol2 \"&lol1;&lol1;&lol1;&lol1;&lol1;&lol1;&lol1;&lol1;&lol1;&lol1;\">\n"
    " <!ENTITY lol3 \"&lol2;&lol2;&lol2;&lol2;&lol2;&lol2;&lol2;&lol2;&lol2;&lol2;\">\n"
    " <!ENTITY lol4 \"&lol3;&lol3;&lol3;&lol3;&lol3;&lol3;&lol3;&lol3;&lol3;&lol3;\">\n"
    " <!ENTITY lol5 \"&lol4;&lol4;&lol4;&lol4;&lol4;&lol4;&lol4;&lol4;&lol4;&lol4;\">\n"
    " <!ENTITY lol6 \"&lol5;&lol5;&lol5;&lol5;&lol5;&lol5;&lol5;&lol5;&lol5;&lol5;\">\n"
    " <!ENTITY lol7 \"&lol6;&lol6;&lol6;&lol6;&lol6;&lol6;&lol6;&lol6;&lol6;&lol6;\">\n"
    " <!ENTITY lol8 \"&lol7;&lol7;&lol7;&lol7;&lol7;&lol7;&lol7;&lol7;&lol7;&lol7;\">\n"
    " <!ENTITY lol9 \"&lol8;&lol8;&lol8;&lol8;&lol8;&lol8;&lol8;&lol8;&lol8;&lol8;\">\n"
    "]>\n<lolz>&lol9;</lolz>";

}  // namespace

TEST(DomLoad, BadInputFailsWithReasonAndLocationAndLeavesDocumentEmpty) {
    struct Row {
        const char* label;
        std::string bytes;
        const char* reason;  // expected start of the reason
        long line;
    };
    const Row rows[] = {
        {"mismatched tag", "<a>\n  <b></a>", "mismatched tag at line 2, column 8", 2},
        {"truncated", "<a><b>text", "no element found at line 1", 1},
        {"empty", "", "no element found", 1},
        {"blank only", "  \n ", "no element found", 2},
        {"invalid UTF-8", "<a>\xff\xfe</a>", "not well-formed (invalid token) at line 1, column 4", 1},
        {"NUL byte", std::string("<a>x\0y</a>", 10), "not well-formed (invalid token)", 1},
        {"undefined entity", "<a>&nope;</a>", "undefined entity at line 1", 1},
        {"two roots", "<a/><b/>", "junk after document element at line 1, column 5", 1},
        {"unknown encoding", "<?xml version=\"1.0\" encoding=\"x-nothing\"?><a/>",
         "unknown encoding", 1},
        {"billion laughs", kBillionLaughs, "limit on input amplification factor", 14},
        {"bad attribute", "<a b=c/>", "not well-formed (invalid token) at line 1, column 6", 1},
        {"duplicate attribute", "<a b='1' b='2'/>", "duplicate attribute", 1},
        {"BOM contradicts declaration", "\xef\xbb\xbf<?xml version='1.0' encoding='ISO-8859-1'?><a/>",
         "encoding \"ISO-8859-1\" declared after a UTF-8 byte order mark at line 1", 1},
        {"ordinal indicator in a name (ISO-8859-1)",
         "<?xml version='1.0' encoding='ISO-8859-1'?>\n<a\xaa/>",
         "not well-formed (invalid name character) at line 2", 2},
        {"micro sign in a name (UTF-16)", std::string("\xff\xfe<\0a\0\xb5\0/\0>\0", 12),
         "not well-formed (invalid name character) at line 1", 1},
        {"UTF-16 BOM on UTF-8 bytes", "\xff\xfe<a/>", "not well-formed", 1},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        IXMLDOMDocument2Ptr doc = Parsed("<ok/>");
        ASSERT_EQ(doc->loadBuffer(row.bytes.data(), row.bytes.size()), VARIANT_FALSE);
        IXMLDOMParseErrorPtr error = doc->GetparseError();
        EXPECT_EQ(error->GeterrorCode(), XML_E_PARSEFAILED);
        EXPECT_EQ(error->Getreason().ToString().rfind(row.reason, 0), 0u)
            << error->Getreason().ToString();
        EXPECT_EQ(error->Getline(), row.line);
        EXPECT_GT(error->Getlinepos(), 0);
        EXPECT_FALSE(doc->GetfirstChild());
        EXPECT_FALSE(doc->GetdocumentElement());
    }
}

TEST(DomLoad, ParseErrorGivesPositionSourceLineAndFileName) {
    TempDir dir;
    std::string path = dir.File("broken.xml");
    WriteFile(path, "<root>\n  <item>1</item>\n  <item>2</oops>\n</root>\n");
    IXMLDOMDocument2Ptr doc = NewDocument();
    ASSERT_EQ(doc->load(_variant_t(path)), VARIANT_FALSE);
    IXMLDOMParseErrorPtr error = doc->GetparseError();
    EXPECT_EQ(error->Getreason().ToString(),
              "mismatched tag at line 3, column 12 in " + path);
    EXPECT_EQ(error->Getline(), 3);
    EXPECT_EQ(error->Getlinepos(), 12);
    EXPECT_EQ(error->Getfilepos(), 35);
    EXPECT_EQ(error->GetsrcText().ToString(), "  <item>2</oops>");
    EXPECT_EQ(error->Geturl().ToString(), path);

    WriteFile(path, "<root/>");
    ASSERT_EQ(doc->load(_variant_t(path)), VARIANT_TRUE);
    EXPECT_EQ(doc->GetparseError()->GeterrorCode(), 0);
    EXPECT_EQ(doc->GetparseError()->Getreason().length(), 0u);
}

TEST(DomLoad, SourcesThatCannotBeReadNameThePathAndTheCause) {
    TempDir dir;
    std::string missing = dir.File("missing.xml");
    std::string empty = dir.File("empty.xml");
    WriteFile(empty, "");
    struct Row {
        const char* label;
        std::string path;
        std::string reason;
    };
    const Row rows[] = {
        {"missing file", missing, "cannot open " + missing + ": No such file or directory"},
        {"directory", dir.Path(), "cannot load " + dir.Path() + ": Is a directory"},
        {"empty file", empty, "no element found at line 1, column 1 in " + empty},
        {"missing folder", dir.File("none/x.xml"),
         "cannot open " + dir.File("none/x.xml") + ": No such file or directory"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        IXMLDOMDocument2Ptr doc = NewDocument();
        EXPECT_EQ(doc->load(_variant_t(row.path)), VARIANT_FALSE);
        EXPECT_NE(doc->GetparseError()->GeterrorCode(), 0);
        EXPECT_EQ(ReasonOf(doc), row.reason);
    }
}

TEST(DomLoad, UnreadableFileIsRefusedWithPermissionReason) {
    TempDir dir;
    std::string path = dir.File("locked.xml");
    WriteFile(path, "<a/>");
    ASSERT_EQ(::chmod(path.c_str(), 0), 0);
    if (::access(path.c_str(), R_OK) == 0)
        GTEST_SKIP() << "running with privileges that read any file (root): cannot test";
    IXMLDOMDocument2Ptr doc = NewDocument();
    EXPECT_EQ(doc->load(_variant_t(path)), VARIANT_FALSE);
    EXPECT_EQ(doc->GetparseError()->GeterrorCode(), E_ACCESSDENIED);
    EXPECT_EQ(ReasonOf(doc), "cannot open " + path + ": Permission denied");
}

TEST(DomLoad, UrlsNeedServerHttpRequest) {
    IXMLDOMDocument2Ptr doc = NewDocument();
    EXPECT_EQ(doc->load(_variant_t("http://127.0.0.1:9/x.xml")), VARIANT_FALSE);
    EXPECT_NE(ReasonOf(doc).find("ServerHTTPRequest"), std::string::npos) << ReasonOf(doc);
    EXPECT_NE(ReasonOf(doc).find("http://127.0.0.1:9/x.xml"), std::string::npos);
    doc->setProperty(u"ServerHTTPRequest", _variant_t(true));
    EXPECT_EQ(doc->load(_variant_t("http://127.0.0.1:9/x.xml")), VARIANT_FALSE);
    EXPECT_EQ(ReasonOf(doc).find("ServerHTTPRequest"), std::string::npos) << ReasonOf(doc);
}

TEST(DomLoad, ExternalEntitiesAndDtdsAreNeverRead) {
    TempDir dir;
    std::string secret = dir.File("secret.txt");
    WriteFile(secret, "TOPSECRET");
    WriteFile(dir.File("ext.dtd"), "<!ENTITY leak SYSTEM \"file://" + secret + "\">");
    const std::string docs[] = {
        "<!DOCTYPE a [<!ENTITY e SYSTEM \"file://" + secret + "\">]><a>&e;</a>",
        "<!DOCTYPE a [<!ENTITY e SYSTEM \"" + secret + "\">]><a b='x'>&e;</a>",
        "<!DOCTYPE a SYSTEM \"" + dir.File("ext.dtd") + "\"><a>&leak;</a>",
        "<!DOCTYPE a [<!ENTITY % p SYSTEM \"" + dir.File("ext.dtd") + "\"> %p;]><a>&leak;</a>",
    };
    for (const std::string& xml : docs) {
        SCOPED_TRACE(xml);
        IXMLDOMDocument2Ptr doc = NewDocument();
        doc->loadBuffer(xml.data(), xml.size());
        EXPECT_EQ(Utf8Of(doc->Getxml()).find("TOPSECRET"), std::string::npos);
    }
}

TEST(DomLoad, DeepNestingFailsQuicklyWithItsOwnReason) {
    std::string xml = Nested(1000000);
    IXMLDOMDocument2Ptr doc = NewDocument();
    auto start = std::chrono::steady_clock::now();
    ASSERT_EQ(doc->loadBuffer(xml.data(), xml.size()), VARIANT_FALSE);
    auto seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
    EXPECT_EQ(ReasonOf(doc), "element nesting deeper than 10000 at line 1, column 30001");
    EXPECT_LT(seconds, 5.0);

    doc->setProperty(u"MaxElementDepth", _variant_t(5L));
    std::string five = Nested(5), six = Nested(6);
    EXPECT_EQ(doc->loadBuffer(five.data(), five.size()), VARIANT_TRUE);
    EXPECT_EQ(doc->loadBuffer(six.data(), six.size()), VARIANT_FALSE);
    EXPECT_EQ(ReasonOf(doc), "element nesting deeper than 5 at line 1, column 16");
}

TEST(DomLoad, MillionDeepDocumentLoadsSavesAndFreesWithRaisedLimit) {
    const long depth = 1000000;
    std::string xml = Nested(depth);
    TempDir dir;
    {
        IXMLDOMDocument2Ptr doc = NewDocument();
        doc->setProperty(u"MaxElementDepth", _variant_t(2000000L));
        ASSERT_EQ(doc->loadBuffer(xml.data(), xml.size()), VARIANT_TRUE) << ReasonOf(doc);
        EXPECT_EQ(Utf8Of(doc->GetdocumentElement()->Gettext()), "");
        doc->save(_variant_t(dir.File("deep.xml")));
    }
    std::string saved = ReadFile(dir.File("deep.xml"));
    // Empty innermost element collapses to <a/>.
    EXPECT_EQ(saved.size(), static_cast<std::size_t>(depth - 1) * 7 + 4 + 1);
}

TEST(DomLoad, HugeAttributeValuesAndTextSurvive) {
    std::string big(3 * 1024 * 1024, 'x');
    big[12345] = '\t';
    std::string xml = "<a v=\"" + big + "\">" + big + "</a>";
    IXMLDOMDocument2Ptr doc = Parsed(xml);
    IXMLDOMElementPtr root = doc->GetdocumentElement();
    std::string expectedAttribute = big;
    expectedAttribute[12345] = ' ';  // attribute value normalisation
    EXPECT_EQ(Utf8Of(_bstr_t(root->getAttribute(u"v"))), expectedAttribute);
    EXPECT_EQ(Utf8Of(root->Gettext()), big);
}

TEST(DomLoad, EncodingsAreDetectedFromBomAndDeclaration) {
    const std::u16string expected = u"\u00e4\u00f6\u00fc\u20ac";
    auto utf16 = [](const std::u16string& text, bool bigEndian) {
        std::string bytes = bigEndian ? "\xfe\xff" : "\xff\xfe";
        for (char16_t c : text) {
            char hi = static_cast<char>(c >> 8), lo = static_cast<char>(c & 0xff);
            bytes += bigEndian ? hi : lo;
            bytes += bigEndian ? lo : hi;
        }
        return bytes;
    };
    const std::u16string doc16 = u"<a b=\"\u00e4\u00f6\u00fc\u20ac\">\u00e4\u00f6\u00fc\u20ac</a>";
    struct Row {
        const char* label;
        std::string bytes;
        std::u16string text;
    };
    const Row rows[] = {
        {"UTF-8", "<a b=\"\xc3\xa4\xc3\xb6\xc3\xbc\xe2\x82\xac\">\xc3\xa4\xc3\xb6\xc3\xbc\xe2\x82\xac</a>",
         expected},
        {"UTF-8 with BOM",
         "\xef\xbb\xbf<a b=\"\xc3\xa4\xc3\xb6\xc3\xbc\xe2\x82\xac\">\xc3\xa4\xc3\xb6\xc3\xbc\xe2\x82\xac</a>",
         expected},
        {"UTF-16LE with BOM", utf16(doc16, false), expected},
        {"UTF-16BE with BOM", utf16(doc16, true), expected},
        {"ISO-8859-1 declared",
         "<?xml version=\"1.0\" encoding=\"ISO-8859-1\"?><a b=\"\xe4\xf6\xfc\">\xe4\xf6\xfc</a>",
         u"\u00e4\u00f6\u00fc"},
        {"US-ASCII declared", "<?xml version=\"1.0\" encoding=\"US-ASCII\"?><a b=\"&#228;\">&#xe4;</a>",
         u"\u00e4"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        IXMLDOMDocument2Ptr doc = Parsed(row.bytes);
        IXMLDOMElementPtr root = doc->GetdocumentElement();
        ASSERT_TRUE(root);
        EXPECT_EQ(_bstr_t(root->getAttribute(u"b")).ToU16String(), row.text);
        EXPECT_EQ(root->Gettext().ToU16String(), row.text);
    }
}

TEST(DomLoad, LoadXmlTakesTheStringAsDecodedText) {
    IXMLDOMDocument2Ptr doc = NewDocument();
    ASSERT_EQ(doc->loadXML(u"<?xml version=\"1.0\" encoding=\"ISO-8859-1\"?><a>\u00e9\u20ac</a>"),
              VARIANT_TRUE)
        << ReasonOf(doc);
    EXPECT_EQ(doc->GetdocumentElement()->Gettext().ToU16String(), u"\u00e9\u20ac");
    EXPECT_EQ(doc->loadXML(u"<a>"), VARIANT_FALSE);
    EXPECT_EQ(doc->GetparseError()->GeterrorCode(), XML_E_PARSEFAILED);
}

TEST(DomLoad, ContentBecomesNodesAsWritten) {
    IXMLDOMDocument2Ptr doc = Parsed(
        "<?xml version=\"1.0\" encoding=\"UTF-8\" standalone=\"yes\"?>\n"
        "<!-- before --><?pi data?>\n"
        "<r xmlns=\"urn:x\" xmlns:p=\"urn:p\" p:a=\"1\" b=\"2\">x&amp;y&#65;<![CDATA[<z>]]>w<!--c-->"
        "\n  <p:e/>\n</r>");
    struct Expected {
        DOMNodeType type;
        const char* name;
        const char* value;  // null: VT_NULL
    };
    const Expected top[] = {
        {NODE_PROCESSING_INSTRUCTION, "xml", "version=\"1.0\" encoding=\"UTF-8\" standalone=\"yes\""},
        {NODE_COMMENT, "#comment", " before "},
        {NODE_PROCESSING_INSTRUCTION, "pi", "data"},
        {NODE_ELEMENT, "r", nullptr},
    };
    const Expected inner[] = {
        {NODE_TEXT, "#text", "x&yA"},          {NODE_CDATA_SECTION, "#cdata-section", "<z>"},
        {NODE_TEXT, "#text", "w"},             {NODE_COMMENT, "#comment", "c"},
        {NODE_TEXT, "#text", "\n  "},          {NODE_ELEMENT, "p:e", nullptr},
        {NODE_TEXT, "#text", "\n"},
    };
    auto check = [](const IXMLDOMNodeListPtr& list, const Expected* rows, std::size_t count) {
        ASSERT_EQ(list->Getlength(), static_cast<long>(count));
        for (std::size_t i = 0; i < count; ++i) {
            SCOPED_TRACE(rows[i].name);
            IXMLDOMNodePtr node = list->nextNode();
            ASSERT_TRUE(node);
            EXPECT_EQ(node->GetnodeType(), rows[i].type);
            EXPECT_EQ(Utf8Of(node->GetnodeName()), rows[i].name);
            _variant_t value = node->GetnodeValue();
            if (rows[i].value) {
                ASSERT_EQ(value.vt, VT_BSTR);
                EXPECT_EQ(Utf8Of(_bstr_t(value)), rows[i].value);
            } else {
                EXPECT_EQ(value.vt, VT_NULL);
            }
        }
        EXPECT_FALSE(list->nextNode());
    };
    check(doc->GetchildNodes(), top, 4);
    IXMLDOMElementPtr root = doc->GetdocumentElement();
    check(root->GetchildNodes(), inner, 7);

    const char* attributes[][2] = {{"xmlns", "urn:x"}, {"xmlns:p", "urn:p"}, {"p:a", "1"}, {"b", "2"}};
    IXMLDOMNamedNodeMapPtr map = root->Getattributes();
    ASSERT_EQ(map->Getlength(), 4);
    for (auto& a : attributes) {
        IXMLDOMNodePtr node = map->nextNode();
        ASSERT_TRUE(node);
        EXPECT_EQ(Utf8Of(node->GetnodeName()), a[0]);
        EXPECT_EQ(Utf8Of(_bstr_t(node->GetnodeValue())), a[1]);
        EXPECT_EQ(Utf8Of(node->GetnamespaceURI()), "");
    }
    IXMLDOMNamedNodeMapPtr declaration = doc->GetfirstChild()->Getattributes();
    ASSERT_TRUE(declaration);
    EXPECT_EQ(Utf8Of(_bstr_t(declaration->getNamedItem(u"standalone")->GetnodeValue())), "yes");
}

TEST(DomLoad, ReloadKeepsEarlierNodesUsable) {
    IXMLDOMDocument2Ptr doc = Parsed("<old><child>text</child></old>");
    IXMLDOMNodePtr oldChild = doc->GetdocumentElement()->GetfirstChild();
    IXMLDOMNodeListPtr oldList = doc->GetdocumentElement()->GetchildNodes();
    std::string next = "<new/>";
    ASSERT_EQ(doc->loadBuffer(next.data(), next.size()), VARIANT_TRUE);
    EXPECT_EQ(Utf8Of(oldChild->GetnodeName()), "child");
    EXPECT_EQ(Utf8Of(oldChild->Gettext()), "text");
    EXPECT_EQ(oldList->Getlength(), 1);
    EXPECT_EQ(Utf8Of(doc->GetdocumentElement()->GetnodeName()), "new");
    // A failed load empties the document but leaves held nodes readable too.
    ASSERT_EQ(doc->loadBuffer("<", 1), VARIANT_FALSE);
    EXPECT_FALSE(doc->GetdocumentElement());
    EXPECT_EQ(Utf8Of(oldChild->Gettext()), "text");
}

TEST(DomLoad, ValidateOnParseChecksTheSchemasTheRootNames) {
    const std::string schemas = std::string(KEST_TEST_DATA_DIR) + "/dom/";
    auto doc = [&](const char* prefix, const char* value) {
        return "<r xmlns=\"urn:kest:dom-test\" xmlns:" + std::string(prefix) +
               "=\"http://www.w3.org/2001/XMLSchema-instance\" " + prefix +
               ":schemaLocation=\"urn:kest:dom-test " + schemas + "small.xsd\"><n>" + value +
               "</n></r>";
    };
    struct Row {
        const char* label;
        std::string xml;
        bool validate;
        bool loads;
        const char* reason = "";  // expected start of the reason
    };
    std::string broken = doc("xsi", "12");
    broken.insert(broken.size() - 4, "</n>");
    const Row rows[] = {
        {"valid", doc("xsi", "12"), true, true},
        {"invalid", doc("xsi", "twelve"), true, false},
        {"invalid, other prefix", doc("i", "twelve"), true, false},
        {"invalid, validation off", doc("xsi", "twelve"), false, true},
        {"no schema named", "<r><n>twelve</n></r>", true, true},
        {"not well-formed, schema named", broken, true, false, "mismatched tag at line 1"},
    };
    TempDir dir;
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        std::string path = dir.File("doc.xml");
        WriteFile(path, row.xml);
        IXMLDOMDocument2Ptr d = NewDocument();
        d->PutvalidateOnParse(row.validate ? VARIANT_TRUE : VARIANT_FALSE);
        EXPECT_EQ(d->load(_variant_t(path)), row.loads ? VARIANT_TRUE : VARIANT_FALSE)
            << ReasonOf(d);
        if (!row.loads) {
            EXPECT_NE(d->GetparseError()->GeterrorCode(), 0);
            EXPECT_NE(ReasonOf(d), "");
            EXPECT_EQ(ReasonOf(d).rfind(row.reason, 0), 0u) << ReasonOf(d);
            EXPECT_FALSE(d->GetdocumentElement());
        }
    }
}

TEST(DomLoad, ValidateUsesAttachedSchemasOrThoseTheRootNames) {
    const std::string schema = std::string(KEST_TEST_DATA_DIR) + "/dom/small.xsd";
    IXMLDOMSchemaCollectionPtr cache;
    ASSERT_EQ(cache.CreateInstance(kProgIdXMLSchemaCache40), S_OK);
    cache->add(u"urn:kest:dom-test", _variant_t(schema));

    IXMLDOMDocument2Ptr doc = Parsed("<r xmlns=\"urn:kest:dom-test\"><n>1</n></r>");
    IXMLDOMParseErrorPtr result = doc->validate();
    EXPECT_NE(result->GeterrorCode(), 0) << "no schema attached or named";
    doc->putref_schemas(cache);
    EXPECT_TRUE(doc->Getschemas() == cache);
    result = doc->validate();
    EXPECT_EQ(result->GeterrorCode(), 0) << result->Getreason().ToString();
    EXPECT_EQ(result->Getreason().length(), 0u);

    // A value changed through the DOM is what gets validated.
    IXMLDOMNodePtr text = doc->GetdocumentElement()->GetfirstChild()->GetfirstChild();
    text->PutnodeValue(_variant_t("one"));
    result = doc->validate();
    EXPECT_NE(result->GeterrorCode(), 0);
    EXPECT_NE(result->Getreason().length(), 0u);
    EXPECT_EQ(doc->GetparseError()->GeterrorCode(), result->GeterrorCode());

    // Without a collection the schemas the root names are used.
    IXMLDOMDocument2Ptr named = Parsed(
        "<r xmlns=\"urn:kest:dom-test\" xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\" "
        "xsi:schemaLocation=\"urn:kest:dom-test " + schema + "\"><n>x</n></r>");
    EXPECT_NE(named->validate()->GeterrorCode(), 0);
    named->GetdocumentElement()->GetlastChild()->GetfirstChild()->PutnodeValue(_variant_t("3"));
    EXPECT_EQ(named->validate()->GeterrorCode(), 0);
}

TEST(DomLoad, ValidateOfAnUnchangedFileReportsTheFilesOwnLines) {
    // The element out of order stands on line 6 of the indented file; a re-serialised copy
    // would put it on another line.
    const std::string data = std::string(KEST_TEST_DATA_DIR) + "/schema/wrong-order.cdf";
    const std::string schema = std::string(KEST_SOURCE_DIR) + "/schema/cdf.xsd";
    IXMLDOMSchemaCollectionPtr cache;
    ASSERT_EQ(cache.CreateInstance(kProgIdXMLSchemaCache40), S_OK);
    cache->add(u"http://kest.dev/schemas/cdf/1.0", _variant_t(schema));
    IXMLDOMDocument2Ptr doc;
    ASSERT_EQ(doc.CreateInstance(kProgIdDOMDocument40), S_OK);
    doc->PutvalidateOnParse(VARIANT_FALSE);
    ASSERT_EQ(doc->load(_variant_t(data)), VARIANT_TRUE);
    doc->putref_schemas(cache);
    IXMLDOMParseErrorPtr result = doc->validate();
    EXPECT_EQ(result->Getline(), 6) << result->Getreason().ToString();

    // Once the document changes, its current content is what gets validated.
    doc->GetdocumentElement()->appendChild(doc->createComment(_bstr_t("edited")));
    result = doc->validate();
    EXPECT_NE(result->GeterrorCode(), 0);
    EXPECT_NE(result->Getline(), 6);
}
