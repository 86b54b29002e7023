// calmorph show: prints items with their values laid out along their axes.

#include "ops/ItemView.h"

#include <cstdio>
#include <memory>

#include "CdfInput.h"
#include "Command.h"
#include "Diagnostics.h"
#include "ExitCode.h"
#include "GuardedRun.h"
#include "ProgressLine.h"
#include "ToolError.h"

namespace kest::tool {

namespace {

struct ShowOptions {
    std::string file;
    std::vector<std::string> items;
    std::string list;
    bool json = false;
    ReadSettings read;
};

int RunShow(const ShowOptions& options) {
    KestCalmorph converter;
    KestCdfCalData data;
    return GuardedRun({options.file}, [&] {
        ops::Document document;
        {
            ProgressLine progress("reading " + DisplayName(options.file));
            ReadCdf(converter, options.file, options.read, data);
            document = ops::FromCalData(data);
        }
        const ops::ItemSelection selection = ops::SelectItems(document, options.items, options.list);
        if (!options.list.empty() && selection.items.empty() && options.items.empty()) {
            throw ToolError(kExitNotFound, DisplayName(options.file),
                            "no list named \"" + options.list + "\"");
        }
        if (options.json) {
            const std::string text = ops::ItemsJson(selection.items);
            std::fwrite(text.data(), 1, text.size(), stdout);
        } else {
            for (std::size_t i = 0; i < selection.items.size(); ++i) {
                const std::string text = ops::ItemText(selection.items[i]);
                std::printf("%s%s", i ? "\n" : "", text.c_str());
            }
        }
        for (const std::string& name : selection.unmatched) {
            ReportError(DisplayName(options.file),
                        "no item matches \"" + name + "\"" +
                            (options.list.empty() ? "" : " in list \"" + options.list + "\""));
        }
        return selection.unmatched.empty() ? kExitOk : kExitNotFound;
    });
}

}  // namespace

Command AddShowCommand(CLI::App& calmorph) {
    auto options = std::make_shared<ShowOptions>();
    CLI::App* app = calmorph.add_subcommand(
        "show", "Print items of FILE with their values: scalars, curves as tables, maps as grids.");
    app->add_option("FILE", options->file, "the CDF file to read; - reads standard input")
        ->required();
    app->add_option("ITEM", options->items,
                    "item names, exact or as globs with * and ?; none: every item");
    app->add_option("--list", options->list, "only items of the list with this exact name")
        ->type_name("NAME");
    app->add_flag("--json", options->json,
                  "print one JSON document: each item with its shape, axes and nested values");
    AddReadOptions(*app, options->read);
    app->footer(
        "A map is printed with its first axis down and its second across (value k of an n0 x n1\n"
        "map is at row k / n1, column k % n1).\n"
        "Exit codes:\n"
        "  0  the items were printed\n"
        "  1  usage error\n"
        "  2  FILE cannot be loaded: missing, unreadable, not well-formed, not valid against the\n"
        "     schema it names, or no CAL-DATA element\n"
        "  4  conversion error: the converter refused the content; with --strict, a warning\n"
        "  7  an ITEM or the --list NAME matches nothing (the items that match are printed)");
    return {app, [options] { return RunShow(*options); }};
}

}  // namespace kest::tool
