#include "KestCdfCalItemValue.h"

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

// Names are made once: every item of a file writes them.
const _bstr_t& ElementName() {
    static const _bstr_t name(u"VALUE");
    return name;
}
const _bstr_t& UnitsName() {
    static const _bstr_t name(u"sw-units-ref");
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

KestCdfCalItemValue::KestCdfCalItemValue() = default;

KestCdfCalItemValue::KestCdfCalItemValue(const KestCdfCalItemValue& other) = default;

KestCdfCalItemValue& KestCdfCalItemValue::operator=(const KestCdfCalItemValue& other) = default;

KestCdfCalItemValue::~KestCdfCalItemValue() = default;

_variant_t KestCdfCalItemValue::GetValue() const { return m_value; }

void KestCdfCalItemValue::SetValue(_variant_t value) {
    // Converting first means a value without a text form fails before anything changes.
    const detail::ValueText text(value);
    if (detail::IsFormatType(m_formatType, detail::kFormatNumeric)) {
        // Text read from a document is split into numbers; a host's text stays one element.
        _variant_t array = detail::NewValueArray(static_cast<ULONG>(CountValues(text.View())));
        if (m_fromDocument)
            array = PutNumbersIntoSafeArray(value, std::move(array));
        else
            PutStringsIntoSafeArray(value, array);
        m_value = std::move(array);
    } else if (detail::IsFormatType(m_formatType, detail::kFormatLabel) ||
               !detail::IsQuoted(text.View())) {
        m_value = detail::SingleValueArray(value);
    } else if (detail::IsFormatType(m_formatType, detail::kFormatString)) {
        _variant_t array = detail::NewValueArray(0);
        PutStringsIntoSafeArray(value, array);
        m_value = std::move(array);
    }
    // Quoted text under any other format type keeps the stored value.
}

void KestCdfCalItemValue::SetValueElements(const _variant_t& elements) {
    if (elements.vt != (VT_ARRAY | VT_VARIANT) || !elements.parray || elements.parray->cDims != 1)
        throw _com_error(E_INVALIDARG);
    m_value = elements;
}

int KestCdfCalItemValue::CountValues(std::u16string_view text) const noexcept {
    return detail::CountValues(detail::IsFormatType(m_formatType, detail::kFormatNumeric), text);
}

_variant_t KestCdfCalItemValue::PutNumbersIntoSafeArray(const _variant_t& value,
                                                        _variant_t array) const {
    const detail::ValueText text(value);
    detail::FillNumbers(text.View(), detail::NumberTyping::kPerToken, array);
    return array;
}

void KestCdfCalItemValue::PutStringsIntoSafeArray(const _variant_t& value,
                                                  _variant_t& array) const {
    if (value.vt != VT_BSTR) return;
    if (!m_fromDocument) {
        // A host's text is kept whole, quotes included.
        SAFEARRAYBOUND bound{1, 0};
        ThrowIfFailed(SafeArrayRedim(array.parray, &bound));
        const LONG index = 0;
        ThrowIfFailed(SafeArrayPutElement(array.parray, &index, &value));
        return;
    }
    detail::PutQuotedStrings(BstrView(value.bstrVal), array);
}

_variant_t KestCdfCalItemValue::GetNumbersFromSafeArray(const _variant_t& value) const {
    return detail::FormatValueList(value, detail::ElementWriting::kCalItemValue,
                                   detail::IsFormatType(m_formatType, detail::kFormatString));
}

bool KestCdfCalItemValue::ConvertCalItemValueNode(IXMLDOMNodePtr node) {
    if (!node) throw _com_error(E_POINTER);
    SetCalItemValueAttributes(node->Getattributes());
    IXMLDOMNodeListPtr children = node->GetchildNodes();
    // An empty LABEL or STRING value is written as an element without children: read it as
    // the setter's value for the empty text (one empty string), so that it is written again.
    if (!children->Getlength() && (detail::IsFormatType(m_formatType, detail::kFormatString) ||
                                   detail::IsFormatType(m_formatType, detail::kFormatLabel))) {
        m_fromDocument = 1;
        SetValue(_variant_t(u""));
        return true;
    }
    // Every child replaces the value, so the last one decides.
    for (IXMLDOMNodePtr child = children->nextNode(); child; child = children->nextNode()) {
        m_fromDocument = 1;
        // Numbers are parsed from the text as the DOM stores it: SetValue's result for the
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
            detail::FillNumbersUtf8(utf8, detail::NumberTyping::kPerToken, array);
            m_value = std::move(array);
            continue;
        }
        SetValue(child->GetnodeValue());
    }
    return true;
}

void KestCdfCalItemValue::SetCalItemValueAttributes(IXMLDOMNamedNodeMapPtr attributes) {
    if (!attributes) return;
    // Attributes are taken by position.
    m_units = GetNodeString(attributes->nextNode());
    m_formatType = GetNodeString(attributes->nextNode());
}

_bstr_t KestCdfCalItemValue::GetNodeString(IXMLDOMNodePtr node) {
    if (!node) return _bstr_t(u"Error occured");
    if (node->GetnodeType() != NODE_ATTRIBUTE)
        KestCalmorphDLLError::Raise(reason::kValueNotAttribute);
    return detail::TakeText(node->GetnodeValue());
}

bool KestCdfCalItemValue::ConvertCalItemValueNodeToXML(IXMLDOMNodePtr parent, IXMLDOMDocument* doc,
                                                       KestCdfNormalizedString ns) {
    if (!doc) throw _com_error(E_POINTER);
    // The namespace is this call's own copy: handed over, not copied again.
    IXMLDOMNodePtr element = doc->createNode(_variant_t(static_cast<int>(NODE_ELEMENT)),
                                             ElementName(), _bstr_t(ns.m_string.Detach(), false));
    if (!parent) throw _com_error(E_POINTER);
    parent->appendChild(element);

    IXMLDOMNamedNodeMapPtr attributes = element->Getattributes();
    AddAttribute(doc, attributes, UnitsName(), m_units.m_string);
    AddAttribute(doc, attributes, FormatTypeName(), m_formatType.m_string);

    // The element stays attached with its attributes when there is nothing to write.
    if (m_value.vt == VT_EMPTY) KestCalmorphDLLError::Raise(reason::kCalItemValueMissing);
    // GetNumbersFromSafeArray's text, built as UTF-8 since that is how the DOM keeps it.
    detail::FormatValueListUtf8(
        m_value, detail::ElementWriting::kCalItemValue,
        detail::IsFormatType(m_formatType, detail::kFormatString), [&](std::string_view text) {
            IXMLDOMNodePtr textNode =
                doc->createNode(_variant_t(static_cast<int>(NODE_TEXT)), NoName(), NoName());
            textNode->PutnodeValueUtf8(text);
            element->appendChild(textNode);
        });
    return true;
}

void KestCdfCalItemValue::WriteXmlText(XmlFileWriter& out) {
    out.StartElement(ElementName().View());
    out.Attribute(UnitsName().View(), BstrView(m_units.m_string));
    out.Attribute(FormatTypeName().View(), BstrView(m_formatType.m_string));
    if (m_value.vt == VT_EMPTY) KestCalmorphDLLError::Raise(reason::kCalItemValueMissing);
    detail::FormatValueListUtf8(m_value, detail::ElementWriting::kCalItemValue,
                                detail::IsFormatType(m_formatType, detail::kFormatString),
                                [&](std::string_view text) { out.Text(text); });
    out.EndElement();
}

}  // namespace kest
