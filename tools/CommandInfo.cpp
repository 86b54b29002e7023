// calmorph info: prints what a CDF file holds.

#include <memory>

#include "CdfInput.h"
#include "Command.h"
#include "ExitCode.h"
#include "GuardedRun.h"
#include "InfoOutput.h"

namespace kest::tool {

namespace {

struct InfoOptions {
    std::string file;
    bool items = false;
    ReadSettings read;
};

int RunInfo(const InfoOptions& options) {
    KestCalmorph converter;
    KestCdfCalData data;
    int code = GuardedRun({options.file}, [&] {
        const std::size_t warnings = ReadCdf(converter, options.file, options.read, data);
        return warnings > 0 && options.read.strict ? kExitConversion : kExitOk;
    });
    if (code != kExitOk) return code;
    PrintInfo(options.file, data, options.items);
    return kExitOk;
}

}  // namespace

Command AddInfoCommand(CLI::App& calmorph) {
    auto options = std::make_shared<InfoOptions>();
    CLI::App* app = calmorph.add_subcommand(
        "info", "Print the header, change history and calibration lists of FILE.");
    app->add_option("FILE", options->file, "the CDF file to read; - reads standard input")
        ->required();
    app->add_flag("--items", options->items,
                  "also print every item: name, units, format type, number of values, axis sizes");
    AddReadOptions(*app, options->read);
    app->footer(
        "Exit codes:\n"
        "  0  the file was read and printed\n"
        "  1  usage error\n"
        "  2  FILE cannot be loaded: missing, unreadable, not well-formed, not valid against the\n"
        "     schema it names, or no CAL-DATA element\n"
        "  4  conversion error: the converter refused the content; with --strict, a warning");
    return {app, [options] { return RunInfo(*options); }};
}

}  // namespace kest::tool
