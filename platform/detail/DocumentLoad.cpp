#include "DocumentLoad.h"

#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <fstream>
#include <vector>

#include "ExpatLoader.h"
#include "SchemaValidation.h"
#include "XmlWriter.h"

namespace kest {
namespace detail {

namespace {

constexpr std::string_view kSchemaInstanceNs = "http://www.w3.org/2001/XMLSchema-instance";

// The schemas the root element names through xsi:schemaLocation or
// xsi:noNamespaceSchemaLocation, whatever prefix the root binds to the schema-instance namespace.
std::vector<SchemaRef> SchemaRefsOf(const DomNode* root) {
    std::vector<SchemaRef> refs;
    if (!root) return refs;
    std::vector<std::string_view> prefixes;
    for (const DomNode* a = root->FirstAttribute(); a; a = a->next) {
        std::string_view name = a->Name();
        if (name.substr(0, 6) == "xmlns:" && a->Text() == kSchemaInstanceNs)
            prefixes.push_back(name.substr(6));
    }
    auto bound = [&](const DomNode* a) {
        std::string_view prefix = a->name->Prefix();
        if (a->name->created && a->name->namespaceURI == kSchemaInstanceNs) return true;
        for (std::string_view p : prefixes)
            if (!prefix.empty() && p == prefix) return true;
        return false;
    };
    for (const DomNode* a = root->FirstAttribute(); a; a = a->next) {
        if (!a->name->prefixLength || !bound(a)) continue;
        std::string_view local = a->name->LocalName();
        std::string_view value = a->Text();
        if (local == "noNamespaceSchemaLocation") {
            std::size_t b = value.find_first_not_of(" \t\r\n");
            std::size_t e = value.find_last_not_of(" \t\r\n");
            if (b != std::string_view::npos)
                refs.push_back({std::string(), std::string(value.substr(b, e - b + 1))});
        } else if (local == "schemaLocation") {
            std::vector<std::string> tokens;
            std::size_t i = 0;
            while (i < value.size()) {
                std::size_t b = value.find_first_not_of(" \t\r\n", i);
                if (b == std::string_view::npos) break;
                std::size_t e = value.find_first_of(" \t\r\n", b);
                if (e == std::string_view::npos) e = value.size();
                tokens.emplace_back(value.substr(b, e - b));
                i = e;
            }
            for (std::size_t t = 0; t + 1 < tokens.size(); t += 2)
                refs.push_back({tokens[t], tokens[t + 1]});
        }
    }
    return refs;
}

// The validator names elements "{namespace}name"; the reader of a message knows them as written
// in the file. Namespaces the root binds become the prefix it binds them to (none for the
// default namespace); others stay as they are.
std::string NamesAsWritten(std::string text, const DomNode* root) {
    if (!root) return text;
    std::string::size_type open = 0;
    while ((open = text.find('{', open)) != std::string::npos) {
        std::string::size_type close = text.find('}', open);
        if (close == std::string::npos) break;
        std::string_view ns(text.data() + open + 1, close - open - 1);
        const DomNode* binding = nullptr;
        for (const DomNode* a = root->FirstAttribute(); a && !binding; a = a->next) {
            std::string_view name = a->Name();
            if ((name == "xmlns" || name.substr(0, 6) == "xmlns:") && a->Text() == ns) binding = a;
        }
        if (!binding) {
            open = close + 1;
            continue;
        }
        std::string prefix = binding->Name() == "xmlns"
                                 ? std::string()
                                 : std::string(binding->Name().substr(6)) + ":";
        text.replace(open, close - open + 1, prefix);
        open += prefix.size();
    }
    return text;
}

DomError FromOutcome(const ValidationOutcome& outcome, const std::string& url,
                     const DomNode* root) {
    DomError error;
    error.code = FAILED(outcome.code) ? outcome.code : XML_E_INVALID;
    error.reason = outcome.reason.empty() ? "the document is not valid" : outcome.reason;
    error.what = NamesAsWritten(outcome.what.empty() ? error.reason : outcome.what, root);
    error.line = outcome.line;
    error.linepos = outcome.column;
    error.url = outcome.url.empty() ? url : outcome.url;
    if (outcome.schemaUnavailable) error.cause = DOM_CAUSE_SCHEMA_UNAVAILABLE;
    return error;
}

bool Failed(const ValidationOutcome& outcome) {
    return FAILED(outcome.code) || !outcome.reason.empty();
}

ValidationRequest RequestFor(const DomDocument& doc, const std::string& url,
                             const std::string& baseUrl) {
    ValidationRequest request;
    request.documentUrl = url;
    request.baseUrl = baseUrl;
    request.allowHttp = doc.serverHttpRequest;
    request.builtinFallback = doc.builtinSchemaFallback;
    request.schemaPath = doc.schemaPath;
    return request;
}

/// Whether a load validates: validate-on-parse is on and there is a schema to validate against.
bool Validates(const DomDocument& doc, const std::vector<SchemaRef>& refs) {
    return doc.validateOnParse && (!refs.empty() || !doc.schemaPath.empty());
}

VARIANT_BOOL FailLoad(DomDocument& doc, DomError error) {
    doc.Clear();
    doc.error = std::move(error);
    return VARIANT_FALSE;
}

VARIANT_BOOL Succeed(DomDocument& doc, ParsedContent content, const std::string& url,
                     bool usedBuiltin) {
    doc.Install(std::move(content.store), content.top);
    doc.url = url;
    doc.error = DomError();
    doc.error.url = url;
    doc.usedBuiltinSchema = usedBuiltin;
    return VARIANT_TRUE;
}

bool StatFile(const std::string& path, long long& size, long long& mtimeNs) {
    struct stat info;
    if (::stat(path.c_str(), &info) != 0) return false;
    size = static_cast<long long>(info.st_size);
    mtimeNs = static_cast<long long>(info.st_mtim.tv_sec) * 1000000000LL + info.st_mtim.tv_nsec;
    return true;
}

void RememberLoadedFile(DomDocument& doc, const std::string& path) {
    DomDocument::LoadedFile& loaded = doc.loadedFile;
    loaded = DomDocument::LoadedFile();
    if (!StatFile(path, loaded.size, loaded.mtimeNs)) return;
    loaded.path = path;
    loaded.generation = doc.generation;
    loaded.textChanges = doc.textChanges;
}

// The bytes of the file the document was loaded from, when neither the document nor the file
// has changed since; validating those keeps the file's own line numbers in the reasons.
bool ReadUnchangedSource(const DomDocument& doc, std::string& bytes) {
    const DomDocument::LoadedFile& loaded = doc.loadedFile;
    if (loaded.path.empty() || loaded.generation != doc.generation ||
        loaded.textChanges != doc.textChanges)
        return false;
    long long size = -1, mtimeNs = -1;
    if (!StatFile(loaded.path, size, mtimeNs) || size != loaded.size || mtimeNs != loaded.mtimeNs)
        return false;
    std::ifstream in(loaded.path, std::ios::binary);
    if (!in) return false;
    bytes.assign(static_cast<std::size_t>(size), '\0');
    in.read(&bytes[0], static_cast<std::streamsize>(size));
    return in.gcount() == static_cast<std::streamsize>(size);
}

// Names under which a process reaches its own standard streams: their directory says nothing
// about where the document's schema lies.
bool IsStreamAlias(const std::string& path) {
    return path == "-" || path == "/dev/stdin" || path.compare(0, 8, "/dev/fd/") == 0 ||
           path.compare(0, 14, "/proc/self/fd/") == 0;
}

DomError ReadFailure(const std::string& reason, const std::string& url, int err) {
    DomError error;
    error.code = err ? HResultForErrno(err) : E_FAIL;
    error.reason = reason;
    error.url = url;
    return error;
}

}  // namespace

const DomNode* RootElement(const DomNode* parentOfRoot) {
    for (const DomNode* c = parentOfRoot->FirstChild(); c; c = c->next)
        if (c->Type() == NODE_ELEMENT) return c;
    return nullptr;
}

VARIANT_BOOL FailLoad(DomDocument& doc, HRESULT code, std::string reason, std::string url) {
    DomError error;
    error.code = code;
    error.reason = std::move(reason);
    error.url = std::move(url);
    return FailLoad(doc, std::move(error));
}

// The document is parsed before it is validated, so that the parser's entity limits hold before
// the validator reads anything, and a document that is not well-formed is reported in the
// parser's own words.
VARIANT_BOOL LoadFromBytes(DomDocument& doc, std::string_view bytes, const char* encoding,
                           const std::string& url, const std::string& baseUrl) {
    DomError error;
    MemorySource source(bytes);
    ParsedContent content = ParseXml(source, encoding, url, doc.EffectiveMaxDepth(), error, false,
                                     doc.preserveWhiteSpace);
    if (!content.store) return FailLoad(doc, std::move(error));
    const DomNode* root = RootElement(content.top);
    std::vector<SchemaRef> refs = SchemaRefsOf(root);
    bool usedBuiltin = false;
    if (Validates(doc, refs)) {
        ValidationOutcome outcome = ValidateDocument(bytes, refs, RequestFor(doc, url, baseUrl));
        if (Failed(outcome)) return FailLoad(doc, FromOutcome(outcome, url, root));
        usedBuiltin = outcome.usedBuiltin;
    }
    return Succeed(doc, std::move(content), url, usedBuiltin);
}

// A regular file is not held in memory while the tree is built: when it is validated, its bytes
// are read whole and validated first, then freed, and the file is parsed again piece by piece,
// so the peak is the larger of the two phases, not their sum.
VARIANT_BOOL LoadFromFile(DomDocument& doc, const std::string& path, const std::string& url) {
    FileSource source;
    DomError error;
    if (!source.Open(path, error)) return FailLoad(doc, std::move(error));
    if (!source.Seekable()) {
        std::string bytes, readError;
        if (!source.ReadAll(bytes, readError)) return FailLoad(doc, ReadFailure(readError, url, 0));
        return LoadFromBytes(doc, bytes, nullptr, url, std::string());
    }
    const long depth = doc.EffectiveMaxDepth();
    const std::string baseUrl = IsStreamAlias(path) ? std::string() : url;
    bool usedBuiltin = false;
    if (doc.validateOnParse) {
        ParsedContent head = ParseXml(source, nullptr, url, depth, error, true);
        if (!head.store) return FailLoad(doc, std::move(error));
        std::vector<SchemaRef> refs = SchemaRefsOf(RootElement(head.top));
        if (Validates(doc, refs)) {
            std::string bytes, readError;
            if (!source.ReadAll(bytes, readError))
                return FailLoad(doc, ReadFailure(readError, url, 0));
            // Entities are declared in a document type only; such a document is parsed in full
            // first, so that the parser's entity limits hold before the validator reads it.
            if (head.hasDoctype) {
                if (!LoadFromBytes(doc, bytes, nullptr, url, baseUrl)) return VARIANT_FALSE;
                RememberLoadedFile(doc, path);
                return VARIANT_TRUE;
            }
            ValidationOutcome outcome =
                ValidateDocument(bytes, refs, RequestFor(doc, url, baseUrl));
            if (Failed(outcome)) {
                // A document that is not even well-formed is reported as such, with the
                // parser's own words.
                MemorySource memory(bytes);
                ParsedContent check = ParseXml(memory, nullptr, url, depth, error);
                return FailLoad(doc, check.store ? FromOutcome(outcome, url, RootElement(check.top))
                                                 : std::move(error));
            }
            usedBuiltin = outcome.usedBuiltin;
        }
        head = ParsedContent();
        if (!source.Rewind())
            return FailLoad(
                doc, ReadFailure("cannot read " + path + ": " + std::strerror(errno), url, errno));
    }
    ParsedContent content =
        ParseXml(source, nullptr, url, depth, error, false, doc.preserveWhiteSpace);
    if (!content.store) return FailLoad(doc, std::move(error));
    VARIANT_BOOL loaded = Succeed(doc, std::move(content), url, usedBuiltin);
    RememberLoadedFile(doc, path);
    return loaded;
}

void ValidateContent(DomDocument& doc) {
    const DomNode* root = RootElement(&doc.node);
    doc.usedBuiltinSchema = false;
    if (!root) {
        doc.error = DomError();
        doc.error.code = XML_E_INVALID;
        doc.error.reason = "the document has no root element to validate";
        doc.error.url = doc.url;
        return;
    }
    std::string bytes;
    if (!ReadUnchangedSource(doc, bytes)) {
        bytes.clear();
        WriteXml(&doc.node, bytes);
    }
    ValidationOutcome outcome;
    if (doc.schemas) {
        outcome = ValidateAgainstCollection(bytes, doc.url, *doc.schemas);
    } else {
        std::vector<SchemaRef> refs = SchemaRefsOf(root);
        if (refs.empty() && doc.schemaPath.empty()) {
            outcome.code = XML_E_INVALID;
            outcome.reason = "no schema to validate against: none attached and the root names none";
        } else {
            outcome = ValidateDocument(bytes, refs, RequestFor(doc, doc.url, doc.url));
        }
    }
    if (Failed(outcome)) {
        doc.error = FromOutcome(outcome, doc.url, root);
    } else {
        doc.error = DomError();
        doc.error.url = doc.url;
        doc.usedBuiltinSchema = outcome.usedBuiltin;
    }
}

}  // namespace detail
}  // namespace kest
