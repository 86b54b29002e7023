#pragma once
// The bounded http(s) client behind URL loads and schema fetches. Private to the platform
// layer: no libcurl header appears here.

#include <cstddef>
#include <string>

namespace kest {
namespace detail {

/// What one fetch may cost. Redirects stay within http and https, and never go from https
/// back to http.
struct HttpLimits {
    long timeoutSeconds = 30;  // the whole transfer
    long connectTimeoutSeconds = 15;
    std::size_t maxBytes = std::size_t(1) << 30;
    long maxRedirects = 5;
};

struct HttpResult {
    bool ok = false;
    std::string body;
    std::string error;  // why the fetch failed, naming the URL
};

/// Fetches an http or https URL within `limits`.
HttpResult HttpGet(const std::string& url, const HttpLimits& limits);
/// Fetches with the default limits, but the given time and size.
HttpResult HttpGet(const std::string& url, long timeoutSeconds = 30,
                   std::size_t maxBytes = std::size_t(1) << 30);

}  // namespace detail
}  // namespace kest
