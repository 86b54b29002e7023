// calmorph import: writes a CDF file from the JSON form that export writes.

#include <kest/calmorph.h>

#include "ops/JsonFormat.h"

#include <cerrno>
#include <cstring>
#include <fstream>
#include <iostream>
#include <iterator>
#include <memory>

#include "Command.h"
#include "Diagnostics.h"
#include "ExitCode.h"
#include "GuardedRun.h"
#include "ProgressLine.h"
#include "StagedOutput.h"
#include "ToolError.h"

namespace kest::tool {

namespace {

struct ImportOptions {
    std::string file;
    std::string out;
    bool indent = false;
};

std::string ReadText(const std::string& file) {
    if (file == "-")
        return std::string(std::istreambuf_iterator<char>(std::cin), std::istreambuf_iterator<char>());
    std::ifstream in(file, std::ios::binary);
    std::string text;
    if (in) text.assign(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
    if (!in.good() && !in.eof())
        throw ToolError(kExitCannotLoad, DisplayName(file),
                        std::string("cannot read: ") + std::strerror(errno ? errno : EIO));
    return text;
}

int RunImport(const ImportOptions& options) {
    if (options.out.empty()) throw ToolError(kExitUsage, "calmorph", "the output path is empty");
    KestCdfCalData data;
    int code = GuardedRun({options.file}, [&] {
        ProgressLine progress("reading " + DisplayName(options.file));
        try {
            data = ops::ToCalData(ops::ImportJson(ReadText(options.file)));
        } catch (const ops::JsonImportError& error) {
            const std::string where = DisplayName(options.file);
            throw ToolError(kExitCannotLoad, where,
                            error.Path().empty() ? error.Reason()
                                                 : error.Path() + ": " + error.Reason());
        }
        return kExitOk;
    });
    if (code != kExitOk) return code;

    StagedOutput output(options.out);
    const std::string shown = DisplayName(options.out, true);
    return GuardedRun({options.out, Subject::Stage::kWrite, output.Path()}, [&] {
        KestCalmorph converter;
        converter.SetWriteOptions(KestWriteOptions{options.indent});
        ProgressLine progress("writing " + shown);
        if (!converter.ConvertCPPToXML(data, CComBSTR(output.Path()), CComBSTR())) {
            throw ToolError(kExitCannotWrite, shown, "nothing was written");
        }
        output.Publish();
        return kExitOk;
    });
}

}  // namespace

Command AddImportCommand(CLI::App& calmorph) {
    auto options = std::make_shared<ImportOptions>();
    CLI::App* app = calmorph.add_subcommand(
        "import", "Write a CDF file from the JSON that calmorph export --format json writes.");
    app->add_option("FILE", options->file, "the JSON file to read; - reads standard input")
        ->required();
    app->add_option("-o,--output", options->out, "the CDF file to write; - writes standard output")
        ->required()
        ->type_name("OUT");
    app->add_flag("--indent", options->indent,
                  "one element per line, two spaces a level (for line diffs)");
    app->footer(
        "The JSON is checked whole before anything is written; a fault is named by its path,\n"
        "such as lists[0].items[3].values[7].\n"
        "Exit codes:\n"
        "  0  OUT was written\n"
        "  1  usage error\n"
        "  2  FILE cannot be read, is not JSON, or is not a calibration document of this\n"
        "     format (a member missing, unknown or of the wrong type, a number out of range,\n"
        "     an unknown format type, a text over 16 MiB, nesting deeper than 32)\n"
        "  4  conversion error: the writer refused the document (a list or item without a\n"
        "     name, a list without a symbolic file, an item without a value)\n"
        "  5  OUT cannot be written (an existing OUT stays as it was)");
    return {app, [options] { return RunImport(*options); }};
}

}  // namespace kest::tool
