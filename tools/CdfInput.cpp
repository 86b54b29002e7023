#include "CdfInput.h"

#include "Diagnostics.h"
#include "ToolError.h"

namespace kest::tool {

namespace {

// A failure at a position in another file (the schema, say) names that file; any other
// failure names the input, whose reason then says which file failed.
std::string FailureWhere(const std::string& argument, const std::string& file, long line,
                         long column) {
    const bool other = !file.empty() && file != argument && line > 0;
    return Where(other ? file : DisplayName(argument), line, column);
}

}  // namespace

void AddReadOptions(CLI::App& command, ReadSettings& settings) {
    CLI::Option* schema =
        command
            .add_option("--schema", settings.schema,
                        "validate against XSD instead of the schema the file names")
            ->type_name("XSD");
    command.add_flag("--no-validate", settings.noValidate, "read without validating")
        ->excludes(schema);
    command.add_flag("--offline", settings.offline,
                     "fetch nothing over the network; a CDF file naming an http schema is "
                     "validated against the built-in cdf.xsd");
    command.add_flag("--strict", settings.strict, "treat every warning as an error (exit 4)");
}

KestReadOptions ReadOptionsOf(const ReadSettings& settings) {
    KestReadOptions options;
    options.validate = !settings.noValidate;
    options.allowNetwork = !settings.offline;
    options.schemaPath = settings.schema;
    options.builtinSchemaFallback = true;
    return options;
}

void ThrowLoadFailure(const std::string& argument, const KestLoadError& error, ExitCode code,
                      const std::string& lead) {
    throw ToolError(code, FailureWhere(argument, error.file, error.line, error.column),
                    lead + error.reason, error.hint);
}

void ThrowLoadFailure(const std::string& argument, const IXMLDOMParseErrorPtr& error, ExitCode code,
                      const std::string& lead, const std::string& hint) {
    const bool helps = error->Getcause() != DOM_CAUSE_OTHER;
    throw ToolError(
        code,
        FailureWhere(argument, error->Geturl().ToString(), error->Getline(), error->Getlinepos()),
        lead + error->GetreasonText().ToString(), helps ? hint : std::string());
}

std::size_t ReadCdf(KestCalmorph& converter, const std::string& argument,
                    const ReadSettings& settings, KestCdfCalData& data) {
    converter.SetReadOptions(ReadOptionsOf(settings));
    CComBSTR message;
    data = converter.ConvertXMLtoCPP(CComBSTR(argument), true, message);
    if (converter.GetLastLoadError().code != 0) {
        ThrowLoadFailure(argument, converter.GetLastLoadError());
    }
    if (message.Length() != 0)
        throw ToolError(kExitCannotLoad, DisplayName(argument), message.ToString());
    // Reading CAL-DATA always sets the namespace (empty when the root has none); a tree whose
    // namespace is still null found no CAL-DATA to convert.
    if (data.GetNamespace().m_string == nullptr) {
        throw ToolError(kExitCannotLoad, DisplayName(argument), "no CAL-DATA element");
    }
    if (converter.UsedBuiltinSchema()) {
        std::string location = data.GetSchemaLocation().m_string == nullptr
                                   ? std::string()
                                   : data.GetSchemaLocation().ToString();
        location = location.substr(location.find(' ') + 1);
        ReportNote(DisplayName(argument), "the schema it names (" + location +
                                              ") is not at hand; validated against the "
                                              "built-in cdf.xsd");
    }
    for (const KestReadWarning& warning : converter.GetReadWarnings()) {
        const std::string where = Where(DisplayName(argument), warning.line, warning.column);
        ReportWarning(where, (warning.item.empty() ? "" : "item " + warning.item + ": ") +
                                 "token \"" + warning.token + "\" read as " + warning.valueRead);
    }
    const std::size_t omitted = converter.GetReadWarningsOmitted();
    if (omitted > 0) {
        ReportWarning(DisplayName(argument), std::to_string(omitted) + " more such warnings");
    }
    return converter.GetReadWarnings().size() + omitted;
}

ops::Document ReadDocument(const std::string& argument, const ReadSettings& settings,
                           std::vector<KestReadWarning>* warnings, std::size_t* warningsOmitted) {
    KestCalmorph converter;
    KestCdfCalData data;
    ReadCdf(converter, argument, settings, data);
    if (warnings) *warnings = converter.GetReadWarnings();
    if (warningsOmitted) *warningsOmitted = converter.GetReadWarningsOmitted();
    return ops::FromCalData(data);
}

}  // namespace kest::tool
