#pragma once
// How KestCalmorph reads and checks files: an extension of the converter, set per converter.

#include <string>

namespace kest {

/// Read options of one converter (KestCalmorph::SetReadOptions). The defaults read as the
/// converter always has: validated against the schema the file names, fetched over http(s) when
/// the file names a URL.
///
/// Network access: with `allowNetwork` on, a file decides which http(s) URLs the library fetches
/// (its schema location and the includes of that schema), each within the client's limits (time,
/// size, redirects within http and https only). A service that reads files it does not trust
/// should switch `allowNetwork` off, so that a file cannot make it contact other hosts.
struct KestReadOptions {
    /// Validate against a schema while loading.
    bool validate = true;
    /// Fetch http(s) schema locations (and the schema's includes) within the client's limits.
    bool allowNetwork = true;
    /// Non-empty: validate against this XSD (path or URL) instead of the schema the file names.
    std::string schemaPath;
    /// A CDF-namespace file naming a local schema that does not exist (or an http one while the
    /// network is off) is validated against the library's built-in copy of cdf.xsd.
    bool builtinSchemaFallback = false;
};

}  // namespace kest
