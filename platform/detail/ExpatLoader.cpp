#include "ExpatLoader.h"

#include <expat.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <new>
#include <vector>

#include "DomNames.h"

namespace kest {
namespace detail {

namespace {

constexpr std::size_t kFeedChunk = 256 * 1024;
constexpr std::size_t kMaxSharedBlank = 64;

struct Builder {
    XML_Parser parser = nullptr;
    DomStore* store = nullptr;
    DomNode* top = nullptr;
    DomNode* current = nullptr;
    long depth = 0;
    long maxDepth = 0;
    int doctypeDepth = 0;
    bool inCdata = false;
    bool utf8Bom = false;   // the bytes start with a UTF-8 byte order mark (encoding not forced)
    bool rootOnly = false;  // stop once the root element's start tag is built
    bool rootSeen = false;
    bool hasDoctype = false;
    std::vector<std::string> declaredEntities;  // general entities of the internal subset
    bool dropBlanksBesideElements = false;
    std::string text;                            // character data not yet turned into a node
    std::uint32_t textLine = 0, textColumn = 0;  // where `text` starts
    // Names repeat throughout a document: a small direct-mapped cache in front of the store's
    // table spares the key building and hashing of most lookups.
    const DomName* nameCache[512] = {};

    const DomName* Name(DOMNodeType type, const XML_Char* raw) {
        std::string_view name(raw);
        std::uint32_t h = 2166136261u ^ static_cast<std::uint32_t>(type);
        for (char c : name) h = (h ^ static_cast<unsigned char>(c)) * 16777619u;
        const DomName*& slot = nameCache[h & 511];
        if (!slot || slot->type != type || slot->qname != name) {
            if (HasForeignNameChar(name)) Stop("not well-formed (invalid name character)");
            slot = store->Intern(type, name);
        }
        return slot;
    }

    // expat's ISO-8859-1 and UTF-16 decoders take U+00AA, U+00B5 and U+00BA for name
    // characters, which XML does not (its UTF-8 decoder refuses them): such a name would be
    // saved as a document that cannot be read back.
    static bool HasForeignNameChar(std::string_view name) {
        for (std::size_t i = 0; i + 1 < name.size(); ++i) {
            if (static_cast<unsigned char>(name[i]) != 0xC2) continue;
            unsigned char c = static_cast<unsigned char>(name[i + 1]);
            if (c == 0xAA || c == 0xB5 || c == 0xBA) return true;
        }
        return false;
    }

    // Why the build stopped the parser, when it did.
    std::string failure;
    long failLine = 0;
    long failColumn = 0;
    long failByte = 0;

    void Stop(std::string why) {
        if (failure.empty()) {
            failure = std::move(why);
            failLine = static_cast<long>(XML_GetCurrentLineNumber(parser));
            failColumn = static_cast<long>(XML_GetCurrentColumnNumber(parser)) + 1;
            failByte = static_cast<long>(XML_GetCurrentByteIndex(parser));
        }
        XML_StopParser(parser, XML_FALSE);
    }

    // Ends the pending text at a tag: `elementFollows` when a child element starts next.
    // Indentation beside elements carries nothing a reader of element content looks at, and on
    // large files its nodes cost a good part of the document's memory.
    void FlushAtTag(bool elementFollows) {
        if (dropBlanksBesideElements && !text.empty() &&
            text.find_first_not_of(" \t\r\n") == std::string::npos) {
            const DomNode* previous = current->LastChild();
            if (elementFollows || (previous && previous->Type() == NODE_ELEMENT)) {
                text.clear();
                return;
            }
        }
        Flush();
    }

    void Flush() {
        if (text.empty()) return;
        DomNode* node = store->NewNode(NODE_TEXT);
        if (text.size() <= kMaxSharedBlank &&
            text.find_first_not_of(" \t\r\n") == std::string::npos) {
            // Indentation repeats all over a document: keep one copy of each run.
            auto it = store->blanks.find(text);
            if (it == store->blanks.end()) {
                const char* stored = store->arena.Copy(text);
                it = store->blanks.emplace(std::string_view(stored, text.size()), stored).first;
            }
            node->SetTextStorage(it->second, static_cast<std::uint32_t>(text.size()));
        } else {
            store->SetText(node, text);
        }
        node->SetTextPosition(textLine, textColumn);
        LinkChild(current, node);
        text.clear();
    }
};

template <class F>
void Guard(void* data, F&& body) {
    auto* b = static_cast<Builder*>(data);
    if (!b->failure.empty() || b->rootSeen) return;  // expat may call a handler after a stop
    try {
        body(*b);
    } catch (const std::bad_alloc&) {
        b->Stop("out of memory");
    } catch (...) {
        b->Stop("internal error while building the document");
    }
}

// expat drops a reference to an undeclared entity in an attribute value without a word when the
// document has a DTD it does not read; the raw start tag shows such a reference.
std::string UndeclaredEntityInTag(const Builder& b) {
    int offset = 0, size = 0;
    const char* context = XML_GetInputContext(b.parser, &offset, &size);
    int length = XML_GetCurrentByteCount(b.parser);
    if (!context || length <= 0 || offset + length > size) return {};
    std::string_view tag(context + offset, static_cast<std::size_t>(length));
    if (tag.find('\0') != std::string_view::npos) return {};  // UTF-16: expat decides alone
    for (std::size_t amp = tag.find('&'); amp != std::string_view::npos;
         amp = tag.find('&', amp + 1)) {
        std::size_t end = tag.find(';', amp);
        if (end == std::string_view::npos) break;
        std::string name(tag.substr(amp + 1, end - amp - 1));
        if (name.empty() || name[0] == '#' || name == "amp" || name == "lt" || name == "gt" ||
            name == "apos" || name == "quot")
            continue;
        if (std::find(b.declaredEntities.begin(), b.declaredEntities.end(), name) ==
            b.declaredEntities.end())
            return name;
    }
    return {};
}

void XMLCALL OnEntityDecl(void* data, const XML_Char* name, int parameterEntity, const XML_Char*,
                          int, const XML_Char*, const XML_Char*, const XML_Char*, const XML_Char*) {
    Guard(data, [&](Builder& b) {
        if (!parameterEntity) b.declaredEntities.emplace_back(name);
    });
}

void XMLCALL OnStart(void* data, const XML_Char* name, const XML_Char** atts) {
    Guard(data, [&](Builder& b) {
        if (b.hasDoctype && atts[0]) {
            std::string entity = UndeclaredEntityInTag(b);
            if (!entity.empty()) {
                b.Stop("reference to entity '" + entity +
                       "', which is not declared in the document and is never loaded");
                return;
            }
        }
        b.FlushAtTag(true);
        if (++b.depth > b.maxDepth) {
            b.Stop("element nesting deeper than " + std::to_string(b.maxDepth));
            return;
        }
        DomNode* element = b.store->NewNode(NODE_ELEMENT, b.Name(NODE_ELEMENT, name));
        DomNode* lastAttribute = nullptr;
        for (const XML_Char** a = atts; *a; a += 2) {
            DomNode* attribute = b.store->NewNode(NODE_ATTRIBUTE, b.Name(NODE_ATTRIBUTE, a[0]));
            b.store->SetText(attribute, a[1]);
            attribute->parent = element;
            attribute->prev = lastAttribute;
            if (lastAttribute)
                lastAttribute->next = attribute;
            else
                element->SetFirstAttribute(attribute);
            lastAttribute = attribute;
        }
        LinkChild(b.current, element);
        b.current = element;
        if (b.rootOnly) {
            b.rootSeen = true;
            XML_StopParser(b.parser, XML_FALSE);
        }
    });
}

void XMLCALL OnEnd(void* data, const XML_Char*) {
    Guard(data, [&](Builder& b) {
        b.FlushAtTag(false);
        --b.depth;
        b.current = b.current->parent;
    });
}

void XMLCALL OnCharacters(void* data, const XML_Char* s, int len) {
    Guard(data, [&](Builder& b) {
        if (b.text.empty()) {
            b.textLine = static_cast<std::uint32_t>(XML_GetCurrentLineNumber(b.parser));
            b.textColumn = static_cast<std::uint32_t>(XML_GetCurrentColumnNumber(b.parser)) + 1;
        }
        b.text.append(s, static_cast<std::size_t>(len));
    });
}

void XMLCALL OnCdataStart(void* data) {
    Guard(data, [&](Builder& b) {
        b.Flush();
        b.inCdata = true;
    });
}

void XMLCALL OnCdataEnd(void* data) {
    Guard(data, [&](Builder& b) {
        DomNode* node = b.store->NewNode(NODE_CDATA_SECTION);
        b.store->SetText(node, b.text);
        node->SetTextPosition(b.textLine, b.textColumn);
        b.text.clear();
        LinkChild(b.current, node);
        b.inCdata = false;
    });
}

void XMLCALL OnComment(void* data, const XML_Char* s) {
    Guard(data, [&](Builder& b) {
        if (b.doctypeDepth > 0) return;  // part of the DTD, not of the document
        b.Flush();
        DomNode* node = b.store->NewNode(NODE_COMMENT);
        b.store->SetText(node, s);
        LinkChild(b.current, node);
    });
}

void XMLCALL OnPI(void* data, const XML_Char* target, const XML_Char* pidata) {
    Guard(data, [&](Builder& b) {
        if (b.doctypeDepth > 0) return;
        b.Flush();
        DomNode* node = b.store->NewNode(NODE_PROCESSING_INSTRUCTION,
                                         b.Name(NODE_PROCESSING_INSTRUCTION, target));
        b.store->SetText(node, pidata ? pidata : "");
        LinkChild(b.current, node);
    });
}

void XMLCALL OnXmlDecl(void* data, const XML_Char* version, const XML_Char* encoding,
                       int standalone) {
    Guard(data, [&](Builder& b) {
        if (!version || b.current != b.top) return;  // a text declaration of an entity
        if (b.utf8Bom && encoding && !IsUtf8EncodingName(encoding)) {
            // expat lets the mark win silently; the document contradicts itself, so refuse it.
            b.Stop(std::string("encoding \"") + encoding +
                   "\" declared after a UTF-8 byte order mark");
            return;
        }
        DomNode* decl = b.store->NewNode(NODE_PROCESSING_INSTRUCTION,
                                         b.store->Intern(NODE_PROCESSING_INSTRUCTION, "xml"));
        auto add = [&](const char* name, std::string_view value) {
            DomNode* attribute =
                b.store->NewNode(NODE_ATTRIBUTE, b.store->Intern(NODE_ATTRIBUTE, name));
            b.store->SetText(attribute, value);
            LinkAttribute(decl, attribute);
        };
        add("version", version);
        if (encoding) add("encoding", encoding);
        if (standalone >= 0) add("standalone", standalone ? "yes" : "no");
        LinkChild(b.current, decl);
    });
}

void XMLCALL OnDoctypeStart(void* data, const XML_Char*, const XML_Char*, const XML_Char*, int) {
    static_cast<Builder*>(data)->doctypeDepth++;
    static_cast<Builder*>(data)->hasDoctype = true;
}

// Entities are never read from outside the bytes: a reference to one would silently lose text.
void XMLCALL OnSkippedEntity(void* data, const XML_Char* name, int parameterEntity) {
    if (parameterEntity) return;  // inside the DTD; changes no content
    Guard(data, [&](Builder& b) {
        b.Stop(std::string("reference to entity '") + name +
               "', which is not declared in the document and is never loaded");
    });
}

int XMLCALL OnExternalEntity(XML_Parser parser, const XML_Char* context, const XML_Char*,
                             const XML_Char* systemId, const XML_Char*) {
    // The context ends with the name of the entity being opened.
    std::string name = context ? context : "";
    std::string::size_type separator = name.rfind('\f');
    if (separator != std::string::npos) name.erase(0, separator + 1);
    void* data = XML_GetUserData(parser);
    Guard(data, [&](Builder& b) {
        b.Stop("reference to external entity '" + name + "' (" + (systemId ? systemId : "") +
               "), which is never loaded");
    });
    return XML_STATUS_ERROR;
}

void XMLCALL OnDoctypeEnd(void* data) { static_cast<Builder*>(data)->doctypeDepth--; }

bool StartsWithUtf16Bom(std::string_view bytes) {
    return bytes.size() >= 2 && ((static_cast<unsigned char>(bytes[0]) == 0xFF &&
                                  static_cast<unsigned char>(bytes[1]) == 0xFE) ||
                                 (static_cast<unsigned char>(bytes[0]) == 0xFE &&
                                  static_cast<unsigned char>(bytes[1]) == 0xFF));
}

// The line of text around `offset`, for the parse error's srcText.
std::string LineAt(std::string_view bytes, long offset) {
    if (offset < 0 || static_cast<std::size_t>(offset) > bytes.size()) return {};
    std::size_t pos = static_cast<std::size_t>(offset);
    std::size_t begin = bytes.rfind('\n', pos == 0 ? 0 : pos - 1);
    begin = (begin == std::string_view::npos || pos == 0) ? 0 : begin + 1;
    if (begin > pos) begin = pos;
    std::size_t end = bytes.find('\n', pos);
    if (end == std::string_view::npos) end = bytes.size();
    constexpr std::size_t kMax = 200;
    if (end - begin > kMax) {
        begin = pos > kMax / 2 ? std::max(begin, pos - kMax / 2) : begin;
        end = std::min(end, begin + kMax);
    }
    std::string line(bytes.substr(begin, end - begin));
    if (!line.empty() && line.back() == '\r') line.pop_back();
    return line;
}

}  // namespace

std::string DescribeLocation(const std::string& what, long line, long column,
                             const std::string& url) {
    std::string s =
        what + " at line " + std::to_string(line) + ", column " + std::to_string(column);
    if (!url.empty()) s += " in " + url;
    return s;
}

MemorySource::MemorySource(std::string_view bytes) noexcept : m_bytes(bytes) {}

bool MemorySource::Next(std::string_view& piece, std::string&) {
    std::size_t n = std::min(kFeedChunk, m_bytes.size() - m_offset);
    piece = m_bytes.substr(m_offset, n);
    m_offset += n;
    return true;
}

std::string MemorySource::LineAround(long offset) {
    return StartsWithUtf16Bom(m_bytes) ? std::string() : LineAt(m_bytes, offset);
}

HRESULT HResultForErrno(int err) noexcept {
    switch (err) {
        case EACCES:
        case EPERM:
        case EROFS:
            return E_ACCESSDENIED;
        case ENOENT:
            return static_cast<HRESULT>(0x80070002u);  // file not found
        case ENOTDIR:
            return static_cast<HRESULT>(0x80070003u);  // path not found
        default:
            return E_FAIL;
    }
}

FileSource::~FileSource() {
    if (m_fd >= 0) ::close(m_fd);
}

bool FileSource::Open(const std::string& path, DomError& error) {
    m_path = path;
    auto fail = [&](int err, const char* what) {
        error = DomError();
        error.code = HResultForErrno(err);
        error.url = path;
        error.reason = std::string(what) + " " + path + ": " + std::strerror(err);
        return false;
    };
    // Our own descriptor for standard input, so that closing the source leaves the process's.
    m_fd = path == "-" ? ::fcntl(STDIN_FILENO, F_DUPFD_CLOEXEC, 0)
                       : ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (m_fd < 0) return fail(errno, "cannot open");
    struct stat st {};
    if (::fstat(m_fd, &st) != 0) return fail(errno, "cannot read");
    if (S_ISDIR(st.st_mode)) return fail(EISDIR, "cannot load");
    // A regular file that is standard input may have been read partly; it is still read once.
    m_seekable = S_ISREG(st.st_mode) && path != "-";
    if (S_ISREG(st.st_mode)) m_size = static_cast<std::size_t>(st.st_size);
    return true;
}

bool FileSource::Next(std::string_view& piece, std::string& error) {
    m_buffer.resize(kFeedChunk);
    for (;;) {
        ssize_t n = ::read(m_fd, &m_buffer[0], m_buffer.size());
        if (n < 0 && errno == EINTR) continue;
        if (n < 0) {
            error = "cannot read " + m_path + ": " + std::strerror(errno);
            return false;
        }
        if (m_atStart && n > 0) m_utf16 = StartsWithUtf16Bom(std::string_view(m_buffer.data(), n));
        m_atStart = false;
        piece = std::string_view(m_buffer.data(), static_cast<std::size_t>(n));
        return true;
    }
}

bool FileSource::Rewind() {
    m_atStart = true;
    return ::lseek(m_fd, 0, SEEK_SET) == 0;
}

bool FileSource::ReadAll(std::string& bytes, std::string& error) {
    if (!m_atStart && !Rewind()) {
        error = "cannot read " + m_path + ": " + std::strerror(errno);
        return false;
    }
    bytes.clear();
    bytes.reserve(m_size);
    std::string_view piece;
    do {
        if (!Next(piece, error)) return false;
        bytes.append(piece.data(), piece.size());
    } while (!piece.empty());
    return true;
}

std::string FileSource::LineAround(long offset) {
    if (m_utf16 || offset < 0) return {};
    constexpr long kWindow = 256;
    long start = offset > kWindow ? offset - kWindow : 0;
    std::string window(static_cast<std::size_t>(2 * kWindow), '\0');
    ssize_t n = ::pread(m_fd, &window[0], window.size(), start);
    if (n < 0) return {};
    window.resize(static_cast<std::size_t>(n));
    return LineAt(window, offset - start);
}

ParsedContent ParseXml(XmlSource& source, const char* forcedEncoding, const std::string& url,
                       long maxElementDepth, DomError& error, bool rootOnly,
                       bool preserveWhiteSpace) noexcept {
    ParsedContent result;
    error = DomError();
    XML_Parser parser = nullptr;
    try {
        error.url = url;
        result.store = std::make_unique<DomStore>();
        result.top = result.store->NewNode(NODE_DOCUMENT);
        parser = XML_ParserCreate(forcedEncoding);
        if (!parser) throw std::bad_alloc();

        Builder b;
        b.parser = parser;
        b.store = result.store.get();
        b.top = b.current = result.top;
        b.maxDepth = maxElementDepth;
        b.rootOnly = rootOnly;
        b.dropBlanksBesideElements = !preserveWhiteSpace;
        XML_SetUserData(parser, &b);
        XML_SetElementHandler(parser, OnStart, OnEnd);
        XML_SetCharacterDataHandler(parser, OnCharacters);
        XML_SetCdataSectionHandler(parser, OnCdataStart, OnCdataEnd);
        XML_SetCommentHandler(parser, OnComment);
        XML_SetProcessingInstructionHandler(parser, OnPI);
        XML_SetXmlDeclHandler(parser, OnXmlDecl);
        XML_SetDoctypeDeclHandler(parser, OnDoctypeStart, OnDoctypeEnd);
        // No external entity handler is installed and parameter entities are never parsed:
        // nothing outside the given bytes is ever read.
        XML_SetParamEntityParsing(parser, XML_PARAM_ENTITY_PARSING_NEVER);
        XML_SetSkippedEntityHandler(parser, OnSkippedEntity);
        XML_SetEntityDeclHandler(parser, OnEntityDecl);
        XML_SetExternalEntityRefHandler(parser, OnExternalEntity);

        XML_Status status = XML_STATUS_OK;
        bool first = true;
        for (;;) {
            std::string_view piece;
            std::string readError;
            if (!source.Next(piece, readError)) {
                XML_ParserFree(parser);
                error.code = E_FAIL;
                error.reason = readError;
                return ParsedContent();
            }
            if (first) {
                b.utf8Bom = !forcedEncoding && piece.size() >= 3 &&
                            piece.compare(0, 3, "\xEF\xBB\xBF") == 0;
                first = false;
            }
            bool last = piece.empty();
            status = XML_Parse(parser, piece.data(), static_cast<int>(piece.size()), last);
            if (status != XML_STATUS_OK || last) break;
        }
        result.hasDoctype = b.hasDoctype;
        if (b.rootSeen) {
            XML_ParserFree(parser);
            return result;
        }

        if (status != XML_STATUS_OK || !b.failure.empty()) {
            error.code = XML_E_PARSEFAILED;
            std::string what, expected;
            if (!b.failure.empty()) {
                what = b.failure;
                error.line = b.failLine;
                error.linepos = b.failColumn;
                error.filepos = b.failByte;
            } else {
                XML_Error code = XML_GetErrorCode(parser);
                what = XML_ErrorString(code) ? XML_ErrorString(code) : "parse error";
                if (code == XML_ERROR_TAG_MISMATCH && b.current && b.current != b.top &&
                    b.current->Type() == NODE_ELEMENT && b.current->name)
                    expected = "; expected </" + std::string(b.current->name->qname) + ">";
                if (code == XML_ERROR_UNKNOWN_ENCODING || code == XML_ERROR_INCORRECT_ENCODING)
                    error.cause = DOM_CAUSE_UNKNOWN_ENCODING;
                error.line = static_cast<long>(XML_GetCurrentLineNumber(parser));
                error.linepos = static_cast<long>(XML_GetCurrentColumnNumber(parser)) + 1;
                error.filepos = static_cast<long>(XML_GetCurrentByteIndex(parser));
            }
            error.reason = DescribeLocation(what, error.line, error.linepos, url);
            // The structured reason also names the element left open, which expat's text does
            // not; the message keeps the parser's own words.
            error.what = what + expected;
            error.srcText = source.LineAround(error.filepos);
            XML_ParserFree(parser);
            return ParsedContent();
        }
        XML_ParserFree(parser);
        return result;
    } catch (...) {
        if (parser) XML_ParserFree(parser);
        error.code = E_OUTOFMEMORY;
        // Short of memory, the reason may be all that can be said.
        try {
            error.reason = "out of memory while loading";
            if (!url.empty()) error.reason += " " + url;
        } catch (...) {
        }
        return ParsedContent();
    }
}

}  // namespace detail
}  // namespace kest
