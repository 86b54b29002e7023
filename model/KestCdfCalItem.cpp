#include "KestCdfCalItem.h"

#include "KestCdfReadWarnings.h"
#include "detail/DomWriting.h"

#include "../platform/KestCalmorphDLLError.h"
#include "../platform/XmlFileWriter.h"

namespace kest {

using detail::AppendElement;
using detail::AppendTextElement;
using detail::TextOf;

KestCdfCalItemValue KestCdfCalItem::GetCalItemValue() const {
    if (!m_value.get()) throw _com_error(E_POINTER);
    return *m_value.get();
}

int KestCdfCalItem::CountAxisNodes(IXMLDOMNodePtr node) {
    IXMLDOMNodeListPtr children = node->GetchildNodes();
    if (!children) return 0;
    int count = 0;
    try {
        while (IXMLDOMNodePtr child = children->nextNode()) {
            if (child->GetnodeType() == NODE_ELEMENT && child->NameIs(u"AXIS")) ++count;
        }
    } catch (...) {
        // -1 makes the allocation that follows fail, which the list reader reports.
        return -1;
    }
    return count;
}

void KestCdfCalItem::ReadChild(const IXMLDOMNodePtr& child, int& axisIndex) {
    if (child->GetnodeType() != NODE_ELEMENT) return;
    const IXMLDOMNode& element = *child;
    auto named = [&element](std::u16string_view candidate) { return element.NameIs(candidate); };
    if (named(u"NAME")) {
        // The last child node stands; no child gives an empty (not null) name.
        CComBSTR text(std::u16string_view{});
        IXMLDOMNodeListPtr parts = child->GetchildNodes();
        if (parts) {
            while (IXMLDOMNodePtr part = parts->nextNode()) text = TextOf(part);
        }
        m_name.m_string = std::move(text);
        if (detail::ReadWarningScope* warnings = detail::ReadWarningScope::Current())
            warnings->SetItem(m_name.ToString());
    } else if (named(u"AXIS")) {
        if (axisIndex < m_axisSize) m_axes.get()[axisIndex++].ConvertAxisNode(child);
    } else if (named(u"VALUE")) {
        m_value.AllocateObject()->ConvertCalItemValueNode(child);
    } else if (named(u"ANNOTATION")) {
        // Only the first child node counts; an empty element leaves the annotation alone.
        if (IXMLDOMNodePtr first = child->GetfirstChild()) m_annotation = TextOf(first);
    } else if (named(u"NOTE")) {
        IXMLDOMNodePtr first = child->GetfirstChild();
        m_note = first ? TextOf(first) : CComBSTR(std::u16string_view{});
    }
}

bool KestCdfCalItem::ConvertCalItemNode(IXMLDOMNodePtr node) {
    if (detail::ReadWarningScope* warnings = detail::ReadWarningScope::Current())
        warnings->SetItem({});
    m_axisSize = CountAxisNodes(node);
    m_axes.AllocateArray(m_axisSize);
    IXMLDOMNodeListPtr children = node->GetchildNodes();
    if (!children) return true;
    int axisIndex = 0;
    while (IXMLDOMNodePtr child = children->nextNode()) {
        // Whatever fails inside the item reaches the host with the item's name.
        try {
            ReadChild(child, axisIndex);
        } catch (KestCalmorphDLLError& error) {
            error.SetReasonString(m_name.m_string);
            throw;
        } catch (...) {
            KestCalmorphDLLError error;
            error.SetReason(reason::kCalItemReadFailed);
            error.SetReasonString(m_name.m_string);
            throw error;
        }
    }
    return true;
}

void KestCdfCalItem::WriteItem(const IXMLDOMNodePtr& parent, IXMLDOMDocument* doc,
                               const KestCdfNormalizedString& ns) {
    if (!doc) throw _com_error(E_POINTER);
    _bstr_t uri(ns.m_string.m_str, true);
    IXMLDOMNodePtr item = AppendElement(parent, doc, u"CAL-ITEM", uri);
    if (m_name.m_string == nullptr) KestCalmorphDLLError::Raise(reason::kCalItemNameMissing);
    AppendTextElement(item, doc, u"NAME", uri, m_name.m_string);
    KestCdfAxis* const axes = m_axes.Checked(m_axisSize);
    for (int i = 0; i < m_axisSize; ++i) axes[i].ConvertAxisNodeToXML(item, doc, ns);
    if (!m_value.get()) KestCalmorphDLLError::Raise(reason::kCalItemValueMissing);
    m_value.get()->ConvertCalItemValueNodeToXML(item, doc, ns);
    if (m_annotation != nullptr) AppendTextElement(item, doc, u"ANNOTATION", uri, m_annotation);
    if (m_note != nullptr) AppendTextElement(item, doc, u"NOTE", uri, m_note);
}

bool KestCdfCalItem::ConvertCalItemNodeToXML(IXMLDOMNodePtr parent, IXMLDOMDocument* doc,
                                             KestCdfNormalizedString ns) {
    try {
        WriteItem(parent, doc, ns);
    } catch (KestCalmorphDLLError& error) {
        error.SetReasonString(m_name.m_string);
        throw;
    }
    return true;
}

void KestCdfCalItem::WriteXmlText(XmlFileWriter& out) {
    try {
        out.StartElement(u"CAL-ITEM");
        if (m_name.m_string == nullptr) KestCalmorphDLLError::Raise(reason::kCalItemNameMissing);
        detail::WriteTextElement(out, u"NAME", m_name.m_string);
        KestCdfAxis* const axes = m_axes.Checked(m_axisSize);
        for (int i = 0; i < m_axisSize; ++i) axes[i].WriteXmlText(out);
        if (!m_value.get()) KestCalmorphDLLError::Raise(reason::kCalItemValueMissing);
        m_value.get()->WriteXmlText(out);
        if (m_annotation != nullptr) detail::WriteTextElement(out, u"ANNOTATION", m_annotation);
        if (m_note != nullptr) detail::WriteTextElement(out, u"NOTE", m_note);
        out.EndElement();
    } catch (KestCalmorphDLLError& error) {
        error.SetReasonString(m_name.m_string);
        throw;
    }
}

}  // namespace kest
