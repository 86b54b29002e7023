#pragma once
// Schema validation with libxml2 and http fetching with libcurl, for the DOM. Private to the
// platform layer: no third-party header appears here.

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "../HResult.h"

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
    long line = 0;
    long column = 0;
    std::string url;
};

/// Validates the document bytes against the schemas it names. Relative locations are resolved
/// against the directory of `documentUrl`; http(s) locations are fetched only when `allowHttp`.
/// Compiled schemas are cached per path and modification time, safely across threads.
ValidationOutcome ValidateAgainstNamedSchemas(std::string_view document,
                                              const std::string& documentUrl,
                                              const std::vector<SchemaRef>& refs, bool allowHttp);

/// Validates the document bytes against the schemas of a collection.
ValidationOutcome ValidateAgainstCollection(std::string_view document,
                                            const std::string& documentUrl,
                                            IXMLDOMSchemaCollection& collection);

/// Fetches an http or https URL with a bounded time and size.
struct HttpResult {
    bool ok = false;
    std::string body;
    std::string error;  // why the fetch failed, naming the URL
};
HttpResult HttpGet(const std::string& url, long timeoutSeconds = 30,
                   std::size_t maxBytes = std::size_t(1) << 30);

/// True when libxml2's parser and schema validator initialise (for the service check).
bool SchemaValidatorUsable() noexcept;

}  // namespace detail
}  // namespace kest
