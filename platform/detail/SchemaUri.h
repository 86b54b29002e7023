#pragma once
// Schema locations as URIs: their scheme, local file URLs, and resolution against the document
// that names them. Private to the platform layer.

#include <string>

namespace kest {
namespace detail {

/// The URI scheme of `text` in lower case, or "" when it has none.
std::string SchemeOf(const std::string& text);
/// True for http: and https: URLs (any case).
bool IsHttpUrl(const std::string& text);
/// "file:///a%20b/c.xsd" or "file://localhost/a" to a path; "" when it is no local file URL.
std::string FileUrlToPath(const std::string& url);
/// A path escaped for use in a file: URL (slashes kept).
std::string EscapePathForUri(const std::string& path);

/// Turns a schema location into an absolute path or an http(s) URL: relative locations are
/// taken against the directory of `baseUrl` (a path or an http(s) URL; empty for the current
/// directory), file: URLs become paths. Returns false, with the reason in `error`, for an empty
/// location or another scheme.
bool ResolveSchemaLocation(const std::string& location, const std::string& baseUrl,
                           std::string& resolved, std::string& error);

}  // namespace detail
}  // namespace kest
