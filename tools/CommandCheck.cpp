// calmorph check: what files get wrong that the schema cannot see.

#include "ops/Check.h"

#include <fstream>
#include <iterator>
#include <memory>
#include <mutex>

#include "CdfInput.h"
#include "Command.h"
#include "Diagnostics.h"
#include "ExitCode.h"
#include "GuardedRun.h"
#include "ManyFiles.h"

namespace kest::tool {

namespace {

struct CheckCommandOptions {
    std::vector<std::string> files;
    ops::CheckOptions check;
    bool json = false;
    unsigned jobs = 1;
    ReadSettings read;
};

std::string FindingText(const ops::CheckFinding& finding) {
    std::string text =
        Where(DisplayName(finding.file), finding.line, finding.column) + ": " + finding.kind + ": ";
    if (!finding.list.empty() || !finding.item.empty()) {
        text += finding.list.empty()   ? finding.item
                : finding.item.empty() ? finding.list
                                       : finding.list + "/" + finding.item;
        text += ": ";
    }
    return text + finding.message + "\n";
}

int RunCheck(const CheckCommandOptions& options) {
    std::vector<std::vector<ops::CheckFinding>> perFile(options.files.size());
    int code =
        RunEachFile(options.files, options.jobs, [&](std::size_t index, const std::string& file) {
            return GuardedRun({file}, [&] {
                ops::CheckSource source;
                source.file = file;
                const ops::Document document =
                    ReadDocument(file, options.read, &source.warnings, &source.warningsOmitted);
                if (file != "-") {
                    std::ifstream in(file, std::ios::binary);
                    source.text.assign(std::istreambuf_iterator<char>(in), {});
                }
                std::vector<ops::CheckFinding>& findings = perFile[index];
                findings = ops::Check(document, source, options.check);
                bool problem = false;
                for (const ops::CheckFinding& finding : findings) {
                    problem = problem || finding.problem;
                    if (!options.json) Print(FindingText(finding));
                }
                return problem ? 1 : kExitOk;
            });
        });
    if (options.json) {
        std::vector<ops::CheckFinding> all;
        for (auto& findings : perFile) all.insert(all.end(), findings.begin(), findings.end());
        Print(ops::CheckJson(all));
    }
    return code;
}

}  // namespace

Command AddCheckCommand(CLI::App& calmorph) {
    auto options = std::make_shared<CheckCommandOptions>();
    CLI::App* app = calmorph.add_subcommand(
        "check",
        "Report what each FILE gets wrong that the schema cannot see, one finding a line "
        "with file, line, column and item.");
    app->add_option("FILE", options->files, "the files to check; - reads standard input")
        ->required();
    app->add_flag("--verify-crc", options->check.verifyCrc,
                  "compute the CRC-32 of each SYMBOLIC-FILE and TARGET-IMAGE (looked up beside "
                  "the CDF file) and compare it with the one stated");
    app->add_flag("--json", options->json, "print the findings of all files as one JSON document");
    AddJobsOption(*app, options->jobs);
    AddReadOptions(*app, options->read);
    app->footer(
        "Findings: read-warning (a number not taken whole), axis-size, value-count,\n"
        "duplicate-item, axis-order (points not strictly monotonic), text-value (a text on a\n"
        "NUMERIC item or axis); with --verify-crc crc-missing, crc-mismatch, crc-directory,\n"
        "crc-unreadable, and crc-match (not a problem).\n"
        "Files are checked on -j threads at once; the report keeps the order of the files.\n"
        "Exit codes (with several files, the highest of any file):\n"
        "  0  no findings (other than crc-match)\n"
        "  1  findings\n"
        "  2  usage error, or a file cannot be loaded\n"
        "  4  conversion error: the converter refused the content; with --strict, a warning");
    return {app, [options] { return RunCheck(*options); }, kExitCannotLoad};
}

}  // namespace kest::tool
