#pragma once
// KestCdfChange: one entry of the change history, the CHANGE element with who changed the data,
// when, with which tool, a note and the data version.

#include <utility>

#include "../platform/Automation.h"
#include "../platform/Export.h"
#include "../platform/XmlDom.h"
#include "../text/KestCdfDate.h"
#include "../text/KestCdfNormalizedString.h"

namespace kest {

class XmlFileWriter;

class KEST_API KestCdfChange {
  public:
    /// Empty strings (null) and the current local time as date.
    KestCdfChange() = default;
    KestCdfChange(const KestCdfChange& other) = default;
    KestCdfChange& operator=(const KestCdfChange& other) = default;
    ~KestCdfChange() = default;

    /// Copy of the user name (the getter's name ends in W, the setter's does not).
    KestCdfNormalizedString GetUserNameW() const { return m_userName; }
    /// Stores the user name verbatim.
    void SetUserName(KestCdfNormalizedString userName) { m_userName = userName; }
    KestCdfDate GetDate() const { return m_date; }
    void SetDate(KestCdfDate date) { m_date = date; }
    /// Null means "no TOOL element".
    CComBSTR GetTool() const { return m_tool; }
    void SetTool(CComBSTR tool) { m_tool = std::move(tool); }
    /// Null means "no NOTE element".
    CComBSTR GetNote() const { return m_note; }
    void SetNote(CComBSTR note) { m_note = std::move(note); }
    /// Null means "no DATA-VERSION element".
    KestCdfNormalizedString GetDataVersion() const { return m_dataVersion; }
    void SetDataVersion(KestCdfNormalizedString dataVersion) { m_dataVersion = dataVersion; }

    /// Reads a CHANGE element: USERNAME (first child node's text), DATE (each child node parsed
    /// as date text), TOOL, NOTE and DATA-VERSION (last child node's text), in any order.
    /// Every failure while one child element is handled (a date out of range, an element nested
    /// in a text) is swallowed: the fields set before it stay, the rest of the entry is skipped
    /// and the result is false. Failures to reach the child list pass as _com_error.
    bool ConvertChangeNode(IXMLDOMNodePtr node);
    /// Appends CHANGE (namespace `ns`) to `parent` with USERNAME, DATE and, when not null,
    /// TOOL, NOTE and DATA-VERSION. Returns true; DOM failures (an absent parent or document)
    /// pass as _com_error.
    bool ConvertChangeToXML(IXMLDOMNodePtr parent, IXMLDOMDocument* doc,
                            KestCdfNormalizedString ns);
    void WriteXmlText(XmlFileWriter& out);

  private:
    KestCdfNormalizedString m_userName;
    KestCdfDate m_date;
    CComBSTR m_tool;
    CComBSTR m_note;
    KestCdfNormalizedString m_dataVersion;
};

}  // namespace kest
