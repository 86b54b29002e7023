// calmorph validate: checks files against the schema they name or a given one.

#include <algorithm>
#include <cstdio>
#include <memory>
#include <vector>

#include "CdfInput.h"
#include "Command.h"
#include "Diagnostics.h"
#include "ExitCode.h"
#include "GuardedRun.h"
#include "ManyFiles.h"
#include "ToolError.h"

namespace kest::tool {

namespace {

struct ValidateOptions {
    std::vector<std::string> files;
    std::string schema;
    unsigned jobs = 1;
};

// The schema location the root names: the text after the first blank of xsi:schemaLocation,
// or xsi:noNamespaceSchemaLocation.
constexpr const char* kSchemaHint = "use --schema XSD";

ExitCode Verdict(long code) { return code == XML_E_INVALID ? kExitInvalid : kExitCannotLoad; }

std::string Lead(ExitCode verdict, const std::string& schema) {
    return verdict == kExitInvalid ? "not valid against " + schema + ": " : std::string();
}

std::string NamedLocation(const std::string& file, const IXMLDOMElementPtr& root) {
    if (IXMLDOMAttributePtr attribute = root->getAttributeNode(_bstr_t(u"xsi:schemaLocation"))) {
        std::string value = _bstr_t(attribute->GetnodeValue()).ToString();
        std::string::size_type blank = value.find(' ');
        return blank == std::string::npos ? value : value.substr(blank + 1);
    }
    if (IXMLDOMAttributePtr attribute =
            root->getAttributeNode(_bstr_t(u"xsi:noNamespaceSchemaLocation"))) {
        return _bstr_t(attribute->GetnodeValue()).ToString();
    }
    throw ToolError(kExitNoSchema, DisplayName(file), "names no schema (no xsi:schemaLocation)",
                    "use --schema XSD");
}

// Validates against the schema the file names: the document is loaded without validation, its
// root tells the schema, and the DOM validates it against that schema.
int ValidateAgainstNamedSchema(const std::string& file) {
    IXMLDOMDocument2Ptr document;
    if (FAILED(document.CreateInstance(kProgIdDOMDocument40))) throw E_FAIL;
    document->Putasync(VARIANT_FALSE);
    document->PutvalidateOnParse(VARIANT_FALSE);
    document->setProperty(_bstr_t(u"ServerHTTPRequest"), _variant_t(true));
    if (document->load(_variant_t(file)) == VARIANT_FALSE) {
        ThrowLoadFailure(file, document->GetparseError(), kExitCannotLoad, "", kSchemaHint);
    }
    std::string location = NamedLocation(file, document->GetdocumentElement());
    IXMLDOMParseErrorPtr result = document->validate();
    if (result->GeterrorCode() != 0) {
        // Only a verdict on the document is "not valid"; a schema that does not load or a
        // document the validator cannot parse is a load failure.
        const ExitCode code = Verdict(result->GeterrorCode());
        ThrowLoadFailure(file, result, code, Lead(code, location), kSchemaHint);
    }
    Print(DisplayName(file) + ": valid against " + location + "\n");
    return kExitOk;
}

int ValidateAgainstSchemaFile(KestCalmorph& converter, const std::string& file,
                              const std::string& schema) {
    try {
        converter.ValidateXMLFileWithLocaleXSD(CComBSTR(file), CComBSTR(schema));
    } catch (const KestCalmorphDLLError& error) {
        if (error.GetReason() != reason::kSchemaNotLoaded) throw;
        ThrowLoadFailure(schema, converter.GetLastLoadError(), kExitCannotLoad,
                         "the schema file cannot be loaded: ");
    } catch (const _com_error& error) {
        throw ToolError(kExitCannotLoad, schema, error.Description());
    }
    const KestLoadError& error = converter.GetLastLoadError();
    if (error.code != 0) {
        ThrowLoadFailure(file, error, Verdict(error.code), Lead(Verdict(error.code), schema));
    }
    Print(DisplayName(file) + ": valid against " + schema + "\n");
    return kExitOk;
}

int RunValidate(const ValidateOptions& options) {
    return RunEachFile(options.files, options.jobs, [&](std::size_t, const std::string& file) {
        KestCalmorph converter;
        return GuardedRun({file}, [&] {
            return options.schema.empty()
                       ? ValidateAgainstNamedSchema(file)
                       : ValidateAgainstSchemaFile(converter, file, options.schema);
        });
    });
}

}  // namespace

Command AddValidateCommand(CLI::App& calmorph) {
    auto options = std::make_shared<ValidateOptions>();
    CLI::App* app = calmorph.add_subcommand(
        "validate",
        "Check each FILE against the schema it names (xsi:schemaLocation, resolved beside the "
        "file), or against XSD under the CDF namespace. One line per valid file.");
    app->add_option("FILE", options->files, "the files to check; - reads standard input")
        ->required();
    app->add_option("--schema", options->schema,
                    "validate against this XSD instead of the schema each file names")
        ->type_name("XSD");
    AddJobsOption(*app, options->jobs);
    app->footer(
        "Files are checked on -j threads at once; the lines keep the order of the files.\n"
        "Exit codes (with several files, the highest of any file):\n"
        "  0  every file is valid\n"
        "  1  usage error\n"
        "  2  a file cannot be loaded, the schema cannot be loaded, or the validator cannot\n"
        "     parse the document\n"
        "  3  a file is not valid against its schema\n"
        "  6  a file names no schema (no xsi:schemaLocation on its root); use --schema XSD");
    return {app, [options] { return RunValidate(*options); }};
}

}  // namespace kest::tool
