#pragma once
// Schema validation of documents, for the DOM. Private to the platform layer: no third-party
// header appears here.

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "../HResult.h"
#include "HttpClient.h"

namespace kest {
class IXMLDOMSchemaCollection;

namespace detail {

/// A schema a document names: its namespace (empty for xsi:noNamespaceSchemaLocation) and its
/// location as written.
struct SchemaRef {
    std::string namespaceURI;
    std::string location;
};

/// Outcome of a validation: code S_OK and empty reason when valid. Otherwise the reason says
/// what is wrong, naming the schema location or the document and the line.
struct ValidationOutcome {
    HRESULT code = S_OK;
    std::string reason;
    std::string what;  // the reason without the position ("" when it has none)
    long line = 0;
    long column = 0;
    std::string url;
    bool schemaUnavailable = false;  // the schema file does not exist, or is http while offline
    bool offline = false;            // an http schema was needed while http was not allowed
    bool usedBuiltin = false;        // validated against the built-in cdf.xsd
};

/// How a document is validated against the schemas it names.
struct ValidationRequest {
    std::string documentUrl;  // names the document in reasons
    std::string baseUrl;      // relative locations resolve against its directory ("": cwd)
    bool allowHttp = false;   // fetch http(s) schemas and includes
    /// A single named schema in the built-in cdf.xsd's namespace whose local file is missing,
    /// or which is http while http is not allowed, is replaced by the built-in copy.
    bool builtinFallback = false;
    std::string schemaPath;  // non-empty: validate against this schema instead
};

/// Validates the document bytes against the schemas it names (or the one the request gives).
/// Compiled schemas are cached per path and modification time, safely across threads.
ValidationOutcome ValidateDocument(std::string_view document, const std::vector<SchemaRef>& refs,
                                   const ValidationRequest& request);

/// ValidateDocument with the locations resolved against the document's own directory.
ValidationOutcome ValidateAgainstNamedSchemas(std::string_view document,
                                              const std::string& documentUrl,
                                              const std::vector<SchemaRef>& refs, bool allowHttp);

/// Validates the document bytes against the schemas of a collection.
ValidationOutcome ValidateAgainstCollection(std::string_view document,
                                            const std::string& documentUrl,
                                            IXMLDOMSchemaCollection& collection);

/// True when libxml2's parser and schema validator initialise (for the service check).
bool SchemaValidatorUsable() noexcept;

}  // namespace detail
}  // namespace kest
