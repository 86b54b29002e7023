#pragma once
// The node store behind the DOM interfaces: one arena per document holds every node and every
// string, so building is a bump allocation and freeing a document drops a few large chunks.
// Nodes are trivially destructible; nothing in the store recurses.

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "../IXMLDOMNode.h"
#include "../IXMLDOMParseError.h"
#include "../IXMLDOMSchemaCollection.h"

namespace kest {
namespace detail {

/// Chunked bump allocator. Memory is returned only when the arena dies.
class Arena {
  public:
    Arena() = default;
    Arena(const Arena&) = delete;
    Arena& operator=(const Arena&) = delete;

    void* Allocate(std::size_t size, std::size_t align = alignof(std::max_align_t));
    /// Copies `text` into the arena; the copy is not zero-terminated.
    const char* Copy(std::string_view text);
    /// Bytes held by the arena's chunks.
    std::size_t Footprint() const noexcept { return m_footprint; }

  private:
    struct FreeChunk {
        void operator()(char* p) const noexcept;
    };
    char* NewChunk(std::size_t size);

    std::vector<std::unique_ptr<char, FreeChunk>> m_chunks;
    char* m_cursor = nullptr;
    std::size_t m_left = 0;
    std::size_t m_nextChunk = 16 * 1024;
    std::size_t m_footprint = 0;
};

/// An interned qualified name together with the kind of node it names and the namespace a
/// node was created in. Every node has one; text, CDATA, comment and document nodes share
/// constant names ("#text", ...).
struct DomName {
    std::string_view qname;
    std::string_view namespaceURI;
    std::uint8_t type = NODE_INVALID;
    /// Elements, documents and the XML declaration hold children or attributes; every other
    /// node holds text.
    bool container = false;
    /// True for names of nodes made through createNode/createElement/createAttribute: the saver
    /// then declares namespaceURI where it is not in scope. Parsed names are written as they are.
    bool created = false;
    /// Length of the prefix before ':' (0 when none).
    std::uint32_t prefixLength = 0;
    std::string_view Prefix() const noexcept { return qname.substr(0, prefixLength); }
    std::string_view LocalName() const noexcept {
        return prefixLength ? qname.substr(prefixLength + 1) : qname;
    }
};

/// The shared name of text, CDATA, comment and document nodes.
const DomName* KindName(DOMNodeType type) noexcept;

/// A node: 56 bytes. Containers and text holders share storage, told apart by the name.
struct DomNode {
    DomNode() noexcept : m_links{nullptr, nullptr, nullptr} {}

    DomNode* parent = nullptr;  // for an attribute: its owner element or declaration
    DomNode* prev = nullptr;
    DomNode* next = nullptr;
    const DomName* name = nullptr;

    DOMNodeType Type() const noexcept { return static_cast<DOMNodeType>(name->type); }
    bool IsContainer() const noexcept { return name->container; }
    DomNode* FirstChild() const noexcept { return IsContainer() ? m_links.first : nullptr; }
    DomNode* LastChild() const noexcept { return IsContainer() ? m_links.last : nullptr; }
    /// Elements and the XML declaration only (null for every other node).
    DomNode* FirstAttribute() const noexcept {
        return IsContainer() ? m_links.attributes : nullptr;
    }
    /// UTF-8 value of a text holder; empty for containers.
    std::string_view Text() const noexcept {
        return IsContainer() ? std::string_view() : std::string_view(m_text.data, m_text.length);
    }
    std::string_view Name() const noexcept { return name->qname; }
    bool IsDeclaration() const noexcept {
        return name->type == NODE_PROCESSING_INSTRUCTION && name->container;
    }
    bool HasAttributes() const noexcept { return name->type == NODE_ELEMENT || IsDeclaration(); }

    // Containers only.
    void SetFirstChild(DomNode* n) noexcept { m_links.first = n; }
    void SetLastChild(DomNode* n) noexcept { m_links.last = n; }
    void SetFirstAttribute(DomNode* n) noexcept { m_links.attributes = n; }
    // Text holders only; `data` lives in the document's arena.
    void SetTextStorage(const char* data, std::uint32_t length) noexcept {
        m_text.data = data;
        m_text.length = length;
        m_text.line = m_text.column = 0;
    }
    // Where a loaded text node starts in its file (1-based); 0 when unknown or changed since.
    // It takes room the links leave free in the union: no node grows.
    void SetTextPosition(std::uint32_t line, std::uint32_t column) noexcept {
        m_text.line = line;
        m_text.column = column;
    }
    std::uint32_t TextLine() const noexcept { return IsContainer() ? 0 : m_text.line; }
    std::uint32_t TextColumn() const noexcept { return IsContainer() ? 0 : m_text.column; }

  private:
    struct Links {
        DomNode* first;
        DomNode* last;
        DomNode* attributes;
    };
    struct TextSpan {
        const char* data;
        std::uint32_t length;
        std::uint32_t line;
        std::uint32_t column;
    };
    union {
        Links m_links;
        TextSpan m_text;
    };
};
static_assert(std::is_trivially_destructible<DomNode>::value, "nodes are freed with the arena");
static_assert(sizeof(DomNode) <= 56 || sizeof(void*) != 8, "keep nodes small");

/// Details of the last load or validation.
struct DomError {
    HRESULT code = S_OK;
    std::string reason;
    std::string url;
    long line = 0;
    long linepos = 0;
    long filepos = 0;
    std::string srcText;
    std::string what;  // the reason without the position, when the reason carries one
    long cause = DOM_CAUSE_OTHER;
};

/// Memory of one generation of content: nodes, strings and the names they use.
struct DomStore {
    Arena arena;
    std::unordered_map<std::string_view, const DomName*> names;
    /// Short whitespace texts (indentation) are stored once.
    std::unordered_map<std::string_view, const char*> blanks;
    std::string key;  // scratch for Intern

    /// The interned name of a node of `type` (element, attribute or processing instruction).
    const DomName* Intern(DOMNodeType type, std::string_view qname,
                          std::string_view namespaceURI = {}, bool created = false);
    /// A new unattached node; `name` null for text, CDATA, comment and document nodes.
    DomNode* NewNode(DOMNodeType type, const DomName* name = nullptr);
    void SetText(DomNode* node, std::string_view text);
};

struct DomDocument {
    DomDocument();
    ~DomDocument();
    DomDocument(const DomDocument&) = delete;
    DomDocument& operator=(const DomDocument&) = delete;

    long refs = 1;  // one thread per document: no atomics needed
    DomNode node;   // the document node itself
    /// Every store whose nodes may still be referenced; the last one takes new nodes. A reload
    /// keeps older stores while anything but the one document pointer refers to the document.
    std::vector<std::unique_ptr<DomStore>> stores;
    /// Bumped by every change of structure, so cached list positions can tell they are stale.
    std::uint64_t generation = 0;

    bool async = true;
    bool validateOnParse = true;
    bool preserveWhiteSpace = true;
    bool serverHttpRequest = false;
    std::string schemaPath;              // "SchemaPath": validate against this schema instead
    bool builtinSchemaFallback = false;  // "BuiltinSchemaFallback"
    bool usedBuiltinSchema = false;      // "UsedBuiltinSchema": the last load or validation did
    long maxElementDepth = 0;            // 0: kDefaultMaxElementDepth
    bool indent = false;                 // save writes one element per line
    ComPtr<IXMLDOMSchemaCollection> schemas;
    DomError error;
    std::string url;  // where the current content was loaded from
    /// Bumped by every change of a node's text.
    std::uint64_t textChanges = 0;
    /// The file the content came from and how it stood then, so validate() can check the file's
    /// own bytes (and report the file's line numbers) while nothing has changed since.
    struct LoadedFile {
        std::string path;
        std::uint64_t generation = 0;
        std::uint64_t textChanges = 0;
        long long size = -1;
        long long mtimeNs = -1;
    } loadedFile;

    /// The node and document behind an interface handle (null for null).
    static DomNode* NodeOf(const IXMLDOMNode* handle) noexcept {
        return handle ? handle->m_node : nullptr;
    }
    static DomDocument* DocumentOf(const IXMLDOMNode* handle) noexcept {
        return handle ? handle->m_doc : nullptr;
    }

    DomStore& Store() { return *stores.back(); }
    /// The interned name for (qname, namespace, created).
    const DomName* Intern(DOMNodeType type, std::string_view qname,
                          std::string_view namespaceURI = {}, bool created = false) {
        return Store().Intern(type, qname, namespaceURI, created);
    }
    /// A new unattached node of this document.
    DomNode* NewNode(DOMNodeType type, const DomName* name = nullptr) {
        return Store().NewNode(type, name);
    }
    void SetText(DomNode* n, std::string_view text) {
        ++textChanges;
        Store().SetText(n, text);
    }
    /// Drops the current content. Detached nodes stay readable while referenced; when nothing
    /// but one document pointer refers to the document, their memory is returned.
    void Clear();
    /// Replaces the content with the children of `top`, all allocated in `store`.
    void Install(std::unique_ptr<DomStore> store, DomNode* top);
    long EffectiveMaxDepth() const noexcept;
};

/// Appends `child` (unattached) as the last child of `parent`.
void LinkChild(DomNode* parent, DomNode* child) noexcept;
/// Detaches a node from its parent (children and attributes alike).
void Unlink(DomNode* node) noexcept;
/// Appends an unattached attribute to an element or declaration.
void LinkAttribute(DomNode* owner, DomNode* attribute) noexcept;
DomNode* FindAttribute(const DomNode* owner, std::string_view qname) noexcept;
/// The next node of `root`'s subtree in document order (attributes excluded), or null.
inline DomNode* NextInSubtree(const DomNode* root, DomNode* node) noexcept {
    if (DomNode* child = node->FirstChild()) return child;
    while (node != root) {
        if (node->next) return node->next;
        node = node->parent;
    }
    return nullptr;
}

/// Number of documents alive in this process (for leak checks in tests).
long LiveDocuments() noexcept;

}  // namespace detail
}  // namespace kest
