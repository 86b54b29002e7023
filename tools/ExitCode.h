#pragma once
// The exit codes of calmorph, shared by every command and by the help texts.

namespace kest::tool {

enum ExitCode {
    kExitOk = 0,
    kExitUsage = 1,
    kExitCannotLoad = 2,
    kExitInvalid = 3,
    kExitConversion = 4,
    kExitCannotWrite = 5,
    kExitNoSchema = 6,
    kExitNotFound = 7,
};

}  // namespace kest::tool
