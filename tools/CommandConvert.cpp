// calmorph convert: reads a CDF file and writes it again as UTF-8.

#include <memory>

#include "CdfInput.h"
#include "Command.h"
#include "Diagnostics.h"
#include "ExitCode.h"
#include "GuardedRun.h"
#include "StagedOutput.h"
#include "ToolError.h"

namespace kest::tool {

namespace {

struct ConvertOptions {
    std::string in;
    std::string out;
    std::string comment;
    bool indent = false;
    ReadSettings read;
};

// Reads the written file back as `calmorph info` would; returns why it would not read, or "".
std::string WhyItWouldNotReadBack(const std::string& path, const ReadSettings& settings) {
    KestCalmorph reader;
    KestReadOptions options = ReadOptionsOf(ReadSettings());
    options.allowNetwork = !settings.offline;
    reader.SetReadOptions(options);
    try {
        CComBSTR message;
        reader.ConvertXMLtoCPP(CComBSTR(path), true, message);
        const KestLoadError& error = reader.GetLastLoadError();
        if (error.code == 0) return message.ToString();
        return (error.line > 0 ? "line " + std::to_string(error.line) + ": " : "") + error.reason;
    } catch (const KestCalmorphDLLError& error) {
        return ReasonOf(error);
    } catch (const std::exception& error) {
        return error.what();
    }
}

int RunConvert(const ConvertOptions& options) {
    if (options.out.empty()) {
        throw ToolError(kExitUsage, "calmorph", "the output path is empty");
    }
    KestCalmorph converter;
    KestCdfCalData data;
    int code = GuardedRun({options.in}, [&] {
        const std::size_t warnings = ReadCdf(converter, options.in, options.read, data);
        return warnings > 0 && options.read.strict ? kExitConversion : kExitOk;
    });
    if (code != kExitOk) return code;

    StagedOutput output(options.out);
    const std::string shown = DisplayName(options.out, true);
    Subject subject{options.out, Subject::Stage::kWrite, output.Path()};
    converter.SetWriteOptions(KestWriteOptions{options.indent});
    return GuardedRun(subject, [&] {
        if (!converter.ConvertCPPToXML(data, CComBSTR(output.Path()), CComBSTR(options.comment))) {
            throw ToolError(kExitCannotWrite, shown, "nothing was written");
        }
        std::string why = WhyItWouldNotReadBack(output.Path(), options.read);
        if (!why.empty()) {
            ReportWarning(shown, "the output would not read back: " + why);
            if (options.read.strict) return kExitConversion;  // nothing is published
        }
        output.Publish();
        return kExitOk;
    });
}

}  // namespace

Command AddConvertCommand(CLI::App& calmorph) {
    auto options = std::make_shared<ConvertOptions>();
    CLI::App* app = calmorph.add_subcommand(
        "convert",
        "Read IN and write it to OUT as a UTF-8 CDF file. OUT is replaced only when the whole "
        "file could be written.");
    app->add_option("IN", options->in, "the CDF file to read; - reads standard input")->required();
    app->add_option("OUT", options->out, "the file to write; - writes standard output")->required();
    app->add_option("--comment", options->comment, "a comment written at the start of CAL-DATA")
        ->type_name("TEXT");
    app->add_flag("--indent", options->indent,
                  "one element per line, two spaces a level (for line diffs)");
    AddReadOptions(*app, options->read);
    app->footer(
        "Exit codes:\n"
        "  0  OUT was written\n"
        "  1  usage error\n"
        "  2  IN cannot be loaded: missing, unreadable, not well-formed, not valid against the\n"
        "     schema it names, or no CAL-DATA element\n"
        "  4  conversion error: the converter refused the content; with --strict, a warning\n"
        "     (OUT is then not written)\n"
        "  5  OUT cannot be written (an existing OUT stays as it was)");
    return {app, [options] { return RunConvert(*options); }};
}

}  // namespace kest::tool
