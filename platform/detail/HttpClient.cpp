#include "HttpClient.h"

#include <curl/curl.h>

#include <algorithm>
#include <climits>

#include "SchemaUri.h"

namespace kest {
namespace detail {

namespace {

struct Download {
    std::string body;
    std::size_t maxBytes = 0;
    bool tooLarge = false;
};

std::size_t WriteBody(char* data, std::size_t size, std::size_t count, void* context) {
    auto* download = static_cast<Download*>(context);
    std::size_t bytes = size * count;
    if (download->body.size() + bytes > download->maxBytes) {
        download->tooLarge = true;
        return 0;  // makes curl abort the transfer
    }
    download->body.append(data, bytes);
    return bytes;
}

bool InitCurl() {
    static bool ok = curl_global_init(CURL_GLOBAL_DEFAULT) == CURLE_OK;
    return ok;
}

}  // namespace

HttpResult HttpGet(const std::string& url, long timeoutSeconds, std::size_t maxBytes) {
    HttpLimits limits;
    limits.timeoutSeconds = timeoutSeconds;
    limits.maxBytes = maxBytes;
    return HttpGet(url, limits);
}

HttpResult HttpGet(const std::string& url, const HttpLimits& limits) {
    HttpResult result;
    std::string scheme = SchemeOf(url);
    if (scheme != "http" && scheme != "https") {
        result.error = "cannot fetch " + url + ": only http and https URLs are fetched";
        return result;
    }
    if (!InitCurl()) {
        result.error = "cannot fetch " + url + ": the http client failed to initialise";
        return result;
    }
    CURL* curl = curl_easy_init();
    if (!curl) {
        result.error = "cannot fetch " + url + ": the http client failed to initialise";
        return result;
    }
    Download download;
    download.maxBytes = limits.maxBytes;
    char curlError[CURL_ERROR_SIZE] = {};
    long timeoutMs = limits.timeoutSeconds > 0 ? limits.timeoutSeconds * 1000 : 30000;
    long connectMs = limits.connectTimeoutSeconds > 0 ? limits.connectTimeoutSeconds * 1000 : 15000;
    curl_easy_setopt(curl, CURLOPT_URL, url.c_str());
    curl_easy_setopt(curl, CURLOPT_PROTOCOLS_STR, "http,https");
    // A redirect may upgrade http to https, never leave them nor fall back from https to http.
    curl_easy_setopt(curl, CURLOPT_REDIR_PROTOCOLS_STR, scheme == "https" ? "https" : "http,https");
    curl_easy_setopt(curl, CURLOPT_FOLLOWLOCATION, limits.maxRedirects > 0 ? 1L : 0L);
    curl_easy_setopt(curl, CURLOPT_MAXREDIRS, limits.maxRedirects);
    curl_easy_setopt(curl, CURLOPT_CONNECTTIMEOUT_MS, std::min(timeoutMs, connectMs));
    curl_easy_setopt(curl, CURLOPT_TIMEOUT_MS, timeoutMs);
    curl_easy_setopt(curl, CURLOPT_NOSIGNAL, 1L);
    curl_easy_setopt(curl, CURLOPT_NOPROXY, "localhost,127.0.0.1,::1");
    curl_easy_setopt(curl, CURLOPT_USERAGENT, "kestcalmorph");
    curl_easy_setopt(curl, CURLOPT_ACCEPT_ENCODING, "");
    curl_easy_setopt(curl, CURLOPT_ERRORBUFFER, curlError);
    curl_easy_setopt(curl, CURLOPT_WRITEFUNCTION, WriteBody);
    curl_easy_setopt(curl, CURLOPT_WRITEDATA, &download);
    if (limits.maxBytes < static_cast<std::size_t>(LLONG_MAX))
        curl_easy_setopt(curl, CURLOPT_MAXFILESIZE_LARGE, static_cast<curl_off_t>(limits.maxBytes));

    CURLcode code = curl_easy_perform(curl);
    long status = 0;
    curl_easy_getinfo(curl, CURLINFO_RESPONSE_CODE, &status);
    curl_easy_cleanup(curl);

    if (download.tooLarge || code == CURLE_FILESIZE_EXCEEDED) {
        result.error = "cannot fetch " + url + ": the response exceeds " +
                       std::to_string(limits.maxBytes) + " bytes";
    } else if (code == CURLE_OPERATION_TIMEDOUT) {
        result.error = "cannot fetch " + url + ": no complete answer within " +
                       std::to_string(timeoutMs / 1000) + " s";
    } else if (code == CURLE_TOO_MANY_REDIRECTS) {
        result.error = "cannot fetch " + url + ": more than " +
                       std::to_string(limits.maxRedirects) + " redirects";
    } else if (code == CURLE_UNSUPPORTED_PROTOCOL) {
        result.error = "cannot fetch " + url + ": redirected to a scheme that is not followed (" +
                       (curlError[0] ? std::string(curlError) : curl_easy_strerror(code)) + ")";
    } else if (code != CURLE_OK) {
        result.error = "cannot fetch " + url + ": " +
                       (curlError[0] ? std::string(curlError) : curl_easy_strerror(code));
    } else if (status >= 400) {
        result.error = "cannot fetch " + url + ": HTTP status " + std::to_string(status);
    } else {
        result.ok = true;
        result.body = std::move(download.body);
    }
    return result;
}

}  // namespace detail
}  // namespace kest
