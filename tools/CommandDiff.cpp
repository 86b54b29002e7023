// calmorph diff: what differs between two CDF files, item by item.

#include "ops/Diff.h"

#include <memory>

#include "CdfInput.h"
#include "Command.h"
#include "Diagnostics.h"
#include "ExitCode.h"
#include "GuardedRun.h"
#include "ToolError.h"

namespace kest::tool {

namespace {

struct DiffCommandOptions {
    std::string a;
    std::string b;
    ops::DiffOptions compare;
    bool json = false;
    ReadSettings read;
};

std::string Shown(const std::optional<std::string>& text) {
    return text ? "\"" + *text + "\"" : "(none)";
}

std::string Shown(const std::optional<ops::Value>& value) {
    if (!value) return "(none)";
    if (value->GetKind() == ops::Value::Kind::kString) return "\"" + value->Text() + "\"";
    if (value->GetKind() == ops::Value::Kind::kEmpty) return "(empty)";
    return value->ToText();
}

std::string KeyText(const ops::ItemKey& key) {
    std::string text = key.list + "/" + key.item;
    if (key.occurrence > 0) text += " (occurrence " + std::to_string(key.occurrence + 1) + ")";
    return text;
}

std::string DiffText(const ops::DocumentDiff& diff, const std::string& a, const std::string& b) {
    std::string out;
    for (const ops::FieldChange& field : diff.fields)
        out += field.field + ": " + Shown(field.a) + " -> " + Shown(field.b) + "\n";
    for (const std::string& list : diff.listsOnlyInA)
        out += "list only in " + a + ": " + list + "\n";
    for (const std::string& list : diff.listsOnlyInB)
        out += "list only in " + b + ": " + list + "\n";
    for (const ops::ItemKey& key : diff.onlyInA) out += "only in " + a + ": " + KeyText(key) + "\n";
    for (const ops::ItemKey& key : diff.onlyInB) out += "only in " + b + ": " + KeyText(key) + "\n";
    for (const ops::ItemDiff& item : diff.changed) {
        out += "changed " + KeyText(item.key) + "\n";
        for (const ops::FieldChange& field : item.fields)
            out += "  " + field.field + ": " + Shown(field.a) + " -> " + Shown(field.b) + "\n";
        for (const ops::ElementChange& change : item.elements) {
            out += "  " + change.part + "[" + std::to_string(change.index) + "]";
            if (!change.axisPoints.empty()) {
                out += " at (";
                for (std::size_t i = 0; i < change.axisPoints.size(); ++i)
                    out += (i ? ", " : "") + change.axisPoints[i];
                out += ")";
            }
            out += ": " + Shown(change.a) + " -> " + Shown(change.b);
            if (change.difference)
                out += " (difference " + ops::FormatNumber(*change.difference) + ")";
            out += "\n";
        }
    }
    for (const std::string& name : diff.duplicates)
        out += "note: " + name + " occurs more than once; matched in order of appearance\n";
    return out;
}

int RunDiff(const DiffCommandOptions& options) {
    ops::Document a, b;
    for (auto [file, document] : {std::pair{&options.a, &a}, std::pair{&options.b, &b}}) {
        const int code = GuardedRun({*file}, [&, file = file, document = document] {
            *document = ReadDocument(*file, options.read);
            return kExitOk;
        });
        if (code != kExitOk) return code;
    }
    const ops::DocumentDiff diff = ops::Diff(a, b, options.compare);
    Print(options.json ? ops::DiffJson(diff)
                       : DiffText(diff, DisplayName(options.a), DisplayName(options.b)));
    return diff.Equal() ? kExitOk : 1;
}

}  // namespace

Command AddDiffCommand(CLI::App& calmorph) {
    auto options = std::make_shared<DiffCommandOptions>();
    CLI::App* app = calmorph.add_subcommand(
        "diff",
        "Compare A and B: items only in one, changed items element by element, headers, "
        "file references and change entries.");
    app->add_option("A", options->a, "the first CDF file; - reads standard input")->required();
    app->add_option("B", options->b, "the second CDF file")->required();
    app->add_option("--tolerance", options->compare.tolerance, "numbers closer than ABS are equal")
        ->type_name("ABS")
        ->check(CLI::NonNegativeNumber);
    app->add_option("--rel-tolerance", options->compare.relTolerance,
                    "numbers closer than REL times the larger magnitude are equal")
        ->type_name("REL")
        ->check(CLI::NonNegativeNumber);
    app->add_flag("--ignore-history", options->compare.ignoreHistory,
                  "do not compare change entries");
    app->add_flag("--json", options->json, "print the difference as one JSON document");
    AddReadOptions(*app, options->read);
    app->footer(
        "Items are matched by list name and item name; a name that occurs more than once in a\n"
        "list is matched in order of appearance. Numbers are equal by value (3 and 3.0, NaN and\n"
        "NaN, -0 and 0) or within max(ABS, REL * max(|a|, |b|)); texts when identical.\n"
        "Exit codes:\n"
        "  0  A and B are equal\n"
        "  1  A and B differ\n"
        "  2  usage error, or a file cannot be loaded\n"
        "  4  conversion error: the converter refused the content; with --strict, a warning");
    return {app, [options] { return RunDiff(*options); }, kExitCannotLoad};
}

}  // namespace kest::tool
