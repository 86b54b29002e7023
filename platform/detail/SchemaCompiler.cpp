// Compiling XSD schemas with libxml2, and the process-wide cache of compiled schemas: local
// files by path, modification time and size; http(s) URLs for the life of the process.

#include <libxml/xmlschemas.h>
#include <libxml/xmlschemastypes.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <deque>
#include <mutex>
#include <unordered_map>

#include "BuiltinCdfSchema.h"
#include "LibxmlSupport.h"
#include "SchemaUri.h"
#include "XsdSchema.h"

namespace kest {
namespace detail {

namespace {

// Schemas are small; anything larger than this from a server is not a schema.
constexpr std::size_t kMaxSchemaBytes = std::size_t(64) << 20;
// A schema with its includes and imports; a chain longer than this is not a CDF schema.
constexpr std::size_t kMaxSchemaDocuments = 64;
// Documents naming several schemas get a compiled combination; keep a few of them.
constexpr std::size_t kMaxCombinedSchemas = 32;

std::mutex g_limitsMutex;
HttpLimits g_fetchLimits = [] {
    HttpLimits limits;
    limits.maxBytes = kMaxSchemaBytes;
    return limits;
}();

std::string XmlAttributeEscape(const std::string& text) {
    std::string out;
    for (char c : text) {
        if (c == '&')
            out += "&amp;";
        else if (c == '<')
            out += "&lt;";
        else if (c == '"')
            out += "&quot;";
        else
            out += c;
    }
    return out;
}

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
    policy.limits = SchemaFetchLimits();
    policy.documentsLeft = kMaxSchemaDocuments;
    policy.bytesLeft = policy.limits.maxBytes;
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
bool FileStamp(const std::string& path, std::string& stamp, std::string& error, bool& missing) {
    struct stat info {};
    if (::stat(path.c_str(), &info) != 0) {
        missing = errno == ENOENT || errno == ENOTDIR;
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
SchemaLoad LocationStamp(const std::string& location, bool allowHttp, std::string& stamp) {
    SchemaLoad failed;
    if (IsHttpUrl(location)) {
        if (!allowHttp) {
            failed = SchemaFailure(location, "schema location " + location +
                                                 " requires the ServerHTTPRequest property");
            failed.failure.schemaUnavailable = true;
            failed.failure.offline = true;
            return failed;
        }
        stamp.clear();
        return failed;
    }
    std::string error;
    bool missing = false;
    if (!FileStamp(location, stamp, error, missing)) {
        failed = SchemaFailure(location, error);
        failed.failure.schemaUnavailable = missing;
    }
    return failed;
}

}  // namespace

HttpLimits SchemaFetchLimits() {
    std::lock_guard<std::mutex> lock(g_limitsMutex);
    return g_fetchLimits;
}

void SetSchemaFetchLimits(const HttpLimits& limits) {
    std::lock_guard<std::mutex> lock(g_limitsMutex);
    g_fetchLimits = limits;
}

SchemaLoad LoadSchema(const std::string& resolvedLocation, bool allowHttp) {
    std::string stamp;
    SchemaLoad stamped = LocationStamp(resolvedLocation, allowHttp, stamp);
    if (!stamped.failure.reason.empty()) return stamped;
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
        std::string stamp;
        SchemaLoad stamped = LocationStamp(ref.location, allowHttp, stamp);
        if (!stamped.failure.reason.empty()) return stamped;
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

SchemaLoad LoadSchemaText(const std::string& name, const std::string& text) {
    return Compile(name, false, &text);
}

const CompiledSchemaHandle& BuiltinCdfSchema() {
    // Compiled once; a copy of a file of this library cannot fail to compile, but if it ever
    // did the handle stays empty and the fallback is simply not offered.
    // Never destroyed, like the cache: validations may run while statics are torn down.
    static const CompiledSchemaHandle* schema = [] {
        std::string text(kBuiltinCdfSchema, kBuiltinCdfSchemaSize);
        return new CompiledSchemaHandle(Compile("(built-in cdf.xsd)", false, &text).schema);
    }();
    return *schema;
}

std::string SchemaTargetNamespace(const CompiledSchema& schema) {
    const xmlChar* ns = schema.Get() ? schema.Get()->targetNamespace : nullptr;
    return ns ? reinterpret_cast<const char*>(ns) : "";
}

}  // namespace detail
}  // namespace kest
