#pragma once
// IXMLDOMDocument and IXMLDOMDocument2: load, build, save and validate XML documents.
//
// Loading uses expat with namespace processing off. External entities and DTDs are never
// fetched, entity expansion is bounded by expat, and element nesting deeper than
// kDefaultMaxElementDepth (or the "MaxElementDepth" property) fails the load. Text is kept as
// the parser delivers it: adjacent character data becomes one text node, whitespace-only text
// between elements included. The XML declaration becomes a processing instruction "xml" whose
// pseudo-attributes (version, encoding, standalone) are its attributes. A failed load leaves the
// document empty; nodes of earlier content that are still referenced stay readable, detached.

#include <cstddef>

#include "Export.h"
#include "IXMLDOMNamedNodeMap.h"
#include "IXMLDOMNode.h"
#include "IXMLDOMNodeList.h"
#include "IXMLDOMParseError.h"
#include "IXMLDOMSchemaCollection.h"

namespace kest {

/// ProgIDs and class id understood by CreateInstance.
constexpr const OLECHAR* kProgIdDOMDocument40 = u"Msxml2.DOMDocument.4.0";
constexpr const OLECHAR* kClsidDOMDocument40 = u"{88d969c0-f192-11d4-a65f-0040963251e5}";
constexpr const OLECHAR* kProgIdXMLSchemaCache40 = u"Msxml2.XMLSchemaCache.4.0";
/// Default limit of element nesting while loading.
constexpr long kDefaultMaxElementDepth = 10000;

class KEST_API IXMLDOMDocument : public IXMLDOMNode {
  public:
    /// The root element, or an empty pointer.
    IXMLDOMElementPtr GetdocumentElement() const;
    /// New unattached node of kind `type` (an integer VARIANT: 1 element, 2 attribute, 3 text,
    /// 4 CDATA, 7 processing instruction, 8 comment) with the qualified name and the namespace
    /// URI given; the saver declares the namespace where it is not in scope.
    IXMLDOMNodePtr createNode(const _variant_t& type, const _bstr_t& name,
                              const _bstr_t& namespaceURI);
    IXMLDOMElementPtr createElement(const _bstr_t& tagName);
    IXMLDOMAttributePtr createAttribute(const _bstr_t& name);
    IXMLDOMTextPtr createTextNode(const _bstr_t& data);
    IXMLDOMCommentPtr createComment(const _bstr_t& data);
    IXMLDOMProcessingInstructionPtr createProcessingInstruction(const _bstr_t& target,
                                                                const _bstr_t& data);

    /// Loads a file path ("-" for standard input; pipes are read once) or (with
    /// "ServerHTTPRequest" true) an http/https URL, replacing the content. Never throws for a bad
    /// source: returns VARIANT_FALSE and fills the parse error.
    VARIANT_BOOL load(const _variant_t& source);
    /// Loads XML text given as a string.
    VARIANT_BOOL loadXML(const _bstr_t& text);
    /// Loads XML from bytes in memory (encoding detected from BOM or declaration).
    VARIANT_BOOL loadBuffer(const void* data, std::size_t size);
    /// Writes the document as UTF-8 to a file path, atomically: a temporary file in the target
    /// directory, named after the writing process, is synced and renamed on success, and the
    /// directory synced; temporaries of ended processes are removed by the next save. On failure
    /// throws _com_error and leaves any earlier file untouched. The declaration is written from the
    /// document's "xml" processing instruction, its encoding always "UTF-8"; a document without one
    /// is written without.
    void save(const _variant_t& destination);
    /// The result of the last load or validation.
    IXMLDOMParseErrorPtr GetparseError() const;

    void Putasync(VARIANT_BOOL async);
    VARIANT_BOOL Getasync() const;
    /// On in a new document: every character the parser delivers is kept, white space between
    /// elements included. Switched off, a load drops text of white space alone that stands
    /// beside an element (indentation); white space inside text-only content always stays.
    void PutpreserveWhiteSpace(VARIANT_BOOL preserve);
    VARIANT_BOOL GetpreserveWhiteSpace() const;
    /// On in a new document: a load checks the document against the schemas its root names.
    void PutvalidateOnParse(VARIANT_BOOL validate);
    VARIANT_BOOL GetvalidateOnParse() const;

    static bool Accepts(const detail::DomNode* node) noexcept {
        return DomNodeIs(node, NODE_DOCUMENT);
    }
    /// Used by DomPtr::CreateInstance. Names are compared case-insensitively; another ProgID or
    /// class id gives REGDB_E_CLASSNOTREG, text that is neither gives CO_E_CLASSSTRING.
    static HRESULT CreateDocument(const OLECHAR* progId, detail::DomDocument** document,
                                  detail::DomNode** node) noexcept;
};

class KEST_API IXMLDOMDocument2 : public IXMLDOMDocument {
  public:
    /// Properties: "ServerHTTPRequest" (bool: allow http/https sources and schema locations),
    /// "MaxElementDepth" (integer, 0 for the default). Extensions: "SchemaPath" (string: a
    /// schema path or URL to validate against instead of those the root names),
    /// "BuiltinSchemaFallback" (bool: a root naming one missing local schema in the CDF
    /// namespace, or an http one without ServerHTTPRequest, is validated against the library's
    /// built-in cdf.xsd) and, to read only, "UsedBuiltinSchema" (the last load or validation
    /// did so).
    /// "Indent" (bool, off in a new document: save puts each child of an element holding only
    /// elements on a line of its own, two spaces per level; an extension of ours). Other
    /// names: E_INVALIDARG.
    void setProperty(const _bstr_t& name, const _variant_t& value);
    _variant_t getProperty(const _bstr_t& name) const;
    /// Attaches a schema collection used by validate(); an empty pointer detaches it.
    void putref_schemas(const IXMLDOMSchemaCollectionPtr& schemas);
    IXMLDOMSchemaCollectionPtr Getschemas() const;
    /// Validates the document against the attached schemas (or, with none attached, those its
    /// root names). The result's reason is empty when the document is valid.
    IXMLDOMParseErrorPtr validate();
};

}  // namespace kest
