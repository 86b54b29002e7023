#pragma once
// KestCdfCalItemValue: the value of one calibration item, the list a VALUE element carries
// with its units and format type.

#include <string_view>

#include "../platform/Automation.h"
#include "../platform/Export.h"
#include "../platform/XmlDom.h"
#include "../text/KestCdfNormalizedString.h"

namespace kest {

class XmlFileWriter;

class KEST_API KestCdfCalItemValue {
  public:
    /// An empty value: VT_EMPTY, empty units and format type, not read from a document.
    KestCdfCalItemValue();
    /// Deep copies of the value (array and elements), both strings and the from-document flag.
    KestCdfCalItemValue(const KestCdfCalItemValue& other);
    KestCdfCalItemValue& operator=(const KestCdfCalItemValue& other);
    ~KestCdfCalItemValue();

    /// A deep copy of the stored value (VT_EMPTY, or VT_ARRAY|VT_VARIANT).
    _variant_t GetValue() const;
    /// Extension: the stored value itself, without a copy; valid until the value changes.
    const _variant_t& PeekValue() const noexcept { return m_value; }
    /// Stores a new value list according to the format type, which must be set first, and to
    /// whether the object was read from a document: read "NUMERIC" text is split into numbers,
    /// read quoted "STRING" text into strings; otherwise the value is kept as one element. A
    /// value without a text form (an array) throws _com_error and changes nothing.
    void SetValue(_variant_t value);
    /// Extension: stores a copy of `elements` (VT_ARRAY|VT_VARIANT, one dimension) as the
    /// value as it stands, whatever the format type; the format type is not consulted and the
    /// elements are not converted. Anything else throws _com_error(E_INVALIDARG) and changes
    /// nothing. How a host puts typed numbers, strings and empty elements back (JSON import).
    void SetValueElements(const _variant_t& elements);

    /// Copies of the format type and the units.
    KestCdfNormalizedString GetFormatType() const { return m_formatType; }
    KestCdfNormalizedString GetUnits() const { return m_units; }
    /// Verbatim copies; the stored value is not converted again.
    void SetFormatType(KestCdfNormalizedString formatType) { m_formatType = formatType; }
    void SetUnits(KestCdfNormalizedString units) { m_units = units; }

    /// Reads a VALUE element: its first two attributes by position (units, format type), then
    /// the value of its last child node. Missing attributes read as "Error occured"; an
    /// attribute node of the wrong kind throws KestCalmorphDLLError 19; an absent node or a
    /// child without text throws _com_error. Returns true.
    bool ConvertCalItemValueNode(IXMLDOMNodePtr node);
    /// Reads units and format type from the first two entries of `attributes`; an absent map
    /// changes nothing.
    void SetCalItemValueAttributes(IXMLDOMNamedNodeMapPtr attributes);
    /// Appends a new VALUE element (namespace `ns`) to `parent` with the attributes
    /// sw-units-ref and format-type and the value as text. Throws KestCalmorphDLLError 29 when
    /// the value is VT_EMPTY (the element stays attached); _com_error for an absent parent or
    /// document. Returns true.
    bool ConvertCalItemValueNodeToXML(IXMLDOMNodePtr parent, IXMLDOMDocument* doc,
                                      KestCdfNormalizedString ns);
    void WriteXmlText(XmlFileWriter& out);

  private:
    _bstr_t GetNodeString(IXMLDOMNodePtr node);
    // The value list codec with this class's rules (see detail/ValueListCodec.h). The text
    // and values are passed by reference and the array by move: these run once per value of a
    // file, and copying a whole array per call would dominate.
    int CountValues(std::u16string_view text) const noexcept;
    _variant_t PutNumbersIntoSafeArray(const _variant_t& value, _variant_t array) const;
    void PutStringsIntoSafeArray(const _variant_t& value, _variant_t& array) const;
    _variant_t GetNumbersFromSafeArray(const _variant_t& value) const;

    _variant_t m_value;
    KestCdfNormalizedString m_units;
    KestCdfNormalizedString m_formatType;
    int m_fromDocument = 0;
};

}  // namespace kest
