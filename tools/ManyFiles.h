#pragma once
// Commands that take many files (validate, check, convert --output-dir) run them on -j N
// threads, each file on its own converter; what each file prints is held until the files
// before it are done, so the report keeps the order of the arguments.

#include <CLI/CLI.hpp>

#include <functional>
#include <string>
#include <vector>

namespace kest::tool {

/// The number of cores (at least 1).
unsigned DefaultJobs();

/// Adds -j,--jobs N to `command`, `jobs` holding the default.
void AddJobsOption(CLI::App& command, unsigned& jobs);

/// Runs `run` on each file, at most `jobs` at once; returns the highest exit code. `run` must
/// report through Diagnostics (Print, PrintError, Report...) and catch its own failures.
int RunEachFile(const std::vector<std::string>& files, unsigned jobs,
                const std::function<int(std::size_t index, const std::string& file)>& run);

}  // namespace kest::tool
