#include "XmlFileWriter.h"

#include <vector>

#include "BStr.h"
#include "detail/AtomicSave.h"
#include "detail/XmlWriter.h"

namespace kest {

namespace {

constexpr std::size_t kFlushSize = 1024 * 1024;

struct OpenElement {
    std::string name;
    bool hasChildren = false;
    bool indented = false;
};

}  // namespace

struct XmlFileWriter::State {
    explicit State(std::string path, bool indentOn) : file(std::move(path)), indent(indentOn) {}
    detail::AtomicFile file;
    bool indent;
    std::string out;
    std::vector<OpenElement> open;
    long unrepresentable = -1;
    bool held = false;
    std::size_t heldAt = 0;  // where the held start tag takes its next attribute

    void Note(long code) {
        if (unrepresentable < 0) unrepresentable = code;
    }
    void LineBreak(std::size_t depth) {
        out += '\n';
        out.append(depth * 2, ' ');
    }
    // Closes the parent's start tag before its first child; an element whose children are
    // elements (or a comment) gets them on lines of their own when indenting.
    void BeforeChild(bool text) {
        if (open.empty()) return;
        OpenElement& parent = open.back();
        if (!parent.hasChildren) {
            out += '>';
            parent.hasChildren = true;
            parent.indented = indent && !text;
            if (parent.indented) LineBreak(open.size());
        } else if (parent.indented) {
            LineBreak(open.size());
        }
    }
    void MaybeFlush() {
        if (held || out.size() < kFlushSize) return;
        file.Write(out);
        out.clear();
    }
};

XmlFileWriter::XmlFileWriter(std::string path, bool indent)
    : m_state(new State(std::move(path), indent)) {
    m_state->out.reserve(kFlushSize + 64 * 1024);
    m_state->out += "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n";
}

XmlFileWriter::~XmlFileWriter() = default;

void XmlFileWriter::StartElement(std::u16string_view name) {
    State& s = *m_state;
    s.BeforeChild(false);
    s.open.push_back({Utf16ToUtf8(name)});
    s.out += '<';
    s.out += s.open.back().name;
}

void XmlFileWriter::Attribute(std::u16string_view name, std::u16string_view value) {
    State& s = *m_state;
    const std::size_t start = s.out.size();
    s.out += ' ';
    s.out += Utf16ToUtf8(name);
    s.out += "=\"";
    s.Note(detail::AppendEscapedText(s.out, Utf16ToUtf8(value), true));
    s.out += '"';
    if (s.held) {
        // Moved into the held start tag, after the attributes it already has.
        std::string text = s.out.substr(start);
        s.out.resize(start);
        s.out.insert(s.heldAt, text);
        s.heldAt += text.size();
    }
}

void XmlFileWriter::Text(std::string_view utf8) {
    State& s = *m_state;
    s.BeforeChild(true);
    s.Note(detail::AppendEscapedText(s.out, utf8, false));
    s.MaybeFlush();
}

void XmlFileWriter::Text(std::u16string_view text) { Text(Utf16ToUtf8(text)); }

void XmlFileWriter::Comment(std::u16string_view text) {
    State& s = *m_state;
    s.BeforeChild(false);
    s.Note(detail::AppendCommentText(s.out, Utf16ToUtf8(text)));
}

void XmlFileWriter::EndElement() {
    State& s = *m_state;
    OpenElement& element = s.open.back();
    if (!element.hasChildren) {
        s.out += "/>";
    } else {
        if (element.indented) s.LineBreak(s.open.size() - 1);
        s.out += "</";
        s.out += element.name;
        s.out += '>';
    }
    s.open.pop_back();
    if (s.open.empty()) s.out += '\n';
    s.MaybeFlush();
}

void XmlFileWriter::HoldStartTag() {
    State& s = *m_state;
    s.held = true;
    s.heldAt = s.out.size();
}

void XmlFileWriter::ReleaseStartTag() {
    m_state->held = false;
    m_state->MaybeFlush();
}

void XmlFileWriter::Commit() {
    State& s = *m_state;
    s.held = false;
    if (!s.out.empty()) s.file.Write(s.out);
    s.out.clear();
    s.file.Commit(s.unrepresentable);
}

}  // namespace kest
