#include "KestCdfCalList.h"

#include "detail/DomWriting.h"

#include "../platform/KestCalmorphDLLError.h"
#include "../platform/XmlFileWriter.h"

namespace kest {

using detail::AppendElement;
using detail::AppendTextElement;
using detail::TextOf;

KestCdfSymbolicFile KestCdfCalList::GetSymbolicFile() const {
    if (!m_symbolicFile.get()) throw _com_error(E_POINTER);
    return *m_symbolicFile.get();
}

KestCdfTargetImage KestCdfCalList::GetTargetImage() const {
    if (!m_targetImage.get()) throw _com_error(E_POINTER);
    return *m_targetImage.get();
}

KestCdfCalItem* KestCdfCalList::CreateCalItems() {
    if (m_calItemSize == -1) KestCalmorphDLLError::Raise(reason::kCalItemSizeUnset);
    m_calItems.AllocateArray(m_calItemSize);
    return m_calItems.Expose();
}

int KestCdfCalList::CountCalItem(IXMLDOMNodePtr node) {
    IXMLDOMNodeListPtr children = node->GetchildNodes();
    if (!children) return 0;
    int count = 0;
    try {
        while (IXMLDOMNodePtr child = children->nextNode()) {
            if (child->GetnodeType() == NODE_ELEMENT && child->NameIs(u"CAL-ITEM")) {
                ++count;
            }
        }
    } catch (...) {
        // -1 makes the allocation that follows fail, which the root reader reports.
        return -1;
    }
    return count;
}

void KestCdfCalList::ReadChild(const IXMLDOMNodePtr& child, int& itemIndex) {
    const IXMLDOMNode& element = *child;
    auto named = [&element](std::u16string_view candidate) { return element.NameIs(candidate); };
    if (named(u"NAME")) {
        // Only the first child node counts; an empty element leaves the name alone.
        if (IXMLDOMNodePtr first = child->GetfirstChild()) m_name.m_string = TextOf(first);
    } else if (named(u"SYMBOLIC-FILE")) {
        m_symbolicFile.AllocateObject()->ConvertSymbolicFileNode(child);
    } else if (named(u"TARGET-IMAGE")) {
        m_targetImage.AllocateObject()->ConvertTargetImageFileNode(child);
    } else if (named(u"NOTE")) {
        // The last child node stands; no child gives an empty (not null) note.
        CComBSTR text(std::u16string_view{});
        IXMLDOMNodeListPtr parts = child->GetchildNodes();
        if (parts) {
            while (IXMLDOMNodePtr part = parts->nextNode()) text = TextOf(part);
        }
        m_note = std::move(text);
    } else if (named(u"CAL-ITEM")) {
        if (itemIndex < m_calItemSize) m_calItems.get()[itemIndex++].ConvertCalItemNode(child);
    }
}

bool KestCdfCalList::ConvertCalListNode(IXMLDOMNodePtr node) {
    m_calItemSize = CountCalItem(node);
    m_calItems.AllocateArray(m_calItemSize);
    IXMLDOMNodeListPtr children = node->GetchildNodes();
    if (!children) return true;
    int itemIndex = 0;
    while (IXMLDOMNodePtr child = children->nextNode()) {
        if (child->GetnodeType() != NODE_ELEMENT) continue;
        try {
            ReadChild(child, itemIndex);
        } catch (KestCalmorphDLLError&) {
            throw;
        } catch (...) {
            KestCalmorphDLLError::Raise(reason::kCalListReadFailed);
        }
    }
    return true;
}

bool KestCdfCalList::ConvertCalListNodeToXML(IXMLDOMNodePtr parent, IXMLDOMDocument* doc,
                                             KestCdfNormalizedString ns) {
    if (!doc) throw _com_error(E_POINTER);
    _bstr_t uri(ns.m_string.m_str, true);
    IXMLDOMNodePtr list = AppendElement(parent, doc, u"CAL-LIST", uri);
    if (m_name.m_string == nullptr) KestCalmorphDLLError::Raise(reason::kCalListNameMissing);
    AppendTextElement(list, doc, u"NAME", uri, m_name.m_string);
    if (!m_symbolicFile.get()) KestCalmorphDLLError::Raise(reason::kSymbolicFileMissing);
    m_symbolicFile.get()->ConvertSymbolicFileNodeToXML(list, doc, ns);
    if (m_targetImage.get()) m_targetImage.get()->ConvertTargetImageFileNodeToXML(list, doc, ns);
    if (m_note != nullptr) AppendTextElement(list, doc, u"NOTE", uri, m_note);
    KestCdfCalItem* const items = m_calItems.Checked(m_calItemSize);
    for (int i = 0; i < m_calItemSize; ++i) {
        items[i].ConvertCalItemNodeToXML(list, doc, ns);
    }
    return true;
}

void KestCdfCalList::WriteXmlText(XmlFileWriter& out) {
    out.StartElement(u"CAL-LIST");
    if (m_name.m_string == nullptr) KestCalmorphDLLError::Raise(reason::kCalListNameMissing);
    detail::WriteTextElement(out, u"NAME", m_name.m_string);
    if (!m_symbolicFile.get()) KestCalmorphDLLError::Raise(reason::kSymbolicFileMissing);
    m_symbolicFile.get()->WriteXmlText(out);
    if (m_targetImage.get()) m_targetImage.get()->WriteXmlText(out);
    if (m_note != nullptr) detail::WriteTextElement(out, u"NOTE", m_note);
    KestCdfCalItem* const items = m_calItems.Checked(m_calItemSize);
    for (int i = 0; i < m_calItemSize; ++i) items[i].WriteXmlText(out);
    out.EndElement();
}

}  // namespace kest
