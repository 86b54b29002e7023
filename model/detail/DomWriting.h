#pragma once
// Small DOM steps shared by the element readers and writers of the document model.

#include "../../platform/Automation.h"
#include "../../platform/XmlDom.h"
#include "../../text/KestCdfNormalizedString.h"

namespace kest {

class XmlFileWriter;

namespace detail {

/// Creates the element `name` in namespace `ns` and appends it to `parent` (which is checked
/// only once the element exists, so an empty parent fails with E_POINTER after creation).
IXMLDOMNodePtr AppendElement(const IXMLDOMNodePtr& parent, IXMLDOMDocument* doc,
                             const OLECHAR* name, const _bstr_t& ns);

/// Appends the element `name` holding one text node and returns it; a null text gives empty
/// content.
IXMLDOMNodePtr AppendTextElement(const IXMLDOMNodePtr& parent, IXMLDOMDocument* doc,
                                 const OLECHAR* name, const _bstr_t& ns, BSTR text);

/// Writes a SYMBOLIC-FILE or TARGET-IMAGE element: the file name as its text, then the crc32
/// attribute. False when the new element offers no attribute map (the element stays).
bool AppendFileReference(const IXMLDOMNodePtr& parent, IXMLDOMDocument* doc, const OLECHAR* name,
                         const _bstr_t& ns, BSTR fileName, const char* crcText);

/// AppendTextElement and AppendFileReference for a streamed write.
void WriteTextElement(XmlFileWriter& out, const OLECHAR* name, BSTR text);
void WriteFileReference(XmlFileWriter& out, const OLECHAR* name, BSTR fileName,
                        const char* crcText);

/// Reads the text of a SYMBOLIC-FILE or TARGET-IMAGE element: the last child's value stands;
/// an element without children leaves `fileName` as it was.
void ReadFileReferenceName(const IXMLDOMNodePtr& node, KestCdfNormalizedString& fileName);

/// The 32 bits of a crc32 text, read as strtoul reads it on a 32-bit unsigned long: base 16
/// when the text holds an 'x' anywhere, else base 10; white space and a sign first (a minus
/// negates modulo 2^32); digits stop at the first other character; a number beyond 32 bits
/// gives 0xFFFFFFFF. The result is the int with those bits.
int ParseCrc(const char* text) noexcept;

/// A node's value as owned text; an element's (null) value throws _com_error.
CComBSTR TextOf(const IXMLDOMNodePtr& node);

/// The text of a text-only element: the last child node's value, empty (not null) without
/// children. A child without text (a nested element) throws _com_error.
CComBSTR ElementText(const IXMLDOMNodePtr& element);

/// Creates the attribute `name` with `value` (null gives empty text) and adds it to the map. The
/// value is lent to the DOM, which copies it. The one attribute writer of the model.
void AddAttribute(IXMLDOMDocument* doc, const IXMLDOMNamedNodeMapPtr& attributes,
                  const _bstr_t& name, BSTR value);

}  // namespace detail
}  // namespace kest
