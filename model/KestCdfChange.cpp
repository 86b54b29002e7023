#include "KestCdfChange.h"

#include "../platform/XmlFileWriter.h"
#include "detail/DomWriting.h"

namespace kest {

using detail::AppendElement;
using detail::AppendTextElement;

namespace {

// Text elements of CHANGE.
constexpr const OLECHAR* kUserName = u"USERNAME";
constexpr const OLECHAR* kDate = u"DATE";
constexpr const OLECHAR* kTool = u"TOOL";
constexpr const OLECHAR* kNote = u"NOTE";
constexpr const OLECHAR* kDataVersion = u"DATA-VERSION";

// The text of every child node of `element` in turn; the last one stands. Computed aside so
// that a child without text (a nested element) leaves the field as it was.
CComBSTR LastChildText(const IXMLDOMNodePtr& element, bool& found) {
    CComBSTR text;
    found = false;
    IXMLDOMNodeListPtr children = element->GetchildNodes();
    if (!children) return text;
    while (IXMLDOMNodePtr child = children->nextNode()) {
        _bstr_t value(child->GetnodeValue());
        text = CComBSTR(value.View());
        found = true;
    }
    return text;
}

}  // namespace

bool KestCdfChange::ConvertChangeNode(IXMLDOMNodePtr node) {
    IXMLDOMNodeListPtr children = node->GetchildNodes();
    if (!children) return true;
    // Every failure inside one child element ends the entry quietly: an unreadable entry must
    // not cost the host the rest of the history.
    try {
        while (IXMLDOMNodePtr child = children->nextNode()) {
            if (child->GetnodeType() != NODE_ELEMENT) continue;
            const IXMLDOMNode& element = *child;
            auto named = [&element](std::u16string_view candidate) {
                return element.NameIs(candidate);
            };
            if (named(kUserName)) {
                IXMLDOMNodePtr first = child->GetfirstChild();
                if (first) {
                    m_userName.m_string = CComBSTR(_bstr_t(first->GetnodeValue()).View());
                }
            } else if (named(kDate)) {
                IXMLDOMNodeListPtr parts = child->GetchildNodes();
                if (!parts) continue;
                while (IXMLDOMNodePtr part = parts->nextNode()) {
                    KestCdfDate date;
                    date.SetDate(CComBSTR(_bstr_t(part->GetnodeValue()).View()));
                    m_date = date;
                }
            } else if (named(kTool) || named(kNote) || named(kDataVersion)) {
                bool found = false;
                CComBSTR text = LastChildText(child, found);
                if (!found) continue;
                if (named(kTool)) {
                    m_tool = std::move(text);
                } else if (named(kNote)) {
                    m_note = std::move(text);
                } else {
                    m_dataVersion.m_string = std::move(text);
                }
            }
        }
    } catch (...) {
        return false;
    }
    return true;
}

bool KestCdfChange::ConvertChangeToXML(IXMLDOMNodePtr parent, IXMLDOMDocument* doc,
                                       KestCdfNormalizedString ns) {
    if (!doc) throw _com_error(E_POINTER);
    _bstr_t uri(ns.m_string.m_str, true);
    IXMLDOMNodePtr change = AppendElement(parent, doc, u"CHANGE", uri);
    AppendTextElement(change, doc, kUserName, uri, m_userName.m_string);
    CComBSTR date = m_date.CreateTimeString();
    AppendTextElement(change, doc, kDate, uri, date);
    if (m_tool != nullptr) AppendTextElement(change, doc, kTool, uri, m_tool);
    if (m_note != nullptr) AppendTextElement(change, doc, kNote, uri, m_note);
    if (m_dataVersion.m_string != nullptr) {
        AppendTextElement(change, doc, kDataVersion, uri, m_dataVersion.m_string);
    }
    return true;
}

void KestCdfChange::WriteXmlText(XmlFileWriter& out) {
    out.StartElement(u"CHANGE");
    detail::WriteTextElement(out, kUserName, m_userName.m_string);
    CComBSTR date = m_date.CreateTimeString();
    detail::WriteTextElement(out, kDate, date);
    if (m_tool != nullptr) detail::WriteTextElement(out, kTool, m_tool);
    if (m_note != nullptr) detail::WriteTextElement(out, kNote, m_note);
    if (m_dataVersion.m_string != nullptr)
        detail::WriteTextElement(out, kDataVersion, m_dataVersion.m_string);
    out.EndElement();
}

}  // namespace kest
