#pragma once
// Reading a CDF file for the commands that need its tree (info, convert): the converter's load,
// and a load failure put into words.

#include <kest/calmorph.h>

#include <string>

namespace kest::tool {

/// The path handed to the library for an input argument: "-" reads standard input.
std::string InputPath(const std::string& argument);

/// Reads `argument` into `data` with `converter`; throws ToolError when the file does not load
/// or holds no CAL-DATA, KestCalmorphDLLError when the converter refuses its content.
void ReadCdf(KestCalmorph& converter, const std::string& argument, KestCdfCalData& data);

/// Throws ToolError(kExitCannotLoad) for a load of `argument` that failed with `message`.
[[noreturn]] void ThrowLoadFailure(const std::string& argument, const std::string& message,
                                   bool validated);

}  // namespace kest::tool
