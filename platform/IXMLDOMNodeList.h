#pragma once
// IXMLDOMNodeList: the children of a node, walked with nextNode in document order.

#include "Export.h"
#include "IXMLDOMNode.h"

namespace kest {

class KEST_API IXMLDOMNodeList : public RefCounted {
  public:
    /// The next node, or an empty pointer after the last one.
    virtual IXMLDOMNodePtr nextNode() = 0;
    /// Starts the walk again at the first node.
    virtual void reset() = 0;
    /// Number of nodes.
    virtual long Getlength() = 0;
    /// The node at index (0-based), or an empty pointer outside the list.
    virtual IXMLDOMNodePtr Getitem(long index) = 0;
};

}  // namespace kest
