#include "KestCdfSymbolicFile.h"

#include "detail/DomWriting.h"

#include "../platform/KestCalmorphDLLError.h"
#include "../platform/XmlFileWriter.h"

namespace kest {
// A CRC is a 32-bit pattern: decimal text is read over the whole unsigned range, as hexadecimal
// text always was.
int KestCdfSymbolicFile::atohd(const char* text) { return detail::ParseCrc(text); }

void KestCdfSymbolicFile::hdtoa(unsigned int value, char* buffer) {
    if (!buffer) return;
    // Digits fill positions 9 down to 2 of "0x00000000"; the prefix and leading zeros stay.
    for (int position = 9; value != 0 && position >= 2; --position) {
        unsigned int digit = value & 0xFu;
        buffer[position] = static_cast<char>(digit < 10 ? '0' + digit : 'A' + (digit - 10));
        value >>= 4;
    }
}

_bstr_t KestCdfSymbolicFile::GetNodeString(IXMLDOMNodePtr node) {
    if (!node || node->GetnodeType() != NODE_ATTRIBUTE) {
        KestCalmorphDLLError::Raise(reason::kSymbolicFileAttribute);
    }
    return _bstr_t(node->GetnodeValue());
}

int KestCdfSymbolicFile::GetNodeValue(IXMLDOMNodePtr node) {
    if (!node || node->GetnodeType() != NODE_ATTRIBUTE) {
        KestCalmorphDLLError::Raise(reason::kSymbolicFileAttribute);
    }
    _bstr_t text(node->GetnodeValue());
    return atohd(static_cast<const char*>(text));
}

void KestCdfSymbolicFile::SetSymbolicFileAttributes(IXMLDOMNamedNodeMapPtr attributes) {
    if (!attributes) return;
    m_crc = GetNodeValue(attributes->nextNode());
}

bool KestCdfSymbolicFile::ConvertSymbolicFileNode(IXMLDOMNodePtr node) {
    SetSymbolicFileAttributes(node->Getattributes());
    detail::ReadFileReferenceName(node, m_fileName);
    return true;
}

bool KestCdfSymbolicFile::ConvertSymbolicFileNodeToXML(IXMLDOMNodePtr parent, IXMLDOMDocument* doc,
                                                       KestCdfNormalizedString ns) {
    char buffer[11] = "0x00000000";
    hdtoa(static_cast<unsigned int>(m_crc), buffer);
    return detail::AppendFileReference(parent, doc, u"SYMBOLIC-FILE",
                                       _bstr_t(ns.m_string.m_str, true), m_fileName.m_string.m_str,
                                       buffer);
}

void KestCdfSymbolicFile::WriteXmlText(XmlFileWriter& out) {
    char buffer[11] = "0x00000000";
    hdtoa(static_cast<unsigned int>(m_crc), buffer);
    detail::WriteFileReference(out, u"SYMBOLIC-FILE", m_fileName.m_string.m_str, buffer);
}

}  // namespace kest
