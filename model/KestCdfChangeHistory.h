#pragma once
// KestCdfChangeHistory: the CHANGE-HISTORY element, a view of an array of change entries.

#include "../platform/Automation.h"
#include "../platform/Export.h"
#include "../platform/XmlDom.h"
#include "../text/KestCdfNormalizedString.h"
#include "KestCdfChange.h"
#include "KestCdfSharedChild.h"

namespace kest {

class XmlFileWriter;

class KEST_API KestCdfChangeHistory {
  public:
    /// No array, count 0.
    KestCdfChangeHistory() = default;
    /// Copies share the entry array; the last copy frees an array the library allocated.
    KestCdfChangeHistory(const KestCdfChangeHistory& other) = default;
    KestCdfChangeHistory& operator=(const KestCdfChangeHistory& other) = default;
    ~KestCdfChangeHistory() = default;

    /// The entry array (null when there is none).
    KestCdfChange* GetChange() const { return m_changes.Expose(); }
    /// Refers to `changes` without copying; an array the host allocated stays the host's and
    /// must outlive every copy of the tree.
    void SetChange(KestCdfChange* changes) { m_changes.Set(changes); }
    /// Number of entries the writer emits; must not exceed the array's length.
    int GetChangeArraySize() const noexcept { return m_count; }
    void SetChangeArraySize(int count) noexcept { m_count = count; }
    /// Allocates `count` new entries (dated now), refers to them and returns them. Throws
    /// KestCalmorphDLLError 33 when the count is -1, std::bad_alloc for another negative count.
    KestCdfChange* CreateChangeList();

    /// Reads CHANGE-HISTORY: counts its CHANGE children, allocates that many entries and reads
    /// them in document order. When counting fails the count stays -1 and std::bad_alloc
    /// leaves. Returns true.
    bool ConvertChangeHistoryNode(IXMLDOMNodePtr node);
    /// Appends CHANGE-HISTORY (namespace `ns`) to `parent` with one CHANGE for each of the first
    /// count entries. Returns true; DOM failures pass as _com_error.
    bool ConvertChangeHistoryToXML(IXMLDOMNodePtr parent, IXMLDOMDocument* doc,
                                   KestCdfNormalizedString ns);
    void WriteXmlText(XmlFileWriter& out);

  private:
    int CountChangeNodes(IXMLDOMNodePtr node);

    KestCdfSharedChild<KestCdfChange> m_changes;
    int m_count = 0;
};

}  // namespace kest
