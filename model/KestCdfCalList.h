#pragma once
// KestCdfCalList: one calibration list, the CAL-LIST element with its name, note, symbolic file,
// target image and items.

#include <utility>

#include "../platform/Automation.h"
#include "../platform/Export.h"
#include "../platform/XmlDom.h"
#include "../text/KestCdfNormalizedString.h"
#include "KestCdfCalItem.h"
#include "KestCdfSharedChild.h"
#include "KestCdfSymbolicFile.h"
#include "KestCdfTargetImage.h"

namespace kest {

class XmlFileWriter;

class KEST_API KestCdfCalList {
  public:
    /// Null name and note, no file references, no items, item size -1 (not set).
    KestCdfCalList() = default;
    /// Copies share the file references and the item array; the last copy frees what the
    /// library allocated.
    KestCdfCalList(const KestCdfCalList& other) = default;
    KestCdfCalList& operator=(const KestCdfCalList& other) = default;
    ~KestCdfCalList() = default;

    KestCdfNormalizedString GetName() const { return m_name; }
    /// Stores the name verbatim; a null name cannot be written.
    void SetName(KestCdfNormalizedString name) { m_name = name; }
    /// Null means "no NOTE element".
    CComBSTR GetNote() const { return m_note; }
    void SetNote(CComBSTR note) { m_note = std::move(note); }

    /// Copy of the symbolic file; throws _com_error(E_POINTER) when the list has none.
    KestCdfSymbolicFile GetSymbolicFile() const;
    /// Refers to `file` without copying; an object the host allocated stays the host's and
    /// must outlive every copy of the tree.
    void SetSymbolicFile(KestCdfSymbolicFile* file) { m_symbolicFile.Set(file); }
    /// Copy of the target image; throws _com_error(E_POINTER) when the list has none.
    KestCdfTargetImage GetTargetImage() const;
    /// Refers to `image` without copying (ownership as for SetSymbolicFile).
    void SetTargetImage(KestCdfTargetImage* image) { m_targetImage.Set(image); }
    /// Extensions: allocate a default symbolic file or target image that the tree owns (the last
    /// copy frees it), refer to it and return it.
    KestCdfSymbolicFile* CreateSymbolicFile() {
        m_symbolicFile.AllocateObject();
        return m_symbolicFile.Expose();
    }
    KestCdfTargetImage* CreateTargetImage() {
        m_targetImage.AllocateObject();
        return m_targetImage.Expose();
    }
    /// The item array (null when there is none).
    KestCdfCalItem* GetCalItems() const { return m_calItems.Expose(); }
    /// Refers to `items` without copying (ownership as for SetSymbolicFile).
    void SetCalItems(KestCdfCalItem* items) { m_calItems.Set(items); }
    /// Number of items the writer emits (-1: not set); must not exceed the array's length.
    int GetCalItemSize() const noexcept { return m_calItemSize; }
    void SetCalItemSize(int size) noexcept { m_calItemSize = size; }
    /// Allocates item size default items, refers to them and returns them. Throws
    /// KestCalmorphDLLError 32 while the item size is -1, std::bad_alloc for another negative
    /// size.
    KestCdfCalItem* CreateCalItems();

    /// Reads CAL-LIST: NAME (first child node), SYMBOLIC-FILE and TARGET-IMAGE into new
    /// objects, NOTE (last child node), each CAL-ITEM into the next item, in any order. A
    /// KestCalmorphDLLError from a child passes unchanged; any other failure while a child is
    /// read becomes KestCalmorphDLLError 14. Returns true.
    bool ConvertCalListNode(IXMLDOMNodePtr node);
    /// Appends CAL-LIST (namespace `ns`) to `parent` with NAME, SYMBOLIC-FILE, TARGET-IMAGE (if
    /// any), NOTE (if not null) and the items. Throws KestCalmorphDLLError 30 for a null name,
    /// 25 without a symbolic file; errors of the items pass unchanged. Returns true.
    bool ConvertCalListNodeToXML(IXMLDOMNodePtr parent, IXMLDOMDocument* doc,
                                 KestCdfNormalizedString ns);
    void WriteXmlText(XmlFileWriter& out);

  private:
    int CountCalItem(IXMLDOMNodePtr node);
    void ReadChild(const IXMLDOMNodePtr& child, int& itemIndex);

    KestCdfNormalizedString m_name;
    KestCdfSharedChild<KestCdfSymbolicFile> m_symbolicFile;
    KestCdfSharedChild<KestCdfTargetImage> m_targetImage;
    CComBSTR m_note;
    KestCdfSharedChild<KestCdfCalItem> m_calItems;
    int m_calItemSize = -1;
};

}  // namespace kest
