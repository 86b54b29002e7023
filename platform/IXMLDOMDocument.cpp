#include "IXMLDOMDocument.h"

#include "detail/AtomicSave.h"
#include "detail/DocumentLoad.h"
#include "detail/DomCollections.h"
#include "detail/DomDocument.h"
#include "detail/DomNames.h"
#include "detail/HttpClient.h"

namespace kest {

using detail::DomDocument;
using detail::DomError;
using detail::DomNode;
using detail::FailLoad;
using detail::RootElement;

namespace {

std::string Utf8(const _bstr_t& text) { return Utf16ToUtf8(text.View()); }

bool StartsWithNoCase(std::string_view text, std::string_view prefix) {
    if (text.size() < prefix.size()) return false;
    for (std::size_t i = 0; i < prefix.size(); ++i) {
        char c = text[i];
        if (c >= 'A' && c <= 'Z') c = static_cast<char>(c + 32);
        if (c != prefix[i]) return false;
    }
    return true;
}

bool EqualsNoCase(std::u16string_view a, std::u16string_view b) {
    if (a.size() != b.size()) return false;
    for (std::size_t i = 0; i < a.size(); ++i) {
        char16_t x = a[i], y = b[i];
        if (x >= u'A' && x <= u'Z') x = static_cast<char16_t>(x + 32);
        if (y >= u'A' && y <= u'Z') y = static_cast<char16_t>(y + 32);
        if (x != y) return false;
    }
    return true;
}

bool LooksLikeClassId(std::u16string_view s) {
    // {xxxxxxxx-xxxx-xxxx-xxxx-xxxxxxxxxxxx}
    if (s.size() != 38 || s.front() != u'{' || s.back() != u'}') return false;
    for (std::size_t i = 1; i < 37; ++i) {
        char16_t c = s[i];
        bool dash = i == 9 || i == 14 || i == 19 || i == 24;
        if (dash ? c != u'-'
                 : !((c >= u'0' && c <= u'9') || (c >= u'a' && c <= u'f') ||
                     (c >= u'A' && c <= u'F')))
            return false;
    }
    return true;
}

bool LooksLikeProgId(std::u16string_view s) {
    // Program.Component[.Version]: letters, digits, '_' and dots, starting with a letter.
    if (s.empty() || s.size() > 39) return false;
    if (!((s[0] >= u'a' && s[0] <= u'z') || (s[0] >= u'A' && s[0] <= u'Z'))) return false;
    bool dot = false;
    for (char16_t c : s) {
        if (c == u'.') {
            dot = true;
            continue;
        }
        if (!((c >= u'a' && c <= u'z') || (c >= u'A' && c <= u'Z') || (c >= u'0' && c <= u'9') ||
              c == u'_'))
            return false;
    }
    return dot;
}

DOMNodeType NodeTypeOf(const _variant_t& type) {
    if (type.vt == VT_BSTR) {
        static const std::pair<std::u16string_view, DOMNodeType> kNames[] = {
            {u"element", NODE_ELEMENT},
            {u"attribute", NODE_ATTRIBUTE},
            {u"text", NODE_TEXT},
            {u"cdatasection", NODE_CDATA_SECTION},
            {u"processinginstruction", NODE_PROCESSING_INSTRUCTION},
            {u"comment", NODE_COMMENT},
        };
        std::u16string_view text = BstrView(type.bstrVal);
        for (const auto& entry : kNames)
            if (EqualsNoCase(text, entry.first)) return entry.second;
        throw _com_error(E_INVALIDARG, "unknown node type name: " + Utf16ToUtf8(text));
    }
    return static_cast<DOMNodeType>(static_cast<long>(type));
}

}  // namespace

HRESULT IXMLDOMDocument::CreateDocument(const OLECHAR* progId, detail::DomDocument** document,
                                        detail::DomNode** node) noexcept {
    if (!document || !node) return E_POINTER;
    *document = nullptr;
    *node = nullptr;
    if (!progId) return CO_E_CLASSSTRING;
    std::u16string_view id(progId);
    if (!EqualsNoCase(id, kProgIdDOMDocument40) && !EqualsNoCase(id, kClsidDOMDocument40))
        return LooksLikeClassId(id) || LooksLikeProgId(id) ? REGDB_E_CLASSNOTREG : CO_E_CLASSSTRING;
    try {
        auto* created = new DomDocument();
        *document = created;
        *node = &created->node;
        return S_OK;
    } catch (...) {
        return E_OUTOFMEMORY;
    }
}

IXMLDOMElementPtr IXMLDOMDocument::GetdocumentElement() const {
    return IXMLDOMElementPtr(m_doc, const_cast<DomNode*>(RootElement(&m_doc->node)));
}

IXMLDOMNodePtr IXMLDOMDocument::createNode(const _variant_t& type, const _bstr_t& name,
                                           const _bstr_t& namespaceURI) {
    DOMNodeType kind = NodeTypeOf(type);
    std::string qname = Utf8(name);
    std::string ns = Utf8(namespaceURI);
    DomNode* node = nullptr;
    switch (kind) {
        case NODE_ELEMENT:
        case NODE_ATTRIBUTE:
            if (!detail::IsXmlName(qname))
                throw _com_error(E_FAIL, "not a valid name: \"" + qname + "\"");
            node = m_doc->NewNode(kind, m_doc->Intern(kind, qname, ns, true));
            break;
        case NODE_PROCESSING_INSTRUCTION:
            if (!detail::IsXmlName(qname))
                throw _com_error(E_FAIL, "not a valid target: \"" + qname + "\"");
            node = m_doc->NewNode(kind, m_doc->Intern(kind, qname));
            break;
        case NODE_TEXT:
        case NODE_CDATA_SECTION:
        case NODE_COMMENT:
            node = m_doc->NewNode(kind);
            break;
        default:
            throw _com_error(E_INVALIDARG,
                             "createNode cannot make nodes of type " + std::to_string(kind));
    }
    return IXMLDOMNodePtr(m_doc, node);
}

IXMLDOMElementPtr IXMLDOMDocument::createElement(const _bstr_t& tagName) {
    std::string qname = Utf8(tagName);
    if (!detail::IsXmlName(qname)) throw _com_error(E_FAIL, "not a valid name: \"" + qname + "\"");
    return IXMLDOMElementPtr(
        m_doc, m_doc->NewNode(NODE_ELEMENT, m_doc->Intern(NODE_ELEMENT, qname, {}, true)));
}

IXMLDOMAttributePtr IXMLDOMDocument::createAttribute(const _bstr_t& name) {
    std::string qname = Utf8(name);
    if (!detail::IsXmlName(qname)) throw _com_error(E_FAIL, "not a valid name: \"" + qname + "\"");
    return IXMLDOMAttributePtr(
        m_doc, m_doc->NewNode(NODE_ATTRIBUTE, m_doc->Intern(NODE_ATTRIBUTE, qname)));
}

IXMLDOMTextPtr IXMLDOMDocument::createTextNode(const _bstr_t& data) {
    DomNode* node = m_doc->NewNode(NODE_TEXT);
    m_doc->SetText(node, Utf8(data));
    return IXMLDOMTextPtr(m_doc, node);
}

IXMLDOMCommentPtr IXMLDOMDocument::createComment(const _bstr_t& data) {
    DomNode* node = m_doc->NewNode(NODE_COMMENT);
    m_doc->SetText(node, Utf8(data));
    return IXMLDOMCommentPtr(m_doc, node);
}

IXMLDOMProcessingInstructionPtr IXMLDOMDocument::createProcessingInstruction(const _bstr_t& target,
                                                                             const _bstr_t& data) {
    std::string name = Utf8(target);
    if (!detail::IsXmlName(name)) throw _com_error(E_FAIL, "not a valid target: \"" + name + "\"");
    DomNode* node = m_doc->NewNode(NODE_PROCESSING_INSTRUCTION,
                                   m_doc->Intern(NODE_PROCESSING_INSTRUCTION, name));
    if (node->IsDeclaration())
        detail::SetDeclarationText(*m_doc, node, Utf8(data));
    else
        m_doc->SetText(node, Utf8(data));
    return IXMLDOMProcessingInstructionPtr(m_doc, node);
}

VARIANT_BOOL IXMLDOMDocument::load(const _variant_t& source) {
    DomDocument& doc = *m_doc;
    try {
        if (source.vt != VT_BSTR)
            return FailLoad(doc, E_INVALIDARG, "load takes a file path or URL as a string", "");
        std::string location = Utf16ToUtf8(BstrView(source.bstrVal));
        std::string bytes;
        if (StartsWithNoCase(location, "http://") || StartsWithNoCase(location, "https://")) {
            if (!doc.serverHttpRequest)
                return FailLoad(
                    doc, E_ACCESSDENIED,
                    "loading from a URL needs the ServerHTTPRequest property: " + location,
                    location);
            detail::HttpResult fetched = detail::HttpGet(location);
            if (!fetched.ok) return FailLoad(doc, E_FAIL, fetched.error, location);
            bytes = std::move(fetched.body);
            return detail::LoadFromBytes(doc, bytes, nullptr, location, location);
        }
        std::string path = location;
        if (StartsWithNoCase(path, "file://")) path.erase(0, 7);
        return detail::LoadFromFile(doc, path, location);
    } catch (...) {
        return FailLoad(doc, E_OUTOFMEMORY, "out of memory while loading", "");
    }
}

VARIANT_BOOL IXMLDOMDocument::loadXML(const _bstr_t& text) {
    DomDocument& doc = *m_doc;
    try {
        // The string is already decoded: an encoding named in its declaration does not apply.
        return detail::LoadFromBytes(doc, Utf16ToUtf8(text.View()), "UTF-8", std::string(),
                                     std::string());
    } catch (...) {
        return FailLoad(doc, E_OUTOFMEMORY, "out of memory while loading", "");
    }
}

VARIANT_BOOL IXMLDOMDocument::loadBuffer(const void* data, std::size_t size) {
    DomDocument& doc = *m_doc;
    try {
        if (!data && size) return FailLoad(doc, E_POINTER, "no buffer given", "");
        return detail::LoadFromBytes(doc, std::string_view(static_cast<const char*>(data), size),
                                     nullptr, std::string(), std::string());
    } catch (...) {
        return FailLoad(doc, E_OUTOFMEMORY, "out of memory while loading", "");
    }
}

void IXMLDOMDocument::save(const _variant_t& destination) {
    if (destination.vt != VT_BSTR)
        throw _com_error(E_INVALIDARG, "save takes a file path as a string");
    detail::SaveAtomically(&m_doc->node, Utf16ToUtf8(BstrView(destination.bstrVal)), m_doc->indent);
}

IXMLDOMParseErrorPtr IXMLDOMDocument::GetparseError() const {
    return detail::MakeParseError(m_doc->error);
}

void IXMLDOMDocument::Putasync(VARIANT_BOOL async) { m_doc->async = async != VARIANT_FALSE; }
VARIANT_BOOL IXMLDOMDocument::Getasync() const {
    return m_doc->async ? VARIANT_TRUE : VARIANT_FALSE;
}

void IXMLDOMDocument::PutpreserveWhiteSpace(VARIANT_BOOL preserve) {
    m_doc->preserveWhiteSpace = preserve != VARIANT_FALSE;
}
VARIANT_BOOL IXMLDOMDocument::GetpreserveWhiteSpace() const {
    return m_doc->preserveWhiteSpace ? VARIANT_TRUE : VARIANT_FALSE;
}

void IXMLDOMDocument::PutvalidateOnParse(VARIANT_BOOL validate) {
    m_doc->validateOnParse = validate != VARIANT_FALSE;
}
VARIANT_BOOL IXMLDOMDocument::GetvalidateOnParse() const {
    return m_doc->validateOnParse ? VARIANT_TRUE : VARIANT_FALSE;
}

void IXMLDOMDocument2::setProperty(const _bstr_t& name, const _variant_t& value) {
    if (name == u"ServerHTTPRequest") {
        m_doc->serverHttpRequest = static_cast<bool>(value);
    } else if (name == u"MaxElementDepth") {
        long depth = static_cast<long>(value);
        if (depth < 0) throw _com_error(E_INVALIDARG, "MaxElementDepth cannot be negative");
        m_doc->maxElementDepth = depth;
    } else if (name == u"SchemaPath") {
        m_doc->schemaPath = Utf8(_bstr_t(value));
    } else if (name == u"BuiltinSchemaFallback") {
        m_doc->builtinSchemaFallback = static_cast<bool>(value);
    } else if (name == u"Indent") {
        m_doc->indent = static_cast<bool>(value);
    } else {
        throw _com_error(E_INVALIDARG, "unknown property " + Utf8(name));
    }
}

_variant_t IXMLDOMDocument2::getProperty(const _bstr_t& name) const {
    if (name == u"ServerHTTPRequest") return _variant_t(m_doc->serverHttpRequest);
    if (name == u"MaxElementDepth") return _variant_t(m_doc->EffectiveMaxDepth());
    if (name == u"SchemaPath") return _variant_t(_bstr_t(m_doc->schemaPath));
    if (name == u"BuiltinSchemaFallback") return _variant_t(m_doc->builtinSchemaFallback);
    if (name == u"UsedBuiltinSchema") return _variant_t(m_doc->usedBuiltinSchema);
    if (name == u"Indent") return _variant_t(m_doc->indent);
    throw _com_error(E_INVALIDARG, "unknown property " + Utf8(name));
}

void IXMLDOMDocument2::putref_schemas(const IXMLDOMSchemaCollectionPtr& schemas) {
    m_doc->schemas = schemas;
}

IXMLDOMSchemaCollectionPtr IXMLDOMDocument2::Getschemas() const { return m_doc->schemas; }

IXMLDOMParseErrorPtr IXMLDOMDocument2::validate() {
    detail::ValidateContent(*m_doc);
    return detail::MakeParseError(m_doc->error);
}

}  // namespace kest
