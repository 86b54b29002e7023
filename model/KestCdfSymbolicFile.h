#pragma once
// KestCdfSymbolicFile: the SYMBOLIC-FILE element of a calibration list, a file name with the
// CRC of that file.

#include "../platform/Automation.h"
#include "../platform/Export.h"
#include "../platform/XmlDom.h"
#include "../text/KestCdfNormalizedString.h"

namespace kest {

class XmlFileWriter;

class KEST_API KestCdfSymbolicFile {
  public:
    /// Empty file name, CRC 0.
    KestCdfSymbolicFile() = default;
    KestCdfSymbolicFile(const KestCdfSymbolicFile& other) = default;
    KestCdfSymbolicFile& operator=(const KestCdfSymbolicFile& other) = default;
    ~KestCdfSymbolicFile() = default;

    /// Copy of the file name.
    KestCdfNormalizedString GetSymbolicFile() const { return m_fileName; }
    /// Stores the file name verbatim.
    void SetSymbolicFile(KestCdfNormalizedString fileName) { m_fileName = fileName; }
    /// The CRC as a 32-bit pattern.
    int GetCrc() const noexcept { return m_crc; }
    void SetCrc(int crc) noexcept { m_crc = crc; }

    /// Parses CRC text. Text holding a lowercase 'x' anywhere is hexadecimal (blanks, a sign and
    /// a "0x"/"0X" prefix are allowed; beyond 32 bits gives 0xFFFFFFFF); other text is decimal
    /// (blanks and a sign allowed; beyond the int range saturates to INT_MIN or INT_MAX).
    /// Reading stops at the first other character; no digits (or a null text) give 0.
    static int atohd(const char* text);
    /// Writes the value's uppercase hexadecimal digits into a prepared "0x00000000" buffer of
    /// 11 bytes, right-aligned; nothing else of the buffer is touched.
    static void hdtoa(unsigned int value, char* buffer);
    /// Text of an attribute node. Throws KestCalmorphDLLError 18 for a missing node or one
    /// that is no attribute.
    _bstr_t GetNodeString(IXMLDOMNodePtr node);
    /// `atohd` of an attribute node's text. Throws KestCalmorphDLLError 18 for a missing node
    /// or one that is no attribute.
    int GetNodeValue(IXMLDOMNodePtr node);

    /// Reads SYMBOLIC-FILE: the CRC from its first attribute, whatever its name (error 18 when
    /// it has none), the file name verbatim from its last child node. Returns true.
    bool ConvertSymbolicFileNode(IXMLDOMNodePtr node);
    /// Appends SYMBOLIC-FILE (namespace `ns`) to `parent` with the file name as text and the
    /// CRC as crc32="0xXXXXXXXX". False when the new element has no attribute map.
    bool ConvertSymbolicFileNodeToXML(IXMLDOMNodePtr parent, IXMLDOMDocument* doc,
                                      KestCdfNormalizedString ns);
    void WriteXmlText(XmlFileWriter& out);

  private:
    void SetSymbolicFileAttributes(IXMLDOMNamedNodeMapPtr attributes);

    KestCdfNormalizedString m_fileName;
    int m_crc = 0;
};

}  // namespace kest
