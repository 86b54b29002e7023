#include "KestCdfAxis.h"

#include <charconv>
#include <climits>
#include <cmath>
#include <cstdint>
#include <string_view>
#include <utility>

#include "../platform/KestCalmorphDLLError.h"
#include "../platform/XmlFileWriter.h"
#include "KestCdfReadWarnings.h"
#include "detail/DomWriting.h"
#include "detail/ValueListCodec.h"

namespace kest {

using detail::AddAttribute;

namespace {

// The size attribute is read as a number, truncated toward zero, of which the low 32 bits are
// kept (-1 becomes 4294967295 and is written back as -1). Numbers beyond the 64-bit range
// saturate at its limits before the low bits are taken, so no text leads to an undefined
// conversion.
unsigned int SizeFromDouble(double value) noexcept {
    constexpr double kTwoTo63 = 9223372036854775808.0;
    std::int64_t whole;
    if (std::isnan(value))
        whole = 0;
    else if (value >= kTwoTo63)
        whole = INT64_MAX;
    else if (value < -kTwoTo63)
        whole = INT64_MIN;
    else
        whole = static_cast<std::int64_t>(value);  // truncates toward zero
    return static_cast<unsigned int>(static_cast<std::uint64_t>(whole) & 0xFFFFFFFFu);
}

// The size as the signed 32-bit number its bits stand for.
_variant_t SizeText(unsigned int size) {
    const std::int64_t signedSize = size > static_cast<unsigned int>(INT_MAX)
                                        ? static_cast<std::int64_t>(size) - 0x100000000LL
                                        : static_cast<std::int64_t>(size);
    char narrow[16];
    const char* end = std::to_chars(narrow, narrow + sizeof narrow, signedSize).ptr;
    OLECHAR wide[16];
    UINT length = 0;
    for (const char* p = narrow; p != end; ++p) wide[length++] = static_cast<OLECHAR>(*p);
    _variant_t text;
    text.bstrVal = SysAllocStringLen(wide, length);
    if (!text.bstrVal) throw _com_error(E_OUTOFMEMORY);
    text.vt = VT_BSTR;
    return text;
}

// Names are made once: every axis of a file writes them.
const _bstr_t& ElementName() {
    static const _bstr_t name(u"AXIS");
    return name;
}
const _bstr_t& SizeName() {
    static const _bstr_t name(u"size");
    return name;
}
const _bstr_t& UnitsName() {
    static const _bstr_t name(u"sw-units");
    return name;
}
const _bstr_t& FormatTypeName() {
    static const _bstr_t name(u"format-type");
    return name;
}
const _bstr_t& NoName() {
    static const _bstr_t name(u"");
    return name;
}

}  // namespace

KestCdfAxis::KestCdfAxis() = default;

KestCdfAxis::KestCdfAxis(const KestCdfAxis& other) = default;

KestCdfAxis& KestCdfAxis::operator=(const KestCdfAxis& other) = default;

KestCdfAxis::~KestCdfAxis() = default;

_variant_t KestCdfAxis::GetAxisValue() const { return m_value; }

void KestCdfAxis::SetAxisElements(const _variant_t& elements) {
    if (elements.vt != (VT_ARRAY | VT_VARIANT) || !elements.parray || elements.parray->cDims != 1)
        throw _com_error(E_INVALIDARG);
    m_value = elements;
}

void KestCdfAxis::SetAxisValue(_variant_t value) {
    // Converting first means a value without a text form fails before anything changes.
    const detail::ValueText text(value);
    if (detail::IsFormatType(m_formatType, detail::kFormatNumeric)) {
        _variant_t array = detail::NewValueArray(static_cast<ULONG>(CountValues(text.View())));
        m_value = PutNumbersIntoSafeArray(value, std::move(array));
    } else if (detail::IsFormatType(m_formatType, detail::kFormatLabel)) {
        m_value = detail::SingleValueArray(value);
    } else if (detail::IsFormatType(m_formatType, detail::kFormatString)) {
        _variant_t array = detail::NewValueArray(static_cast<ULONG>(CountValues(text.View())));
        PutStringsIntoSafeArray(value, array);
        m_value = std::move(array);
    }
    // Any other format type keeps the stored value.
}

int KestCdfAxis::CountValues(std::u16string_view text) const noexcept {
    return detail::CountValues(detail::IsFormatType(m_formatType, detail::kFormatNumeric), text);
}

_variant_t KestCdfAxis::PutNumbersIntoSafeArray(const _variant_t& value, _variant_t array) const {
    if (value.vt == VT_BSTR) {
        detail::FillNumbers(BstrView(value.bstrVal), detail::NumberTyping::kWholeText, array);
        return array;
    }
    // A number given by the host: a whole number within the 32-bit range becomes the integer
    // (3.0 gives 3), any other double stays a double with its value. Values of other kinds are
    // taken by their numeric value.
    const double number = static_cast<double>(value);
    VARIANT element;
    VariantInit(&element);
    if (number == std::trunc(number) && number >= INT_MIN && number <= INT_MAX &&
        !(number == 0.0 && std::signbit(number))) {
        element.vt = VT_I4;
        element.lVal = static_cast<LONG>(number);
    } else {
        element.vt = VT_R8;
        element.dblVal = number;
    }
    const LONG index = 0;
    ThrowIfFailed(SafeArrayPutElement(array.parray, &index, &element));
    return array;
}

void KestCdfAxis::PutStringsIntoSafeArray(const _variant_t& value, _variant_t& array) const {
    if (value.vt != VT_BSTR) return;
    detail::PutQuotedStrings(BstrView(value.bstrVal), array);
}

_variant_t KestCdfAxis::GetNumbersFromSafeArray(const _variant_t& value) const {
    return detail::FormatValueList(value, detail::ElementWriting::kAxis,
                                   detail::IsFormatType(m_formatType, detail::kFormatString));
}

bool KestCdfAxis::ConvertAxisNode(IXMLDOMNodePtr node) {
    if (!node) throw _com_error(E_POINTER);
    SetAxisAttributes(node->Getattributes());
    IXMLDOMNodeListPtr children = node->GetchildNodes();
    // What the writer writes for a STRING axis of no points or an empty LABEL is an element
    // without children: read it as the setter's value for the empty text, so that it is
    // written again.
    if (!children->Getlength() && (detail::IsFormatType(m_formatType, detail::kFormatString) ||
                                   detail::IsFormatType(m_formatType, detail::kFormatLabel))) {
        SetAxisValue(_variant_t(u""));
        return true;
    }
    // Every child replaces the value, so the last one decides.
    for (IXMLDOMNodePtr child = children->nextNode(); child; child = children->nextNode()) {
        // Numbers are parsed from the text as the DOM stores it: SetAxisValue's result for the
        // text, without making a BSTR of it first.
        std::string_view utf8;
        if (detail::IsFormatType(m_formatType, detail::kFormatNumeric) &&
            child->GetnodeValueUtf8(utf8)) {
            if (detail::ReadWarningScope* warnings = detail::ReadWarningScope::Current()) {
                long line = 0, column = 0;
                child->GettextPosition(line, column);
                warnings->SetText(utf8.data(), line, column);
            }
            _variant_t array =
                detail::NewValueArray(static_cast<ULONG>(detail::CountValues(true, utf8)));
            detail::FillNumbersUtf8(utf8, detail::NumberTyping::kWholeText, array);
            m_value = std::move(array);
            continue;
        }
        _variant_t text = child->GetnodeValue();
        if (text.vt != VT_BSTR) text.ChangeType(VT_BSTR);
        SetAxisValue(std::move(text));
    }
    return true;
}

void KestCdfAxis::SetAxisAttributes(IXMLDOMNamedNodeMapPtr attributes) {
    if (!attributes) KestCalmorphDLLError::Raise(reason::kAxisNoAttributeMap);
    // Attributes are taken by position; each member is set before the next is read.
    m_size = GetNodeValue(attributes->nextNode());
    m_swUnits = GetNodeString(attributes->nextNode());
    m_formatType = GetNodeString(attributes->nextNode());
}

unsigned int KestCdfAxis::GetNodeValue(IXMLDOMNodePtr node) {
    if (!node || node->GetnodeType() != NODE_ATTRIBUTE)
        KestCalmorphDLLError::Raise(reason::kAxisAttributeMissing);
    _variant_t number = node->GetnodeValue();
    number.ChangeType(VT_R8);
    return SizeFromDouble(number.dblVal);
}

_bstr_t KestCdfAxis::GetNodeString(IXMLDOMNodePtr node) {
    if (!node || node->GetnodeType() != NODE_ATTRIBUTE)
        KestCalmorphDLLError::Raise(reason::kAxisAttributeMissing);
    return detail::TakeText(node->GetnodeValue());
}

bool KestCdfAxis::ConvertAxisNodeToXML(IXMLDOMNodePtr parent, IXMLDOMDocument* doc,
                                       KestCdfNormalizedString ns) {
    if (!doc) throw _com_error(E_POINTER);
    // The namespace is this call's own copy: handed over, not copied again.
    IXMLDOMNodePtr element = doc->createNode(_variant_t(static_cast<int>(NODE_ELEMENT)),
                                             ElementName(), _bstr_t(ns.m_string.Detach(), false));
    if (!parent) throw _com_error(E_POINTER);
    parent->appendChild(element);

    IXMLDOMNamedNodeMapPtr attributes = element->Getattributes();
    if (!attributes) KestCalmorphDLLError::Raise(reason::kAxisWriteNoAttributeMap);
    AddAttribute(doc, attributes, SizeName(), SizeText(m_size).bstrVal);
    attributes = element->Getattributes();
    AddAttribute(doc, attributes, UnitsName(), m_swUnits.m_string);
    AddAttribute(doc, attributes, FormatTypeName(), m_formatType.m_string);

    // The element stays attached with its attributes when there is nothing to write.
    if (m_value.vt == VT_EMPTY) KestCalmorphDLLError::Raise(reason::kAxisValueEmpty);
    // GetNumbersFromSafeArray's text, built as UTF-8 since that is how the DOM keeps it.
    detail::FormatValueListUtf8(
        m_value, detail::ElementWriting::kAxis,
        detail::IsFormatType(m_formatType, detail::kFormatString), [&](std::string_view text) {
            IXMLDOMNodePtr textNode =
                doc->createNode(_variant_t(static_cast<int>(NODE_TEXT)), NoName(), NoName());
            textNode->PutnodeValueUtf8(text);
            element->appendChild(textNode);
        });
    return true;
}

void KestCdfAxis::WriteXmlText(XmlFileWriter& out) {
    out.StartElement(ElementName().View());
    out.Attribute(SizeName().View(), BstrView(SizeText(m_size).bstrVal));
    out.Attribute(UnitsName().View(), BstrView(m_swUnits.m_string));
    out.Attribute(FormatTypeName().View(), BstrView(m_formatType.m_string));
    if (m_value.vt == VT_EMPTY) KestCalmorphDLLError::Raise(reason::kAxisValueEmpty);
    detail::FormatValueListUtf8(m_value, detail::ElementWriting::kAxis,
                                detail::IsFormatType(m_formatType, detail::kFormatString),
                                [&](std::string_view text) { out.Text(text); });
    out.EndElement();
}

}  // namespace kest
