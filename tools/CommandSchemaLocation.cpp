// calmorph schema-location: prints the schema location a file names.

#include <cstdio>
#include <memory>

#include "CdfInput.h"
#include "Command.h"
#include "Diagnostics.h"
#include "ExitCode.h"
#include "GuardedRun.h"
#include "ToolError.h"

namespace kest::tool {

namespace {

int RunSchemaLocation(const std::string& file) {
    return GuardedRun({file}, [&] {
        KestCalmorph converter;
        // A file whose schema is missing still tells where it looks for it.
        KestReadOptions options;
        options.builtinSchemaFallback = true;
        converter.SetReadOptions(options);
        CComBSTR message;
        CComBSTR location;
        try {
            location = converter.DetectSchemaLocation(CComBSTR(file), message);
        } catch (const KestCalmorphDLLError& error) {
            if (error.GetReason() == reason::kSchemaLocationAbsent) {
                throw ToolError(kExitNoSchema, DisplayName(file),
                                "names no schema (no xsi:schemaLocation)");
            }
            throw ToolError(kExitCannotLoad, DisplayName(file), "cannot load: " + ReasonOf(error));
        }
        if (converter.GetLastLoadError().code != 0) {
            ThrowLoadFailure(file, converter.GetLastLoadError());
        }
        std::printf("%s\n", location.ToString().c_str());
        return kExitOk;
    });
}

}  // namespace

Command AddSchemaLocationCommand(CLI::App& calmorph) {
    auto file = std::make_shared<std::string>();
    CLI::App* app = calmorph.add_subcommand(
        "schema-location",
        "Print the schema location FILE names (the text after the first blank of its "
        "xsi:schemaLocation).");
    app->add_option("FILE", *file, "the CDF file to look into; - reads standard input")->required();
    app->footer(
        "Exit codes:\n"
        "  0  the location was printed\n"
        "  1  usage error\n"
        "  2  FILE cannot be loaded\n"
        "  6  FILE names no schema (no xsi:schemaLocation on its root)");
    return {app, [file] { return RunSchemaLocation(*file); }};
}

}  // namespace kest::tool
