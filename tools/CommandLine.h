#pragma once
// The calmorph command line: parses the arguments, runs the chosen command and returns the
// process's exit code.

namespace kest::tool {

int RunCommandLine(int argc, char** argv);

}  // namespace kest::tool
