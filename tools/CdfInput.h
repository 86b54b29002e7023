#pragma once
// Reading a CDF file for the commands that need its tree (info, convert): the read options they
// share, the converter's load, and a failed load put into words.

#include <kest/calmorph.h>
#include <CLI/CLI.hpp>

#include <string>
#include <vector>

#include "ops/Document.h"

#include "ExitCode.h"

namespace kest::tool {

/// The read options of a command line.
struct ReadSettings {
    std::string schema;       // --schema XSD
    bool noValidate = false;  // --no-validate
    bool offline = false;     // --offline
    bool strict = false;      // --strict: a warning fails the command (exit 4)
};

/// Adds --schema, --no-validate, --offline and --strict to `command`.
void AddReadOptions(CLI::App& command, ReadSettings& settings);

/// The converter options for `settings`: a file whose schema is missing (or an http one while
/// offline) is validated against the built-in cdf.xsd.
KestReadOptions ReadOptionsOf(const ReadSettings& settings);

/// Reads `argument` ("-": standard input) into `data` with `converter`, telling on standard
/// error when the built-in schema served and each number not read whole. Returns the number of
/// warnings. Throws ToolError when the file does not load or holds no CAL-DATA,
/// KestCalmorphDLLError when the converter refuses its content.
std::size_t ReadCdf(KestCalmorph& converter, const std::string& argument,
                    const ReadSettings& settings, KestCdfCalData& data);

/// The document of `argument`, read as ReadCdf does; the converter's read warnings are kept in
/// `warnings` when given.
ops::Document ReadDocument(const std::string& argument, const ReadSettings& settings,
                           std::vector<KestReadWarning>* warnings = nullptr,
                           std::size_t* warningsOmitted = nullptr);

/// Throws ToolError(`code`) for a failed load or validation of `argument`, its reason after
/// `lead`.
[[noreturn]] void ThrowLoadFailure(const std::string& argument, const KestLoadError& error,
                                   ExitCode code = kExitCannotLoad,
                                   const std::string& lead = std::string());
[[noreturn]] void ThrowLoadFailure(const std::string& argument, const IXMLDOMParseErrorPtr& error,
                                   ExitCode code, const std::string& lead, const std::string& hint);

}  // namespace kest::tool
