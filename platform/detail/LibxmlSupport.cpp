// libxml2 is only ever asked to read what we allow: an external entity loader installed once
// refuses everything while one of our operations runs on the thread, except the local files a
// schema includes or imports and, when the caller allows it, http(s) schemas fetched through
// HttpGet. Outside our operations it hands over to the loader that was installed before, so a
// host that uses libxml2 itself keeps its behaviour.

#include "LibxmlSupport.h"

#include <libxml/globals.h>
#include <libxml/parserInternals.h>
#include <libxml/xmlIO.h>
#include <libxml/xmlschemastypes.h>

#include <algorithm>
#include <cctype>
#include <mutex>

#include "SchemaUri.h"

namespace kest {
namespace detail {

namespace {

std::string TrimEnd(std::string text) {
    while (!text.empty() && std::isspace(static_cast<unsigned char>(text.back()))) text.pop_back();
    return text;
}

void IgnoreGenericError(void*, const char*, ...) {}

thread_local LoadPolicy* t_policy = nullptr;
xmlExternalEntityLoader g_previousLoader = nullptr;

void Refuse(LoadPolicy& policy, std::string reason) {
    if (policy.refusal.empty()) policy.refusal = std::move(reason);
}

xmlParserInputPtr FetchedInput(LoadPolicy& policy, const char* url, xmlParserCtxtPtr ctxt) {
    std::string location(url);
    if (!policy.allowHttp) {
        Refuse(policy, "schema location " + location + " requires the ServerHTTPRequest property");
        return nullptr;
    }
    HttpLimits limits = policy.limits;
    limits.maxBytes = std::min(limits.maxBytes, policy.bytesLeft);
    HttpResult fetched = HttpGet(location, limits);
    if (!fetched.ok) {
        Refuse(policy, fetched.error);
        return nullptr;
    }
    policy.bytesLeft -= fetched.body.size();
    xmlParserInputBufferPtr buffer = xmlParserInputBufferCreateMem(
        fetched.body.data(), static_cast<int>(fetched.body.size()), XML_CHAR_ENCODING_NONE);
    if (!buffer) return nullptr;
    xmlParserInputPtr input = xmlNewIOInputStream(ctxt, buffer, XML_CHAR_ENCODING_NONE);
    if (!input) {
        xmlFreeParserInputBuffer(buffer);
        return nullptr;
    }
    // The name lets relative includes of the fetched schema resolve against its URL.
    input->filename = reinterpret_cast<const char*>(xmlStrdup(BAD_CAST url));
    return input;
}

xmlParserInputPtr GuardedEntityLoader(const char* url, const char* id, xmlParserCtxtPtr ctxt) {
    LoadPolicy* policy = t_policy;
    if (!policy) return g_previousLoader ? g_previousLoader(url, id, ctxt) : nullptr;
    if (!url) return nullptr;
    std::string location(url);
    // A schema document (the schema itself, or one it includes or imports) is loaded into a
    // fresh parser context: no input open and none created yet. DTDs and parameter entities
    // load with the document's input open, and external general entities get a sub-context
    // whose input numbering continues from the document's.
    bool documentLoad = ctxt != nullptr && ctxt->inputNr == 0 && ctxt->input_id <= 1;
    if (!documentLoad || !policy->allowLocalSchemas) {
        Refuse(*policy, "external resource '" + location +
                            "' refused: entities and DTDs are "
                            "not read during schema processing");
        return nullptr;
    }
    if (policy->documentsLeft == 0) {
        Refuse(*policy,
               "schema document " + location + " refused: the schema reads too many documents");
        return nullptr;
    }
    --policy->documentsLeft;
    std::string scheme = SchemeOf(location);
    if (scheme == "http" || scheme == "https") return FetchedInput(*policy, url, ctxt);
    if (!scheme.empty() && scheme != "file") {
        Refuse(*policy, "schema location " + location +
                            " uses an unsupported scheme; only files, http and https are read");
        return nullptr;
    }
    return xmlNewInputFromFile(ctxt, url);
}

}  // namespace

void CollectError(void* userData, xmlErrorPtr error) {
    if (!userData || !error || error->level < XML_ERR_ERROR) return;
    auto* errors = static_cast<ErrorCollector*>(userData);
    ++errors->count;
    if (errors->has) return;
    errors->has = true;
    errors->domain = error->domain;
    errors->message = TrimEnd(error->message ? error->message : "unknown error");
    errors->file = error->file ? error->file : "";
    errors->line = error->line;
    // Parser errors carry the column in int2, and so do validity errors when libxml2 knows it.
    if (error->domain == XML_FROM_PARSER || error->domain == XML_FROM_NAMESPACE ||
        error->domain == XML_FROM_SCHEMASV)
        errors->column = error->int2 > 0 ? error->int2 : 0;
}

std::string Located(const ErrorCollector& errors, const std::string& fallbackFile) {
    std::string file = errors.file.empty() ? fallbackFile : errors.file;
    std::string text;
    if (!file.empty()) {
        text = file;
        if (errors.line > 0) text += ":" + std::to_string(errors.line);
        text += ": ";
    }
    return text + errors.message;
}

void InitLibxml() {
    static std::once_flag once;
    std::call_once(once, [] {
        xmlInitParser();
        // The built-in types are set up lazily by the first schema compile, and that set-up is
        // not safe when two threads compile at once: one copy would be lost. Doing it here,
        // once, keeps concurrent first compiles apart.
        xmlSchemaInitTypes();
        g_previousLoader = xmlGetExternalEntityLoader();
        xmlSetExternalEntityLoader(GuardedEntityLoader);
    });
}

LibxmlScope::LibxmlScope(LoadPolicy& policy, ErrorCollector& errors) {
    InitLibxml();
    m_previousPolicy = t_policy;
    t_policy = &policy;
    m_structured = xmlStructuredError;
    m_structuredContext = xmlStructuredErrorContext;
    m_generic = xmlGenericError;
    m_genericContext = xmlGenericErrorContext;
    xmlSetStructuredErrorFunc(&errors, CollectError);
    xmlSetGenericErrorFunc(nullptr, IgnoreGenericError);
}

LibxmlScope::~LibxmlScope() {
    xmlSetStructuredErrorFunc(m_structuredContext, m_structured);
    xmlSetGenericErrorFunc(m_genericContext, m_generic);
    t_policy = m_previousPolicy;
}

}  // namespace detail
}  // namespace kest
