#include "KestCdfTargetImage.h"

#include "detail/DomWriting.h"

#include "../platform/KestCalmorphDLLError.h"
#include "../platform/XmlFileWriter.h"
#include "KestCdfSymbolicFile.h"

namespace kest {

int KestCdfTargetImage::atohd(const char* text) { return detail::ParseCrc(text); }

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
    detail::ReadFileReferenceName(node, m_fileName);
    return true;
}

bool KestCdfTargetImage::ConvertTargetImageFileNodeToXML(IXMLDOMNodePtr parent,
                                                         IXMLDOMDocument* doc,
                                                         KestCdfNormalizedString ns) {
    char buffer[11] = "0x00000000";
    hdtoa(static_cast<unsigned int>(m_crc), buffer);
    return detail::AppendFileReference(parent, doc, u"TARGET-IMAGE",
                                       _bstr_t(ns.m_string.m_str, true), m_fileName.m_string.m_str,
                                       buffer);
}

void KestCdfTargetImage::WriteXmlText(XmlFileWriter& out) {
    char buffer[11] = "0x00000000";
    hdtoa(static_cast<unsigned int>(m_crc), buffer);
    detail::WriteFileReference(out, u"TARGET-IMAGE", m_fileName.m_string.m_str, buffer);
}

}  // namespace kest
