#include "DomCollections.h"

namespace kest {
namespace detail {

DomChain::DomChain(DomDocument* document, DomNode* owner, bool attributes) noexcept
    : m_doc(document), m_owner(owner), m_attributes(attributes) {
    DomAddRef(m_doc);
}

DomChain::~DomChain() { DomRelease(m_doc); }

IXMLDOMNodePtr DomChain::Next() {
    if (!m_started) {
        m_started = true;
        m_cursor = First();
    } else if (m_cursor) {
        // The node returned last may have moved since; then the walk ends rather than
        // continuing in its new place.
        DomNode* owner = m_cursor->parent;
        m_cursor = owner == m_owner ? m_cursor->next : nullptr;
    }
    return Wrap(m_cursor);
}

long DomChain::Length() const noexcept {
    long n = 0;
    for (DomNode* node = First(); node; node = node->next) ++n;
    return n;
}

IXMLDOMNodePtr DomChain::Item(long index) {
    if (index < 0) return nullptr;
    DomNode* node = nullptr;
    long i = 0;
    if (m_generation == m_doc->generation && m_cachedNode && index >= m_cachedIndex) {
        node = m_cachedNode;
        i = m_cachedIndex;
    } else {
        node = First();
    }
    for (; node && i < index; ++i) node = node->next;
    if (!node) return nullptr;
    m_generation = m_doc->generation;
    m_cachedIndex = index;
    m_cachedNode = node;
    return Wrap(node);
}

namespace {

class ChildList final : public IXMLDOMNodeList {
  public:
    ChildList(DomDocument* document, DomNode* owner) : m_chain(document, owner, false) {}
    IXMLDOMNodePtr nextNode() override { return m_chain.Next(); }
    void reset() override { m_chain.Reset(); }
    long Getlength() override { return m_chain.Length(); }
    IXMLDOMNodePtr Getitem(long index) override { return m_chain.Item(index); }

  private:
    DomChain m_chain;
};

class AttributeMap final : public IXMLDOMNamedNodeMap {
  public:
    AttributeMap(DomDocument* document, DomNode* owner) : m_chain(document, owner, true) {}
    IXMLDOMNodePtr nextNode() override { return m_chain.Next(); }
    void reset() override { m_chain.Reset(); }
    long Getlength() override { return m_chain.Length(); }
    IXMLDOMNodePtr Getitem(long index) override { return m_chain.Item(index); }

    IXMLDOMNodePtr getNamedItem(const _bstr_t& name) override {
        return m_chain.Wrap(FindAttribute(m_chain.m_owner, Utf16ToUtf8(name.View())));
    }

    IXMLDOMNodePtr setNamedItem(const IXMLDOMNodePtr& attribute) override {
        IXMLDOMNode* handle = attribute.GetInterfacePtr();
        if (!handle) throw _com_error(E_POINTER);
        IXMLDOMAttributePtr typed(attribute);
        if (!typed) throw _com_error(E_INVALIDARG, "setNamedItem takes an attribute node");
        DomNode* node = Node(attribute);
        if (Document(attribute) != m_chain.m_doc)
            throw _com_error(E_INVALIDARG, "the attribute belongs to another document");
        DomNode* owner = m_chain.m_owner;
        if (node->parent == owner) return attribute;  // already here
        if (node->parent)
            throw _com_error(E_INVALIDARG, "the attribute is already attached to an element");
        DomNode* old = FindAttribute(owner, node->Name());
        if (old) {
            // Replace in place, keeping the attribute's position.
            node->parent = owner;
            node->prev = old->prev;
            node->next = old->next;
            if (old->prev)
                old->prev->next = node;
            else
                owner->SetFirstAttribute(node);
            if (old->next) old->next->prev = node;
            old->parent = old->prev = old->next = nullptr;
        } else {
            LinkAttribute(owner, node);
        }
        ++m_chain.m_doc->generation;
        return attribute;
    }

    IXMLDOMNodePtr removeNamedItem(const _bstr_t& name) override {
        DomNode* node = FindAttribute(m_chain.m_owner, Utf16ToUtf8(name.View()));
        if (!node) return nullptr;
        Unlink(node);
        ++m_chain.m_doc->generation;
        return m_chain.Wrap(node);
    }

  private:
    static DomNode* Node(const IXMLDOMNodePtr& p) {
        return DomDocument::NodeOf(p.GetInterfacePtr());
    }
    static DomDocument* Document(const IXMLDOMNodePtr& p) {
        return DomDocument::DocumentOf(p.GetInterfacePtr());
    }

    DomChain m_chain;
};

class ParseError final : public IXMLDOMParseError {
  public:
    explicit ParseError(const DomError& error) : m_error(error) {}
    long GeterrorCode() override { return m_error.code; }
    _bstr_t Getreason() override { return _bstr_t(m_error.reason); }
    _bstr_t Geturl() override { return _bstr_t(m_error.url); }
    long Getline() override { return m_error.line; }
    long Getlinepos() override { return m_error.linepos; }
    long Getfilepos() override { return m_error.filepos; }
    _bstr_t GetsrcText() override { return _bstr_t(m_error.srcText); }
    _bstr_t GetreasonText() override {
        return _bstr_t(m_error.what.empty() ? m_error.reason : m_error.what);
    }
    long Getcause() override { return m_error.cause; }

  private:
    DomError m_error;
};

}  // namespace

IXMLDOMNodeListPtr MakeChildList(DomDocument* document, DomNode* owner) {
    return IXMLDOMNodeListPtr(new ChildList(document, owner));
}

IXMLDOMNamedNodeMapPtr MakeAttributeMap(DomDocument* document, DomNode* owner) {
    return IXMLDOMNamedNodeMapPtr(new AttributeMap(document, owner));
}

IXMLDOMParseErrorPtr MakeParseError(const DomError& error) {
    return IXMLDOMParseErrorPtr(new ParseError(error));
}

}  // namespace detail
}  // namespace kest
