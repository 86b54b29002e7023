// The converter object, the read pipeline (load, walk, convert CAL-DATA) and the write pipeline
// (the tree written straight to the file).

#include "KestCalmorph.h"

#include "../model/KestCdfReadWarnings.h"
#include "../platform/XmlFileWriter.h"

#include <utility>
#include <vector>

namespace kest {

namespace {

// Element names whose subtrees the walk never enters: the change history is read by the root's
// own reader, and calibration items can be large and hold nothing the walk looks for.
constexpr std::u16string_view kSkippedChangeHistory = u"CHANGE-HISTORY";
constexpr std::u16string_view kSkippedCalItem = u"CAL-ITEM";
constexpr std::u16string_view kCalDataName = u"CAL-DATA";

bool IsSkippedSubtree(const IXMLDOMNodePtr& node) {
    return node->NameIs(kSkippedChangeHistory) || node->NameIs(kSkippedCalItem);
}

}  // namespace

KestCalmorph::KestCalmorph() = default;

// ---------------------------------------------------------------------------------------------
// Reading

void KestCalmorph::SetReadOptions(const KestReadOptions& options) { m_readOptions = options; }

const KestReadOptions& KestCalmorph::GetReadOptions() const { return m_readOptions; }

bool KestCalmorph::UsedBuiltinSchema() const { return m_usedBuiltinSchema; }

const KestLoadError& KestCalmorph::GetLastLoadError() const { return m_lastLoadError; }

void KestCalmorph::PrepareReadDocument(const IXMLDOMDocument2Ptr& document, bool validate) const {
    document->PutvalidateOnParse(validate ? VARIANT_TRUE : VARIANT_FALSE);
    document->setProperty(_bstr_t(u"ServerHTTPRequest"), _variant_t(m_readOptions.allowNetwork));
    document->setProperty(_bstr_t(u"SchemaPath"), _variant_t(m_readOptions.schemaPath));
    document->setProperty(_bstr_t(u"BuiltinSchemaFallback"),
                          _variant_t(m_readOptions.builtinSchemaFallback));
}

void KestCalmorph::RecordLoadResult(const IXMLDOMParseErrorPtr& result,
                                    const IXMLDOMDocument2Ptr& document, const CComBSTR& path) {
    m_lastLoadError = KestLoadError();
    m_usedBuiltinSchema = false;
    if (!result) return;
    long code = result->GeterrorCode();
    if (code == 0) {
        m_usedBuiltinSchema =
            static_cast<bool>(document->getProperty(_bstr_t(u"UsedBuiltinSchema")));
        return;
    }
    KestLoadError& error = m_lastLoadError;
    error.code = code;
    error.line = result->Getline();
    error.column = result->Getlinepos();
    long offset = result->Getfilepos();
    // The parse error gives 0 both for the first byte and for "unknown".
    error.offset = offset > 0 || (error.line == 1 && error.column == 1) ? offset : -1;
    std::string url = result->Geturl().ToString();
    // A position inside another file (a schema) names that file; otherwise the path as given.
    error.file = error.line > 0 && !url.empty() ? url : path.ToString();
    error.reason = result->GetreasonText().ToString();
    switch (result->Getcause()) {
        case DOM_CAUSE_UNKNOWN_ENCODING:
            error.hint = "save the file as UTF-8";
            break;
        case DOM_CAUSE_SCHEMA_UNAVAILABLE:
            error.hint = "use --schema or --no-validate";
            break;
        default:
            break;
    }
}

KestCdfCalData KestCalmorph::ConvertXMLtoCPP(CComBSTR path, bool wantMessage, CComBSTR& message) {
    m_lastLoadError = KestLoadError();
    m_usedBuiltinSchema = false;
    m_readWarnings.clear();
    m_readWarningsOmitted = 0;
    // The readers of the value lists record their warnings in this scope; they are kept also
    // when the read fails half way.
    const std::string file = path.ToString();
    detail::ReadWarningScope warnings;
    struct Keep {
        KestCalmorph& self;
        const detail::ReadWarningScope& warnings;
        const std::string& file;
        ~Keep() {
            try {
                for (const detail::ReadWarningEntry& entry : warnings.Entries())
                    self.m_readWarnings.push_back({file, entry.line, entry.column, entry.item,
                                                   entry.token, entry.valueRead, entry.kind});
                self.m_readWarningsOmitted = warnings.Omitted();
            } catch (...) {
                // Out of memory for the copies: the count says what was not kept.
                self.m_readWarningsOmitted =
                    warnings.Omitted() + warnings.Entries().size() - self.m_readWarnings.size();
            }
        }
    } keep{*this, warnings, file};
    CComBSTR result = LoadXMLFile(std::move(path), IXMLDOMDocument2Ptr(), wantMessage);
    // Assigned only once the load returned, so that an exception leaves the caller's text alone.
    message = std::move(result);
    return m_calData;
}

CComBSTR KestCalmorph::LoadXMLFile(CComBSTR path, IXMLDOMDocument2Ptr document, bool wantMessage) {
    CComBSTR message(u"");
    if (path != nullptr) {
        HRESULT hr = document.CreateInstance(kProgIdDOMDocument40);
        if (FAILED(hr)) throw hr;
        document->Putasync(VARIANT_FALSE);
        // Indentation between elements is never part of a CDF value; not keeping it as nodes
        // saves a good part of the document's memory and walking time on large files.
        document->PutpreserveWhiteSpace(VARIANT_FALSE);
        // Validate-on-parse stays on unless the host switched validation off.
        PrepareReadDocument(document, m_readOptions.validate);

        VARIANT_BOOL loaded = VARIANT_FALSE;
        try {
            loaded = document->load(_variant_t(static_cast<const OLECHAR*>(path)));
        } catch (...) {
            // A load that throws is a load that failed; the parse error says why.
            loaded = VARIANT_FALSE;
        }

        if (loaded != VARIANT_FALSE) {
            IXMLDOMParseErrorPtr parseError = document->GetparseError();
            if (parseError->GeterrorCode() != 0) message = CComBSTR(parseError->Getreason().View());
            RecordLoadResult(parseError, document, path);
        } else {
            IXMLDOMParseErrorPtr parseError = document->GetparseError();
            if (!parseError) throw E_POINTER;
            message = CComBSTR(parseError->Getreason().View());
            RecordLoadResult(parseError, document, path);
        }

        // After a failed load the document is empty, so the walk converts nothing and the tree
        // keeps what an earlier read left in it.
        VisitCalDataNodes(IXMLDOMNodePtr(document));
    }
    return wantMessage ? message : CComBSTR(u"");
}

long KestCalmorph::VisitCalDataNodes(IXMLDOMNodePtr node) {
    if (!node) return 1;

    // The node's own conversion and its attributes are not guarded: their failures reach the
    // caller as they are.
    ConvertXMLNode(node);
    if (IXMLDOMNamedNodeMapPtr attributes = node->Getattributes()) {
        for (IXMLDOMNodePtr attribute = attributes->nextNode(); attribute;
             attribute = attributes->nextNode()) {
            ConvertXMLNode(attribute);
        }
    }

    // Everything below the node is guarded. The walk keeps its own stack of child lists instead
    // of recursing, so that nesting depth is limited by memory, not by the call stack; the order
    // is the recursive one: a node, its attributes, then its children in document order.
    try {
        std::vector<IXMLDOMNodeListPtr> pending;
        pending.push_back(node->GetchildNodes());
        while (!pending.empty()) {
            IXMLDOMNodePtr child = pending.back()->nextNode();
            if (!child) {
                pending.pop_back();
                continue;
            }
            if (IsSkippedSubtree(child)) continue;

            ConvertXMLNode(child);
            if (IXMLDOMNamedNodeMapPtr attributes = child->Getattributes()) {
                for (IXMLDOMNodePtr attribute = attributes->nextNode(); attribute;
                     attribute = attributes->nextNode()) {
                    ConvertXMLNode(attribute);
                }
            }
            pending.push_back(child->GetchildNodes());
        }
    } catch (const KestCalmorphDLLError& error) {
        throw KestCalmorphDLLError(error);
    } catch (...) {
        KestCalmorphDLLError::Raise(reason::kWalkFailed);
    }
    return 0;
}

const OLECHAR* KestCalmorph::ConvertXMLNode(IXMLDOMNodePtr node) {
    if (!node) throw _com_error(E_POINTER);
    if (node->GetnodeType() == NODE_ELEMENT && node->NameIs(kCalDataName)) {
        m_calData.SetNodeAttributes(node->Getattributes());
        if (!m_calData.ConvertCalDataNode(node)) throw KestCalmorphDLLError();
    }
    return nullptr;
}

long KestCalmorph::LoadDocumentSync(IXMLDOMDocument* document, const OLECHAR* path) {
    if (!document) return E_POINTER;
    try {
        document->Putasync(VARIANT_FALSE);
    } catch (const _com_error& error) {
        return error.Error();
    }
    try {
        return document->load(_variant_t(path)) != VARIANT_FALSE ? S_OK : S_FALSE;
    } catch (const _com_error& error) {
        return error.Error();
    }
}

IXMLDOMDocument2Ptr KestCalmorph::GetDocumentPointer() { return m_documentPointer; }

void KestCalmorph::SetDocumentPointer(IXMLDOMDocument2Ptr document) {
    m_documentPointer = std::move(document);
}

// ---------------------------------------------------------------------------------------------
// Writing

const std::vector<KestReadWarning>& KestCalmorph::GetReadWarnings() const { return m_readWarnings; }

size_t KestCalmorph::GetReadWarningsOmitted() const { return m_readWarningsOmitted; }

KestCdfCalData KestCalmorph::ConvertCPPToXML() { return KestCdfCalData(); }

bool KestCalmorph::ConvertCPPToXML(KestCdfCalData data, CComBSTR outputPath, CComBSTR comment) {
    m_calData = data;
    // Written straight from the tree, with the bytes and checks of a document built and saved.
    // The file is only renamed into place once the whole tree is written: a writer that refuses
    // the tree throws, and the target is not touched.
    XmlFileWriter out(outputPath.ToString(), m_writeOptions.indent);
    m_calData.WriteXmlText(out, comment);
    if (outputPath.Length() == 0) return false;
    out.Commit();
    return true;
}

void KestCalmorph::CreateXMLEnvironment() {
    if (!m_writeDocument) throw _com_error(E_POINTER);
    IXMLDOMNodePtr declaration = m_writeDocument->createNode(
        _variant_t(static_cast<int>(NODE_PROCESSING_INSTRUCTION)), _bstr_t(u"xml"), _bstr_t(u""));
    IXMLDOMNamedNodeMapPtr pseudoAttributes = declaration->Getattributes();
    if (!pseudoAttributes) throw _com_error(E_POINTER);
    IXMLDOMAttributePtr encoding = m_writeDocument->createAttribute(_bstr_t(u"encoding"));
    encoding->PutnodeValue(_variant_t(u"UTF-8"));
    pseudoAttributes->setNamedItem(encoding);
    m_currentNode = declaration;
    m_writeDocument->appendChild(declaration);
}

bool KestCalmorph::SaveDocument(CComBSTR path) {
    if (!m_writeDocument) return false;
    if (path.Length() == 0) return false;
    m_writeDocument->save(_variant_t(static_cast<const OLECHAR*>(path)));
    return true;
}

void KestCalmorph::NewXMLNodeElement(const OLECHAR* name) {
    try {
        if (!m_writeDocument) throw _com_error(E_POINTER);
        IXMLDOMElementPtr element = m_writeDocument->createElement(_bstr_t(name));
        m_currentNode->appendChild(element);
    } catch (const _com_error& error) {
        if (error.Error() == E_FAIL) KestCalmorphDLLError::Raise(reason::kNewElementRefused);
        // Other DOM failures leave the document as it is.
    } catch (...) {
        KestCalmorphDLLError::Raise(reason::kNewElementFailed);
    }
}

}  // namespace kest
