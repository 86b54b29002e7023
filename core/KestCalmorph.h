#pragma once
// KestCalmorph: the converter. Reads a CDF file into a KestCdfCalData tree, writes a tree to a
// CDF file, and answers the schema checks around a file.

#include <string>
#include <vector>

#include "../model/KestCdfCalData.h"
#include "../platform/CComBSTR.h"
#include "../platform/Export.h"
#include "../platform/KestCalmorphDLLError.h"
#include "../platform/XmlDom.h"
#include "KestLoadError.h"
#include "KestReadOptions.h"
#include "KestReadWarning.h"
#include "KestWriteOptions.h"

namespace kest {

/// The namespace URI under which the CDF schema is registered for validation.
constexpr const OLECHAR* kCdfNamespaceURI = u"http://kest.dev/schemas/cdf/1.0";
/// The conventional file name of the CDF schema.
constexpr const char* kCdfSchemaFileName = "cdf.xsd";

class KEST_API KestCalmorph {
  public:
    KestCalmorph();
    KestCalmorph(const KestCalmorph& other) = default;
    KestCalmorph& operator=(const KestCalmorph& other) = default;
    ~KestCalmorph() = default;

    /// Loads the file (validating it against the schema it names) and converts its CAL-DATA
    /// element into the converter's tree; returns a copy of that tree. A file that does not load
    /// is no exception: the tree stays as it was and, when `wantMessage` is true, `message`
    /// receives the parser's reason. Conversion errors throw KestCalmorphDLLError.
    KestCdfCalData ConvertXMLtoCPP(CComBSTR path, bool wantMessage, CComBSTR& message);
    /// Extension: the numbers of the last ConvertXMLtoCPP not taken whole (at most 1,000).
    const std::vector<KestReadWarning>& GetReadWarnings() const;
    /// Extension: how many warnings of the last ConvertXMLtoCPP were beyond those kept.
    size_t GetReadWarningsOmitted() const;
    /// Writes `data` to `outputPath` as a UTF-8 CDF file, with `comment` as the first child of
    /// CAL-DATA when not empty. False for an empty path; throws KestCalmorphDLLError when the
    /// tree is incomplete (the target is not touched) and _com_error when saving fails (an existing
    /// file is then left as it was). The text goes to the file as it is written, with no document
    /// in memory.
    bool ConvertCPPToXML(KestCdfCalData data, CComBSTR outputPath, CComBSTR comment);
    /// A new default tree; the converter is not touched.
    KestCdfCalData ConvertCPPToXML();

    /// Extension: the layout of the files ConvertCPPToXML writes (indentation, off by default).
    void SetWriteOptions(const KestWriteOptions& options) { m_writeOptions = options; }
    const KestWriteOptions& GetWriteOptions() const { return m_writeOptions; }

    /// A document a host parked on the converter (empty when none).
    IXMLDOMDocument2Ptr GetDocumentPointer();
    void SetDocumentPointer(IXMLDOMDocument2Ptr document);

    /// True when the DOM service (parser, validator, document creation) is usable; otherwise
    /// writes "\nError: MSXML 4.0 is not installed. Exiting.\n" to standard error.
    bool IsMSXML4Installed();
    /// The schema location the file's root names in "xsi:schemaLocation": the text after the
    /// first blank, however long; a value without any blank is returned whole (a location
    /// alone). The file is loaded with validation against the schemas it names. Empty with the
    /// parser's reason in `message` when the file does not load; KestCalmorphDLLError 45 when
    /// the root has no "xsi:schemaLocation", 44 when the load fails without a reason code.
    CComBSTR DetectSchemaLocation(CComBSTR path, CComBSTR& message);
    /// Whether a schema location can be reached: an http URL that loads, "cdf.xsd" beside the
    /// data file (the directory part of `path`, up to its last '/' or '\\'), or any other
    /// location as a path readable from the current directory. A directory is not readable as
    /// a schema; a null location is not valid (false).
    bool IsSchemaLocationValid(CComBSTR location, CComBSTR path);
    /// Validates the data file against the schema file under the CDF namespace URI: empty when
    /// valid, "FAIL" when the data file did not load without a reason, else the reason.
    CComBSTR ValidateXMLFileWithLocaleXSD(CComBSTR dataPath, CComBSTR schemaPath);

    /// Extension: how this converter reads and checks files (validation, network, schema).
    void SetReadOptions(const KestReadOptions& options);
    /// Extension: the read options in force.
    const KestReadOptions& GetReadOptions() const;
    /// Extension: true when the last read was validated against the built-in copy of cdf.xsd.
    bool UsedBuiltinSchema() const;
    /// Extension: why the last read or validation failed (code 0 when it loaded); reset by each.
    const KestLoadError& GetLastLoadError() const;

    /// True when a server file name (the text after the last '\\' or '/') reads as "msxml"
    /// followed by a plain decimal version (digits, optional fraction) of at least 4.0.
    static bool IsSupportedServerFileName(const char* fileName);

  private:
    CComBSTR LoadXMLFile(CComBSTR path, IXMLDOMDocument2Ptr document, bool wantMessage);
    long VisitCalDataNodes(IXMLDOMNodePtr node);
    const OLECHAR* ConvertXMLNode(IXMLDOMNodePtr node);
    long LoadDocumentSync(IXMLDOMDocument* document, const OLECHAR* path);
    void CreateXMLEnvironment();
    bool SaveDocument(CComBSTR path);
    void NewXMLNodeElement(const OLECHAR* name);
    /// The directory part of `path`, up to and including its last '/' or '\\'; empty when it
    /// has neither.
    std::string GetFilePath(CComBSTR path);
    /// Applies the read options to a document about to load a file.
    void PrepareReadDocument(const IXMLDOMDocument2Ptr& document, bool validate) const;
    /// Records the outcome of a load or validation as the last load error (and whether the
    /// built-in schema served).
    void RecordLoadResult(const IXMLDOMParseErrorPtr& result, const IXMLDOMDocument2Ptr& document,
                          const CComBSTR& path);

    KestCdfCalData m_calData;
    std::vector<KestReadWarning> m_readWarnings;
    size_t m_readWarningsOmitted = 0;
    IXMLDOMDocument* m_writeDocument = nullptr;
    IXMLDOMNodePtr m_currentNode;
    IXMLDOMDocument2Ptr m_documentPointer;
    KestReadOptions m_readOptions;
    KestLoadError m_lastLoadError;
    bool m_usedBuiltinSchema = false;
    KestWriteOptions m_writeOptions;
};

}  // namespace kest
