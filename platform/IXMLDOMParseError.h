#pragma once
// IXMLDOMParseError: why a load or a validation failed. Code 0 and an empty reason mean success.

#include "Export.h"
#include "IXMLDOMNode.h"

namespace kest {

/// Extension: the kind of failure, where something can be done about it.
enum DomFailureCause : long {
    DOM_CAUSE_OTHER = 0,
    DOM_CAUSE_UNKNOWN_ENCODING = 1,    ///< the document's encoding is not one the parser reads
    DOM_CAUSE_SCHEMA_UNAVAILABLE = 2,  ///< the named schema file is missing, or http while offline
};

class KEST_API IXMLDOMParseError : public RefCounted {
  public:
    /// 0 on success; otherwise a failure code (XML_E_PARSEFAILED, XML_E_INVALID,
    /// E_ACCESSDENIED...).
    virtual long GeterrorCode() = 0;
    /// What is wrong and where, e.g. "mismatched tag at line 3, column 5 in /x/a.xml".
    virtual _bstr_t Getreason() = 0;
    /// The file or URL that was loaded (empty for text loaded from memory).
    virtual _bstr_t Geturl() = 0;
    /// 1-based line and column of the failure; 0 when not known.
    virtual long Getline() = 0;
    virtual long Getlinepos() = 0;
    /// Byte offset of the failure in the source; 0 when not known.
    virtual long Getfilepos() = 0;
    /// The text of the failing line, as far as known.
    virtual _bstr_t GetsrcText() = 0;
    /// Extension: what is wrong without where, element names as written in the document.
    virtual _bstr_t GetreasonText() = 0;
    /// Extension: a DomFailureCause.
    virtual long Getcause() = 0;
};

}  // namespace kest
