#include "KestCdfChangeHistory.h"

#include "../platform/KestCalmorphDLLError.h"
#include "../platform/XmlFileWriter.h"

namespace kest {

KestCdfChange* KestCdfChangeHistory::CreateChangeList() {
    if (m_count == -1) KestCalmorphDLLError::Raise(reason::kChangeCountUnset);
    m_changes.AllocateArray(m_count);
    return m_changes.Expose();
}

int KestCdfChangeHistory::CountChangeNodes(IXMLDOMNodePtr node) {
    IXMLDOMNodeListPtr children = node->GetchildNodes();
    if (!children) return 0;
    int count = 0;
    try {
        while (IXMLDOMNodePtr child = children->nextNode()) {
            if (child->GetnodeType() == NODE_ELEMENT && child->NameIs(u"CHANGE")) {
                ++count;
            }
        }
    } catch (...) {
        // -1 makes the allocation that follows fail, which the root reader reports.
        return -1;
    }
    return count;
}

bool KestCdfChangeHistory::ConvertChangeHistoryNode(IXMLDOMNodePtr node) {
    m_count = CountChangeNodes(node);
    KestCdfChange* changes = m_changes.AllocateArray(m_count);
    IXMLDOMNodeListPtr children = node->GetchildNodes();
    if (!children) return true;
    int index = 0;
    while (IXMLDOMNodePtr child = children->nextNode()) {
        if (child->GetnodeType() != NODE_ELEMENT || !child->NameIs(u"CHANGE")) continue;
        if (index >= m_count) break;  // the children changed since they were counted
        changes[index++].ConvertChangeNode(child);
    }
    return true;
}

bool KestCdfChangeHistory::ConvertChangeHistoryToXML(IXMLDOMNodePtr parent, IXMLDOMDocument* doc,
                                                     KestCdfNormalizedString ns) {
    if (!doc) throw _com_error(E_POINTER);
    _bstr_t uri(ns.m_string.m_str, true);
    IXMLDOMNodePtr history = doc->createNode(_variant_t(static_cast<int>(NODE_ELEMENT)),
                                             _bstr_t(u"CHANGE-HISTORY"), uri);
    parent->appendChild(history);
    KestCdfChange* const changes = m_changes.Checked(m_count);
    for (int i = 0; i < m_count; ++i) changes[i].ConvertChangeToXML(history, doc, ns);
    return true;
}

void KestCdfChangeHistory::WriteXmlText(XmlFileWriter& out) {
    out.StartElement(u"CHANGE-HISTORY");
    KestCdfChange* const changes = m_changes.Checked(m_count);
    for (int i = 0; i < m_count; ++i) changes[i].WriteXmlText(out);
    out.EndElement();
}

}  // namespace kest
