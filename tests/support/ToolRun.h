#pragma once
// Runs the calmorph binary from tables: each row a command line, its exit code, the parts each
// output stream must hold and the files it leaves beside the inputs.

#include <gtest/gtest.h>
#include <sys/wait.h>

#include <algorithm>
#include <cstdlib>
#include <string>
#include <vector>

#include "support/TestFiles.h"

namespace kest {
namespace test {

struct ToolRow {
    std::string command;  // shell words after calmorph, run in the folder
    int code;
    std::vector<std::string> out, err;  // parts each stream must hold; {} for an empty stream
    std::vector<std::string> files;     // files the command leaves beside the inputs
};

/// Runs `calmorph args` (shell words) in `dir`; the exit code, -1 when it did not exit.
inline int RunTool(const ScratchDir& dir, const std::string& args, std::string& out,
                   std::string& err) {
    const std::string command = "cd '" + dir.str() + "' && '" KEST_CALMORPH_EXE "' " + args +
                                " >'" + dir / ".out" + "' 2>'" + dir / ".err" + "'";
    const int status = std::system(command.c_str());
    out = ReadWholeFile(dir / ".out");
    err = ReadWholeFile(dir / ".err");
    std::filesystem::remove(dir / ".out");
    std::filesystem::remove(dir / ".err");
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

/// Runs every row in `dir` and removes what it leaves beside `inputs` before the next one.
inline void CheckTool(const ScratchDir& dir, const std::vector<std::string>& inputs,
                      const std::vector<ToolRow>& rows) {
    for (const ToolRow& row : rows) {
        SCOPED_TRACE(row.command);
        std::string out, err;
        EXPECT_EQ(RunTool(dir, row.command, out, err), row.code) << err;
        for (const auto& [text, parts] : {std::pair{out, row.out}, std::pair{err, row.err}}) {
            if (parts.empty()) {
                EXPECT_EQ(text, "");
            }
            for (const std::string& part : parts) EXPECT_NE(text.find(part), text.npos) << text;
        }
        std::vector<std::string> left;
        for (const auto& entry : std::filesystem::directory_iterator(dir.Path())) {
            const std::string name = entry.path().filename().string();
            if (std::find(inputs.begin(), inputs.end(), name) == inputs.end()) left.push_back(name);
        }
        std::sort(left.begin(), left.end());
        EXPECT_EQ(left, row.files);
        for (const std::string& name : left) std::filesystem::remove_all(dir / name);
    }
}

}  // namespace test
}  // namespace kest
