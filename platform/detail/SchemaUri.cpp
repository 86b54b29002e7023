#include "SchemaUri.h"

#include <libxml/uri.h>
#include <libxml/xmlmemory.h>

#include <algorithm>
#include <cctype>
#include <filesystem>

namespace kest {
namespace detail {

namespace {

std::string Lower(std::string text) {
    std::transform(text.begin(), text.end(), text.begin(),
                   [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
    return text;
}

std::string Unescape(const std::string& text) {
    char* raw = xmlURIUnescapeString(text.c_str(), static_cast<int>(text.size()), nullptr);
    if (!raw) return text;
    std::string result(raw);
    xmlFree(raw);
    return result;
}

}  // namespace

std::string SchemeOf(const std::string& text) {
    if (text.empty() || !std::isalpha(static_cast<unsigned char>(text[0]))) return {};
    for (std::size_t i = 1; i < text.size(); ++i) {
        unsigned char c = static_cast<unsigned char>(text[i]);
        if (c == ':') return Lower(text.substr(0, i));
        if (!std::isalnum(c) && c != '+' && c != '-' && c != '.') return {};
    }
    return {};
}

bool IsHttpUrl(const std::string& text) {
    std::string scheme = SchemeOf(text);
    return scheme == "http" || scheme == "https";
}

std::string EscapePathForUri(const std::string& path) {
    xmlChar* raw = xmlURIEscapeStr(reinterpret_cast<const xmlChar*>(path.c_str()),
                                   reinterpret_cast<const xmlChar*>("/"));
    if (!raw) return path;
    std::string result(reinterpret_cast<const char*>(raw));
    xmlFree(raw);
    return result;
}

std::string FileUrlToPath(const std::string& url) {
    std::string rest = url.substr(5);  // after "file:"
    if (rest.compare(0, 2, "//") == 0) {
        rest.erase(0, 2);
        if (Lower(rest.substr(0, 9)) == "localhost") rest.erase(0, 9);
        if (rest.empty() || rest[0] != '/') return {};
    }
    return Unescape(rest);
}

bool ResolveSchemaLocation(const std::string& location, const std::string& baseUrl,
                           std::string& resolved, std::string& error) {
    namespace fs = std::filesystem;
    if (location.empty()) {
        error = "empty schema location";
        return false;
    }
    std::string scheme = SchemeOf(location);
    if (scheme == "http" || scheme == "https") {
        resolved = location;
        return true;
    }
    std::string path;
    if (scheme == "file") {
        path = FileUrlToPath(location);
        if (path.empty()) {
            error = "schema location " + location + " is not a local file URL";
            return false;
        }
    } else if (!scheme.empty()) {
        error = "schema location " + location +
                " uses an unsupported scheme; only files, http and https are read";
        return false;
    } else {
        path = location;
    }
    if (path[0] != '/' && IsHttpUrl(baseUrl)) {
        xmlChar* built = xmlBuildURI(BAD_CAST location.c_str(), BAD_CAST baseUrl.c_str());
        if (!built) {
            error = "schema location " + location + " cannot be resolved against " + baseUrl;
            return false;
        }
        resolved = reinterpret_cast<const char*>(built);
        xmlFree(built);
        return true;
    }
    fs::path full(path);
    if (full.is_relative()) {
        std::string base = SchemeOf(baseUrl) == "file" ? FileUrlToPath(baseUrl) : baseUrl;
        std::size_t slash = base.rfind('/');
        fs::path directory =
            slash == std::string::npos ? fs::path() : fs::path(base.substr(0, slash + 1));
        full = directory / full;
        std::error_code ignored;
        if (full.is_relative()) full = fs::absolute(full, ignored);
    }
    resolved = full.lexically_normal().string();
    return true;
}

}  // namespace detail
}  // namespace kest
