#pragma once
// KestCdfCalItem: one calibration item, the CAL-ITEM element with its name, axes, value,
// annotation and note. Library errors raised while an item is read or written carry the item's
// name as their reason text.

#include <utility>

#include "../platform/Automation.h"
#include "../platform/Export.h"
#include "../platform/XmlDom.h"
#include "../text/KestCdfNormalizedString.h"
#include "KestCdfAxis.h"
#include "KestCdfCalItemValue.h"
#include "KestCdfSharedChild.h"

namespace kest {

class XmlFileWriter;

class KEST_API KestCdfCalItem {
  public:
    /// Null name, annotation and note; no value, no axes, axis size 0.
    KestCdfCalItem() = default;
    /// Copies share the value object and the axis array; the last copy frees what the library
    /// allocated.
    KestCdfCalItem(const KestCdfCalItem& other) = default;
    KestCdfCalItem& operator=(const KestCdfCalItem& other) = default;
    ~KestCdfCalItem() = default;

    KestCdfNormalizedString GetName() const { return m_name; }
    /// Stores the name verbatim; a null name cannot be written.
    void SetName(KestCdfNormalizedString name) { m_name = name; }
    /// Null means "no ANNOTATION element".
    CComBSTR GetAnnotation() const { return m_annotation; }
    void SetAnnotation(CComBSTR annotation) { m_annotation = std::move(annotation); }
    /// Null means "no NOTE element".
    CComBSTR GetNote() const { return m_note; }
    void SetNote(CComBSTR note) { m_note = std::move(note); }

    /// Copy of the value object; throws _com_error(E_POINTER) when the item has none.
    KestCdfCalItemValue GetCalItemValue() const;
    /// Extension: the value object itself, without a copy (null when the item has none); valid
    /// while the tree holds it.
    const KestCdfCalItemValue* PeekCalItemValue() const noexcept { return m_value.get(); }
    /// Refers to `value` without copying; an object the host allocated stays the host's and
    /// must outlive every copy of the tree.
    void SetCalItemValue(KestCdfCalItemValue* value) { m_value.Set(value); }
    /// Extension: allocates a default value object that the tree owns (the last copy frees it),
    /// refers to it and returns it.
    KestCdfCalItemValue* CreateCalItemValue() {
        m_value.AllocateObject();
        return m_value.Expose();
    }
    /// The axis array (null when there is none).
    KestCdfAxis* GetAxis() const { return m_axes.Expose(); }
    /// Extension: the axis array for reading, without handing it out (a pointer from here is
    /// not recognised by SetAxis); null when there is none.
    const KestCdfAxis* PeekAxes() const noexcept { return m_axes.get(); }
    /// Refers to `axes` without copying (ownership as for SetCalItemValue).
    void SetAxis(KestCdfAxis* axes) { m_axes.Set(axes); }
    /// Number of axes the writer emits; must not exceed the array's length.
    int GetAxisSize() const noexcept { return m_axisSize; }
    void SetAxisSize(int size) noexcept { m_axisSize = size; }
    /// Allocates `count` default axes, refers to them and returns them; the axis size is not
    /// changed. A negative count throws std::bad_alloc.
    KestCdfAxis* CreateAxisArray(int count) {
        m_axes.AllocateArray(count);
        return m_axes.Expose();
    }

    /// Reads CAL-ITEM: NAME (last child node), each AXIS into the next axis, VALUE into a new
    /// value object, ANNOTATION and NOTE (first child node), in any order. A KestCalmorphDLLError
    /// from a child leaves with the item's name (as read so far) as its text; any other failure
    /// becomes KestCalmorphDLLError 12 with that name. Returns true.
    bool ConvertCalItemNode(IXMLDOMNodePtr node);
    /// Appends CAL-ITEM (namespace `ns`) to `parent` with NAME, the axes, VALUE and, when not
    /// null, ANNOTATION and NOTE. Throws KestCalmorphDLLError 31 for a null name, 29 without a
    /// value object; every KestCalmorphDLLError leaves with the item's name as its text. DOM
    /// failures pass as _com_error. Returns true.
    bool ConvertCalItemNodeToXML(IXMLDOMNodePtr parent, IXMLDOMDocument* doc,
                                 KestCdfNormalizedString ns);
    void WriteXmlText(XmlFileWriter& out);

  private:
    int CountAxisNodes(IXMLDOMNodePtr node);
    void ReadChild(const IXMLDOMNodePtr& child, int& axisIndex);
    void WriteItem(const IXMLDOMNodePtr& parent, IXMLDOMDocument* doc,
                   const KestCdfNormalizedString& ns);

    KestCdfNormalizedString m_name;
    KestCdfSharedChild<KestCdfAxis> m_axes;
    KestCdfSharedChild<KestCdfCalItemValue> m_value;
    CComBSTR m_annotation;
    CComBSTR m_note;
    int m_axisSize = 0;
};

}  // namespace kest
