// XSD validation with libxml2 and http fetching with libcurl.
//
// libxml2 is only ever asked to read what we allow: an external entity loader installed once
// refuses everything while one of our operations runs on the thread, except the local files a
// schema includes or imports and, when the caller allows it, http(s) schemas fetched through
// HttpGet. Outside our operations it hands over to the loader that was installed before, so a
// host that uses libxml2 itself keeps its behaviour.
//
// Documents are validated while they stream through an xmlTextReader, so memory stays flat
// whatever the size of the document; the compiled schemas are cached process-wide and shared
// by concurrent validations (libxml2 only reads a compiled schema while validating).

#include "SchemaValidation.h"

#include <curl/curl.h>
#include <libxml/globals.h>
#include <libxml/parser.h>
#include <libxml/parserInternals.h>
#include <libxml/uri.h>
#include <libxml/xmlIO.h>
#include <libxml/xmlerror.h>
#include <libxml/xmlreader.h>
#include <libxml/xmlschemas.h>
#include <libxml/xmlschemastypes.h>
#include <sys/stat.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <climits>
#include <cstring>
#include <deque>
#include <filesystem>
#include <map>
#include <mutex>
#include <unordered_map>

#include "XsdSchema.h"

namespace kest {
namespace detail {

class CompiledSchema {
  public:
    CompiledSchema(xmlSchemaPtr schema, std::string location) noexcept
        : m_schema(schema), m_location(std::move(location)) {}
    ~CompiledSchema() { xmlSchemaFree(m_schema); }
    CompiledSchema(const CompiledSchema&) = delete;
    CompiledSchema& operator=(const CompiledSchema&) = delete;

    xmlSchemaPtr Get() const noexcept { return m_schema; }
    const std::string& Location() const noexcept { return m_location; }

  private:
    xmlSchemaPtr m_schema;
    std::string m_location;
};

namespace {

// Schemas are small; anything larger than this from a server is not a schema.
constexpr std::size_t kMaxSchemaBytes = std::size_t(64) << 20;
constexpr long kSchemaFetchTimeoutSeconds = 30;
// Documents naming several schemas get a compiled combination; keep a few of them.
constexpr std::size_t kMaxCombinedSchemas = 32;

// ---------------------------------------------------------------------------------------------
// Text helpers

std::string Lower(std::string text) {
    std::transform(text.begin(), text.end(), text.begin(),
                   [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
    return text;
}

/// The URI scheme of `text` in lower case, or "" when it has none.
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

std::string TrimEnd(std::string text) {
    while (!text.empty() && std::isspace(static_cast<unsigned char>(text.back()))) text.pop_back();
    return text;
}

std::string Unescape(const std::string& text) {
    char* raw = xmlURIUnescapeString(text.c_str(), static_cast<int>(text.size()), nullptr);
    if (!raw) return text;
    std::string result(raw);
    xmlFree(raw);
    return result;
}

std::string EscapePathForUri(const std::string& path) {
    xmlChar* raw = xmlURIEscapeStr(reinterpret_cast<const xmlChar*>(path.c_str()),
                                   reinterpret_cast<const xmlChar*>("/"));
    if (!raw) return path;
    std::string result(reinterpret_cast<const char*>(raw));
    xmlFree(raw);
    return result;
}

std::string XmlAttributeEscape(const std::string& text) {
    std::string out;
    for (char c : text) {
        switch (c) {
            case '&':
                out += "&amp;";
                break;
            case '<':
                out += "&lt;";
                break;
            case '"':
                out += "&quot;";
                break;
            default:
                out += c;
        }
    }
    return out;
}

/// "file:///a%20b/c.xsd" or "file://localhost/a" to a path; "" when it is no local file URL.
std::string FileUrlToPath(const std::string& url) {
    std::string rest = url.substr(5);  // after "file:"
    if (rest.compare(0, 2, "//") == 0) {
        rest.erase(0, 2);
        if (Lower(rest.substr(0, 9)) == "localhost") rest.erase(0, 9);
        if (rest.empty() || rest[0] != '/') return {};
    }
    return Unescape(rest);
}

// ---------------------------------------------------------------------------------------------
// Error capture

/// Keeps the first error libxml2 reports (warnings are not failures) and counts the rest.
struct ErrorCollector {
    bool has = false;
    int domain = 0;
    std::string message;
    std::string file;
    long line = 0;
    long column = 0;
    std::size_t count = 0;
};

void CollectError(void* userData, xmlErrorPtr error) {
    if (!userData || !error || error->level < XML_ERR_ERROR) return;
    auto* errors = static_cast<ErrorCollector*>(userData);
    ++errors->count;
    if (errors->has) return;
    errors->has = true;
    errors->domain = error->domain;
    errors->message = TrimEnd(error->message ? error->message : "unknown error");
    errors->file = error->file ? error->file : "";
    errors->line = error->line;
    // Parser errors carry the column in int2; validity errors leave it 0.
    if (error->domain == XML_FROM_PARSER || error->domain == XML_FROM_NAMESPACE)
        errors->column = error->int2;
}

void IgnoreGenericError(void*, const char*, ...) {}

/// "file:line: message", with the fallback file when libxml2 named none.
std::string Located(const ErrorCollector& errors, const std::string& fallbackFile) {
    std::string file = errors.file.empty() ? fallbackFile : errors.file;
    std::string text;
    if (!file.empty()) {
        text = file;
        if (errors.line > 0) text += ":" + std::to_string(errors.line);
        text += ": ";
    }
    return text + errors.message;
}

// ---------------------------------------------------------------------------------------------
// What libxml2 may read while one of our operations runs on this thread

struct LoadPolicy {
    bool allowLocalSchemas = false;  // top-level loads of local files (schema documents)
    bool allowHttp = false;          // top-level loads of http(s) schemas, through HttpGet
    std::string refusal;             // why the first load was refused or failed
};

thread_local LoadPolicy* t_policy = nullptr;
xmlExternalEntityLoader g_previousLoader = nullptr;

void Refuse(LoadPolicy& policy, std::string reason) {
    if (policy.refusal.empty()) policy.refusal = std::move(reason);
}

xmlParserInputPtr GuardedEntityLoader(const char* url, const char* id, xmlParserCtxtPtr ctxt) {
    LoadPolicy* policy = t_policy;
    if (!policy) return g_previousLoader ? g_previousLoader(url, id, ctxt) : nullptr;
    if (!url) return nullptr;
    std::string location(url);
    // A schema document (the schema itself, or one it includes or imports) is loaded into a
    // fresh parser context: no input open and none created yet. DTDs and parameter entities
    // load with the document's input open, and external general entities get a sub-context
    // whose input numbering continues from the document's.
    bool documentLoad = ctxt != nullptr && ctxt->inputNr == 0 && ctxt->input_id <= 1;
    if (!documentLoad || !policy->allowLocalSchemas) {
        Refuse(*policy, "external resource '" + location +
                            "' refused: entities and DTDs are "
                            "not read during schema processing");
        return nullptr;
    }
    std::string scheme = SchemeOf(location);
    if (scheme == "http" || scheme == "https") {
        if (!policy->allowHttp) {
            Refuse(*policy,
                   "schema location " + location + " requires the ServerHTTPRequest property");
            return nullptr;
        }
        HttpResult fetched = HttpGet(location, kSchemaFetchTimeoutSeconds, kMaxSchemaBytes);
        if (!fetched.ok) {
            Refuse(*policy, fetched.error);
            return nullptr;
        }
        xmlParserInputBufferPtr buffer = xmlParserInputBufferCreateMem(
            fetched.body.data(), static_cast<int>(fetched.body.size()), XML_CHAR_ENCODING_NONE);
        if (!buffer) return nullptr;
        xmlParserInputPtr input = xmlNewIOInputStream(ctxt, buffer, XML_CHAR_ENCODING_NONE);
        if (!input) {
            xmlFreeParserInputBuffer(buffer);
            return nullptr;
        }
        // The name lets relative includes of the fetched schema resolve against its URL.
        input->filename = reinterpret_cast<const char*>(xmlStrdup(BAD_CAST url));
        return input;
    }
    if (!scheme.empty() && scheme != "file") {
        Refuse(*policy, "schema location " + location +
                            " uses an unsupported scheme; only files, http and https are read");
        return nullptr;
    }
    return xmlNewInputFromFile(ctxt, url);
}

void InitLibxml() {
    static std::once_flag once;
    std::call_once(once, [] {
        xmlInitParser();
        // The built-in types are set up lazily by the first schema compile, and that set-up is
        // not safe when two threads compile at once: one copy would be lost. Doing it here,
        // once, keeps concurrent first compiles apart.
        xmlSchemaInitTypes();
        g_previousLoader = xmlGetExternalEntityLoader();
        xmlSetExternalEntityLoader(GuardedEntityLoader);
    });
}

/// Installs the policy and routes every libxml2 message of this thread to `errors` for the
/// lifetime of the object; restores what was there before.
class LibxmlScope {
  public:
    LibxmlScope(LoadPolicy& policy, ErrorCollector& errors) {
        InitLibxml();
        m_previousPolicy = t_policy;
        t_policy = &policy;
        m_structured = xmlStructuredError;
        m_structuredContext = xmlStructuredErrorContext;
        m_generic = xmlGenericError;
        m_genericContext = xmlGenericErrorContext;
        xmlSetStructuredErrorFunc(&errors, CollectError);
        xmlSetGenericErrorFunc(nullptr, IgnoreGenericError);
    }
    ~LibxmlScope() {
        xmlSetStructuredErrorFunc(m_structuredContext, m_structured);
        xmlSetGenericErrorFunc(m_genericContext, m_generic);
        t_policy = m_previousPolicy;
    }
    LibxmlScope(const LibxmlScope&) = delete;
    LibxmlScope& operator=(const LibxmlScope&) = delete;

  private:
    LoadPolicy* m_previousPolicy;
    xmlStructuredErrorFunc m_structured;
    void* m_structuredContext;
    xmlGenericErrorFunc m_generic;
    void* m_genericContext;
};

// ---------------------------------------------------------------------------------------------
// Compiling and caching

SchemaLoad SchemaFailure(const std::string& location, std::string reason) {
    SchemaLoad load;
    load.failure.code = XML_E_PARSEFAILED;
    load.failure.reason = std::move(reason);
    load.failure.url = location;
    return load;
}

/// Compiles a schema from a location, or from `text` in memory when given (named `location`
/// in messages).
SchemaLoad Compile(const std::string& location, bool allowHttp, const std::string* text) {
    ErrorCollector errors;
    LoadPolicy policy;
    policy.allowLocalSchemas = true;
    policy.allowHttp = allowHttp;
    xmlSchemaPtr schema = nullptr;
    {
        LibxmlScope scope(policy, errors);
        xmlSchemaParserCtxtPtr parser =
            text ? xmlSchemaNewMemParserCtxt(text->data(), static_cast<int>(text->size()))
                 : xmlSchemaNewParserCtxt(location.c_str());
        if (!parser) return SchemaFailure(location, "schema " + location + ": out of memory");
        xmlSchemaSetParserStructuredErrors(parser, CollectError, &errors);
        schema = xmlSchemaParse(parser);
        xmlSchemaFreeParserCtxt(parser);
    }
    // A refused include or import only warns in libxml2; here it makes the schema unusable.
    if (!schema || errors.has || !policy.refusal.empty()) {
        if (schema) xmlSchemaFree(schema);
        std::string reason = "schema " + location + " cannot be used: ";
        if (!policy.refusal.empty()) {
            reason += policy.refusal;
            if (errors.has) reason += " (" + Located(errors, location) + ")";
        } else if (errors.has) {
            reason += Located(errors, location);
        } else {
            reason += "it is not a valid XML schema";
        }
        SchemaLoad load = SchemaFailure(location, std::move(reason));
        load.failure.line = errors.line;
        load.failure.column = errors.column;
        return load;
    }
    SchemaLoad load;
    load.schema = std::make_shared<const CompiledSchema>(schema, location);
    return load;
}

/// Modification time and size of a regular file, as a text that changes when either does.
bool FileStamp(const std::string& path, std::string& stamp, std::string& error) {
    struct stat info {};
    if (::stat(path.c_str(), &info) != 0) {
        error = "schema " + path + " cannot be read: " + std::strerror(errno);
        return false;
    }
    if (!S_ISREG(info.st_mode)) {
        error = "schema " + path + " cannot be read: not a regular file";
        return false;
    }
    stamp = std::to_string(info.st_mtim.tv_sec) + "." + std::to_string(info.st_mtim.tv_nsec) + "/" +
            std::to_string(info.st_size);
    return true;
}

class SchemaCache {
  public:
    CompiledSchemaHandle Find(const std::string& key, const std::string& stamp) {
        std::lock_guard<std::mutex> lock(m_mutex);
        auto found = m_entries.find(key);
        if (found == m_entries.end() || found->second.stamp != stamp) return nullptr;
        return found->second.schema;
    }
    // A newer stamp replaces the entry; the old schema lives on while validations hold it.
    void Store(const std::string& key, const std::string& stamp, CompiledSchemaHandle schema) {
        std::lock_guard<std::mutex> lock(m_mutex);
        m_entries[key] = Entry{stamp, std::move(schema)};
    }
    CompiledSchemaHandle FindCombined(const std::string& key) {
        std::lock_guard<std::mutex> lock(m_mutex);
        for (auto& entry : m_combined)
            if (entry.first == key) return entry.second;
        return nullptr;
    }
    void StoreCombined(const std::string& key, CompiledSchemaHandle schema) {
        std::lock_guard<std::mutex> lock(m_mutex);
        for (auto& entry : m_combined)
            if (entry.first == key) return;
        m_combined.emplace_back(key, std::move(schema));
        if (m_combined.size() > kMaxCombinedSchemas) m_combined.pop_front();
    }

  private:
    struct Entry {
        std::string stamp;
        CompiledSchemaHandle schema;
    };
    std::mutex m_mutex;
    std::unordered_map<std::string, Entry> m_entries;
    std::deque<std::pair<std::string, CompiledSchemaHandle>> m_combined;
};

// Never destroyed: validations may still run while static objects are torn down at exit, and
// the entries stay reachable for leak checkers.
SchemaCache& Cache() {
    static SchemaCache* cache = new SchemaCache;
    return *cache;
}

/// The cache stamp of a resolved location: file time and size, or "" for http.
bool LocationStamp(const std::string& location, bool allowHttp, std::string& stamp,
                   std::string& error) {
    if (IsHttpUrl(location)) {
        if (!allowHttp) {
            error = "schema location " + location + " requires the ServerHTTPRequest property";
            return false;
        }
        stamp.clear();
        return true;
    }
    return FileStamp(location, stamp, error);
}

// ---------------------------------------------------------------------------------------------
// Validation

struct MemoryCursor {
    std::string_view data;
    std::size_t offset = 0;
};

int ReadFromMemory(void* context, char* buffer, int length) {
    auto* cursor = static_cast<MemoryCursor*>(context);
    std::size_t left = cursor->data.size() - cursor->offset;
    std::size_t count = std::min(left, static_cast<std::size_t>(length > 0 ? length : 0));
    std::memcpy(buffer, cursor->data.data() + cursor->offset, count);
    cursor->offset += count;
    return static_cast<int>(count);
}

int CloseMemory(void*) { return 0; }

}  // namespace

// -------------------------------------------------------------------------------------------------

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
        InitLibxml();
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

SchemaLoad LoadSchema(const std::string& resolvedLocation, bool allowHttp) {
    std::string stamp, error;
    if (!LocationStamp(resolvedLocation, allowHttp, stamp, error))
        return SchemaFailure(resolvedLocation, error);
    if (CompiledSchemaHandle cached = Cache().Find(resolvedLocation, stamp)) {
        SchemaLoad load;
        load.schema = std::move(cached);
        return load;
    }
    // Compiled outside the lock: two threads may compile the same schema once each, which is
    // cheaper than making every validation wait for one compile.
    SchemaLoad load = Compile(resolvedLocation, allowHttp, nullptr);
    if (load.schema) Cache().Store(resolvedLocation, stamp, load.schema);
    return load;
}

SchemaLoad LoadCombinedSchema(const std::vector<SchemaRef>& resolvedRefs, bool allowHttp) {
    std::string key, includes, imports, names;
    for (const SchemaRef& ref : resolvedRefs) {
        std::string stamp, error;
        if (!LocationStamp(ref.location, allowHttp, stamp, error))
            return SchemaFailure(ref.location, error);
        key += ref.namespaceURI + '\n' + ref.location + '\n' + stamp + '\n';
        std::string uri =
            IsHttpUrl(ref.location) ? ref.location : "file://" + EscapePathForUri(ref.location);
        if (ref.namespaceURI.empty())
            includes += "<xs:include schemaLocation=\"" + XmlAttributeEscape(uri) + "\"/>";
        else
            imports += "<xs:import namespace=\"" + XmlAttributeEscape(ref.namespaceURI) +
                       "\" schemaLocation=\"" + XmlAttributeEscape(uri) + "\"/>";
        names += (names.empty() ? "" : ", ") + ref.location;
    }
    if (CompiledSchemaHandle cached = Cache().FindCombined(key)) {
        SchemaLoad load;
        load.schema = std::move(cached);
        return load;
    }
    std::string text = "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\">" + includes +
                       imports + "</xs:schema>";
    SchemaLoad load = Compile("(" + names + ")", allowHttp, &text);
    if (load.schema) Cache().StoreCombined(key, load.schema);
    return load;
}

std::string SchemaTargetNamespace(const CompiledSchema& schema) {
    const xmlChar* ns = schema.Get() ? schema.Get()->targetNamespace : nullptr;
    return ns ? reinterpret_cast<const char*>(ns) : "";
}

ValidationOutcome ValidateWithSchema(const CompiledSchema& schema, std::string_view document,
                                     const std::string& documentUrl) {
    ValidationOutcome outcome;
    outcome.url = documentUrl;
    ErrorCollector errors;
    LoadPolicy policy;  // nothing may be loaded while the document is read
    LibxmlScope scope(policy, errors);

    xmlSchemaValidCtxtPtr validator = xmlSchemaNewValidCtxt(schema.Get());
    if (!validator) {
        outcome.code = E_OUTOFMEMORY;
        outcome.reason = "out of memory while preparing validation of " + documentUrl;
        return outcome;
    }
    xmlSchemaSetValidStructuredErrors(validator, CollectError, &errors);
    MemoryCursor cursor{document, 0};
    // No entity substitution, no DTD loading, no network: the loader refuses the rest.
    xmlTextReaderPtr reader = xmlReaderForIO(ReadFromMemory, CloseMemory, &cursor,
                                             documentUrl.empty() ? nullptr : documentUrl.c_str(),
                                             nullptr, XML_PARSE_NONET);
    if (!reader) {
        xmlSchemaFreeValidCtxt(validator);
        outcome.code = E_OUTOFMEMORY;
        outcome.reason = "out of memory while preparing validation of " + documentUrl;
        return outcome;
    }
    xmlTextReaderSetStructuredErrorHandler(reader, CollectError, &errors);
    int result = xmlTextReaderSchemaValidateCtxt(reader, validator, 0);
    if (result == 0) {
        // The first error decides; reading on would only cost time on large files.
        while ((result = xmlTextReaderRead(reader)) == 1 && !errors.has) {
        }
        if (!errors.has && result == 0 && xmlTextReaderIsValid(reader) != 1) {
            errors.has = true;
            errors.message = "the document is not valid against its schema";
        }
        if (!errors.has && result < 0) {
            errors.has = true;
            errors.domain = XML_FROM_PARSER;
            errors.message = "the document cannot be read";
        }
    } else if (!errors.has) {
        errors.has = true;
        errors.message = "the schema cannot be used for validation";
    }
    xmlFreeTextReader(reader);
    xmlSchemaFreeValidCtxt(validator);

    if (!errors.has) return outcome;
    bool invalid = errors.domain == XML_FROM_SCHEMASV || errors.domain == XML_FROM_SCHEMASP ||
                   errors.domain == XML_FROM_NONE;
    outcome.code = invalid ? XML_E_INVALID : XML_E_PARSEFAILED;
    outcome.reason = Located(errors, documentUrl);
    outcome.line = errors.line;
    outcome.column = errors.column;
    if (!errors.file.empty()) outcome.url = errors.file;
    return outcome;
}

// -------------------------------------------------------------------------------------------------

ValidationOutcome ValidateAgainstNamedSchemas(std::string_view document,
                                              const std::string& documentUrl,
                                              const std::vector<SchemaRef>& refs, bool allowHttp) {
    if (refs.empty()) {
        ValidationOutcome outcome;
        outcome.code = XML_E_INVALID;
        outcome.url = documentUrl;
        outcome.reason = documentUrl + ": the document names no schema to validate against";
        return outcome;
    }
    std::vector<SchemaRef> resolved;
    for (const SchemaRef& ref : refs) {
        SchemaRef target{ref.namespaceURI, {}};
        std::string error;
        if (!ResolveSchemaLocation(ref.location, documentUrl, target.location, error))
            return SchemaFailure(ref.location, error).failure;
        if (IsHttpUrl(target.location) && !allowHttp)
            return SchemaFailure(target.location, "schema location " + target.location +
                                                      " requires the ServerHTTPRequest property")
                .failure;
        resolved.push_back(std::move(target));
    }
    SchemaLoad load;
    if (resolved.size() == 1) {
        load = LoadSchema(resolved[0].location, allowHttp);
        if (load.schema) {
            std::string target = SchemaTargetNamespace(*load.schema);
            if (target != resolved[0].namespaceURI) {
                return SchemaFailure(resolved[0].location,
                                     "schema " + resolved[0].location + " has target namespace '" +
                                         target + "', but the document names it for '" +
                                         resolved[0].namespaceURI + "'")
                    .failure;
            }
        }
    } else {
        load = LoadCombinedSchema(resolved, allowHttp);
    }
    if (!load.schema) return load.failure;
    return ValidateWithSchema(*load.schema, document, documentUrl);
}

bool SchemaValidatorUsable() noexcept {
    static bool usable = [] {
        try {
            const std::string schema =
                "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\">"
                "<xs:element name=\"probe\" type=\"xs:int\"/></xs:schema>";
            SchemaLoad load = Compile("(built-in probe)", false, &schema);
            if (!load.schema) return false;
            return ValidateWithSchema(*load.schema, "<probe>1</probe>", "").code == S_OK &&
                   ValidateWithSchema(*load.schema, "<probe>x</probe>", "").code == XML_E_INVALID;
        } catch (...) {
            return false;
        }
    }();
    return usable;
}

// ---------------------------------------------------------------------------------------------
// HTTP

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
    HttpResult result;
    if (!IsHttpUrl(url)) {
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
    download.maxBytes = maxBytes;
    char curlError[CURL_ERROR_SIZE] = {};
    long timeoutMs = timeoutSeconds > 0 ? timeoutSeconds * 1000 : 30000;
    curl_easy_setopt(curl, CURLOPT_URL, url.c_str());
    curl_easy_setopt(curl, CURLOPT_PROTOCOLS_STR, "http,https");
    curl_easy_setopt(curl, CURLOPT_REDIR_PROTOCOLS_STR, "http,https");
    curl_easy_setopt(curl, CURLOPT_FOLLOWLOCATION, 1L);
    curl_easy_setopt(curl, CURLOPT_MAXREDIRS, 5L);
    curl_easy_setopt(curl, CURLOPT_CONNECTTIMEOUT_MS, std::min(timeoutMs, 15000L));
    curl_easy_setopt(curl, CURLOPT_TIMEOUT_MS, timeoutMs);
    curl_easy_setopt(curl, CURLOPT_NOSIGNAL, 1L);
    curl_easy_setopt(curl, CURLOPT_NOPROXY, "localhost,127.0.0.1,::1");
    curl_easy_setopt(curl, CURLOPT_USERAGENT, "kestcalmorph");
    curl_easy_setopt(curl, CURLOPT_ACCEPT_ENCODING, "");
    curl_easy_setopt(curl, CURLOPT_ERRORBUFFER, curlError);
    curl_easy_setopt(curl, CURLOPT_WRITEFUNCTION, WriteBody);
    curl_easy_setopt(curl, CURLOPT_WRITEDATA, &download);
    if (maxBytes < static_cast<std::size_t>(LLONG_MAX))
        curl_easy_setopt(curl, CURLOPT_MAXFILESIZE_LARGE, static_cast<curl_off_t>(maxBytes));

    CURLcode code = curl_easy_perform(curl);
    long status = 0;
    curl_easy_getinfo(curl, CURLINFO_RESPONSE_CODE, &status);
    curl_easy_cleanup(curl);

    if (download.tooLarge || code == CURLE_FILESIZE_EXCEEDED) {
        result.error =
            "cannot fetch " + url + ": the response exceeds " + std::to_string(maxBytes) + " bytes";
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
