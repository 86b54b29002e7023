#include "KestCdfTargetImage.h"

#include "../core/KestCalmorphDLLError.h"
#include "KestCdfSymbolicFile.h"

namespace kest {

int KestCdfTargetImage::atohd(const char* text) { return KestCdfSymbolicFile::atohd(text); }

void KestCdfTargetImage::hdtoa(unsigned int value, char* buffer) {
    KestCdfSymbolicFile::hdtoa(value, buffer);
}

_bstr_t KestCdfTargetImage::GetNodeString(IXMLDOMNodePtr node) {
    if (!node) return _bstr_t(u"Error occured");
    if (node->GetnodeType() != NODE_ATTRIBUTE) {
        KestCalmorphDLLError::Raise(reason::kTargetImageNotAttribute);
    }
    return _bstr_t(node->GetnodeValue());
}

int KestCdfTargetImage::GetNodeValue(IXMLDOMNodePtr node) {
    // A target image is optional information: an element without crc32 reads as CRC 0.
    if (!node) return 0;
    if (node->GetnodeType() != NODE_ATTRIBUTE) {
        KestCalmorphDLLError::Raise(reason::kTargetImageNotAttribute);
    }
    _bstr_t text(node->GetnodeValue());
    return atohd(static_cast<const char*>(text));
}

void KestCdfTargetImage::SetTargetImageAttributes(IXMLDOMNamedNodeMapPtr attributes) {
    if (!attributes) return;
    m_crc = GetNodeValue(attributes->nextNode());
}

bool KestCdfTargetImage::ConvertTargetImageFileNode(IXMLDOMNodePtr node) {
    SetTargetImageAttributes(node->Getattributes());
    IXMLDOMNodeListPtr children = node->GetchildNodes();
    if (!children) return true;
    while (IXMLDOMNodePtr child = children->nextNode()) {
        m_fileName.m_string = CComBSTR(_bstr_t(child->GetnodeValue()).View());
    }
    return true;
}

bool KestCdfTargetImage::ConvertTargetImageFileNodeToXML(IXMLDOMNodePtr parent,
                                                         IXMLDOMDocument* doc,
                                                         KestCdfNormalizedString ns) {
    char buffer[11] = "0x00000000";
    if (!doc) throw _com_error(E_POINTER);
    IXMLDOMNodePtr element =
        doc->createNode(_variant_t(static_cast<int>(NODE_ELEMENT)), _bstr_t(u"TARGET-IMAGE"),
                        _bstr_t(ns.m_string.m_str, true));
    parent->appendChild(element);
    IXMLDOMNodePtr text =
        doc->createNode(_variant_t(static_cast<int>(NODE_TEXT)), _bstr_t(u""), _bstr_t(u""));
    text->PutnodeValue(_variant_t(_bstr_t(m_fileName.m_string.View())));
    element->appendChild(text);
    IXMLDOMNamedNodeMapPtr attributes = element->Getattributes();
    if (!attributes) return false;
    IXMLDOMAttributePtr crc = doc->createAttribute(_bstr_t(u"crc32"));
    hdtoa(static_cast<unsigned int>(m_crc), buffer);
    crc->PutnodeValue(_variant_t(static_cast<const char*>(buffer)));
    attributes->setNamedItem(crc);
    return true;
}

}  // namespace kest
