#pragma once
// KestCdfCalData: the root of a calibration tree, the CAL-DATA element with its namespace and
// schema attributes, header texts, change history and calibration lists.

#include <utility>

#include "../platform/Automation.h"
#include "../platform/Export.h"
#include "../platform/XmlDom.h"
#include "../text/KestCdfNormalizedString.h"
#include "KestCdfCalList.h"
#include "KestCdfChangeHistory.h"
#include "KestCdfSharedChild.h"

namespace kest {

class XmlFileWriter;

class KEST_API KestCdfCalData {
  public:
    /// Empty strings, no lists (size 0), an empty change history.
    KestCdfCalData() = default;
    /// Copies share the list array and the change entries; the last copy frees what the
    /// library allocated.
    KestCdfCalData(const KestCdfCalData& other) = default;
    KestCdfCalData& operator=(const KestCdfCalData& other) = default;
    ~KestCdfCalData() = default;

    /// The default namespace (xmlns); every element below the root is written in it.
    KestCdfNormalizedString GetNamespace() const { return m_namespace; }
    void SetNamespace(KestCdfNormalizedString value) { m_namespace = value; }
    /// The schema-instance namespace (xmlns:xsi); null cannot be written.
    KestCdfNormalizedString GetSchemaInstance() const { return m_schemaInstance; }
    void SetSchemaInstance(KestCdfNormalizedString value) { m_schemaInstance = value; }
    /// The schema location (xsi:schemaLocation or xsi:noNamespaceSchemaLocation); null cannot
    /// be written.
    KestCdfNormalizedString GetSchemaLocation() const { return m_schemaLocation; }
    void SetSchemaLocation(KestCdfNormalizedString value) { m_schemaLocation = value; }
    /// COMPANY-INFO text; null means "no COMPANY-INFO element".
    KestCdfNormalizedString GetCompany() const { return m_company; }
    void SetCompany(KestCdfNormalizedString value) { m_company = value; }
    /// FILENAME text; both setters store it verbatim.
    KestCdfNormalizedString GetFileName() const { return m_fileName; }
    void SetFileName(KestCdfNormalizedString value) { m_fileName = value; }
    void SetFileName(CComBSTR value) { m_fileName = KestCdfNormalizedString(value); }
    /// NOTE text; null means "no NOTE element".
    CComBSTR GetNote() const { return m_note; }
    void SetNote(CComBSTR note) { m_note = std::move(note); }

    /// Copy of the change history (it shares the entry array).
    KestCdfChangeHistory GetChangeHistory() const { return m_changeHistory; }
    void SetChangeHistory(KestCdfChangeHistory& history) { m_changeHistory = history; }

    /// Number of lists the writer emits; must not exceed the array's length.
    int GetCalListSize() const noexcept { return m_calListSize; }
    void SetCalListSize(int size) noexcept { m_calListSize = size; }
    /// Allocates `count` default lists, refers to them and returns them; the list size is not
    /// changed. A negative count throws std::bad_alloc.
    KestCdfCalList* CreateCalList(int count);
    /// Copy of list 0. Throws _com_error(E_POINTER) without an array and
    /// _com_error(DISP_E_BADINDEX) when the library allocated an empty one.
    KestCdfCalList GetCalList() const;
    /// Assigns `list` to list 0 (same requirements as GetCalList).
    void SetCalList(KestCdfCalList list);
    /// The list array itself (null when there is none), to reach lists beyond the first.
    KestCdfCalList* GetCalLists() const { return m_calLists.Expose(); }
    /// Refers to `lists` without copying; an array the host allocated stays the host's and
    /// must outlive every copy of the tree, one the library allocated is shared. Set the list
    /// size to match.
    void SetCalLists(KestCdfCalList* lists);

    /// Reads the first three attributes of CAL-DATA by position into namespace, schema instance
    /// and schema location (tab, line feed, carriage return become spaces). Throws
    /// KestCalmorphDLLError 41 for a null map, 42 when an attribute is missing (the values read
    /// before it stay), 16 for a node that is no attribute.
    void SetNodeAttributes(IXMLDOMNamedNodeMapPtr attributes);
    /// Reads CAL-DATA: CHANGE-HISTORY, FILENAME, COMPANY-INFO, NOTE (last child node's text)
    /// and each CAL-LIST into the next list, in any order. A KestCalmorphDLLError from a child
    /// passes unchanged; any other failure while a child is read becomes KestCalmorphDLLError
    /// 15. Returns true.
    bool ConvertCalDataNode(IXMLDOMNodePtr node);
    /// Builds CAL-DATA into the (empty) document: attributes, the comment when not empty,
    /// CHANGE-HISTORY, FILENAME, COMPANY-INFO and NOTE when not null, then the lists. Throws
    /// KestCalmorphDLLError 23 or 24 for a null schema instance or location and passes the
    /// errors of the lists on; _com_error(E_POINTER) for a null document. Returns true.
    bool ConvertCalDataNodeToXML(IXMLDOMDocument* doc, CComBSTR comment);
    /// The same text as ConvertCalDataNodeToXML and a save, written straight to `out`, with the
    /// same checks in the same order.
    void WriteXmlText(XmlFileWriter& out, const CComBSTR& comment);

  private:
    _bstr_t GetNodeString(IXMLDOMNodePtr node);
    int CountCalList(IXMLDOMNodePtr node);
    bool SetXMLAttributes(IXMLDOMNodePtr root);
    void ReadChild(const IXMLDOMNodePtr& child, int& listIndex);
    KestCdfCalList& FirstList() const;

    KestCdfNormalizedString m_namespace;
    KestCdfNormalizedString m_schemaInstance;
    KestCdfNormalizedString m_schemaLocation;
    KestCdfNormalizedString m_company;
    KestCdfNormalizedString m_fileName;
    CComBSTR m_note;
    KestCdfSharedChild<KestCdfCalList> m_calLists;
    KestCdfChangeHistory m_changeHistory;
    int m_calListSize = 0;
    // Working pointer of the write in progress; holds no reference and is stale afterwards.
    IXMLDOMDocument* m_document = nullptr;
    // Length of the list array when the library allocated it, -1 when unknown (host array).
    int m_calListLength = -1;
};

}  // namespace kest
