#pragma once
// IXMLDOMSchemaCollection: compiled XSD schemas by target namespace, attached to documents
// for validate().

#include "Export.h"
#include "IXMLDOMNode.h"

namespace kest {

class KEST_API IXMLDOMSchemaCollection : public RefCounted {
  public:
    /// Compiles the schema at `location` (a path or, when allowed, a URL) and registers it under
    /// `namespaceURI`. Throws _com_error when it cannot be read or compiled, or when its target
    /// namespace differs from `namespaceURI`; the collection is then unchanged.
    virtual void add(const _bstr_t& namespaceURI, const _variant_t& location) = 0;
    virtual long Getlength() = 0;
    /// The namespace URI at index, or E_INVALIDARG outside the collection.
    virtual _bstr_t GetnamespaceURI(long index) = 0;
    /// Removes the schema of that namespace, if any.
    virtual void remove(const _bstr_t& namespaceURI) = 0;
    /// Extension: whether add() may fetch http(s) schemas and includes (true in a new
    /// collection), as the "ServerHTTPRequest" property does for a document.
    virtual void PutserverHttpRequest(bool allow) = 0;

    /// Creates an empty collection for ProgID "Msxml2.XMLSchemaCache.4.0"; the caller owns the
    /// returned reference count of zero through ComPtr. Other names give REGDB_E_CLASSNOTREG.
    static HRESULT CreateInstance(const OLECHAR* progId, IXMLDOMSchemaCollection** result) noexcept;
    /// True when the schema validator behind the collections and documents starts up.
    static bool ValidatorUsable() noexcept;
};

}  // namespace kest
