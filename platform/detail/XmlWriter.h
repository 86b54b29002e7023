#pragma once
// Serialises DOM content as UTF-8 XML text.
//
// What is written reads back to the same values: text escapes & < > and CR; attribute values
// escape & < > " and TAB, LF, CR; a CDATA section holding "]]>" or CR (which no CDATA section
// can carry) is written as escaped text, so that its value stays in one node. Nodes made
// with a namespace URI are declared through the in-scope default namespace (or their prefix)
// only where the URI is not already in scope; parsed nodes are written as they are, and an
// explicit xmlns attribute on an element always wins. Where XML has no way to write a value
// faithfully the text is made well-formed instead: "--" inside a comment becomes "- -" and a
// trailing '-' gets a space; "?>" inside a processing instruction becomes "? >".
// The XML declaration is written from the document's "xml" processing instruction, with its
// encoding always "UTF-8" (the bytes written are UTF-8); a document without one gets none.
// No whitespace is added except a line break after each node at document level, unless
// indentation is asked for.

#include <functional>
#include <string>
#include <string_view>

#include "DomDocument.h"

namespace kest {
namespace detail {

/// Receives written text in pieces; may throw to stop the writing.
using XmlFlush = std::function<void(std::string_view)>;

/// Appends the XML text of `node` (its subtree included) to `out`. Iterative: any depth works.
/// With `flush`, the text is handed over in pieces of about a megabyte as it grows (and `out`
/// is left empty), so that large documents need no second copy of themselves in memory.
/// Returns -1, or the first character met that XML 1.0 cannot carry (a control character other
/// than TAB, LF, CR, or U+FFFE/U+FFFF): such text is written (as a character reference where
/// escaped) but will not load again.
/// With `indent`, every child of an element that holds elements and no text starts a line of
/// its own, indented by two spaces per level, and the element's end tag a line at its level.
long WriteXml(const DomNode* node, std::string& out, const XmlFlush& flush = nullptr,
              bool indent = false);

/// Appends `text` escaped as WriteXml escapes a text node (or, with `attribute`, an attribute
/// value); returns -1 or the first character met that XML 1.0 cannot carry.
long AppendEscapedText(std::string& out, std::string_view text, bool attribute);

/// Appends a comment holding `text` as WriteXml writes one; returns as AppendEscapedText.
long AppendCommentText(std::string& out, std::string_view text);

}  // namespace detail
}  // namespace kest
