#pragma once
// KestCdfTargetImage: the TARGET-IMAGE element of a calibration list, a file name with the CRC
// of that file. The twin of KestCdfSymbolicFile, more lenient about a missing attribute.

#include "../platform/Automation.h"
#include "../platform/Export.h"
#include "../platform/XmlDom.h"
#include "../text/KestCdfNormalizedString.h"

namespace kest {

class XmlFileWriter;

class KEST_API KestCdfTargetImage {
  public:
    /// Empty file name, CRC 0.
    KestCdfTargetImage() = default;
    KestCdfTargetImage(const KestCdfTargetImage& other) = default;
    KestCdfTargetImage& operator=(const KestCdfTargetImage& other) = default;
    ~KestCdfTargetImage() = default;

    /// Copy of the file name.
    KestCdfNormalizedString GetTargetImage() const { return m_fileName; }
    /// Stores the file name verbatim.
    void SetTargetImage(KestCdfNormalizedString fileName) { m_fileName = fileName; }
    /// The CRC as a 32-bit pattern.
    int GetCrc() const noexcept { return m_crc; }
    void SetCrc(int crc) noexcept { m_crc = crc; }

    /// Parses CRC text exactly as KestCdfSymbolicFile::atohd does.
    static int atohd(const char* text);
    /// Formats a CRC exactly as KestCdfSymbolicFile::hdtoa does.
    static void hdtoa(unsigned int value, char* buffer);
    /// Text of an attribute node; "Error occured" for a missing node. Throws
    /// KestCalmorphDLLError 17 for a node that is no attribute.
    _bstr_t GetNodeString(IXMLDOMNodePtr node);
    /// `atohd` of an attribute node's text; 0 for a missing node. Throws KestCalmorphDLLError
    /// 17 for a node that is no attribute.
    int GetNodeValue(IXMLDOMNodePtr node);

    /// Reads TARGET-IMAGE: the CRC from its first attribute, whatever its name (0 when it has
    /// none), the file name verbatim from its last child node. Returns true.
    bool ConvertTargetImageFileNode(IXMLDOMNodePtr node);
    /// Appends TARGET-IMAGE (namespace `ns`) to `parent` with the file name as text and the
    /// CRC as crc32="0xXXXXXXXX". False when the new element has no attribute map.
    bool ConvertTargetImageFileNodeToXML(IXMLDOMNodePtr parent, IXMLDOMDocument* doc,
                                         KestCdfNormalizedString ns);
    void WriteXmlText(XmlFileWriter& out);

  private:
    void SetTargetImageAttributes(IXMLDOMNamedNodeMapPtr attributes);

    int m_crc = 0;
    KestCdfNormalizedString m_fileName;
};

}  // namespace kest
