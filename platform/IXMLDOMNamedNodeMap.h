#pragma once
// IXMLDOMNamedNodeMap: the attributes of an element (or the pseudo-attributes of the XML
// declaration) in document order.

#include "Export.h"
#include "IXMLDOMNode.h"

namespace kest {

class KEST_API IXMLDOMNamedNodeMap : public RefCounted {
  public:
    /// The next attribute, or an empty pointer after the last one.
    virtual IXMLDOMNodePtr nextNode() = 0;
    virtual void reset() = 0;
    virtual long Getlength() = 0;
    /// The attribute at index (0-based), or an empty pointer.
    virtual IXMLDOMNodePtr Getitem(long index) = 0;
    /// The attribute with this qualified name, or an empty pointer.
    virtual IXMLDOMNodePtr getNamedItem(const _bstr_t& name) = 0;
    /// Adds an attribute node (replacing one of the same name in place, else appending it last);
    /// returns it. E_POINTER for an empty node, E_INVALIDARG for a node that is no attribute,
    /// belongs to another document or is already attached elsewhere.
    virtual IXMLDOMNodePtr setNamedItem(const IXMLDOMNodePtr& attribute) = 0;
    /// Removes and returns the named attribute, or an empty pointer.
    virtual IXMLDOMNodePtr removeNamedItem(const _bstr_t& name) = 0;
};

}  // namespace kest
