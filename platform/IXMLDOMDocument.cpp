#include "IXMLDOMDocument.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>

#include "detail/DomCollections.h"
#include "detail/DomDocument.h"
#include "detail/DomNames.h"
#include "detail/ExpatLoader.h"
#include "detail/SchemaValidation.h"
#include "detail/XmlWriter.h"

namespace kest {

using detail::DomDocument;
using detail::DomError;
using detail::DomNode;

namespace {

constexpr std::string_view kSchemaInstanceNs = "http://www.w3.org/2001/XMLSchema-instance";

std::string Utf8(const _bstr_t& text) { return Utf16ToUtf8(text.View()); }

bool StartsWithNoCase(std::string_view text, std::string_view prefix) {
    if (text.size() < prefix.size()) return false;
    for (std::size_t i = 0; i < prefix.size(); ++i) {
        char c = text[i];
        if (c >= 'A' && c <= 'Z') c = static_cast<char>(c + 32);
        if (c != prefix[i]) return false;
    }
    return true;
}

// The schemas the root element names through xsi:schemaLocation or
// xsi:noNamespaceSchemaLocation, whatever prefix the root binds to the schema-instance namespace.
std::vector<detail::SchemaRef> SchemaRefsOf(const DomNode* root) {
    std::vector<detail::SchemaRef> refs;
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

const DomNode* RootElement(const DomNode* parentOfRoot) {
    for (const DomNode* c = parentOfRoot->FirstChild(); c; c = c->next)
        if (c->Type() == NODE_ELEMENT) return c;
    return nullptr;
}

DomError FromOutcome(const detail::ValidationOutcome& outcome, const std::string& url) {
    DomError error;
    error.code = FAILED(outcome.code) ? outcome.code : XML_E_INVALID;
    error.reason = outcome.reason.empty() ? "the document is not valid" : outcome.reason;
    error.line = outcome.line;
    error.linepos = outcome.column;
    error.url = outcome.url.empty() ? url : outcome.url;
    return error;
}

bool Failed(const detail::ValidationOutcome& outcome) {
    return FAILED(outcome.code) || !outcome.reason.empty();
}

// Parses `bytes` and, if it is well-formed (and valid where the root names schemas and
// validate-on-parse is on), makes it the document's content. A failure empties the document.
VARIANT_BOOL LoadBytes(DomDocument& doc, std::string_view bytes, const char* encoding,
                       const std::string& url) {
    DomError error;
    detail::MemorySource source(bytes);
    detail::ParsedContent content = detail::ParseXml(source, encoding, url, doc.EffectiveMaxDepth(),
                                                     error, false, doc.preserveWhiteSpace);
    if (!content.store) {
        doc.Clear();
        doc.error = std::move(error);
        return VARIANT_FALSE;
    }
    if (doc.validateOnParse) {
        std::vector<detail::SchemaRef> refs = SchemaRefsOf(RootElement(content.top));
        if (!refs.empty()) {
            detail::ValidationOutcome outcome =
                detail::ValidateAgainstNamedSchemas(bytes, url, refs, doc.serverHttpRequest);
            if (Failed(outcome)) {
                doc.Clear();
                doc.error = FromOutcome(outcome, url);
                return VARIANT_FALSE;
            }
        }
    }
    doc.Install(std::move(content.store), content.top);
    doc.url = url;
    doc.error = DomError();
    doc.error.url = url;
    return VARIANT_TRUE;
}

VARIANT_BOOL FailLoad(DomDocument& doc, DomError error) {
    doc.Clear();
    doc.error = std::move(error);
    return VARIANT_FALSE;
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

// Loads a file. The file is not held in memory while the tree is built: when the root names
// schemas (and validate-on-parse is on) the file is read whole and validated first, then freed
// and parsed again piece by piece, so the peak is the larger of the two phases, not their sum.
VARIANT_BOOL LoadFile(DomDocument& doc, const std::string& path, const std::string& url) {
    detail::FileSource source;
    DomError error;
    if (!source.Open(path, error)) return FailLoad(doc, std::move(error));
    const long depth = doc.EffectiveMaxDepth();
    if (doc.validateOnParse) {
        detail::ParsedContent head = detail::ParseXml(source, nullptr, url, depth, error, true);
        if (!head.store) return FailLoad(doc, std::move(error));
        std::vector<detail::SchemaRef> refs = SchemaRefsOf(RootElement(head.top));
        head = detail::ParsedContent();
        if (!refs.empty()) {
            std::string bytes;
            std::string readError;
            if (!source.ReadAll(bytes, readError)) {
                error = DomError();
                error.code = E_FAIL;
                error.reason = readError;
                error.url = url;
                return FailLoad(doc, std::move(error));
            }
            detail::ValidationOutcome outcome =
                detail::ValidateAgainstNamedSchemas(bytes, url, refs, doc.serverHttpRequest);
            if (Failed(outcome)) {
                // A document that is not even well-formed is reported as such, with the
                // parser's own words.
                detail::MemorySource memory(bytes);
                detail::ParsedContent check = detail::ParseXml(memory, nullptr, url, depth, error);
                return FailLoad(doc, check.store ? FromOutcome(outcome, url) : std::move(error));
            }
        }
        if (!source.Rewind()) {
            error = DomError();
            error.code = detail::HResultForErrno(errno);
            error.reason = "cannot read " + path + ": " + std::strerror(errno);
            error.url = url;
            return FailLoad(doc, std::move(error));
        }
    }
    detail::ParsedContent content =
        detail::ParseXml(source, nullptr, url, depth, error, false, doc.preserveWhiteSpace);
    if (!content.store) return FailLoad(doc, std::move(error));
    doc.Install(std::move(content.store), content.top);
    doc.url = url;
    doc.error = DomError();
    doc.error.url = url;
    RememberLoadedFile(doc, path);
    return VARIANT_TRUE;
}

VARIANT_BOOL FailLoad(DomDocument& doc, HRESULT code, std::string reason, std::string url) {
    doc.Clear();
    doc.error = DomError();
    doc.error.code = code;
    doc.error.reason = std::move(reason);
    doc.error.url = std::move(url);
    return VARIANT_FALSE;
}

bool EqualsNoCase(std::u16string_view a, std::u16string_view b) {
    if (a.size() != b.size()) return false;
    for (std::size_t i = 0; i < a.size(); ++i) {
        char16_t x = a[i], y = b[i];
        if (x >= u'A' && x <= u'Z') x = static_cast<char16_t>(x + 32);
        if (y >= u'A' && y <= u'Z') y = static_cast<char16_t>(y + 32);
        if (x != y) return false;
    }
    return true;
}

bool LooksLikeClassId(std::u16string_view s) {
    // {xxxxxxxx-xxxx-xxxx-xxxx-xxxxxxxxxxxx}
    if (s.size() != 38 || s.front() != u'{' || s.back() != u'}') return false;
    for (std::size_t i = 1; i < 37; ++i) {
        char16_t c = s[i];
        bool dash = i == 9 || i == 14 || i == 19 || i == 24;
        if (dash ? c != u'-'
                 : !((c >= u'0' && c <= u'9') || (c >= u'a' && c <= u'f') ||
                     (c >= u'A' && c <= u'F')))
            return false;
    }
    return true;
}

bool LooksLikeProgId(std::u16string_view s) {
    // Program.Component[.Version]: letters, digits, '_' and dots, starting with a letter.
    if (s.empty() || s.size() > 39) return false;
    if (!((s[0] >= u'a' && s[0] <= u'z') || (s[0] >= u'A' && s[0] <= u'Z'))) return false;
    bool dot = false;
    for (char16_t c : s) {
        if (c == u'.') {
            dot = true;
            continue;
        }
        if (!((c >= u'a' && c <= u'z') || (c >= u'A' && c <= u'Z') || (c >= u'0' && c <= u'9') ||
              c == u'_'))
            return false;
    }
    return dot;
}

DOMNodeType NodeTypeOf(const _variant_t& type) {
    if (type.vt == VT_BSTR) {
        static const std::pair<std::u16string_view, DOMNodeType> kNames[] = {
            {u"element", NODE_ELEMENT},
            {u"attribute", NODE_ATTRIBUTE},
            {u"text", NODE_TEXT},
            {u"cdatasection", NODE_CDATA_SECTION},
            {u"processinginstruction", NODE_PROCESSING_INSTRUCTION},
            {u"comment", NODE_COMMENT},
        };
        std::u16string_view text = BstrView(type.bstrVal);
        for (const auto& entry : kNames)
            if (EqualsNoCase(text, entry.first)) return entry.second;
        throw _com_error(E_INVALIDARG, "unknown node type name: " + Utf16ToUtf8(text));
    }
    return static_cast<DOMNodeType>(static_cast<long>(type));
}

// Atomically replaces `path` with the document's text: a temporary file beside it is written
// piece by piece and renamed over it; on any failure the temporary file is removed.
void SaveAtomically(const DomNode* document, const std::string& path, bool indent) {
    auto fail = [&](int err, const char* what) {
        throw _com_error(detail::HResultForErrno(err),
                         std::string(what) + " " + path + ": " + std::strerror(err));
    };
    if (path.empty()) fail(ENOENT, "cannot save to");
    // Saving through a symbolic link replaces the file it points to, not the link.
    std::string target = path;
    struct stat link {};
    if (::lstat(path.c_str(), &link) == 0 && S_ISLNK(link.st_mode)) {
        char* resolved = ::realpath(path.c_str(), nullptr);
        if (resolved) {
            target = resolved;
            std::free(resolved);
        }
    }
    std::string::size_type slash = target.rfind('/');
    std::string dir =
        slash == std::string::npos ? "." : (slash == 0 ? "/" : target.substr(0, slash));
    std::string base = slash == std::string::npos ? target : target.substr(slash + 1);
    if (base.empty()) fail(EISDIR, "cannot save to");
    struct stat st {};
    mode_t mode = 0666;
    if (::stat(target.c_str(), &st) == 0) {
        if (S_ISDIR(st.st_mode)) fail(EISDIR, "cannot save to");
        mode = st.st_mode & 07777;  // a replaced file keeps its permissions
    } else {
        // New files get the usual permissions, as open() would give them.
        std::ifstream status("/proc/self/status");
        std::string line;
        mode_t mask = 022;
        while (std::getline(status, line))
            if (line.compare(0, 6, "Umask:") == 0)
                mask = static_cast<mode_t>(std::strtol(line.c_str() + 6, nullptr, 8));
        mode &= ~mask;
    }
    // The temporary name stays within the file name length limit however long the target is.
    std::string temp = dir + "/." + base.substr(0, 200) + ".XXXXXX";
    int fd = ::mkstemp(&temp[0]);
    if (fd < 0) fail(errno, "cannot save to");
    struct TempFile {
        int fd;
        const std::string& path;
        bool keep = false;
        ~TempFile() {
            if (fd >= 0) ::close(fd);
            if (!keep) ::unlink(path.c_str());
        }
    } guard{fd, temp};
    auto write = [&](std::string_view piece) {
        while (!piece.empty()) {
            ssize_t n = ::write(fd, piece.data(), piece.size());
            if (n < 0) {
                if (errno == EINTR) continue;
                fail(errno, "cannot write");
            }
            piece.remove_prefix(static_cast<std::size_t>(n));
        }
    };
    std::string buffer;
    buffer.reserve(1024 * 1024 + 64 * 1024);
    long unrepresentable = detail::WriteXml(document, buffer, write, indent);
    if (unrepresentable >= 0) {
        // The file would not load again: refuse it rather than report a save that loses data.
        char code[32];
        std::snprintf(code, sizeof code, "U+%04lX", unrepresentable);
        throw _com_error(E_FAIL, "cannot save " + path + ": the document holds character " + code +
                                     ", which XML 1.0 cannot represent");
    }
    if (::fchmod(fd, mode) != 0) fail(errno, "cannot save to");
    if (::fsync(fd) != 0) fail(errno, "cannot write");
    guard.fd = -1;
    if (::close(fd) != 0) fail(errno, "cannot write");
    if (::rename(temp.c_str(), target.c_str()) != 0) fail(errno, "cannot save to");
    guard.keep = true;
}

}  // namespace

HRESULT IXMLDOMDocument::CreateDocument(const OLECHAR* progId, detail::DomDocument** document,
                                        detail::DomNode** node) noexcept {
    if (!document || !node) return E_POINTER;
    *document = nullptr;
    *node = nullptr;
    if (!progId) return CO_E_CLASSSTRING;
    std::u16string_view id(progId);
    if (!EqualsNoCase(id, kProgIdDOMDocument40) && !EqualsNoCase(id, kClsidDOMDocument40))
        return LooksLikeClassId(id) || LooksLikeProgId(id) ? REGDB_E_CLASSNOTREG : CO_E_CLASSSTRING;
    try {
        auto* created = new DomDocument();
        *document = created;
        *node = &created->node;
        return S_OK;
    } catch (...) {
        return E_OUTOFMEMORY;
    }
}

IXMLDOMElementPtr IXMLDOMDocument::GetdocumentElement() const {
    return IXMLDOMElementPtr(m_doc, const_cast<DomNode*>(RootElement(&m_doc->node)));
}

IXMLDOMNodePtr IXMLDOMDocument::createNode(const _variant_t& type, const _bstr_t& name,
                                           const _bstr_t& namespaceURI) {
    DOMNodeType kind = NodeTypeOf(type);
    std::string qname = Utf8(name);
    std::string ns = Utf8(namespaceURI);
    DomNode* node = nullptr;
    switch (kind) {
        case NODE_ELEMENT:
        case NODE_ATTRIBUTE:
            if (!detail::IsXmlName(qname))
                throw _com_error(E_FAIL, "not a valid name: \"" + qname + "\"");
            node = m_doc->NewNode(kind, m_doc->Intern(kind, qname, ns, true));
            break;
        case NODE_PROCESSING_INSTRUCTION:
            if (!detail::IsXmlName(qname))
                throw _com_error(E_FAIL, "not a valid target: \"" + qname + "\"");
            node = m_doc->NewNode(kind, m_doc->Intern(kind, qname));
            break;
        case NODE_TEXT:
        case NODE_CDATA_SECTION:
        case NODE_COMMENT:
            node = m_doc->NewNode(kind);
            break;
        default:
            throw _com_error(E_INVALIDARG,
                             "createNode cannot make nodes of type " + std::to_string(kind));
    }
    return IXMLDOMNodePtr(m_doc, node);
}

IXMLDOMElementPtr IXMLDOMDocument::createElement(const _bstr_t& tagName) {
    std::string qname = Utf8(tagName);
    if (!detail::IsXmlName(qname)) throw _com_error(E_FAIL, "not a valid name: \"" + qname + "\"");
    return IXMLDOMElementPtr(
        m_doc, m_doc->NewNode(NODE_ELEMENT, m_doc->Intern(NODE_ELEMENT, qname, {}, true)));
}

IXMLDOMAttributePtr IXMLDOMDocument::createAttribute(const _bstr_t& name) {
    std::string qname = Utf8(name);
    if (!detail::IsXmlName(qname)) throw _com_error(E_FAIL, "not a valid name: \"" + qname + "\"");
    return IXMLDOMAttributePtr(
        m_doc, m_doc->NewNode(NODE_ATTRIBUTE, m_doc->Intern(NODE_ATTRIBUTE, qname)));
}

IXMLDOMTextPtr IXMLDOMDocument::createTextNode(const _bstr_t& data) {
    DomNode* node = m_doc->NewNode(NODE_TEXT);
    m_doc->SetText(node, Utf8(data));
    return IXMLDOMTextPtr(m_doc, node);
}

IXMLDOMCommentPtr IXMLDOMDocument::createComment(const _bstr_t& data) {
    DomNode* node = m_doc->NewNode(NODE_COMMENT);
    m_doc->SetText(node, Utf8(data));
    return IXMLDOMCommentPtr(m_doc, node);
}

IXMLDOMProcessingInstructionPtr IXMLDOMDocument::createProcessingInstruction(const _bstr_t& target,
                                                                             const _bstr_t& data) {
    std::string name = Utf8(target);
    if (!detail::IsXmlName(name)) throw _com_error(E_FAIL, "not a valid target: \"" + name + "\"");
    DomNode* node = m_doc->NewNode(NODE_PROCESSING_INSTRUCTION,
                                   m_doc->Intern(NODE_PROCESSING_INSTRUCTION, name));
    if (node->IsDeclaration())
        detail::SetDeclarationText(*m_doc, node, Utf8(data));
    else
        m_doc->SetText(node, Utf8(data));
    return IXMLDOMProcessingInstructionPtr(m_doc, node);
}

VARIANT_BOOL IXMLDOMDocument::load(const _variant_t& source) {
    DomDocument& doc = *m_doc;
    try {
        if (source.vt != VT_BSTR)
            return FailLoad(doc, E_INVALIDARG, "load takes a file path or URL as a string", "");
        std::string location = Utf16ToUtf8(BstrView(source.bstrVal));
        std::string bytes;
        if (StartsWithNoCase(location, "http://") || StartsWithNoCase(location, "https://")) {
            if (!doc.serverHttpRequest)
                return FailLoad(
                    doc, E_ACCESSDENIED,
                    "loading from a URL needs the ServerHTTPRequest property: " + location,
                    location);
            detail::HttpResult fetched = detail::HttpGet(location);
            if (!fetched.ok) return FailLoad(doc, E_FAIL, fetched.error, location);
            bytes = std::move(fetched.body);
            return LoadBytes(doc, bytes, nullptr, location);
        }
        std::string path = location;
        if (StartsWithNoCase(path, "file://")) path.erase(0, 7);
        return LoadFile(doc, path, location);
    } catch (...) {
        return FailLoad(doc, E_OUTOFMEMORY, "out of memory while loading", "");
    }
}

VARIANT_BOOL IXMLDOMDocument::loadXML(const _bstr_t& text) {
    DomDocument& doc = *m_doc;
    try {
        // The string is already decoded: an encoding named in its declaration does not apply.
        return LoadBytes(doc, Utf16ToUtf8(text.View()), "UTF-8", std::string());
    } catch (...) {
        return FailLoad(doc, E_OUTOFMEMORY, "out of memory while loading", "");
    }
}

VARIANT_BOOL IXMLDOMDocument::loadBuffer(const void* data, std::size_t size) {
    DomDocument& doc = *m_doc;
    try {
        if (!data && size) return FailLoad(doc, E_POINTER, "no buffer given", "");
        return LoadBytes(doc, std::string_view(static_cast<const char*>(data), size), nullptr,
                         std::string());
    } catch (...) {
        return FailLoad(doc, E_OUTOFMEMORY, "out of memory while loading", "");
    }
}

void IXMLDOMDocument::save(const _variant_t& destination) {
    if (destination.vt != VT_BSTR)
        throw _com_error(E_INVALIDARG, "save takes a file path as a string");
    SaveAtomically(&m_doc->node, Utf16ToUtf8(BstrView(destination.bstrVal)), m_doc->indent);
}

IXMLDOMParseErrorPtr IXMLDOMDocument::GetparseError() const {
    return detail::MakeParseError(m_doc->error);
}

void IXMLDOMDocument::Putasync(VARIANT_BOOL async) { m_doc->async = async != VARIANT_FALSE; }
VARIANT_BOOL IXMLDOMDocument::Getasync() const {
    return m_doc->async ? VARIANT_TRUE : VARIANT_FALSE;
}

void IXMLDOMDocument::PutpreserveWhiteSpace(VARIANT_BOOL preserve) {
    m_doc->preserveWhiteSpace = preserve != VARIANT_FALSE;
}
VARIANT_BOOL IXMLDOMDocument::GetpreserveWhiteSpace() const {
    return m_doc->preserveWhiteSpace ? VARIANT_TRUE : VARIANT_FALSE;
}

void IXMLDOMDocument::PutvalidateOnParse(VARIANT_BOOL validate) {
    m_doc->validateOnParse = validate != VARIANT_FALSE;
}
VARIANT_BOOL IXMLDOMDocument::GetvalidateOnParse() const {
    return m_doc->validateOnParse ? VARIANT_TRUE : VARIANT_FALSE;
}

void IXMLDOMDocument2::setProperty(const _bstr_t& name, const _variant_t& value) {
    if (name == u"ServerHTTPRequest") {
        m_doc->serverHttpRequest = static_cast<bool>(value);
    } else if (name == u"MaxElementDepth") {
        long depth = static_cast<long>(value);
        if (depth < 0) throw _com_error(E_INVALIDARG, "MaxElementDepth cannot be negative");
        m_doc->maxElementDepth = depth;
    } else if (name == u"Indent") {
        m_doc->indent = static_cast<bool>(value);
    } else {
        throw _com_error(E_INVALIDARG, "unknown property " + Utf8(name));
    }
}

_variant_t IXMLDOMDocument2::getProperty(const _bstr_t& name) const {
    if (name == u"ServerHTTPRequest") return _variant_t(m_doc->serverHttpRequest);
    if (name == u"MaxElementDepth") return _variant_t(m_doc->EffectiveMaxDepth());
    if (name == u"Indent") return _variant_t(m_doc->indent);
    throw _com_error(E_INVALIDARG, "unknown property " + Utf8(name));
}

void IXMLDOMDocument2::putref_schemas(const IXMLDOMSchemaCollectionPtr& schemas) {
    m_doc->schemas = schemas;
}

IXMLDOMSchemaCollectionPtr IXMLDOMDocument2::Getschemas() const { return m_doc->schemas; }

IXMLDOMParseErrorPtr IXMLDOMDocument2::validate() {
    DomDocument& doc = *m_doc;
    const DomNode* root = RootElement(&doc.node);
    if (!root) {
        doc.error = DomError();
        doc.error.code = XML_E_INVALID;
        doc.error.reason = "the document has no root element to validate";
        doc.error.url = doc.url;
        return detail::MakeParseError(doc.error);
    }
    std::string bytes;
    if (!ReadUnchangedSource(doc, bytes)) {
        bytes.clear();
        detail::WriteXml(&doc.node, bytes);
    }
    detail::ValidationOutcome outcome;
    if (doc.schemas) {
        outcome = detail::ValidateAgainstCollection(bytes, doc.url, *doc.schemas);
    } else {
        std::vector<detail::SchemaRef> refs = SchemaRefsOf(root);
        if (refs.empty()) {
            outcome.code = XML_E_INVALID;
            outcome.reason = "no schema to validate against: none attached and the root names none";
        } else {
            outcome =
                detail::ValidateAgainstNamedSchemas(bytes, doc.url, refs, doc.serverHttpRequest);
        }
    }
    if (Failed(outcome)) {
        doc.error = FromOutcome(outcome, doc.url);
    } else {
        doc.error = DomError();
        doc.error.url = doc.url;
    }
    return detail::MakeParseError(doc.error);
}

}  // namespace kest
