// calmorph merge: three-way merge of calibration files by item and element.

#include "ops/Merge.h"

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

struct MergeOptions {
    std::string base;
    std::string ours;
    std::string theirs;
    std::string out;
    std::string prefer;
    bool indent = false;
    bool json = false;
    ReadSettings read;
};

std::string Shown(const std::optional<std::string>& text) {
    return text ? "\"" + *text + "\"" : "(none)";
}

std::string ConflictText(const ops::MergeConflict& conflict) {
    std::string where = conflict.list.empty() ? std::string("header") : conflict.list;
    if (!conflict.item.empty()) where += "/" + conflict.item;
    return where + " " + conflict.element + ": base " + Shown(conflict.base) + ", ours " +
           Shown(conflict.ours) + ", theirs " + Shown(conflict.theirs);
}

int RunMerge(const MergeOptions& options) {
    if (options.out.empty())
        throw ToolError(kExitCannotLoad, "calmorph", "the output path is empty");
    ops::Document documents[3];
    const std::string* files[3] = {&options.base, &options.ours, &options.theirs};
    for (int i = 0; i < 3; ++i) {
        const int code = GuardedRun({*files[i]}, [&] {
            documents[i] = ReadDocument(*files[i], options.read);
            return kExitOk;
        });
        if (code != kExitOk) return code;
    }
    const ops::MergePrefer prefer = options.prefer == "ours"     ? ops::MergePrefer::kOurs
                                    : options.prefer == "theirs" ? ops::MergePrefer::kTheirs
                                                                 : ops::MergePrefer::kNone;
    const ops::MergeResult result = ops::Merge(documents[0], documents[1], documents[2], prefer);
    if (options.json) {
        Print(ops::MergeJson(result));
    } else {
        for (const ops::MergeConflict& conflict : result.conflicts) {
            Print((result.resolved ? "resolved to " + options.prefer + ": " : "conflict: ") +
                  ConflictText(conflict) + "\n");
        }
    }
    if (!result.conflicts.empty() && !result.resolved) {
        ReportError(DisplayName(options.out, true),
                    std::to_string(result.conflicts.size()) +
                        (result.conflicts.size() == 1 ? " conflict" : " conflicts") +
                        "; nothing was written",
                    "use --prefer ours or --prefer theirs to resolve every conflict to one side");
        return 1;
    }
    StagedOutput output(options.out);
    const std::string shown = DisplayName(options.out, true);
    return GuardedRun({options.out, Subject::Stage::kWrite, output.Path()}, [&] {
        KestCdfCalData data = ops::ToCalData(result.merged);
        KestCalmorph converter;
        converter.SetWriteOptions(KestWriteOptions{options.indent});
        if (!converter.ConvertCPPToXML(data, CComBSTR(output.Path()), CComBSTR())) {
            throw ToolError(kExitCannotWrite, shown, "nothing was written");
        }
        output.Publish();
        return kExitOk;
    });
}

}  // namespace

Command AddMergeCommand(CLI::App& calmorph) {
    auto options = std::make_shared<MergeOptions>();
    CLI::App* app = calmorph.add_subcommand(
        "merge",
        "Merge the changes OURS and THEIRS made to BASE, by item and by element, into "
        "OUT.");
    app->add_option("BASE", options->base, "the common ancestor")->required();
    app->add_option("OURS", options->ours, "one side")->required();
    app->add_option("THEIRS", options->theirs, "the other side")->required();
    app->add_option("-o,--output", options->out, "the merged file; - writes standard output")
        ->type_name("OUT")
        ->required();
    app->add_option("--prefer", options->prefer, "resolve every conflict to this side")
        ->type_name("ours|theirs")
        ->check(CLI::IsMember({"ours", "theirs"}));
    app->add_flag("--indent", options->indent, "one element per line, two spaces a level");
    app->add_flag("--json", options->json, "print the conflicts as one JSON document");
    AddReadOptions(*app, options->read);
    app->footer(
        "A change made on one side is taken, the same change on both once; an item added on one\n"
        "side is added, one deleted on one side and unchanged on the other is deleted. Different\n"
        "changes to one element, a deletion against a change, and different changes of\n"
        "dimensions, format type, header fields or file references are conflicts, each listed\n"
        "with its three values. Change histories are joined in date order without duplicates.\n"
        "Exit codes:\n"
        "  0  OUT was written (conflicts, with --prefer, were resolved and listed)\n"
        "  1  conflicts and no --prefer: nothing was written\n"
        "  2  usage error, or a file cannot be loaded\n"
        "  4  conversion error: the converter refused the content or the merge (a date)\n"
        "  5  OUT cannot be written (an existing OUT stays as it was)");
    return {app, [options] { return RunMerge(*options); }, kExitCannotLoad};
}

}  // namespace kest::tool
