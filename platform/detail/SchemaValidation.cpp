// Documents are validated while they stream through an xmlTextReader, so memory stays flat
// whatever the size of the document; the compiled schemas come from the process-wide cache and
// are shared by concurrent validations (libxml2 only reads a compiled schema while validating).

#include "SchemaValidation.h"

#include <libxml/xmlreader.h>

#include <algorithm>
#include <climits>
#include <cstring>

#include "LibxmlSupport.h"
#include "XsdSchema.h"

namespace kest {
namespace detail {

namespace {

struct MemoryCursor {
    std::string_view data;
    std::size_t offset = 0;
};

int ReadFromMemory(void* context, char* buffer, int length) {
    auto* cursor = static_cast<MemoryCursor*>(context);
    std::size_t left = cursor->data.size() - cursor->offset;
    std::size_t count = std::min(left, static_cast<std::size_t>(length > 0 ? length : 0));
    std::memcpy(buffer, cursor->data.data() + cursor->offset, count);
    cursor->offset += count;
    return static_cast<int>(count);
}

int CloseMemory(void*) { return 0; }

// The streaming validator gathers a text by appending each piece the parser hands it to what it
// has, measuring that anew each time: quadratic in the length of one text. A document holding a
// text this long is validated as a tree instead, which costs memory but grows linearly.
constexpr std::size_t kLongestStreamedText = std::size_t(1) << 20;

bool HasLongText(std::string_view document) {
    std::size_t previous = 0;
    while (previous < document.size()) {
        std::size_t next = document.find('<', previous);
        if (next == std::string_view::npos) next = document.size();
        if (next - previous > kLongestStreamedText) return true;
        previous = next + 1;
    }
    return false;
}

/// Validates as a tree; the parser's errors and the validator's go to `errors`.
void ValidateAsTree(xmlSchemaValidCtxtPtr validator, std::string_view document,
                    const std::string& documentUrl, ErrorCollector& errors) {
    xmlParserCtxtPtr parser = xmlNewParserCtxt();
    if (!parser) {
        errors.has = true;
        errors.message = "out of memory while preparing validation";
        return;
    }
    xmlDocPtr tree = xmlCtxtReadMemory(parser, document.data(), static_cast<int>(document.size()),
                                       documentUrl.empty() ? nullptr : documentUrl.c_str(), nullptr,
                                       XML_PARSE_NONET | XML_PARSE_HUGE | XML_PARSE_BIG_LINES);
    if (tree && !errors.has && xmlSchemaValidateDoc(validator, tree) != 0 && !errors.has) {
        errors.has = true;
        errors.message = "the document is not valid against its schema";
    }
    if (!tree && !errors.has) {
        errors.has = true;
        errors.domain = XML_FROM_PARSER;
        errors.message = "the document cannot be read";
    }
    xmlFreeDoc(tree);
    xmlFreeParserCtxt(parser);
}

ValidationOutcome Failure(const std::string& location, std::string reason) {
    ValidationOutcome outcome;
    outcome.code = XML_E_PARSEFAILED;
    outcome.reason = std::move(reason);
    outcome.url = location;
    return outcome;
}

/// The failure for an http schema while http is not allowed.
ValidationOutcome Offline(const std::string& location) {
    ValidationOutcome outcome = Failure(
        location, "schema location " + location + " requires the ServerHTTPRequest property");
    outcome.schemaUnavailable = true;
    outcome.offline = true;
    return outcome;
}

ValidationOutcome Outcome(ValidationOutcome& outcome, const ErrorCollector& errors,
                          const std::string& documentUrl) {
    if (!errors.has) return outcome;
    bool invalid = errors.domain == XML_FROM_SCHEMASV || errors.domain == XML_FROM_SCHEMASP ||
                   errors.domain == XML_FROM_NONE;
    outcome.code = invalid ? XML_E_INVALID : XML_E_PARSEFAILED;
    outcome.reason = Located(errors, documentUrl);
    outcome.what = errors.message;
    outcome.line = errors.line;
    outcome.column = errors.column;
    if (!errors.file.empty()) outcome.url = errors.file;
    return outcome;
}

ValidationOutcome WithBuiltin(std::string_view document, const std::string& documentUrl) {
    ValidationOutcome outcome = ValidateWithSchema(*BuiltinCdfSchema(), document, documentUrl);
    outcome.usedBuiltin = true;
    return outcome;
}

}  // namespace

ValidationOutcome ValidateWithSchema(const CompiledSchema& schema, std::string_view document,
                                     const std::string& documentUrl) {
    ValidationOutcome outcome;
    outcome.url = documentUrl;
    ErrorCollector errors;
    LoadPolicy policy;  // nothing may be loaded while the document is read
    LibxmlScope scope(policy, errors);

    xmlSchemaValidCtxtPtr validator = xmlSchemaNewValidCtxt(schema.Get());
    if (!validator) {
        outcome.code = E_OUTOFMEMORY;
        outcome.reason = "out of memory while preparing validation of " + documentUrl;
        return outcome;
    }
    xmlSchemaSetValidStructuredErrors(validator, CollectError, &errors);
    if (HasLongText(document) && document.size() < static_cast<std::size_t>(INT_MAX)) {
        ValidateAsTree(validator, document, documentUrl, errors);
        xmlSchemaFreeValidCtxt(validator);
        return Outcome(outcome, errors, documentUrl);
    }
    MemoryCursor cursor{document, 0};
    // No entity substitution, no DTD loading, no network: the loader refuses the rest. Texts
    // may be as long as the document: a value list of many megabytes is one text node. Every
    // document reaching here has passed the DOM's own parser first, whose entity limits hold.
    xmlTextReaderPtr reader = xmlReaderForIO(ReadFromMemory, CloseMemory, &cursor,
                                             documentUrl.empty() ? nullptr : documentUrl.c_str(),
                                             nullptr, XML_PARSE_NONET | XML_PARSE_HUGE);
    if (!reader) {
        xmlSchemaFreeValidCtxt(validator);
        outcome.code = E_OUTOFMEMORY;
        outcome.reason = "out of memory while preparing validation of " + documentUrl;
        return outcome;
    }
    xmlTextReaderSetStructuredErrorHandler(reader, CollectError, &errors);
    int result = xmlTextReaderSchemaValidateCtxt(reader, validator, 0);
    if (result == 0) {
        // The first error decides; reading on would only cost time on large files.
        while ((result = xmlTextReaderRead(reader)) == 1 && !errors.has) {
        }
        if (!errors.has && result == 0 && xmlTextReaderIsValid(reader) != 1) {
            errors.has = true;
            errors.message = "the document is not valid against its schema";
        }
        if (!errors.has && result < 0) {
            errors.has = true;
            errors.domain = XML_FROM_PARSER;
            errors.message = "the document cannot be read";
        }
    } else if (!errors.has) {
        errors.has = true;
        errors.message = "the schema cannot be used for validation";
    }
    xmlFreeTextReader(reader);
    xmlSchemaFreeValidCtxt(validator);
    return Outcome(outcome, errors, documentUrl);
}

ValidationOutcome ValidateDocument(std::string_view document, const std::vector<SchemaRef>& refs,
                                   const ValidationRequest& request) {
    const std::string& url = request.documentUrl;
    if (!request.schemaPath.empty()) {
        std::string resolved, error;
        if (!ResolveSchemaLocation(request.schemaPath, std::string(), resolved, error))
            return Failure(request.schemaPath, error);
        SchemaLoad load = LoadSchema(resolved, request.allowHttp);
        if (!load.schema) return load.failure;
        return ValidateWithSchema(*load.schema, document, url);
    }
    if (refs.empty()) {
        ValidationOutcome outcome;
        outcome.code = XML_E_INVALID;
        outcome.url = url;
        outcome.what = "the document names no schema to validate against";
        outcome.reason = url + ": " + outcome.what;
        return outcome;
    }
    std::vector<SchemaRef> resolved;
    for (const SchemaRef& ref : refs) {
        SchemaRef target{ref.namespaceURI, {}};
        std::string error;
        if (!ResolveSchemaLocation(ref.location, request.baseUrl, target.location, error))
            return Failure(ref.location, error);
        resolved.push_back(std::move(target));
    }
    const CompiledSchemaHandle& builtin = BuiltinCdfSchema();
    bool mayFallBack = request.builtinFallback && resolved.size() == 1 && builtin &&
                       resolved[0].namespaceURI == SchemaTargetNamespace(*builtin);
    SchemaLoad load;
    if (resolved.size() == 1) {
        if (IsHttpUrl(resolved[0].location) && !request.allowHttp)
            return mayFallBack ? WithBuiltin(document, url) : Offline(resolved[0].location);
        load = LoadSchema(resolved[0].location, request.allowHttp);
        if (!load.schema && mayFallBack && load.failure.schemaUnavailable)
            return WithBuiltin(document, url);
        if (load.schema) {
            std::string target = SchemaTargetNamespace(*load.schema);
            if (target != resolved[0].namespaceURI) {
                return Failure(resolved[0].location, "schema " + resolved[0].location +
                                                         " has target namespace '" + target +
                                                         "', but the document names it for '" +
                                                         resolved[0].namespaceURI + "'");
            }
        }
    } else {
        for (const SchemaRef& ref : resolved)
            if (IsHttpUrl(ref.location) && !request.allowHttp) return Offline(ref.location);
        load = LoadCombinedSchema(resolved, request.allowHttp);
    }
    if (!load.schema) return load.failure;
    return ValidateWithSchema(*load.schema, document, url);
}

ValidationOutcome ValidateAgainstNamedSchemas(std::string_view document,
                                              const std::string& documentUrl,
                                              const std::vector<SchemaRef>& refs, bool allowHttp) {
    ValidationRequest request;
    request.documentUrl = documentUrl;
    request.baseUrl = documentUrl;
    request.allowHttp = allowHttp;
    return ValidateDocument(document, refs, request);
}

bool SchemaValidatorUsable() noexcept {
    static bool usable = [] {
        try {
            const std::string schema =
                "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\">"
                "<xs:element name=\"probe\" type=\"xs:int\"/></xs:schema>";
            SchemaLoad load = LoadSchemaText("(built-in probe)", schema);
            if (!load.schema) return false;
            return ValidateWithSchema(*load.schema, "<probe>1</probe>", "").code == S_OK &&
                   ValidateWithSchema(*load.schema, "<probe>x</probe>", "").code == XML_E_INVALID;
        } catch (...) {
            return false;
        }
    }();
    return usable;
}

}  // namespace detail
}  // namespace kest
