#include "CommandLine.h"

#include <iostream>
#include <vector>

#include "Command.h"
#include "Diagnostics.h"
#include "ExitCode.h"
#include "GuardedRun.h"

namespace kest::tool {

namespace {

constexpr const char* kOverview =
    "Commands (calmorph COMMAND --help shows a command's options and exit codes):\n"
    "  calmorph info FILE [--items] [READ OPTIONS]\n"
    "      Print the header, change history and calibration lists of FILE; with --items\n"
    "      also every item (name, units, format type, number of values, axis sizes).\n"
    "  calmorph show FILE [ITEM...] [--list NAME] [--json] [READ OPTIONS]\n"
    "      Print items (all, or those named; * and ? match any text and one character)\n"
    "      with their values: a scalar, a curve as a table, a map as a grid.\n"
    "  calmorph convert IN OUT [--comment TEXT] [--indent] [READ OPTIONS]\n"
    "      Read IN and write it to OUT as a UTF-8 CDF file, with TEXT as a comment at the\n"
    "      start of CAL-DATA. OUT is replaced only when the whole file could be written.\n"
    "      --indent: one element per line, for line diffs.\n"
    "  calmorph convert IN... --output-dir DIR [-j N] [--indent] [READ OPTIONS]\n"
    "      Convert many files to DIR/NAME on N threads at once.\n"
    "  calmorph export FILE --format json|csv [-o OUT] [READ OPTIONS]\n"
    "      Write everything FILE holds as JSON (lossless), or its values as CSV.\n"
    "  calmorph import FILE.json -o OUT [--indent]\n"
    "      Write the CDF file a JSON export stands for.\n"
    "  calmorph diff A B [--tolerance ABS] [--rel-tolerance REL] [--ignore-history] [--json]\n"
    "      Compare two files item by item (matched by list and name): exit 0 equal, 1 differ.\n"
    "  calmorph merge BASE OURS THEIRS -o OUT [--prefer ours|theirs] [--indent]\n"
    "      Three-way merge by item and element; conflicts exit 1 and write nothing.\n"
    "  calmorph check FILE... [--verify-crc] [--json] [-j N]\n"
    "      Report what the schema cannot see: axis sizes, value counts, duplicates, axis\n"
    "      order, texts in numbers; with --verify-crc the CRC-32 of referenced files.\n"
    "  calmorph validate FILE... [--schema XSD] [-j N]\n"
    "      Check each FILE against the schema it names (xsi:schemaLocation, resolved beside\n"
    "      the file), or against XSD under the CDF namespace. One line per file.\n"
    "  calmorph schema-location FILE\n"
    "      Print the schema location FILE names (the text after the first blank of its\n"
    "      xsi:schemaLocation).\n"
    "READ OPTIONS: --schema XSD (validate against XSD instead of the schema the file names),\n"
    "  --no-validate, --offline (fetch nothing over the network: a CDF file naming an http\n"
    "  schema is validated against the built-in cdf.xsd, as one naming a missing local schema\n"
    "  always is),\n"
    "  --strict (every warning is an error, exit 4).\n"
    "A FILE or IN of - is standard input; an OUT of - is standard output.\n"
    "\n"
    "Exit codes:\n"
    "  0  success; for validate: every file is valid\n"
    "  1  usage error: unknown command or option, missing or extra argument\n"
    "  2  an input cannot be loaded: missing, unreadable, not well-formed, not valid against\n"
    "     the schema it names, or no CAL-DATA element; for validate also a schema that cannot\n"
    "     be loaded or a document the validator cannot parse\n"
    "  3  validate: a file is not valid against its schema\n"
    "  4  conversion error: the converter refused the content (reason code and item name);\n"
    "     with --strict also any warning\n"
    "  5  the output file cannot be written\n"
    "  6  the file names no schema (no xsi:schemaLocation on its root)\n"
    "  7  show: an ITEM or the --list NAME matches nothing\n"
    "diff, merge and check exit 1 when the files differ, conflict or have findings, and 2 for\n"
    "a usage error; see their --help.\n"
    "With several files, validate exits with the highest code of any file.\n"
    "Errors go to standard error as FILE:LINE:COL: error: TEXT, as far as the position is known.";

// Every command of the tool, in the order of the help text.
constexpr Command (*kCommands[])(CLI::App&) = {
    AddInfoCommand,   AddShowCommand,     AddConvertCommand,       AddExportCommand,
    AddImportCommand, AddDiffCommand,     AddMergeCommand,         AddCheckCommand,
    AddReportCommand, AddValidateCommand, AddSchemaLocationCommand};

}  // namespace

int RunCommandLine(int argc, char** argv) {
    CLI::App calmorph("calmorph - look into, convert and validate CDF calibration files",
                      "calmorph");
    calmorph.set_version_flag("--version", "calmorph " KEST_VERSION);
    calmorph.require_subcommand(1);
    calmorph.footer(kOverview);
    std::vector<Command> commands;
    for (auto add : kCommands) {
        commands.push_back(add(calmorph));
        // The overview above lists the commands with their arguments.
        commands.back().app->group("");
        // Positional arguments are named for what they are (FILE, IN); a type adds nothing.
        for (CLI::Option* argument : commands.back().app->get_options(
                 [](CLI::Option* option) { return option->get_positional(); })) {
            argument->type_name("");
        }
    }

    try {
        calmorph.parse(argc, argv);
    } catch (const CLI::CallForHelp& help) {
        return calmorph.exit(help);
    } catch (const CLI::CallForVersion& version) {
        return calmorph.exit(version);
    } catch (const CLI::ParseError& error) {
        if (argc <= 1) {
            std::cerr << calmorph.help();
            return kExitUsage;
        }
        std::string usage = "calmorph";
        int code = kExitUsage;
        for (const Command& command : commands) {
            if (command.app->parsed()) {
                usage += " " + command.app->get_name();
                code = command.usageExit;
            }
        }
        std::string text = error.what();
        if (usage == "calmorph" && argv[1][0] != '-') {
            text = "unknown command '" + std::string(argv[1]) + "'";
        }
        ReportError("calmorph", text, "see '" + usage + " --help'");
        return code;
    }
    for (const Command& command : commands) {
        if (command.app->parsed()) return GuardedRun({}, command.run);
    }
    return kExitUsage;  // unreachable: exactly one command is required
}

}  // namespace kest::tool
