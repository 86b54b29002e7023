#pragma once
// The one place where failures thrown by the library or by a command become messages and exit
// codes. Commands run each step that touches a file through GuardedRun.

#include <functional>
#include <string>

namespace kest::tool {

/// What a guarded step works on: the file its messages name, and whether it reads or writes
/// (a system failure while writing is a write failure, exit 5).
struct Subject {
    enum class Stage { kRead, kWrite };
    Subject(std::string file = {}, Stage stage = Stage::kRead, std::string stagedPath = {})
        : file(std::move(file)), stage(stage), stagedPath(std::move(stagedPath)) {}

    std::string file;  // as the user wrote it ("" when the step is about no single file)
    Stage stage;
    std::string stagedPath;  // a temporary path written in place of `file`, named as `file`
};

/// Runs `step`; returns its exit code, or the code of the failure it threw, after reporting it.
int GuardedRun(const Subject& subject, const std::function<int()>& step);

}  // namespace kest::tool
