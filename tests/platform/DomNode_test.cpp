#include <gtest/gtest.h>

#include <functional>
#include <string>

#include "DomTestUtil.h"
#include "platform/XmlDom.h"

using namespace kest;
using namespace kest::testing;

namespace {

HRESULT CodeOf(const std::function<void()>& call) {
    try {
        call();
    } catch (const _com_error& e) {
        return e.Error();
    }
    return S_OK;
}

std::vector<std::string> ChildNames(const IXMLDOMNodePtr& parent) {
    std::vector<std::string> names;
    IXMLDOMNodeListPtr list = parent->GetchildNodes();
    while (IXMLDOMNodePtr n = list->nextNode()) names.push_back(Utf8Of(n->GetnodeName()));
    return names;
}

}  // namespace

TEST(DomNode, DocumentsAreCreatedByProgIdOrClassIdOnly) {
    struct Row {
        const OLECHAR* id;
        HRESULT expected;
    };
    const Row rows[] = {
        {u"Msxml2.DOMDocument.4.0", S_OK},
        {u"msxml2.domdocument.4.0", S_OK},
        {u"{88d969c0-f192-11d4-a65f-0040963251e5}", S_OK},
        {u"{88D969C0-F192-11D4-A65F-0040963251E5}", S_OK},
        {u"Msxml2.DOMDocument.6.0", REGDB_E_CLASSNOTREG},
        {u"{00000000-0000-0000-0000-000000000000}", REGDB_E_CLASSNOTREG},
        {u"88d969c0-f192-11d4-a65f-0040963251e5", CO_E_CLASSSTRING},
        {u"not a name", CO_E_CLASSSTRING},
        {u"", CO_E_CLASSSTRING},
        {nullptr, CO_E_CLASSSTRING},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.id ? _bstr_t(row.id).ToString() : "null");
        IXMLDOMDocument2Ptr doc;
        EXPECT_EQ(doc.CreateInstance(row.id), row.expected);
        EXPECT_EQ(static_cast<bool>(doc), row.expected == S_OK);
    }
    IXMLDOMDocument2Ptr doc = NewDocument();
    EXPECT_EQ(doc->GetvalidateOnParse(), VARIANT_TRUE);
    EXPECT_EQ(doc->Getasync(), VARIANT_TRUE);
    doc->Putasync(VARIANT_FALSE);
    EXPECT_EQ(doc->Getasync(), VARIANT_FALSE);
    EXPECT_EQ(doc->GetnodeType(), NODE_DOCUMENT);
    EXPECT_EQ(Utf8Of(doc->GetnodeName()), "#document");
    EXPECT_EQ(doc->GetnodeValue().vt, VT_NULL);
    EXPECT_FALSE(doc->Getattributes());
    EXPECT_FALSE(doc->GetparentNode());
    EXPECT_EQ(long(doc->getProperty(u"MaxElementDepth")), kDefaultMaxElementDepth);
    EXPECT_EQ(CodeOf([&] { doc->setProperty(u"NoSuchProperty", _variant_t(1L)); }), E_INVALIDARG);
}

TEST(DomNode, EmptyPointersAndKindConversions) {
    IXMLDOMNodePtr empty;
    EXPECT_EQ(CodeOf([&] { empty->GetnodeType(); }), E_POINTER);
    IXMLDOMDocument2Ptr doc = Parsed("<a b='1'>t<!--c--></a>");
    IXMLDOMNodePtr text = doc->GetdocumentElement()->GetfirstChild();
    EXPECT_FALSE(IXMLDOMElementPtr(text));
    EXPECT_TRUE(IXMLDOMTextPtr(text));
    EXPECT_FALSE(IXMLDOMCommentPtr(text));
    EXPECT_TRUE(IXMLDOMCommentPtr(text->GetnextSibling()));
    EXPECT_TRUE(IXMLDOMDocumentPtr(IXMLDOMNodePtr(doc)));
    EXPECT_TRUE(IXMLDOMAttributePtr(doc->GetdocumentElement()->getAttributeNode(u"b")));
    EXPECT_FALSE(doc->GetdocumentElement()->getAttributeNode(u"c"));
    EXPECT_EQ(doc->GetdocumentElement()->getAttribute(u"c").vt, VT_NULL);
    EXPECT_TRUE(text->GetownerDocument() == doc);
}

TEST(DomNode, ValuesAndTheirChanges) {
    IXMLDOMDocument2Ptr doc = Parsed("<a b='1'>t<![CDATA[c]]><!--k--><?p d?><e>x<f>y</f></e></a>");
    IXMLDOMElementPtr root = doc->GetdocumentElement();
    EXPECT_EQ(Utf8Of(root->Gettext()), "tcxy");
    EXPECT_EQ(CodeOf([&] { root->PutnodeValue(_variant_t("v")); }), E_FAIL);
    EXPECT_EQ(CodeOf([&] { doc->PutnodeValue(_variant_t("v")); }), E_FAIL);
    EXPECT_EQ(root->GetnodeValue().vt, VT_NULL);

    IXMLDOMNodePtr node = root->GetfirstChild();
    for (const char* value : {"T", "C", "K", "P"}) {
        SCOPED_TRACE(value);
        node->PutnodeValue(_variant_t(value));
        EXPECT_EQ(Utf8Of(_bstr_t(node->GetnodeValue())), value);
        node = node->GetnextSibling();
    }
    IXMLDOMNodePtr attribute = root->getAttributeNode(u"b");
    attribute->PutnodeValue(_variant_t(2.5));
    EXPECT_EQ(Utf8Of(_bstr_t(root->getAttribute(u"b"))), "2.5");
    _variant_t null;
    null.vt = VT_NULL;
    EXPECT_NE(CodeOf([&] { attribute->PutnodeValue(null); }), S_OK);
    EXPECT_EQ(Utf8Of(root->Getxml()), "<a b=\"2.5\">T<![CDATA[C]]><!--K--><?p P?><e>x<f>y</f></e></a>");
    EXPECT_FALSE(attribute->GetparentNode());
    EXPECT_FALSE(attribute->GetnextSibling());
    EXPECT_EQ(attribute->GetchildNodes()->Getlength(), 0);
}

TEST(DomNode, AppendChildMovesNodesAndRefusesWhatCannotGoThere) {
    IXMLDOMDocument2Ptr doc = Parsed("<a><b><c/></b><d/></a>");
    IXMLDOMElementPtr a = doc->GetdocumentElement();
    IXMLDOMNodePtr b = a->GetfirstChild();
    IXMLDOMNodePtr c = b->GetfirstChild();
    IXMLDOMNodePtr d = a->GetlastChild();

    IXMLDOMNodePtr moved = d->appendChild(c);
    EXPECT_TRUE(moved == c);
    EXPECT_FALSE(b->hasChildNodes());
    EXPECT_TRUE(c->GetparentNode() == d);
    b->appendChild(b->GetnextSibling());  // d (with c) moves into b
    EXPECT_EQ(Utf8Of(a->Getxml()), "<a><b><d><c/></d></b></a>");

    IXMLDOMDocument2Ptr other = Parsed("<x/>");
    IXMLDOMNodePtr foreign = other->GetdocumentElement();
    IXMLDOMNodePtr attribute = doc->createAttribute(u"z");
    IXMLDOMNodePtr text = doc->createTextNode(u"t");
    struct Row {
        const char* label;
        IXMLDOMNodePtr parent;
        IXMLDOMNodePtr child;
        HRESULT expected;
    };
    const Row rows[] = {
        {"empty child", a, nullptr, E_POINTER},
        {"other document", a, foreign, E_INVALIDARG},
        {"itself", b, b, E_INVALIDARG},
        {"its ancestor", c, a, E_INVALIDARG},
        {"attribute", a, attribute, E_INVALIDARG},
        {"document", a, doc, E_INVALIDARG},
        {"under text", text, doc->createElement(u"e"), E_INVALIDARG},
        {"text under document", doc, text, E_INVALIDARG},
        {"second root", doc, doc->createElement(u"e"), E_INVALIDARG},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        EXPECT_EQ(CodeOf([&] { row.parent->appendChild(row.child); }), row.expected);
    }
    EXPECT_EQ(Utf8Of(a->Getxml()), "<a><b><d><c/></d></b></a>");
}

TEST(DomNode, ChildListsAreLiveAndIndexable) {
    IXMLDOMDocument2Ptr doc = Parsed("<r><a/><b/><c/></r>");
    IXMLDOMElementPtr r = doc->GetdocumentElement();
    IXMLDOMNodeListPtr list = r->GetchildNodes();
    EXPECT_EQ(list->Getlength(), 3);
    EXPECT_EQ(Utf8Of(list->Getitem(2)->GetnodeName()), "c");
    EXPECT_EQ(Utf8Of(list->Getitem(0)->GetnodeName()), "a");
    EXPECT_EQ(Utf8Of(list->Getitem(1)->GetnodeName()), "b");
    EXPECT_FALSE(list->Getitem(3));
    EXPECT_FALSE(list->Getitem(-1));
    EXPECT_EQ(Utf8Of(list->nextNode()->GetnodeName()), "a");
    r->appendChild(doc->createElement(u"d"));
    EXPECT_EQ(list->Getlength(), 4);
    EXPECT_EQ(Utf8Of(list->Getitem(3)->GetnodeName()), "d");
    r->appendChild(list->Getitem(0));  // a moves to the end: b c d a
    EXPECT_EQ(Utf8Of(list->Getitem(3)->GetnodeName()), "a");
    EXPECT_EQ(Utf8Of(list->Getitem(0)->GetnodeName()), "b");
    list->reset();
    std::string walked;
    while (IXMLDOMNodePtr n = list->nextNode()) walked += Utf8Of(n->GetnodeName());
    EXPECT_EQ(walked, "bcda");
    EXPECT_EQ(Utf8Of(r->GetlastChild()->GetpreviousSibling()->GetnodeName()), "d");
}

TEST(DomNode, AttributeMapsAddReplaceAndRemove) {
    IXMLDOMDocument2Ptr doc = Parsed("<r a='1' b='2' c='3'/>");
    IXMLDOMElementPtr r = doc->GetdocumentElement();
    IXMLDOMNamedNodeMapPtr map = r->Getattributes();
    EXPECT_EQ(Utf8Of(_bstr_t(map->getNamedItem(u"b")->GetnodeValue())), "2");
    EXPECT_FALSE(map->getNamedItem(u"x"));

    IXMLDOMAttributePtr replacement = doc->createAttribute(u"b");
    replacement->PutnodeValue(_variant_t("two"));
    map->setNamedItem(replacement);
    IXMLDOMAttributePtr added = doc->createAttribute(u"d");
    map->setNamedItem(added);
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

    IXMLDOMDocument2Ptr other = NewDocument();
    struct Row {
        const char* label;
        IXMLDOMNodePtr node;
        HRESULT expected;
    };
    const Row rows[] = {
        {"empty", nullptr, E_POINTER},
        {"not an attribute", doc->createElement(u"x"), E_INVALIDARG},
        {"other document", other->createAttribute(u"x"), E_INVALIDARG},
        {"attached elsewhere", Parsed("<q z='1'/>")->GetdocumentElement()->getAttributeNode(u"z"),
         E_INVALIDARG},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        EXPECT_EQ(CodeOf([&] { map->setNamedItem(row.node); }), row.expected);
    }
    IXMLDOMElementPtr second = doc->createElement(u"s");
    EXPECT_EQ(CodeOf([&] { second->Getattributes()->setNamedItem(map->getNamedItem(u"b")); }),
              E_INVALIDARG);
}

TEST(DomNode, CreateNodeMakesEachKind) {
    IXMLDOMDocument2Ptr doc = NewDocument();
    struct Row {
        _variant_t type;
        const char* name;
        DOMNodeType kind;
        const char* nodeName;
    };
    const Row rows[] = {
        {_variant_t(1L), "p:e", NODE_ELEMENT, "p:e"},
        {_variant_t(2L), "at", NODE_ATTRIBUTE, "at"},
        {_variant_t(3L), "", NODE_TEXT, "#text"},
        {_variant_t(4L), "", NODE_CDATA_SECTION, "#cdata-section"},
        {_variant_t(7L), "target", NODE_PROCESSING_INSTRUCTION, "target"},
        {_variant_t(8L), "", NODE_COMMENT, "#comment"},
        {_variant_t(short(1)), "e", NODE_ELEMENT, "e"},
        {_variant_t("element"), "e", NODE_ELEMENT, "e"},
        {_variant_t("comment"), "", NODE_COMMENT, "#comment"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.nodeName);
        IXMLDOMNodePtr node = doc->createNode(row.type, row.name, u"urn:n");
        ASSERT_TRUE(node);
        EXPECT_EQ(node->GetnodeType(), row.kind);
        EXPECT_EQ(Utf8Of(node->GetnodeName()), row.nodeName);
        EXPECT_FALSE(node->GetparentNode());
    }
    EXPECT_EQ(Utf8Of(doc->createNode(_variant_t(1L), u"e", u"urn:n")->GetnamespaceURI()), "urn:n");
    EXPECT_EQ(CodeOf([&] { doc->createNode(_variant_t(5L), u"e", u""); }), E_INVALIDARG);
    EXPECT_EQ(CodeOf([&] { doc->createNode(_variant_t("entity"), u"e", u""); }), E_INVALIDARG);
    EXPECT_NE(CodeOf([&] { doc->createNode(_variant_t(1L), u"a b", u""); }), S_OK);
    EXPECT_NE(CodeOf([&] { doc->createElement(u""); }), S_OK);
    EXPECT_NE(CodeOf([&] { doc->createElement(u"<x>"); }), S_OK);

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
    IXMLDOMProcessingInstructionPtr pi = doc->createProcessingInstruction(u"xml", u"version=\"1.0\"");
    EXPECT_EQ(pi->Getattributes()->Getlength(), 1);
    EXPECT_FALSE(doc->createProcessingInstruction(u"other", u"x")->Getattributes());
}

TEST(DomNode, ManyDocumentsAndListsAreFreed) {
    // The live-object check after the test catches leaked documents, lists and maps.
    for (int i = 0; i < 100; ++i) {
        IXMLDOMDocument2Ptr doc = Parsed("<r a='1'><c/></r>");
        IXMLDOMNodeListPtr list = doc->GetdocumentElement()->GetchildNodes();
        IXMLDOMNamedNodeMapPtr map = doc->GetdocumentElement()->Getattributes();
        IXMLDOMNodePtr child = list->nextNode();
        doc = nullptr;
        EXPECT_EQ(Utf8Of(child->GetnodeName()), "c");  // the node keeps its document alive
        EXPECT_EQ(ChildNames(child->GetparentNode()), std::vector<std::string>{"c"});
    }
}
