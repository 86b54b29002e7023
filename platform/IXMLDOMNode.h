#pragma once
// DOM nodes. A node pointer (IXMLDOMNodePtr and its relatives) is a small value that refers to
// one node and keeps the node's document alive; copies refer to the same node. Every member
// reached through an empty pointer throws _com_error(E_POINTER); a failing operation throws
// _com_error with its failure code.
//
// Names are reported as written (prefix included): documents are parsed with namespace
// processing off, so `xmlns` and `xmlns:p` are ordinary attributes in document order.

#include <cstddef>
#include <string_view>
#include <type_traits>
#include <utility>

#include "BstrT.h"
#include "ComPtr.h"
#include "Export.h"
#include "VariantT.h"

namespace kest {

// Opaque handles of the DOM implementation; only their addresses appear here.
namespace detail {
struct DomDocument;
struct DomNode;
}  // namespace detail

/// Reference counting of a document, for the node pointers below.
KEST_API void DomAddRef(detail::DomDocument* document) noexcept;
KEST_API void DomRelease(detail::DomDocument* document) noexcept;

enum DOMNodeType {
    NODE_INVALID = 0,
    NODE_ELEMENT = 1,
    NODE_ATTRIBUTE = 2,
    NODE_TEXT = 3,
    NODE_CDATA_SECTION = 4,
    NODE_ENTITY_REFERENCE = 5,
    NODE_ENTITY = 6,
    NODE_PROCESSING_INSTRUCTION = 7,
    NODE_COMMENT = 8,
    NODE_DOCUMENT = 9,
    NODE_DOCUMENT_TYPE = 10,
    NODE_DOCUMENT_FRAGMENT = 11,
    NODE_NOTATION = 12,
};

class IXMLDOMNode;
class IXMLDOMElement;
class IXMLDOMAttribute;
class IXMLDOMText;
class IXMLDOMComment;
class IXMLDOMProcessingInstruction;
class IXMLDOMDocument;
class IXMLDOMDocument2;
class IXMLDOMNodeList;
class IXMLDOMNamedNodeMap;
class IXMLDOMParseError;
class IXMLDOMSchemaCollection;

/// Smart pointer to a node of interface I. Converting to a more specific interface yields an
/// empty pointer when the node is not of that kind (as a failed QueryInterface would).
template <class I>
class DomPtr {
  public:
    DomPtr() noexcept = default;
    DomPtr(std::nullptr_t) noexcept {}
    DomPtr(const DomPtr& other) noexcept : DomPtr(other.m_handle.m_doc, other.m_handle.m_node) {}
    DomPtr(DomPtr&& other) noexcept : m_handle(std::exchange(other.m_handle, I())) {}
    template <class J>
    DomPtr(const DomPtr<J>& other) noexcept
        : DomPtr(I::Accepts(other.m_handle.m_node) ? other.m_handle.m_doc : nullptr,
                 I::Accepts(other.m_handle.m_node) ? other.m_handle.m_node : nullptr) {}
    ~DomPtr() { Release(); }
    DomPtr& operator=(DomPtr other) noexcept {
        std::swap(m_handle, other.m_handle);
        return *this;
    }
    DomPtr& operator=(std::nullptr_t) noexcept {
        Release();
        return *this;
    }

    /// Throws _com_error(E_POINTER) when empty.
    I* operator->() const {
        if (!m_handle.m_node) throw _com_error(E_POINTER);
        return &m_handle;
    }
    I& operator*() const { return *operator->(); }
    /// A plain pointer, valid while this smart pointer lives; null when empty.
    I* GetInterfacePtr() const noexcept { return m_handle.m_node ? &m_handle : nullptr; }
    explicit operator bool() const noexcept { return m_handle.m_node != nullptr; }
    bool operator!() const noexcept { return m_handle.m_node == nullptr; }
    /// Identity: both refer to the same node.
    template <class J>
    bool operator==(const DomPtr<J>& other) const noexcept {
        return m_handle.m_node == other.m_handle.m_node;
    }
    template <class J>
    bool operator!=(const DomPtr<J>& other) const noexcept {
        return m_handle.m_node != other.m_handle.m_node;
    }
    bool operator==(std::nullptr_t) const noexcept { return m_handle.m_node == nullptr; }
    bool operator!=(std::nullptr_t) const noexcept { return m_handle.m_node != nullptr; }
    void Release() noexcept {
        if (m_handle.m_doc) DomRelease(m_handle.m_doc);
        m_handle = I();
    }
    /// Documents only: creates a document by ProgID ("Msxml2.DOMDocument.4.0") or class id
    /// ("{88d969c0-f192-11d4-a65f-0040963251e5}"); returns the failure code otherwise.
    HRESULT CreateInstance(const OLECHAR* progId) noexcept {
        static_assert(std::is_base_of<IXMLDOMDocument, I>::value, "documents only");
        detail::DomDocument* document = nullptr;
        detail::DomNode* node = nullptr;
        HRESULT hr = I::CreateDocument(progId, &document, &node);
        if (SUCCEEDED(hr)) {
            *this = DomPtr(document, node);
            DomRelease(document);  // CreateDocument returned one reference
        }
        return hr;
    }

    /// For the DOM implementation: a pointer to `node`, taking a new reference to `document`.
    DomPtr(detail::DomDocument* document, detail::DomNode* node) noexcept {
        if (document && node) {
            DomAddRef(document);
            m_handle.m_doc = document;
            m_handle.m_node = node;
        }
    }

  private:
    template <class J>
    friend class DomPtr;
    mutable I m_handle;
};

using IXMLDOMNodePtr = DomPtr<IXMLDOMNode>;
using IXMLDOMElementPtr = DomPtr<IXMLDOMElement>;
using IXMLDOMAttributePtr = DomPtr<IXMLDOMAttribute>;
using IXMLDOMTextPtr = DomPtr<IXMLDOMText>;
using IXMLDOMCommentPtr = DomPtr<IXMLDOMComment>;
using IXMLDOMProcessingInstructionPtr = DomPtr<IXMLDOMProcessingInstruction>;
using IXMLDOMDocumentPtr = DomPtr<IXMLDOMDocument>;
using IXMLDOMDocument2Ptr = DomPtr<IXMLDOMDocument2>;
using IXMLDOMNodeListPtr = ComPtr<IXMLDOMNodeList>;
using IXMLDOMNamedNodeMapPtr = ComPtr<IXMLDOMNamedNodeMap>;
using IXMLDOMParseErrorPtr = ComPtr<IXMLDOMParseError>;
using IXMLDOMSchemaCollectionPtr = ComPtr<IXMLDOMSchemaCollection>;

/// Any node. Reached through a DomPtr.
class KEST_API IXMLDOMNode {
  public:
    /// The node's kind.
    DOMNodeType GetnodeType() const;
    /// The qualified name as written; "#text", "#cdata-section", "#comment", "#document" for
    /// nodes without a name.
    _bstr_t GetnodeName() const;
    /// Extension: true when the node's name (as GetnodeName gives it) equals `name`, without
    /// building a string; readers test every child's name this way.
    bool NameIs(std::u16string_view name) const;
    /// The text of an attribute, text, CDATA section, comment or processing instruction as
    /// VT_BSTR; VT_NULL for elements and documents.
    _variant_t GetnodeValue() const;
    /// Sets the text (the value is converted to a string); E_FAIL for elements and documents.
    void PutnodeValue(const _variant_t& value);
    /// Extension (no MSXML counterpart), for callers that hold text as UTF-8 already: the value
    /// as stored, without a conversion to UTF-16. False for elements and documents (where
    /// GetnodeValue gives VT_NULL) and for the XML declaration, whose value is composed from
    /// its pseudo-attributes rather than stored (GetnodeValue gives it). The view stays valid
    /// until the node's value changes or the document dies.
    bool GetnodeValueUtf8(std::string_view& text) const;
    /// Extension (no MSXML counterpart): where a text node read from a file starts, 1-based;
    /// false (and 0, 0) for other nodes and for text created or changed since the load.
    bool GettextPosition(long& line, long& column) const noexcept;
    /// Extension (no MSXML counterpart): PutnodeValue of a string given as UTF-8, stored
    /// without a detour through UTF-16. Same rules: E_FAIL for elements and documents; for the
    /// XML declaration the text is parsed as its pseudo-attributes. `utf8` must be valid UTF-8
    /// (it is stored as it stands, not checked): pass only text produced as UTF-8.
    void PutnodeValueUtf8(std::string_view utf8);
    /// The namespace URI the node was created in (empty for parsed nodes and for none).
    _bstr_t GetnamespaceURI() const;
    /// The text content: the node's value, or the concatenated text of an element's subtree.
    _bstr_t Gettext() const;
    /// The node and its subtree as XML text.
    _bstr_t Getxml() const;
    /// The children in document order (a live list; empty for attributes).
    IXMLDOMNodeListPtr GetchildNodes() const;
    /// The attributes of an element (or pseudo-attributes of the XML declaration) in document
    /// order; an empty pointer for every other kind of node, documents included.
    IXMLDOMNamedNodeMapPtr Getattributes() const;
    IXMLDOMNodePtr GetparentNode() const;
    IXMLDOMNodePtr GetfirstChild() const;
    IXMLDOMNodePtr GetlastChild() const;
    IXMLDOMNodePtr GetnextSibling() const;
    IXMLDOMNodePtr GetpreviousSibling() const;
    VARIANT_BOOL hasChildNodes() const;
    IXMLDOMDocumentPtr GetownerDocument() const;
    /// Appends `child` (a node of the same document, not an attribute) as the last child,
    /// detaching it from a former parent; returns it. E_POINTER for an empty child,
    /// E_INVALIDARG for a node of another document or one that cannot go here.
    IXMLDOMNodePtr appendChild(const IXMLDOMNodePtr& child);

    /// Every node kind is accepted by this interface.
    static bool Accepts(const detail::DomNode* node) noexcept { return node != nullptr; }

  protected:
    template <class J>
    friend class DomPtr;
    friend struct detail::DomDocument;
    detail::DomDocument* m_doc = nullptr;
    detail::DomNode* m_node = nullptr;
};

/// Kind checks used by the pointer conversions.
KEST_API bool DomNodeIs(const detail::DomNode* node, DOMNodeType type) noexcept;

class KEST_API IXMLDOMElement : public IXMLDOMNode {
  public:
    /// The attribute with this qualified name, or an empty pointer.
    IXMLDOMAttributePtr getAttributeNode(const _bstr_t& name) const;
    /// The attribute's value as VT_BSTR, or VT_NULL when there is none.
    _variant_t getAttribute(const _bstr_t& name) const;
    /// Sets (or adds, last) the attribute with this qualified name.
    void setAttribute(const _bstr_t& name, const _variant_t& value);
    _bstr_t GettagName() const { return GetnodeName(); }
    static bool Accepts(const detail::DomNode* node) noexcept {
        return DomNodeIs(node, NODE_ELEMENT);
    }
};

class KEST_API IXMLDOMAttribute : public IXMLDOMNode {
  public:
    static bool Accepts(const detail::DomNode* node) noexcept {
        return DomNodeIs(node, NODE_ATTRIBUTE);
    }
};

class KEST_API IXMLDOMText : public IXMLDOMNode {
  public:
    static bool Accepts(const detail::DomNode* node) noexcept {
        return DomNodeIs(node, NODE_TEXT) || DomNodeIs(node, NODE_CDATA_SECTION);
    }
};

class KEST_API IXMLDOMComment : public IXMLDOMNode {
  public:
    static bool Accepts(const detail::DomNode* node) noexcept {
        return DomNodeIs(node, NODE_COMMENT);
    }
};

class KEST_API IXMLDOMProcessingInstruction : public IXMLDOMNode {
  public:
    static bool Accepts(const detail::DomNode* node) noexcept {
        return DomNodeIs(node, NODE_PROCESSING_INSTRUCTION);
    }
};

}  // namespace kest
