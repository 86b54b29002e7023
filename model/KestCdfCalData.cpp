#include "KestCdfCalData.h"

#include "detail/DomWriting.h"
#include "detail/ValueListCodec.h"

#include <string>
#include <string_view>

#include "../platform/KestCalmorphDLLError.h"
#include "../platform/XmlFileWriter.h"

namespace kest {

using detail::AddAttribute;
using detail::AppendElement;
using detail::AppendTextElement;
using detail::ElementText;

KestCdfCalList* KestCdfCalData::CreateCalList(int count) {
    m_calLists.AllocateArray(count);
    m_calListLength = count;
    return m_calLists.Expose();
}

void KestCdfCalData::SetCalLists(KestCdfCalList* lists) {
    m_calLists.Set(lists);
    m_calListLength = -1;
}

KestCdfCalList& KestCdfCalData::FirstList() const {
    if (!m_calLists.get()) throw _com_error(E_POINTER);
    if (m_calListLength == 0) throw _com_error(DISP_E_BADINDEX);
    return m_calLists.get()[0];
}

KestCdfCalList KestCdfCalData::GetCalList() const { return FirstList(); }

void KestCdfCalData::SetCalList(KestCdfCalList list) { FirstList() = list; }

_bstr_t KestCdfCalData::GetNodeString(IXMLDOMNodePtr node) {
    if (!node) KestCalmorphDLLError::Raise(reason::kCalDataAttributeMissing);
    if (node->GetnodeType() != NODE_ATTRIBUTE) {
        KestCalmorphDLLError::Raise(reason::kCalDataNotAttribute);
    }
    return _bstr_t(node->GetnodeValue());
}

void KestCdfCalData::SetNodeAttributes(IXMLDOMNamedNodeMapPtr attributes) {
    if (!attributes) KestCalmorphDLLError::Raise(reason::kCalDataNoAttributeMap);
    // By role when the root has all three, in any order: "xmlns" is the namespace, an
    // "xmlns:P" naming the schema-instance URI the schema instance, and "P:schemaLocation" or
    // "P:noNamespaceSchemaLocation" the location. Reading them by position would swap the
    // namespaces of a root that declares xmlns:xsi first.
    IXMLDOMNodePtr roles[3];
    const long count = attributes->Getlength();
    for (long i = 0; i < count; ++i) {
        IXMLDOMNodePtr attribute = attributes->Getitem(i);
        if (!attribute || attribute->GetnodeType() != NODE_ATTRIBUTE) continue;
        const _bstr_t name = attribute->GetnodeName();
        const std::u16string_view view = BstrView(name);
        if (view == u"xmlns") {
            if (!roles[0]) roles[0] = attribute;
        } else if (view.substr(0, 6) == u"xmlns:" && !roles[1]) {
            const _bstr_t value = detail::TakeText(attribute->GetnodeValue());
            if (BstrView(value) == u"http://www.w3.org/2001/XMLSchema-instance")
                roles[1] = attribute;
        }
    }
    if (roles[0] && roles[1]) {
        const _bstr_t instanceName = roles[1]->GetnodeName();
        const std::u16string prefix(BstrView(instanceName).substr(6));
        for (long i = 0; i < count && !roles[2]; ++i) {
            IXMLDOMNodePtr attribute = attributes->Getitem(i);
            if (!attribute || attribute->GetnodeType() != NODE_ATTRIBUTE) continue;
            const _bstr_t name = attribute->GetnodeName();
            const std::u16string_view view = BstrView(name);
            if (view == prefix + u":schemaLocation" ||
                view == prefix + u":noNamespaceSchemaLocation")
                roles[2] = attribute;
        }
    }
    if (roles[0] && roles[1] && roles[2]) {
        m_namespace = GetNodeString(roles[0]);
        m_schemaInstance = GetNodeString(roles[1]);
        m_schemaLocation = GetNodeString(roles[2]);
        return;
    }
    // Otherwise by position, whatever the names: namespace, schema instance, schema location.
    m_namespace = GetNodeString(attributes->nextNode());
    m_schemaInstance = GetNodeString(attributes->nextNode());
    m_schemaLocation = GetNodeString(attributes->nextNode());
}

int KestCdfCalData::CountCalList(IXMLDOMNodePtr node) {
    IXMLDOMNodeListPtr children = node->GetchildNodes();
    if (!children) return 0;
    int count = 0;
    try {
        while (IXMLDOMNodePtr child = children->nextNode()) {
            if (child->GetnodeType() == NODE_ELEMENT && child->NameIs(u"CAL-LIST")) {
                ++count;
            }
        }
    } catch (...) {
        KestCalmorphDLLError::Raise(reason::kCalDataReadFailed);
    }
    return count;
}

void KestCdfCalData::ReadChild(const IXMLDOMNodePtr& child, int& listIndex) {
    if (child->GetnodeType() != NODE_ELEMENT) return;
    const IXMLDOMNode& element = *child;
    auto named = [&element](std::u16string_view candidate) { return element.NameIs(candidate); };
    if (named(u"CHANGE-HISTORY")) {
        m_changeHistory.ConvertChangeHistoryNode(child);
    } else if (named(u"FILENAME")) {
        m_fileName.m_string = ElementText(child);
    } else if (named(u"COMPANY-INFO")) {
        m_company.m_string = ElementText(child);
    } else if (named(u"NOTE")) {
        m_note = ElementText(child);
    } else if (named(u"CAL-LIST")) {
        if (listIndex < m_calListSize) m_calLists.get()[listIndex++].ConvertCalListNode(child);
    }
}

bool KestCdfCalData::ConvertCalDataNode(IXMLDOMNodePtr node) {
    m_calListSize = CountCalList(node);
    CreateCalList(m_calListSize);
    IXMLDOMNodeListPtr children = node->GetchildNodes();
    if (!children) return true;
    int listIndex = 0;
    while (IXMLDOMNodePtr child = children->nextNode()) {
        try {
            ReadChild(child, listIndex);
        } catch (KestCalmorphDLLError&) {
            throw;
        } catch (...) {
            KestCalmorphDLLError::Raise(reason::kCalDataReadFailed);
        }
    }
    return true;
}

bool KestCdfCalData::SetXMLAttributes(IXMLDOMNodePtr root) {
    IXMLDOMNamedNodeMapPtr attributes = root->Getattributes();
    if (!attributes) return false;
    AddAttribute(m_document, attributes, u"xmlns", m_namespace.m_string);
    if (m_schemaInstance.m_string == nullptr) {
        KestCalmorphDLLError::Raise(reason::kSchemaInstanceMissing);
    }
    AddAttribute(m_document, attributes, u"xmlns:xsi", m_schemaInstance.m_string);
    if (m_schemaLocation.m_string == nullptr) {
        KestCalmorphDLLError::Raise(reason::kSchemaLocationMissing);
    }
    const bool noNamespace = m_namespace.m_string.Length() == 0;
    AddAttribute(m_document, attributes,
                 noNamespace ? u"xsi:noNamespaceSchemaLocation" : u"xsi:schemaLocation",
                 m_schemaLocation.m_string);
    return true;
}

bool KestCdfCalData::ConvertCalDataNodeToXML(IXMLDOMDocument* doc, CComBSTR comment) {
    if (!doc) throw _com_error(E_POINTER);
    m_document = doc;
    IXMLDOMNodePtr root = doc->createNode(_variant_t(static_cast<int>(NODE_ELEMENT)),
                                          _bstr_t(u"CAL-DATA"), _bstr_t(u""));
    doc->appendChild(root);
    if (comment.Length() != 0) root->appendChild(doc->createComment(_bstr_t(comment.View())));
    m_changeHistory.ConvertChangeHistoryToXML(root, doc, m_namespace);
    _bstr_t uri(m_namespace.m_string.m_str, true);
    AppendTextElement(root, doc, u"FILENAME", uri, m_fileName.m_string);
    if (m_company.m_string != nullptr) {
        AppendTextElement(root, doc, u"COMPANY-INFO", uri, m_company.m_string);
    }
    if (m_note != nullptr) AppendTextElement(root, doc, u"NOTE", uri, m_note);
    SetXMLAttributes(root);
    KestCdfCalList* const lists = m_calLists.Checked(m_calListSize);
    for (int i = 0; i < m_calListSize; ++i) {
        lists[i].ConvertCalListNodeToXML(root, doc, m_namespace);
    }
    return true;
}

void KestCdfCalData::WriteXmlText(XmlFileWriter& out, const CComBSTR& comment) {
    out.StartElement(u"CAL-DATA");
    // The root's attributes are checked after its first children, as the document is built.
    out.HoldStartTag();
    if (comment.Length() != 0) out.Comment(comment.View());
    m_changeHistory.WriteXmlText(out);
    detail::WriteTextElement(out, u"FILENAME", m_fileName.m_string);
    if (m_company.m_string != nullptr)
        detail::WriteTextElement(out, u"COMPANY-INFO", m_company.m_string);
    if (m_note != nullptr) detail::WriteTextElement(out, u"NOTE", m_note);
    out.Attribute(u"xmlns", BstrView(m_namespace.m_string));
    if (m_schemaInstance.m_string == nullptr) {
        KestCalmorphDLLError::Raise(reason::kSchemaInstanceMissing);
    }
    out.Attribute(u"xmlns:xsi", BstrView(m_schemaInstance.m_string));
    if (m_schemaLocation.m_string == nullptr) {
        KestCalmorphDLLError::Raise(reason::kSchemaLocationMissing);
    }
    const bool noNamespace = m_namespace.m_string.Length() == 0;
    out.Attribute(noNamespace ? u"xsi:noNamespaceSchemaLocation" : u"xsi:schemaLocation",
                  BstrView(m_schemaLocation.m_string));
    out.ReleaseStartTag();
    KestCdfCalList* const lists = m_calLists.Checked(m_calListSize);
    for (int i = 0; i < m_calListSize; ++i) lists[i].WriteXmlText(out);
    out.EndElement();
}

}  // namespace kest
