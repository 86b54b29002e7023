// calmorph report: one self-contained HTML page of a CDF file (and of its differences to an
// older one), for looking at curves and maps in a browser, opened from disk.

#include "ops/ReportData.h"

#include <cstddef>
#include <memory>
#include <string_view>

#include "CdfInput.h"
#include "Command.h"
#include "Diagnostics.h"
#include "ExitCode.h"
#include "GuardedRun.h"
#include "OutputFile.h"
#include "ProgressLine.h"

namespace kest::detail {
// tools/report/report.html, embedded at build time.
extern const char kReportPage[];
extern const std::size_t kReportPageSize;
}  // namespace kest::detail

namespace kest::tool {

namespace {

struct ReportOptions {
    std::string file;
    std::string against;
    std::string out;
    ReadSettings read;
};

int ReadDocument(const std::string& file, const ReadSettings& read, ops::Document& document) {
    return GuardedRun({file}, [&] {
        KestCalmorph converter;
        KestCdfCalData data;
        ProgressLine progress("reading " + DisplayName(file));
        ReadCdf(converter, file, read, data);
        document = ops::FromCalData(data);
        return kExitOk;
    });
}

int RunReport(const ReportOptions& options) {
    ops::Document current;
    ops::Document old;
    int code = ReadDocument(options.file, options.read, current);
    if (code == kExitOk && !options.against.empty())
        code = ReadDocument(options.against, options.read, old);
    if (code != kExitOk) return code;

    const std::string data = ops::ReportJson(
        {&current, options.file},
        options.against.empty() ? ops::ReportSource{} : ops::ReportSource{&old, options.against});
    return GuardedRun({options.out, Subject::Stage::kWrite}, [&] {
        OutputFile output(options.out);
        ProgressLine progress("writing " + DisplayName(options.out, true));
        const std::string_view page(detail::kReportPage, detail::kReportPageSize);
        static constexpr std::string_view kSlot = "@KEST_REPORT_DATA@";
        const auto slot = page.find(kSlot);
        output.Write(page.substr(0, slot));
        output.Write(data);
        output.Write(page.substr(slot + kSlot.size()));
        output.Finish();
        return kExitOk;
    });
}

}  // namespace

Command AddReportCommand(CLI::App& calmorph) {
    auto options = std::make_shared<ReportOptions>();
    CLI::App* app = calmorph.add_subcommand(
        "report", "Write one HTML page showing FILE: its items, curves, maps and values.");
    app->add_option("FILE", options->file, "the CDF file to show; - reads standard input")
        ->required();
    app->add_option("--against", options->against,
                    "an older CDF file: items added, removed and changed are marked")
        ->type_name("OLD");
    app->add_option("-o,--output", options->out,
                    "the HTML file to write (replaced only when complete)")
        ->type_name("OUT")
        ->required();
    AddReadOptions(*app, options->read);
    app->footer(
        "The page holds its styles, script and data; it opens from disk with no network.\n"
        "File references are checked against the files of that name beside FILE (CRC-32).\n"
        "Exit codes:\n"
        "  0  the report was written\n"
        "  1  usage error\n"
        "  2  FILE or OLD cannot be loaded: missing, unreadable, not well-formed, not valid\n"
        "     against the schema it names, or no CAL-DATA element\n"
        "  4  conversion error: the converter refused the content; with --strict, a warning\n"
        "  5  OUT cannot be written (an existing OUT stays as it was)");
    return {app, [options] { return RunReport(*options); }};
}

}  // namespace kest::tool
