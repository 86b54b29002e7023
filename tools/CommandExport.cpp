// calmorph export: writes what a CDF file holds as JSON (lossless) or CSV (its values).

#include "ops/CsvFormat.h"
#include "ops/JsonFormat.h"

#include <memory>

#include "CdfInput.h"
#include "Command.h"
#include "Diagnostics.h"
#include "ExitCode.h"
#include "GuardedRun.h"
#include "OutputFile.h"
#include "ProgressLine.h"

namespace kest::tool {

namespace {

struct ExportOptions {
    std::string file;
    std::string format;
    std::string out;
    ReadSettings read;
};

int RunExport(const ExportOptions& options) {
    KestCalmorph converter;
    KestCdfCalData data;
    ops::Document document;
    int code = GuardedRun({options.file}, [&] {
        ProgressLine progress("reading " + DisplayName(options.file));
        ReadCdf(converter, options.file, options.read, data);
        document = ops::FromCalData(data);
        return kExitOk;
    });
    if (code != kExitOk) return code;

    // Nothing is staged before the input has been read: a failed read leaves no file behind.
    const std::string target = options.out.empty() ? "-" : options.out;
    return GuardedRun({target, Subject::Stage::kWrite}, [&] {
        OutputFile output(options.out);
        ProgressLine progress("writing " + DisplayName(target, true));
        if (options.format == "json")
            ops::ExportJson(document, [&](std::string_view piece) { output.Write(piece); });
        else
            output.Write(ops::ExportCsv(document));
        output.Finish();
        return kExitOk;
    });
}

}  // namespace

Command AddExportCommand(CLI::App& calmorph) {
    auto options = std::make_shared<ExportOptions>();
    CLI::App* app = calmorph.add_subcommand(
        "export", "Write what FILE holds as JSON (everything, lossless) or CSV (its values).");
    app->add_option("FILE", options->file, "the CDF file to read; - reads standard input")
        ->required();
    app->add_option("--format", options->format, "json or csv")
        ->required()
        ->check(CLI::IsMember({"json", "csv"}))
        ->type_name("json|csv");
    app->add_option("-o,--output", options->out,
                    "the file to write (replaced only when complete); none: standard output")
        ->type_name("OUT");
    AddReadOptions(*app, options->read);
    app->footer(
        "JSON: every field of the tree, as docs/json-format.md describes; calmorph import writes\n"
        "it back as the file calmorph convert would write. CSV: one row per value, columns\n"
        "list,item,format,units,index,x,y,value (RFC 4180, UTF-8, a header row).\n"
        "Exit codes:\n"
        "  0  the export was written\n"
        "  1  usage error\n"
        "  2  FILE cannot be loaded: missing, unreadable, not well-formed, not valid against the\n"
        "     schema it names, or no CAL-DATA element\n"
        "  4  conversion error: the converter refused the content; with --strict, a warning\n"
        "  5  OUT cannot be written (an existing OUT stays as it was)");
    return {app, [options] { return RunExport(*options); }};
}

}  // namespace kest::tool
