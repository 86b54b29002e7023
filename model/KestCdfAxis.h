#pragma once
// KestCdfAxis: one axis of a calibration item, the points of an AXIS element with its size,
// units and format type.

#include <string_view>

#include "../platform/Automation.h"
#include "../platform/Export.h"
#include "../platform/XmlDom.h"
#include "../text/KestCdfNormalizedString.h"

namespace kest {

class XmlFileWriter;

class KEST_API KestCdfAxis {
  public:
    /// An empty axis: value VT_EMPTY, size 0, empty units and format type.
    KestCdfAxis();
    /// Deep copies of the value (array and elements) and both strings.
    KestCdfAxis(const KestCdfAxis& other);
    KestCdfAxis& operator=(const KestCdfAxis& other);
    ~KestCdfAxis();

    /// A deep copy of the stored points (VT_EMPTY, or VT_ARRAY|VT_VARIANT).
    _variant_t GetAxisValue() const;
    /// Extension: the stored points themselves, without a copy; valid until they change.
    const _variant_t& PeekAxisValue() const noexcept { return m_value; }
    /// Stores new points read from `value` according to the format type, which must be set
    /// first. "NUMERIC" splits the text at spaces into VT_I4 or (when the text holds a '.')
    /// VT_R8 points, "STRING" takes the quoted strings, "LABEL" keeps the value as one point;
    /// any other format type leaves the stored value alone. A value without a text form (an
    /// array) throws _com_error and changes nothing.
    void SetAxisValue(_variant_t value);
    /// Extension: stores a copy of `elements` (VT_ARRAY|VT_VARIANT, one dimension) as the
    /// points as they stand, as SetValueElements does for item values.
    void SetAxisElements(const _variant_t& elements);

    /// The number carried by the size attribute; never checked against the points.
    unsigned int GetSize() const noexcept { return m_size; }
    void SetSize(unsigned int size) noexcept { m_size = size; }
    /// Copies of the units and the format type.
    KestCdfNormalizedString GetSwUnits() const { return m_swUnits; }
    KestCdfNormalizedString GetFormatType() const { return m_formatType; }
    /// Verbatim copies; the stored value is not converted again.
    void SetSwUnits(KestCdfNormalizedString units) { m_swUnits = units; }
    void SetFormatType(KestCdfNormalizedString formatType) { m_formatType = formatType; }

    /// Reads an AXIS element: its first three attributes by position (size, units, format
    /// type), then the value of its last child node. The size text is read as a number,
    /// truncated toward zero, and its low 32 bits kept (-1 gives 4294967295); a number beyond
    /// the 64-bit range saturates at that range's limits first. Throws KestCalmorphDLLError 20
    /// without an attribute map, 11 when an attribute is missing; _com_error for an absent node or
    /// a size that is no number. Returns true.
    bool ConvertAxisNode(IXMLDOMNodePtr node);
    /// Appends a new AXIS element (namespace `ns`) to `parent` with the attributes size (as a
    /// signed 32-bit number), sw-units and format-type and the points as text. Throws
    /// KestCalmorphDLLError 27 when the new element has no attribute map and 26 when the value is
    /// VT_EMPTY (the element stays attached); _com_error for an absent parent or document. Returns
    /// true.
    bool ConvertAxisNodeToXML(IXMLDOMNodePtr parent, IXMLDOMDocument* doc,
                              KestCdfNormalizedString ns);
    void WriteXmlText(XmlFileWriter& out);

  private:
    void SetAxisAttributes(IXMLDOMNamedNodeMapPtr attributes);
    unsigned int GetNodeValue(IXMLDOMNodePtr node);
    _bstr_t GetNodeString(IXMLDOMNodePtr node);
    // The value list codec with this class's rules (see detail/ValueListCodec.h). The text
    // and values are passed by reference and the array by move: these run once per value of a
    // file, and copying a whole array per call would dominate.
    int CountValues(std::u16string_view text) const noexcept;
    _variant_t PutNumbersIntoSafeArray(const _variant_t& value, _variant_t array) const;
    void PutStringsIntoSafeArray(const _variant_t& value, _variant_t& array) const;
    _variant_t GetNumbersFromSafeArray(const _variant_t& value) const;

    _variant_t m_value;
    unsigned int m_size = 0;
    KestCdfNormalizedString m_swUnits;
    KestCdfNormalizedString m_formatType;
};

}  // namespace kest
