#include "DomWriting.h"

#include <climits>
#include <cstdint>
#include <cstring>

#include "../../platform/XmlFileWriter.h"
#include "ValueListCodec.h"

namespace kest {
namespace detail {

IXMLDOMNodePtr AppendElement(const IXMLDOMNodePtr& parent, IXMLDOMDocument* doc,
                             const OLECHAR* name, const _bstr_t& ns) {
    IXMLDOMNodePtr element =
        doc->createNode(_variant_t(static_cast<int>(NODE_ELEMENT)), _bstr_t(name), ns);
    parent->appendChild(element);
    return element;
}

IXMLDOMNodePtr AppendTextElement(const IXMLDOMNodePtr& parent, IXMLDOMDocument* doc,
                                 const OLECHAR* name, const _bstr_t& ns, BSTR text) {
    IXMLDOMNodePtr element = AppendElement(parent, doc, name, ns);
    IXMLDOMNodePtr node =
        doc->createNode(_variant_t(static_cast<int>(NODE_TEXT)), _bstr_t(u""), _bstr_t(u""));
    node->PutnodeValue(_variant_t(_bstr_t(BstrView(text))));
    element->appendChild(node);
    return element;
}

bool AppendFileReference(const IXMLDOMNodePtr& parent, IXMLDOMDocument* doc, const OLECHAR* name,
                         const _bstr_t& ns, BSTR fileName, const char* crcText) {
    if (!doc) throw _com_error(E_POINTER);
    IXMLDOMNodePtr element = AppendTextElement(parent, doc, name, ns, fileName);
    IXMLDOMNamedNodeMapPtr attributes = element->Getattributes();
    if (!attributes) return false;
    AddAttribute(doc, attributes, u"crc32", CComBSTR(crcText));
    return true;
}

void WriteTextElement(XmlFileWriter& out, const OLECHAR* name, BSTR text) {
    out.StartElement(name);
    out.Text(BstrView(text));
    out.EndElement();
}

void WriteFileReference(XmlFileWriter& out, const OLECHAR* name, BSTR fileName,
                        const char* crcText) {
    out.StartElement(name);
    out.Attribute(u"crc32", CComBSTR(crcText).View());
    out.Text(BstrView(fileName));
    out.EndElement();
}

CComBSTR TextOf(const IXMLDOMNodePtr& node) {
    return CComBSTR(_bstr_t(node->GetnodeValue()).View());
}

CComBSTR ElementText(const IXMLDOMNodePtr& element) {
    CComBSTR text(std::u16string_view{});
    IXMLDOMNodeListPtr parts = element->GetchildNodes();
    if (!parts) return text;
    while (IXMLDOMNodePtr part = parts->nextNode()) {
        text = CComBSTR(_bstr_t(part->GetnodeValue()).View());
    }
    return text;
}

void AddAttribute(IXMLDOMDocument* doc, const IXMLDOMNamedNodeMapPtr& attributes,
                  const _bstr_t& name, BSTR value) {
    IXMLDOMAttributePtr attribute = doc->createAttribute(name);
    const LentText text(value);
    attribute->PutnodeValue(text.Get());
    attributes->setNamedItem(attribute);
}

void ReadFileReferenceName(const IXMLDOMNodePtr& node, KestCdfNormalizedString& fileName) {
    IXMLDOMNodeListPtr children = node->GetchildNodes();
    if (!children) return;
    while (IXMLDOMNodePtr child = children->nextNode())
        fileName.m_string = CComBSTR(_bstr_t(child->GetnodeValue()).View());
}

namespace {

int DigitValue(char c) noexcept {
    if (c >= '0' && c <= '9') return c - '0';
    if (c >= 'a' && c <= 'f') return c - 'a' + 10;
    if (c >= 'A' && c <= 'F') return c - 'A' + 10;
    return 99;
}

}  // namespace

int ParseCrc(const char* text) noexcept {
    if (!text) return 0;
    const unsigned base = std::strchr(text, 'x') ? 16 : 10;
    const char* p = text;
    while (*p == ' ' || (*p >= '\t' && *p <= '\r')) ++p;
    bool negative = false;
    if (*p == '+' || *p == '-') {
        negative = *p == '-';
        ++p;
    }
    if (base == 16 && p[0] == '0' && (p[1] == 'x' || p[1] == 'X') && DigitValue(p[2]) < 16) p += 2;
    std::uint64_t value = 0;
    for (unsigned digit; (digit = static_cast<unsigned>(DigitValue(*p))) < base; ++p) {
        value = value * base + digit;
        if (value > 0xFFFFFFFFu) {
            value = 0xFFFFFFFFu;  // saturated: the sign no longer matters
            negative = false;
            break;
        }
    }
    std::uint32_t bits = static_cast<std::uint32_t>(value);
    if (negative) bits = 0u - bits;
    // The int with the same 32 bits, without relying on implementation-defined narrowing.
    if (bits <= static_cast<std::uint32_t>(INT_MAX)) return static_cast<int>(bits);
    return static_cast<int>(bits - 0x80000000u) + INT_MIN;
}

}  // namespace detail
}  // namespace kest
