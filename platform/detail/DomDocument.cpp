#include "DomDocument.h"

#include <sys/mman.h>

#include <atomic>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <new>
#include <stdexcept>

#include "../IXMLDOMDocument.h"

namespace kest {
namespace detail {

namespace {
std::atomic<long> g_liveDocuments{0};
constexpr std::size_t kMaxChunk = 2 * 1024 * 1024;
}  // namespace

void Arena::FreeChunk::operator()(char* p) const noexcept { std::free(p); }

char* Arena::NewChunk(std::size_t size) {
    m_chunks.reserve(m_chunks.size() + 1);
    void* p = nullptr;
    if (size == kMaxChunk) {
        // Full-size chunks are aligned to the huge page size and offered to the kernel as huge
        // pages: a large document then costs far fewer page faults while it is built.
        if (::posix_memalign(&p, kMaxChunk, size) != 0) p = nullptr;
#ifdef MADV_HUGEPAGE
        if (p) ::madvise(p, size, MADV_HUGEPAGE);
#endif
    } else {
        p = std::malloc(size);
    }
    if (!p) throw std::bad_alloc();
    m_chunks.emplace_back(static_cast<char*>(p));
    m_footprint += size;
    return static_cast<char*>(p);
}

void* Arena::Allocate(std::size_t size, std::size_t align) {
    std::size_t pad = (align - reinterpret_cast<std::uintptr_t>(m_cursor) % align) % align;
    if (!m_cursor || pad + size > m_left) {
        // Large blocks get a chunk of their own so that the current chunk keeps its room.
        if (size + align > m_nextChunk / 4) {
            char* p = NewChunk(size + align);
            std::size_t off = (align - reinterpret_cast<std::uintptr_t>(p) % align) % align;
            return p + off;
        }
        m_cursor = NewChunk(m_nextChunk);
        m_left = m_nextChunk;
        if (m_nextChunk < kMaxChunk) m_nextChunk *= 2;
        pad = (align - reinterpret_cast<std::uintptr_t>(m_cursor) % align) % align;
    }
    char* result = m_cursor + pad;
    m_cursor += pad + size;
    m_left -= pad + size;
    return result;
}

const char* Arena::Copy(std::string_view text) {
    if (text.empty()) return "";
    char* p = static_cast<char*>(Allocate(text.size(), 1));
    std::memcpy(p, text.data(), text.size());
    return p;
}

namespace {
DomName MakeKindName(DOMNodeType type, std::string_view qname, bool container) {
    DomName name;
    name.qname = qname;
    name.type = static_cast<std::uint8_t>(type);
    name.container = container;
    return name;
}
const DomName kDocumentName = MakeKindName(NODE_DOCUMENT, "#document", true);
const DomName kTextName = MakeKindName(NODE_TEXT, "#text", false);
const DomName kCdataName = MakeKindName(NODE_CDATA_SECTION, "#cdata-section", false);
const DomName kCommentName = MakeKindName(NODE_COMMENT, "#comment", false);
}  // namespace

const DomName* KindName(DOMNodeType type) noexcept {
    switch (type) {
        case NODE_DOCUMENT:
            return &kDocumentName;
        case NODE_TEXT:
            return &kTextName;
        case NODE_CDATA_SECTION:
            return &kCdataName;
        case NODE_COMMENT:
            return &kCommentName;
        default:
            return nullptr;
    }
}

DomDocument::DomDocument() {
    node.name = &kDocumentName;
    stores.push_back(std::make_unique<DomStore>());
    g_liveDocuments.fetch_add(1, std::memory_order_relaxed);
}

DomDocument::~DomDocument() { g_liveDocuments.fetch_sub(1, std::memory_order_relaxed); }

const DomName* DomStore::Intern(DOMNodeType type, std::string_view qname,
                                std::string_view namespaceURI, bool created) {
    // Key: kind, flag, namespace, NUL, qualified name. A namespace URI read from XML has no NUL.
    key.clear();
    key.reserve(qname.size() + namespaceURI.size() + 3);
    key.push_back(static_cast<char>('A' + type));
    key.push_back(created ? '1' : '0');
    key.append(namespaceURI);
    key.push_back('\0');
    key.append(qname);
    auto it = names.find(key);
    if (it != names.end()) return it->second;
    const char* stored = arena.Copy(key);
    std::string_view storedKey(stored, key.size());
    auto* name = new (arena.Allocate(sizeof(DomName), alignof(DomName))) DomName();
    name->namespaceURI = storedKey.substr(2, namespaceURI.size());
    name->qname = storedKey.substr(namespaceURI.size() + 3);
    name->type = static_cast<std::uint8_t>(type);
    name->container =
        type == NODE_ELEMENT || (type == NODE_PROCESSING_INSTRUCTION && qname == "xml");
    name->created = created;
    std::size_t colon = name->qname.find(':');
    name->prefixLength =
        (colon != std::string_view::npos && colon > 0) ? static_cast<std::uint32_t>(colon) : 0;
    names.emplace(storedKey, name);
    return name;
}

DomNode* DomStore::NewNode(DOMNodeType type, const DomName* name) {
    auto* n = new (arena.Allocate(sizeof(DomNode), alignof(DomNode))) DomNode();
    n->name = name ? name : KindName(type);
    if (!n->name) throw std::invalid_argument("a node of this kind needs a name");
    if (!n->IsContainer()) n->SetTextStorage("", 0);
    return n;
}

void DomStore::SetText(DomNode* n, std::string_view text) {
    if (text.size() > std::numeric_limits<std::uint32_t>::max()) throw std::bad_alloc();
    n->SetTextStorage(arena.Copy(text), static_cast<std::uint32_t>(text.size()));
}

void DomDocument::Clear() {
    for (DomNode* child = node.FirstChild(); child;) {
        DomNode* next = child->next;
        child->parent = child->prev = child->next = nullptr;
        child = next;
    }
    node.SetFirstChild(nullptr);
    node.SetLastChild(nullptr);
    ++generation;
    loadedFile = LoadedFile();
    if (refs == 1) {
        // Only the caller's document pointer is left: no node of the old content is reachable.
        stores.clear();
        stores.push_back(std::make_unique<DomStore>());
    }
}

void DomDocument::Install(std::unique_ptr<DomStore> store, DomNode* top) {
    Clear();
    if (refs == 1) stores.clear();
    stores.push_back(std::move(store));
    for (DomNode* child = top->FirstChild(); child; child = child->next) child->parent = &node;
    node.SetFirstChild(top->FirstChild());
    node.SetLastChild(top->LastChild());
    top->SetFirstChild(nullptr);
    top->SetLastChild(nullptr);
}

long DomDocument::EffectiveMaxDepth() const noexcept {
    return maxElementDepth > 0 ? maxElementDepth : kDefaultMaxElementDepth;
}

void LinkChild(DomNode* parent, DomNode* child) noexcept {
    child->parent = parent;
    child->next = nullptr;
    DomNode* last = parent->LastChild();
    child->prev = last;
    if (last)
        last->next = child;
    else
        parent->SetFirstChild(child);
    parent->SetLastChild(child);
}

void LinkAttribute(DomNode* owner, DomNode* attribute) noexcept {
    attribute->parent = owner;
    attribute->next = nullptr;
    DomNode* last = owner->FirstAttribute();
    while (last && last->next) last = last->next;
    attribute->prev = last;
    if (last)
        last->next = attribute;
    else
        owner->SetFirstAttribute(attribute);
}

void Unlink(DomNode* n) noexcept {
    DomNode* parent = n->parent;
    if (!parent) return;
    if (n->Type() == NODE_ATTRIBUTE) {
        if (n->prev)
            n->prev->next = n->next;
        else
            parent->SetFirstAttribute(n->next);
        if (n->next) n->next->prev = n->prev;
    } else {
        if (n->prev)
            n->prev->next = n->next;
        else
            parent->SetFirstChild(n->next);
        if (n->next)
            n->next->prev = n->prev;
        else
            parent->SetLastChild(n->prev);
    }
    n->parent = n->prev = n->next = nullptr;
}

DomNode* FindAttribute(const DomNode* owner, std::string_view qname) noexcept {
    for (DomNode* a = owner->FirstAttribute(); a; a = a->next)
        if (a->Name() == qname) return a;
    return nullptr;
}

long LiveDocuments() noexcept { return g_liveDocuments.load(std::memory_order_relaxed); }

}  // namespace detail

void DomAddRef(detail::DomDocument* document) noexcept { ++document->refs; }

void DomRelease(detail::DomDocument* document) noexcept {
    if (--document->refs == 0) delete document;
}

bool DomNodeIs(const detail::DomNode* node, DOMNodeType type) noexcept {
    return node && node->name->type == type;
}

}  // namespace kest
