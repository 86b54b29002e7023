// calmorph validate: checks files against the schema they name or a given one.

#include <sys/stat.h>

#include <algorithm>
#include <cstdio>
#include <memory>
#include <vector>

#include "CdfInput.h"
#include "Command.h"
#include "Diagnostics.h"
#include "ExitCode.h"
#include "GuardedRun.h"
#include "ToolError.h"

namespace kest::tool {

namespace {

struct ValidateOptions {
    std::vector<std::string> files;
    std::string schema;
};

bool IsRegularReadableFile(const std::string& path) {
    std::FILE* file = std::fopen(path.c_str(), "rb");
    if (!file) return false;
    struct stat info {};
    bool regular = fstat(fileno(file), &info) == 0 && !S_ISDIR(info.st_mode);
    std::fclose(file);
    return regular;
}

std::string DirectoryOf(const std::string& path) {
    std::string::size_type separator = path.find_last_of('/');
    return separator == std::string::npos ? std::string() : path.substr(0, separator + 1);
}

// The schema location the root names: the text after the first blank of xsi:schemaLocation,
// or xsi:noNamespaceSchemaLocation.
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
    if (document->load(_variant_t(InputPath(file))) == VARIANT_FALSE) {
        ThrowLoadFailure(file, document->GetparseError()->Getreason().ToString(), false);
    }
    std::string location = NamedLocation(file, document->GetdocumentElement());

    // A single local location is looked up where the validator will look: beside the file.
    bool local = location.compare(0, 4, "http") != 0 && location.find(' ') == std::string::npos;
    if (local && file != "-") {
        std::string resolved = location;
        if (!location.empty() && location[0] != '/') resolved = DirectoryOf(file) + location;
        if (!IsRegularReadableFile(resolved)) {
            throw ToolError(kExitCannotLoad, DisplayName(file),
                            "the schema it names cannot be read: " + resolved, "use --schema XSD");
        }
    }

    IXMLDOMParseErrorPtr result = document->validate();
    if (result->GeterrorCode() == 0) {
        std::printf("%s: valid against %s\n", DisplayName(file).c_str(), location.c_str());
        return kExitOk;
    }
    // Only a verdict on the document is "not valid"; a schema that does not load or a document
    // the validator cannot parse is a load failure.
    const bool invalid = result->GeterrorCode() == XML_E_INVALID;
    throw ToolError(invalid ? kExitInvalid : kExitCannotLoad,
                    Where(DisplayName(file), result->Getline(), result->Getlinepos()),
                    (invalid ? "not valid against " + location + ": " : std::string()) +
                        result->Getreason().ToString());
}

int ValidateAgainstSchemaFile(KestCalmorph& converter, const std::string& file,
                              const std::string& schema) {
    CComBSTR message;
    try {
        message =
            converter.ValidateXMLFileWithLocaleXSD(CComBSTR(InputPath(file)), CComBSTR(schema));
    } catch (const KestCalmorphDLLError& error) {
        if (error.GetReason() != reason::kSchemaNotLoaded) throw;
        throw ToolError(kExitCannotLoad, schema, "the schema file cannot be loaded");
    } catch (const _com_error& error) {
        throw ToolError(kExitCannotLoad, schema, "the schema is refused: " + error.Description());
    }
    if (message.Length() == 0) {
        std::printf("%s: valid against %s\n", DisplayName(file).c_str(), schema.c_str());
        return kExitOk;
    }

    // The message alone does not tell a file that does not load from one that is invalid.
    IXMLDOMDocument2Ptr document;
    if (file != "-" && SUCCEEDED(document.CreateInstance(kProgIdDOMDocument40))) {
        document->Putasync(VARIANT_FALSE);
        document->PutvalidateOnParse(VARIANT_FALSE);
        if (document->load(_variant_t(file)) == VARIANT_FALSE) {
            ThrowLoadFailure(file, message.ToString(), false);
        }
    }
    throw ToolError(kExitInvalid, DisplayName(file),
                    "not valid against " + schema + ": " + message.ToString());
}

int RunValidate(const ValidateOptions& options) {
    KestCalmorph converter;
    int worst = kExitOk;
    for (const std::string& file : options.files) {
        worst = std::max(worst, GuardedRun({file}, [&] {
                             return options.schema.empty() ? ValidateAgainstNamedSchema(file)
                                                           : ValidateAgainstSchemaFile(
                                                                 converter, file, options.schema);
                         }));
    }
    return worst;
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
    app->footer(
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
