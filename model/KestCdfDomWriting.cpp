#include "KestCdfDomWriting.h"

#include "KestCdfValueListCodec.h"

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

}  // namespace detail
}  // namespace kest
