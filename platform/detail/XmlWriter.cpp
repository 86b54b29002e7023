#include "XmlWriter.h"

#include <vector>

#include "DomNames.h"

namespace kest {
namespace detail {

namespace {

constexpr std::string_view kXmlNamespace = "http://www.w3.org/XML/1998/namespace";

// The text being written, with the first character met that XML 1.0 cannot carry (a control
// character, U+FFFE, U+FFFF), or -1. One per WriteXml call, so concurrent writes stay apart.
struct Output : std::string {
    long unrepresentable = -1;
    void NoteUnrepresentable(long codePoint) {
        if (unrepresentable < 0) unrepresentable = codePoint;
    }
};

// Notes a character XML 1.0 cannot carry in raw text (CDATA, comments, instructions).
void CheckRaw(Output& out, std::string_view text) {
    for (std::size_t i = 0; i < text.size(); ++i) {
        unsigned char c = static_cast<unsigned char>(text[i]);
        if (c < 0x20 && c != '\t' && c != '\n' && c != '\r') {
            out.NoteUnrepresentable(c);
        } else if (c == 0xEF && i + 2 < text.size() &&
                   static_cast<unsigned char>(text[i + 1]) == 0xBF &&
                   (static_cast<unsigned char>(text[i + 2]) & 0xFE) == 0xBE) {
            out.NoteUnrepresentable(0xFFFE + (static_cast<unsigned char>(text[i + 2]) & 1));
        }
    }
}

void AppendCharRef(Output& out, unsigned char c) {
    out.NoteUnrepresentable(c);
    out += "&#";
    out += std::to_string(static_cast<unsigned>(c));
    out += ';';
}

// Writes text, escaping what must not appear raw. `attribute` selects the attribute rules.
void AppendEscaped(Output& out, std::string_view text, bool attribute) {
    if (text.find("\xEF\xBF") != std::string_view::npos) CheckRaw(out, text);  // U+FFFE, U+FFFF
    std::size_t run = 0;
    for (std::size_t i = 0; i < text.size(); ++i) {
        unsigned char c = static_cast<unsigned char>(text[i]);
        const char* replacement = nullptr;
        switch (c) {
            case '&':
                replacement = "&amp;";
                break;
            case '<':
                replacement = "&lt;";
                break;
            case '>':
                replacement = "&gt;";
                break;
            case '"':
                replacement = attribute ? "&quot;" : nullptr;
                break;
            case '\r':
                replacement = "&#13;";
                break;
            case '\n':
                replacement = attribute ? "&#10;" : nullptr;
                break;
            case '\t':
                replacement = attribute ? "&#9;" : nullptr;
                break;
            default:
                if (c < 0x20) {
                    out.append(text.data() + run, i - run);
                    AppendCharRef(out, c);
                    run = i + 1;
                }
                continue;
        }
        if (!replacement) continue;
        out.append(text.data() + run, i - run);
        out += replacement;
        run = i + 1;
    }
    out.append(text.data() + run, text.size() - run);
}

void AppendAttribute(Output& out, std::string_view name, std::string_view value) {
    out += ' ';
    out += name;
    out += "=\"";
    AppendEscaped(out, value, true);
    out += '"';
}

void AppendCdata(Output& out, std::string_view text) {
    // "]]>" cannot appear in a CDATA section and a CR in one reads back as LF. Splitting the
    // section would turn one value into several nodes; as escaped text it stays one value.
    if (text.find("]]>") != std::string_view::npos || text.find('\r') != std::string_view::npos) {
        AppendEscaped(out, text, false);
        return;
    }
    CheckRaw(out, text);
    out += "<![CDATA[";
    out += text;
    out += "]]>";
}

void AppendComment(Output& out, std::string_view text) {
    CheckRaw(out, text);
    out += "<!--";
    for (std::size_t i = 0; i < text.size(); ++i) {
        out += text[i];
        if (text[i] == '-' && (i + 1 == text.size() || text[i + 1] == '-')) out += ' ';
    }
    out += "-->";
}

void AppendPI(Output& out, const DomNode* node) {
    out += "<?";
    out += node->Name();
    if (node->IsDeclaration()) {
        const DomNode* version = FindAttribute(node, "version");
        AppendAttribute(out, "version", version ? version->Text() : "1.0");
        for (const DomNode* a = node->FirstAttribute(); a; a = a->next) {
            if (a == version) continue;
            if (a->Name() == "encoding" && !IsUtf8EncodingName(a->Text()))
                AppendAttribute(out, "encoding", "UTF-8");
            else
                AppendAttribute(out, a->Name(), a->Text());
        }
        out += "?>";
        return;
    }
    std::string_view data = node->Text();
    CheckRaw(out, data);
    if (!data.empty()) out += ' ';
    std::size_t run = 0;
    for (std::size_t i = 0; i + 1 < data.size(); ++i) {
        if (data[i] == '?' && data[i + 1] == '>') {
            out.append(data.data() + run, i + 1 - run);
            out += ' ';
            run = i + 1;
        }
    }
    out.append(data.data() + run, data.size() - run);
    out += "?>";
}

// In-scope namespace bindings of the elements being written; prefix "" is the default.
class Scope {
  public:
    std::size_t Mark() const noexcept { return m_bindings.size(); }
    void Pop(std::size_t mark) { m_bindings.resize(mark); }
    void Bind(std::string_view prefix, std::string_view uri) {
        m_bindings.push_back({prefix, uri});
    }
    /// The URI bound to `prefix`; `bound` false when the prefix is not declared.
    std::string_view Lookup(std::string_view prefix, bool& bound) const {
        for (auto it = m_bindings.rbegin(); it != m_bindings.rend(); ++it)
            if (it->first == prefix) {
                bound = true;
                return it->second;
            }
        bound = prefix.empty() || prefix == "xml";
        return prefix == "xml" ? kXmlNamespace : std::string_view();
    }
    bool DeclaredSince(std::size_t mark, std::string_view prefix) const {
        for (std::size_t i = mark; i < m_bindings.size(); ++i)
            if (m_bindings[i].first == prefix) return true;
        return false;
    }

  private:
    std::vector<std::pair<std::string_view, std::string_view>> m_bindings;
};

// Writes the start tag of `element`; returns the scope mark to restore at its end.
std::size_t AppendStartTag(Output& out, const DomNode* element, Scope& scope) {
    std::size_t mark = scope.Mark();
    out += '<';
    out += element->Name();
    for (const DomNode* a = element->FirstAttribute(); a; a = a->next) {
        std::string_view name = a->Name();
        if (name == "xmlns")
            scope.Bind("", a->Text());
        else if (name.substr(0, 6) == "xmlns:")
            scope.Bind(name.substr(6), a->Text());
    }
    auto declare = [&](const DomName* n, bool isElement) {
        if (!n || !n->created) return;
        std::string_view prefix = n->Prefix();
        if (!isElement && (prefix.empty() || prefix == "xmlns")) return;  // no namespace
        if (n->qname == "xmlns" || prefix == "xml") return;
        if (scope.DeclaredSince(mark, prefix)) return;  // an explicit declaration wins
        bool bound = false;
        std::string_view current = scope.Lookup(prefix, bound);
        if (bound && current == n->namespaceURI) return;
        if (!prefix.empty() && n->namespaceURI.empty()) return;  // cannot undeclare a prefix
        std::string attribute = prefix.empty() ? "xmlns" : "xmlns:" + std::string(prefix);
        AppendAttribute(out, attribute, n->namespaceURI);
        scope.Bind(prefix, n->namespaceURI);
    };
    declare(element->name, true);
    for (const DomNode* a = element->FirstAttribute(); a; a = a->next) declare(a->name, false);
    for (const DomNode* a = element->FirstAttribute(); a; a = a->next)
        AppendAttribute(out, a->Name(), a->Text());
    return mark;
}

void AppendLeaf(Output& out, const DomNode* node) {
    switch (node->Type()) {
        case NODE_TEXT:
            AppendEscaped(out, node->Text(), false);
            break;
        case NODE_CDATA_SECTION:
            AppendCdata(out, node->Text());
            break;
        case NODE_COMMENT:
            AppendComment(out, node->Text());
            break;
        case NODE_PROCESSING_INSTRUCTION:
            AppendPI(out, node);
            break;
        case NODE_ATTRIBUTE:
            AppendAttribute(out, node->Name(), node->Text());
            break;
        default:
            break;
    }
}

constexpr std::size_t kFlushSize = 1024 * 1024;

// Indentation goes only where it cannot change a value: between the children of an element
// that holds elements and no text.
bool HoldsElementsOnly(const DomNode* element) {
    bool elements = false;
    for (const DomNode* child = element->FirstChild(); child; child = child->next) {
        const DOMNodeType type = child->Type();
        if (type == NODE_TEXT || type == NODE_CDATA_SECTION) return false;
        elements = elements || type == NODE_ELEMENT;
    }
    return elements;
}

void AppendLineBreak(Output& out, std::size_t depth) {
    out += '\n';
    out.append(depth * 2, ' ');
}

void AppendSubtree(Output& out, const DomNode* root, const XmlFlush& flush, bool indent) {
    Scope scope;
    std::vector<std::size_t> marks;
    std::vector<bool> indented;  // per open element: its children go on lines of their own
    const DomNode* node = root;
    for (;;) {
        if (node->Type() == NODE_ELEMENT) {
            std::size_t mark = AppendStartTag(out, node, scope);
            if (node->FirstChild()) {
                out += '>';
                marks.push_back(mark);
                indented.push_back(indent && HoldsElementsOnly(node));
                if (indented.back()) AppendLineBreak(out, indented.size());
                node = node->FirstChild();
                continue;
            }
            out += "/>";
            scope.Pop(mark);
        } else {
            AppendLeaf(out, node);
        }
        while (node != root && !node->next) {
            node = node->parent;
            if (indented.back()) AppendLineBreak(out, indented.size() - 1);
            out += "</";
            out += node->Name();
            out += '>';
            scope.Pop(marks.back());
            marks.pop_back();
            indented.pop_back();
        }
        if (node == root) return;
        node = node->next;
        if (indented.back()) AppendLineBreak(out, indented.size());
        if (flush && out.size() >= kFlushSize) {
            flush(out);
            out.clear();
        }
    }
}

}  // namespace

long AppendEscapedText(std::string& text, std::string_view value, bool attribute) {
    Output out;
    out.swap(text);
    AppendEscaped(out, value, attribute);
    out.swap(text);
    return out.unrepresentable;
}

long AppendCommentText(std::string& text, std::string_view value) {
    Output out;
    out.swap(text);
    AppendComment(out, value);
    out.swap(text);
    return out.unrepresentable;
}

long WriteXml(const DomNode* node, std::string& text, const XmlFlush& flush, bool indent) {
    Output out;
    out.swap(text);
    if (node->Type() != NODE_DOCUMENT) {
        AppendSubtree(out, node, flush, indent);
    } else {
        for (const DomNode* child = node->FirstChild(); child; child = child->next) {
            AppendSubtree(out, child, flush, indent);
            out += '\n';
        }
    }
    if (flush && !out.empty()) {
        flush(out);
        out.clear();
    }
    out.swap(text);
    return out.unrepresentable;
}

}  // namespace detail
}  // namespace kest
