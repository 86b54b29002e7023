#pragma once
// Heap objects handed out by the DOM: child lists, attribute maps and parse errors.

#include "../IXMLDOMNamedNodeMap.h"
#include "../IXMLDOMNodeList.h"
#include "../IXMLDOMParseError.h"
#include "DomDocument.h"

namespace kest {
namespace detail {

/// A live view of the children (or, for `attributes`, the attribute chain) of a node.
/// Holds a reference to the document.
class DomChain {
  public:
    DomChain(DomDocument* document, DomNode* owner, bool attributes) noexcept;
    ~DomChain();
    DomChain(const DomChain&) = delete;
    DomChain& operator=(const DomChain&) = delete;

    DomNode* First() const noexcept {
        return m_attributes ? m_owner->FirstAttribute() : m_owner->FirstChild();
    }
    IXMLDOMNodePtr Next();
    void Reset() noexcept { m_started = false; }
    long Length() const noexcept;
    IXMLDOMNodePtr Item(long index);
    IXMLDOMNodePtr Wrap(DomNode* node) const { return IXMLDOMNodePtr(m_doc, node); }

    DomDocument* m_doc;
    DomNode* m_owner;

  private:
    bool m_attributes;
    bool m_started = false;
    DomNode* m_cursor = nullptr;  // the node nextNode returned last
    // Cached position for repeated item() access, valid while the generation is unchanged.
    std::uint64_t m_generation = ~std::uint64_t(0);
    long m_cachedIndex = -1;
    DomNode* m_cachedNode = nullptr;
};

IXMLDOMNodeListPtr MakeChildList(DomDocument* document, DomNode* owner);
IXMLDOMNamedNodeMapPtr MakeAttributeMap(DomDocument* document, DomNode* owner);
IXMLDOMParseErrorPtr MakeParseError(const DomError& error);

}  // namespace detail
}  // namespace kest
