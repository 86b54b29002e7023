#pragma once
// A calmorph command: its CLI11 subcommand (arguments, options, help) and the step that runs it
// once the command line has been parsed. A new command is one file defining an Add...Command
// function, declared here and listed in CommandLine.cpp.

#include <CLI/CLI.hpp>

#include <functional>

namespace kest::tool {

struct Command {
    CLI::App* app = nullptr;
    std::function<int()> run;  // returns the exit code
    int usageExit = 1;         // the exit code of a usage error (2 where 1 means "differ")
};

Command AddInfoCommand(CLI::App& calmorph);
Command AddConvertCommand(CLI::App& calmorph);
Command AddValidateCommand(CLI::App& calmorph);
Command AddSchemaLocationCommand(CLI::App& calmorph);
Command AddShowCommand(CLI::App& calmorph);
Command AddExportCommand(CLI::App& calmorph);
Command AddImportCommand(CLI::App& calmorph);
Command AddDiffCommand(CLI::App& calmorph);
Command AddMergeCommand(CLI::App& calmorph);
Command AddCheckCommand(CLI::App& calmorph);
Command AddReportCommand(CLI::App& calmorph);

}  // namespace kest::tool
