#include "IXMLDOMNode.h"

#include "IXMLDOMDocument.h"
#include "IXMLDOMNamedNodeMap.h"
#include "IXMLDOMNodeList.h"
#include "detail/DomCollections.h"
#include "detail/DomDocument.h"
#include "detail/DomNames.h"
#include "detail/XmlWriter.h"

namespace kest {

using detail::DomDocument;
using detail::DomNode;

namespace {

// Straight from the stored UTF-8 into one BSTR: values are read often enough (every number list
// of a file) that intermediate strings show in profiles.
BSTR NewBstr(std::string_view utf8) {
    BSTR text = SysAllocStringFromUtf8(utf8);
    if (!text) throw _com_error(E_OUTOFMEMORY);
    return text;
}

_bstr_t ToBstr(std::string_view utf8) { return _bstr_t(NewBstr(utf8), false); }

_variant_t TextVariant(std::string_view utf8) {
    _variant_t value;
    value.bstrVal = NewBstr(utf8);
    value.vt = VT_BSTR;
    return value;
}

_variant_t NullVariant() {
    _variant_t v;
    v.vt = VT_NULL;
    return v;
}

}  // namespace

DOMNodeType IXMLDOMNode::GetnodeType() const { return static_cast<DOMNodeType>(m_node->Type()); }

_bstr_t IXMLDOMNode::GetnodeName() const {
    return ToBstr(m_node->Name());  // kinds without a name have "#text", "#comment", ...
}

bool IXMLDOMNode::NameIs(std::u16string_view name) const {
    const std::string_view own = m_node->Name();
    bool ascii = true;
    for (char16_t c : name) ascii = ascii && c < 0x80;
    if (!ascii) return Utf8ToUtf16(own) == name;
    if (own.size() != name.size()) return false;
    for (std::size_t i = 0; i < name.size(); ++i) {
        if (static_cast<unsigned char>(own[i]) != name[i]) return false;
    }
    return true;
}

_variant_t IXMLDOMNode::GetnodeValue() const {
    switch (m_node->Type()) {
        case NODE_ATTRIBUTE:
        case NODE_TEXT:
        case NODE_CDATA_SECTION:
        case NODE_COMMENT:
            return TextVariant(m_node->Text());
        case NODE_PROCESSING_INSTRUCTION:
            return TextVariant(m_node->IsDeclaration() ? detail::DeclarationText(m_node)
                                                       : std::string(m_node->Text()));
        default:
            return NullVariant();
    }
}

void IXMLDOMNode::PutnodeValue(const _variant_t& value) {
    if (m_node->Type() == NODE_ELEMENT || m_node->Type() == NODE_DOCUMENT)
        throw _com_error(E_FAIL, "elements and documents have no value of their own");
    // A value that cannot become text fails here; a string is taken without a copy.
    std::string utf8;
    if (value.vt == VT_BSTR) {
        utf8 = Utf16ToUtf8(BstrView(value.bstrVal));
    } else {
        _bstr_t text = value;
        utf8 = Utf16ToUtf8(text.View());
    }
    if (m_node->IsDeclaration()) {
        detail::SetDeclarationText(*m_doc, m_node, utf8);
    } else {
        m_doc->SetText(m_node, utf8);
    }
}

bool IXMLDOMNode::GettextPosition(long& line, long& column) const noexcept {
    line = column = 0;
    if (m_node->Type() != NODE_TEXT && m_node->Type() != NODE_CDATA_SECTION) return false;
    line = static_cast<long>(m_node->TextLine());
    column = static_cast<long>(m_node->TextColumn());
    return line > 0;
}

bool IXMLDOMNode::GetnodeValueUtf8(std::string_view& text) const {
    switch (m_node->Type()) {
        case NODE_ATTRIBUTE:
        case NODE_TEXT:
        case NODE_CDATA_SECTION:
        case NODE_COMMENT:
            text = m_node->Text();
            return true;
        case NODE_PROCESSING_INSTRUCTION:
            if (m_node->IsDeclaration()) return false;  // no stored text to lend
            text = m_node->Text();
            return true;
        default:
            return false;
    }
}

void IXMLDOMNode::PutnodeValueUtf8(std::string_view utf8) {
    if (m_node->Type() == NODE_ELEMENT || m_node->Type() == NODE_DOCUMENT)
        throw _com_error(E_FAIL, "elements and documents have no value of their own");
    if (m_node->IsDeclaration()) {
        detail::SetDeclarationText(*m_doc, m_node, utf8);
    } else {
        m_doc->SetText(m_node, utf8);
    }
}

_bstr_t IXMLDOMNode::GetnamespaceURI() const {
    const detail::DomName* name = m_node->name;
    return name && name->created ? ToBstr(name->namespaceURI) : _bstr_t(u"");
}

_bstr_t IXMLDOMNode::Gettext() const {
    if (m_node->Type() != NODE_ELEMENT && m_node->Type() != NODE_DOCUMENT) {
        _variant_t value = GetnodeValue();
        return value.vt == VT_BSTR ? _bstr_t(value.bstrVal, true) : _bstr_t(u"");
    }
    std::string text;
    for (DomNode* n = m_node->FirstChild(); n; n = detail::NextInSubtree(m_node, n)) {
        if (n->Type() == NODE_TEXT || n->Type() == NODE_CDATA_SECTION) text += n->Text();
    }
    return ToBstr(text);
}

_bstr_t IXMLDOMNode::Getxml() const {
    std::string out;
    detail::WriteXml(m_node, out);
    return ToBstr(out);
}

IXMLDOMNodeListPtr IXMLDOMNode::GetchildNodes() const {
    return detail::MakeChildList(m_doc, m_node);
}

IXMLDOMNamedNodeMapPtr IXMLDOMNode::Getattributes() const {
    if (!m_node->HasAttributes()) return nullptr;
    return detail::MakeAttributeMap(m_doc, m_node);
}

IXMLDOMNodePtr IXMLDOMNode::GetparentNode() const {
    if (m_node->Type() == NODE_ATTRIBUTE) return nullptr;
    return IXMLDOMNodePtr(m_doc, m_node->parent);
}

IXMLDOMNodePtr IXMLDOMNode::GetfirstChild() const {
    return IXMLDOMNodePtr(m_doc, m_node->FirstChild());
}

IXMLDOMNodePtr IXMLDOMNode::GetlastChild() const {
    return IXMLDOMNodePtr(m_doc, m_node->LastChild());
}

IXMLDOMNodePtr IXMLDOMNode::GetnextSibling() const {
    if (m_node->Type() == NODE_ATTRIBUTE) return nullptr;
    return IXMLDOMNodePtr(m_doc, m_node->next);
}

IXMLDOMNodePtr IXMLDOMNode::GetpreviousSibling() const {
    if (m_node->Type() == NODE_ATTRIBUTE) return nullptr;
    return IXMLDOMNodePtr(m_doc, m_node->prev);
}

VARIANT_BOOL IXMLDOMNode::hasChildNodes() const {
    return m_node->FirstChild() ? VARIANT_TRUE : VARIANT_FALSE;
}

IXMLDOMDocumentPtr IXMLDOMNode::GetownerDocument() const {
    if (m_node->Type() == NODE_DOCUMENT) return nullptr;
    return IXMLDOMDocumentPtr(m_doc, &m_doc->node);
}

IXMLDOMNodePtr IXMLDOMNode::appendChild(const IXMLDOMNodePtr& child) {
    const IXMLDOMNode* handle = child.GetInterfacePtr();
    if (!handle) throw _com_error(E_POINTER);
    DomNode* node = DomDocument::NodeOf(handle);
    if (DomDocument::DocumentOf(handle) != m_doc)
        throw _com_error(E_INVALIDARG, "the node belongs to another document");
    if (m_node->Type() != NODE_ELEMENT && m_node->Type() != NODE_DOCUMENT)
        throw _com_error(E_INVALIDARG, "this kind of node cannot have children");
    switch (node->Type()) {
        case NODE_ELEMENT:
        case NODE_PROCESSING_INSTRUCTION:
        case NODE_COMMENT:
            break;
        case NODE_TEXT:
        case NODE_CDATA_SECTION:
            if (m_node->Type() == NODE_DOCUMENT)
                throw _com_error(E_INVALIDARG, "text cannot be a child of the document");
            break;
        default:
            throw _com_error(E_INVALIDARG, "this kind of node cannot be a child");
    }
    if (m_node->Type() == NODE_DOCUMENT && node->Type() == NODE_ELEMENT) {
        for (DomNode* c = m_node->FirstChild(); c; c = c->next)
            if (c->Type() == NODE_ELEMENT && c != node)
                throw _com_error(E_INVALIDARG, "the document already has a root element");
    }
    for (DomNode* a = m_node; a; a = a->parent)
        if (a == node) throw _com_error(E_INVALIDARG, "a node cannot be appended below itself");
    detail::Unlink(node);
    detail::LinkChild(m_node, node);
    ++m_doc->generation;
    return child;
}

IXMLDOMAttributePtr IXMLDOMElement::getAttributeNode(const _bstr_t& name) const {
    return IXMLDOMAttributePtr(m_doc, detail::FindAttribute(m_node, Utf16ToUtf8(name.View())));
}

_variant_t IXMLDOMElement::getAttribute(const _bstr_t& name) const {
    DomNode* a = detail::FindAttribute(m_node, Utf16ToUtf8(name.View()));
    return a ? _variant_t(ToBstr(a->Text())) : NullVariant();
}

void IXMLDOMElement::setAttribute(const _bstr_t& name, const _variant_t& value) {
    std::string qname = Utf16ToUtf8(name.View());
    if (!detail::IsXmlName(qname)) throw _com_error(E_INVALIDARG, "not a valid name: " + qname);
    _bstr_t text = value;
    DomNode* a = detail::FindAttribute(m_node, qname);
    if (!a) {
        a = m_doc->NewNode(NODE_ATTRIBUTE, m_doc->Intern(NODE_ATTRIBUTE, qname));
        detail::LinkAttribute(m_node, a);
        ++m_doc->generation;
    }
    m_doc->SetText(a, Utf16ToUtf8(text.View()));
}

}  // namespace kest
