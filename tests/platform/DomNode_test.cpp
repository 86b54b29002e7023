#include <gtest/gtest.h>

#include <string>
#include <string_view>
#include <vector>

#include "DomTestUtil.h"
#include "platform/XmlDom.h"

using namespace kest;
using namespace kest::testing;

TEST(DomNode, DocumentsAreCreatedByProgIdOrClassIdOnly) {
    auto create = [](const OLECHAR* id) {
        IXMLDOMDocument2Ptr doc;
        HRESULT hr = doc.CreateInstance(id);
        EXPECT_EQ(static_cast<bool>(doc), hr == S_OK);
        return hr;
    };
    EXPECT_EQ(create(u"Msxml2.DOMDocument.4.0"), S_OK);
    EXPECT_EQ(create(u"msxml2.domdocument.4.0"), S_OK);
    EXPECT_EQ(create(u"{88D969C0-F192-11D4-A65F-0040963251E5}"), S_OK);
    EXPECT_EQ(create(u"Msxml2.DOMDocument.6.0"), REGDB_E_CLASSNOTREG);
    EXPECT_EQ(create(u"{00000000-0000-0000-0000-000000000000}"), REGDB_E_CLASSNOTREG);
    EXPECT_EQ(create(u"88d969c0-f192-11d4-a65f-0040963251e5"), CO_E_CLASSSTRING);
    EXPECT_EQ(create(u""), CO_E_CLASSSTRING);
    EXPECT_EQ(create(nullptr), CO_E_CLASSSTRING);
    IXMLDOMDocument2Ptr doc = NewDocument();
    EXPECT_EQ(doc->GetvalidateOnParse(), VARIANT_TRUE);
    EXPECT_EQ(CodeOf([&] { doc->setProperty(u"NoSuchProperty", _variant_t(1L)); }), E_INVALIDARG);
}

TEST(DomNode, KindsValuesAndTheirChanges) {
    IXMLDOMNodePtr empty;
    EXPECT_EQ(CodeOf([&] { empty->GetnodeType(); }), E_POINTER);
    IXMLDOMDocument2Ptr doc = Parsed("<a b='1'>t<![CDATA[c]]><!--k--><?p d?><e>x<f>y</f></e></a>");
    IXMLDOMElementPtr root = doc->GetdocumentElement();
    IXMLDOMNodePtr text = root->GetfirstChild();
    EXPECT_FALSE(IXMLDOMElementPtr(text));
    EXPECT_TRUE(IXMLDOMTextPtr(text));
    EXPECT_FALSE(IXMLDOMCommentPtr(text));
    EXPECT_TRUE(IXMLDOMCommentPtr(text->GetnextSibling()->GetnextSibling()));
    EXPECT_TRUE(IXMLDOMAttributePtr(root->getAttributeNode(u"b")));
    EXPECT_FALSE(root->getAttributeNode(u"c"));
    EXPECT_EQ(root->getAttribute(u"c").vt, VT_NULL);
    EXPECT_TRUE(text->GetownerDocument() == doc);

    EXPECT_EQ(Utf8Of(root->Gettext()), "tcxy");
    EXPECT_EQ(CodeOf([&] { root->PutnodeValue(_variant_t("v")); }), E_FAIL);
    IXMLDOMNodePtr node = root->GetfirstChild();
    for (const char* value : {"T", "C", "K", "P"}) {
        node->PutnodeValue(_variant_t(value));
        node = node->GetnextSibling();
    }
    IXMLDOMNodePtr attribute = root->getAttributeNode(u"b");
    attribute->PutnodeValue(_variant_t(2.5));
    _variant_t null;
    null.vt = VT_NULL;
    EXPECT_NE(CodeOf([&] { attribute->PutnodeValue(null); }), S_OK);
    EXPECT_EQ(Utf8Of(root->Getxml()),
              "<a b=\"2.5\">T<![CDATA[C]]><!--K--><?p P?><e>x<f>y</f></e></a>");
    EXPECT_FALSE(attribute->GetparentNode());
}

TEST(DomNode, AppendChildMovesNodesAndRefusesWhatCannotGoThere) {
    IXMLDOMDocument2Ptr doc = Parsed("<a><b><c/></b><d/></a>");
    IXMLDOMElementPtr a = doc->GetdocumentElement();
    IXMLDOMNodePtr b = a->GetfirstChild(), c = b->GetfirstChild(), d = a->GetlastChild();
    EXPECT_TRUE(d->appendChild(c) == c);
    EXPECT_FALSE(b->hasChildNodes());
    EXPECT_TRUE(c->GetparentNode() == d);
    b->appendChild(d);  // d (with c) moves into b
    EXPECT_EQ(Utf8Of(a->Getxml()), "<a><b><d><c/></d></b></a>");

    auto append = [](const IXMLDOMNodePtr& parent, const IXMLDOMNodePtr& child) {
        return CodeOf([&] { parent->appendChild(child); });
    };
    IXMLDOMNodePtr text = doc->createTextNode(u"t");
    EXPECT_EQ(append(a, nullptr), E_POINTER);
    EXPECT_EQ(append(a, Parsed("<x/>")->GetdocumentElement()), E_INVALIDARG);  // other document
    EXPECT_EQ(append(b, b), E_INVALIDARG);
    EXPECT_EQ(append(c, a), E_INVALIDARG);  // its ancestor
    EXPECT_EQ(append(a, doc->createAttribute(u"z")), E_INVALIDARG);
    EXPECT_EQ(append(a, doc), E_INVALIDARG);
    EXPECT_EQ(append(text, doc->createElement(u"e")), E_INVALIDARG);
    EXPECT_EQ(append(doc, text), E_INVALIDARG);
    EXPECT_EQ(append(doc, doc->createElement(u"e")), E_INVALIDARG);  // a second root
    EXPECT_EQ(Utf8Of(a->Getxml()), "<a><b><d><c/></d></b></a>");
}

TEST(DomNode, ChildListsAreLiveAndIndexable) {
    IXMLDOMDocument2Ptr doc = Parsed("<r><a/><b/><c/></r>");
    IXMLDOMElementPtr r = doc->GetdocumentElement();
    IXMLDOMNodeListPtr list = r->GetchildNodes();
    auto byIndex = [&] {
        std::string names;
        for (long i = -1; i <= list->Getlength(); ++i)
            names += list->Getitem(i) ? Utf8Of(list->Getitem(i)->GetnodeName()) : "-";
        return names;
    };
    EXPECT_EQ(byIndex(), "-abc-");
    EXPECT_EQ(Utf8Of(list->nextNode()->GetnodeName()), "a");
    r->appendChild(doc->createElement(u"d"));
    EXPECT_EQ(byIndex(), "-abcd-");
    r->appendChild(list->Getitem(0));  // a moves to the end
    EXPECT_EQ(byIndex(), "-bcda-");
    list->reset();
    std::string walked;
    while (IXMLDOMNodePtr n = list->nextNode()) walked += Utf8Of(n->GetnodeName());
    EXPECT_EQ(walked, "bcda");
    EXPECT_EQ(Utf8Of(r->GetlastChild()->GetpreviousSibling()->GetnodeName()), "d");
    // After a change, an index at or past the one fetched last is counted afresh.
    EXPECT_EQ(Utf8Of(list->Getitem(1)->GetnodeName()), "c");
    r->appendChild(r->GetfirstChild());  // b moves to the end: c d a b
    EXPECT_EQ(Utf8Of(list->Getitem(1)->GetnodeName()), "d");
}

TEST(DomNode, AttributeMapsAddReplaceAndRemove) {
    IXMLDOMDocument2Ptr doc = Parsed("<r a='1' b='2' c='3'/>");
    IXMLDOMElementPtr r = doc->GetdocumentElement();
    IXMLDOMNamedNodeMapPtr map = r->Getattributes();
    EXPECT_FALSE(map->getNamedItem(u"x"));
    IXMLDOMAttributePtr replacement = doc->createAttribute(u"b");
    replacement->PutnodeValue(_variant_t("two"));
    map->setNamedItem(replacement);
    map->setNamedItem(doc->createAttribute(u"d"));
    EXPECT_EQ(Utf8Of(r->Getxml()), "<r a=\"1\" b=\"two\" c=\"3\" d=\"\"/>");
    IXMLDOMNodePtr removed = map->removeNamedItem(u"a");
    ASSERT_TRUE(removed);
    EXPECT_EQ(Utf8Of(_bstr_t(removed->GetnodeValue())), "1");
    EXPECT_FALSE(map->removeNamedItem(u"a"));
    EXPECT_EQ(map->Getlength(), 3);
    EXPECT_EQ(Utf8Of(map->Getitem(2)->GetnodeName()), "d");
    r->setAttribute(u"c", _variant_t(7L));
    r->setAttribute(u"e", _variant_t("5"));
    EXPECT_EQ(Utf8Of(r->Getxml()), "<r b=\"two\" c=\"7\" d=\"\" e=\"5\"/>");

    auto set = [](const IXMLDOMNamedNodeMapPtr& on, const IXMLDOMNodePtr& node) {
        return CodeOf([&] { on->setNamedItem(node); });
    };
    EXPECT_EQ(set(map, nullptr), E_POINTER);
    EXPECT_EQ(set(map, doc->createElement(u"x")), E_INVALIDARG);
    EXPECT_EQ(set(map, NewDocument()->createAttribute(u"x")), E_INVALIDARG);
    EXPECT_EQ(set(map, Parsed("<q z='1'/>")->GetdocumentElement()->getAttributeNode(u"z")),
              E_INVALIDARG);  // attached in another document
    EXPECT_EQ(set(doc->createElement(u"s")->Getattributes(), map->getNamedItem(u"b")),
              E_INVALIDARG);  // attached here, to another element
}

TEST(DomNode, CreateNodeMakesEachKind) {
    IXMLDOMDocument2Ptr doc = NewDocument();
    auto made = [&](const _variant_t& type, const char16_t* name) {
        IXMLDOMNodePtr node = doc->createNode(type, name, u"urn:n");
        return std::to_string(node->GetnodeType()) + " " + Utf8Of(node->GetnodeName());
    };
    EXPECT_EQ(made(_variant_t(1L), u"p:e"), "1 p:e");
    EXPECT_EQ(made(_variant_t(2L), u"at"), "2 at");
    EXPECT_EQ(made(_variant_t(3L), u""), "3 #text");
    EXPECT_EQ(made(_variant_t(4L), u""), "4 #cdata-section");
    EXPECT_EQ(made(_variant_t(7L), u"target"), "7 target");
    EXPECT_EQ(made(_variant_t(8L), u""), "8 #comment");
    EXPECT_EQ(made(_variant_t(short(1)), u"e"), "1 e");
    EXPECT_EQ(made(_variant_t("element"), u"e"), "1 e");
    EXPECT_EQ(Utf8Of(doc->createNode(_variant_t(1L), u"e", u"urn:n")->GetnamespaceURI()), "urn:n");
    EXPECT_EQ(CodeOf([&] { doc->createNode(_variant_t(5L), u"e", u""); }), E_INVALIDARG);
    EXPECT_NE(CodeOf([&] { doc->createNode(_variant_t(1L), u"a b", u""); }), S_OK);
    EXPECT_NE(CodeOf([&] { doc->createElement(u""); }), S_OK);

    // The declaration made by hand carries attributes, like a parsed one.
    IXMLDOMNodePtr declaration = doc->createNode(_variant_t(7L), u"xml", u"");
    IXMLDOMNamedNodeMapPtr map = declaration->Getattributes();
    ASSERT_TRUE(map);
    IXMLDOMAttributePtr encoding = doc->createAttribute(u"encoding");
    encoding->PutnodeValue(_variant_t("UTF-8"));
    map->setNamedItem(encoding);
    EXPECT_EQ(Utf8Of(_bstr_t(declaration->GetnodeValue())), "encoding=\"UTF-8\"");
    declaration->PutnodeValue(_variant_t("version='1.0' standalone=\"no\""));
    EXPECT_EQ(map->Getlength(), 2);
    EXPECT_EQ(CodeOf([&] { declaration->PutnodeValue(_variant_t("version=1.0")); }), E_FAIL);
    EXPECT_EQ(
        doc->createProcessingInstruction(u"xml", u"version=\"1.0\"")->Getattributes()->Getlength(),
        1);
    EXPECT_FALSE(doc->createProcessingInstruction(u"other", u"x")->Getattributes());
}

TEST(DomNode, Utf8ValuesAreTheStoredTextOfTheUtf16Ones) {
    IXMLDOMDocument2Ptr doc = Parsed(
        "<?xml version='1.0'?><a b='\xC3\xA9'>t\xE2\x82\xAC<![CDATA[c]]><!--k--><?p d?></a>");
    IXMLDOMElementPtr root = doc->GetdocumentElement();
    std::string_view view;
    EXPECT_FALSE(root->GetnodeValueUtf8(view));
    EXPECT_FALSE(IXMLDOMNodePtr(doc)->GetnodeValueUtf8(view));
    IXMLDOMNodePtr declaration = doc->GetfirstChild();
    ASSERT_EQ(declaration->GetnodeType(), NODE_PROCESSING_INSTRUCTION);
    EXPECT_FALSE(declaration->GetnodeValueUtf8(view)) << "composed, not stored";

    std::vector<IXMLDOMNodePtr> holders = {root->getAttributeNode(u"b")};
    for (IXMLDOMNodePtr n = root->GetfirstChild(); n; n = n->GetnextSibling()) holders.push_back(n);
    ASSERT_EQ(holders.size(), 5u);
    const std::string written = "x\xF0\x9F\x98\x80 y\xC3\xA9";  // a pair of units, and a 2-byte one
    for (const IXMLDOMNodePtr& node : holders) {
        SCOPED_TRACE(Utf8Of(node->GetnodeName()));
        ASSERT_TRUE(node->GetnodeValueUtf8(view));
        EXPECT_EQ(std::string(view), Utf8Of(_bstr_t(node->GetnodeValue())));
        node->PutnodeValueUtf8(written);
        EXPECT_EQ(std::u16string(BstrView(node->GetnodeValue().bstrVal)), Utf8ToUtf16(written));
        ASSERT_TRUE(node->GetnodeValueUtf8(view));
        EXPECT_EQ(view, written);
        node->PutnodeValueUtf8("");
        ASSERT_TRUE(node->GetnodeValueUtf8(view));
        EXPECT_TRUE(view.empty());
    }
    // A view outlives changes of other nodes' values.
    holders[0]->PutnodeValueUtf8("kept");
    ASSERT_TRUE(holders[0]->GetnodeValueUtf8(view));
    for (int i = 0; i < 1000; ++i) holders[1]->PutnodeValueUtf8(std::string(100, 'z'));
    EXPECT_EQ(view, "kept");

    EXPECT_EQ(CodeOf([&] { root->PutnodeValueUtf8("v"); }), E_FAIL);
    EXPECT_EQ(CodeOf([&] { IXMLDOMNodePtr(doc)->PutnodeValueUtf8("v"); }), E_FAIL);
    declaration->PutnodeValueUtf8("version=\"1.0\" encoding=\"UTF-8\"");
    EXPECT_EQ(Utf8Of(_bstr_t(declaration->GetnodeValue())), "version=\"1.0\" encoding=\"UTF-8\"");
    EXPECT_NE(CodeOf([&] { declaration->PutnodeValueUtf8("no pseudo-attributes"); }), S_OK);
}

TEST(DomNode, NameIsComparesTheNameAsWritten) {
    IXMLDOMDocument2Ptr doc = Parsed("<p:CAL-ITEM xmlns:p=\"urn:x\"><Grö/>t</p:CAL-ITEM>");
    IXMLDOMNodePtr root = doc->GetdocumentElement();
    const struct {
        IXMLDOMNodePtr node;
        std::u16string_view name;
        bool equal;
    } rows[] = {
        {root, u"p:CAL-ITEM", true},
        {root, u"CAL-ITEM", false},
        {root, u"p:CAL-ITEMS", false},
        {root, u"p:cal-item", false},
        {root->GetfirstChild(), u"Grö", true},
        {root->GetfirstChild(), u"Gro", false},
        {root->GetlastChild(), u"#text", true},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(Utf16ToUtf8(row.name));
        EXPECT_EQ(row.node->NameIs(row.name), row.equal);
        EXPECT_EQ(row.node->GetnodeName() == _bstr_t(std::u16string(row.name)), row.equal);
    }
}
