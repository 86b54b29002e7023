// calmorph convert: reads a CDF file and writes it again as UTF-8.

#include <filesystem>
#include <memory>
#include <set>
#include <vector>

#include "CdfInput.h"
#include "Command.h"
#include "Diagnostics.h"
#include "ExitCode.h"
#include "GuardedRun.h"
#include "ManyFiles.h"
#include "StagedOutput.h"
#include "ToolError.h"

namespace kest::tool {

namespace {

struct ConvertOptions {
    std::string in;
    std::vector<std::string> rest;  // OUT, or with --output-dir more inputs
    std::string outputDir;
    unsigned jobs = 1;
    std::string comment;
    bool indent = false;
    ReadSettings read;
};

// Reads the written file back as `calmorph info` would; returns why it would not read, or "".
std::string WhyItWouldNotReadBack(const std::string& path, const ReadSettings& settings) {
    KestCalmorph reader;
    KestReadOptions options = ReadOptionsOf(ReadSettings());
    options.allowNetwork = !settings.offline;
    reader.SetReadOptions(options);
    try {
        CComBSTR message;
        reader.ConvertXMLtoCPP(CComBSTR(path), true, message);
        const KestLoadError& error = reader.GetLastLoadError();
        if (error.code == 0) return message.ToString();
        return (error.line > 0 ? "line " + std::to_string(error.line) + ": " : "") + error.reason;
    } catch (const KestCalmorphDLLError& error) {
        return ReasonOf(error);
    } catch (const std::exception& error) {
        return error.what();
    }
}

int ConvertOne(const ConvertOptions& options, const std::string& in, const std::string& out) {
    if (out.empty()) {
        throw ToolError(kExitUsage, "calmorph", "the output path is empty");
    }
    KestCalmorph converter;
    KestCdfCalData data;
    int code = GuardedRun({in}, [&] {
        const std::size_t warnings = ReadCdf(converter, in, options.read, data);
        return warnings > 0 && options.read.strict ? kExitConversion : kExitOk;
    });
    if (code != kExitOk) return code;

    StagedOutput output(out);
    const std::string shown = DisplayName(out, true);
    Subject subject{out, Subject::Stage::kWrite, output.Path()};
    converter.SetWriteOptions(KestWriteOptions{options.indent});
    return GuardedRun(subject, [&] {
        if (!converter.ConvertCPPToXML(data, CComBSTR(output.Path()), CComBSTR(options.comment))) {
            throw ToolError(kExitCannotWrite, shown, "nothing was written");
        }
        std::string why = WhyItWouldNotReadBack(output.Path(), options.read);
        if (!why.empty()) {
            ReportWarning(shown, "the output would not read back: " + why);
            if (options.read.strict) return kExitConversion;  // nothing is published
        }
        output.Publish();
        return kExitOk;
    });
}

int RunConvert(const ConvertOptions& options) {
    if (options.outputDir.empty()) {
        if (options.rest.size() != 1) {
            throw ToolError(
                kExitUsage, "calmorph",
                options.rest.empty() ? "OUT is required" : "several inputs need --output-dir DIR");
        }
        return ConvertOne(options, options.in, options.rest.front());
    }
    std::vector<std::string> inputs{options.in};
    inputs.insert(inputs.end(), options.rest.begin(), options.rest.end());
    // Two inputs of one file name would write the same output.
    std::set<std::string> names;
    for (const std::string& in : inputs) {
        const std::string name = std::filesystem::path(in).filename().string();
        if (in == "-" || name.empty()) {
            throw ToolError(kExitUsage, "calmorph", "--output-dir needs named input files");
        }
        if (!names.insert(name).second) {
            throw ToolError(kExitUsage, "calmorph",
                            "two inputs are named " + name + "; their outputs would collide");
        }
    }
    return RunEachFile(inputs, options.jobs, [&](std::size_t, const std::string& in) {
        const std::filesystem::path out =
            std::filesystem::path(options.outputDir) / std::filesystem::path(in).filename();
        return ConvertOne(options, in, out.string());
    });
}

}  // namespace

Command AddConvertCommand(CLI::App& calmorph) {
    auto options = std::make_shared<ConvertOptions>();
    CLI::App* app = calmorph.add_subcommand(
        "convert",
        "Read IN and write it to OUT as a UTF-8 CDF file. OUT is replaced only when the whole "
        "file could be written.");
    app->add_option("IN", options->in, "the CDF file to read; - reads standard input")->required();
    app->add_option("OUT", options->rest,
                    "the file to write (- writes standard output); with --output-dir, more "
                    "files to read");
    app->add_option("--output-dir", options->outputDir,
                    "convert every IN to DIR/NAME, NAME its file name (the folder must exist)")
        ->type_name("DIR");
    AddJobsOption(*app, options->jobs);
    app->add_option("--comment", options->comment, "a comment written at the start of CAL-DATA")
        ->type_name("TEXT");
    app->add_flag("--indent", options->indent,
                  "one element per line, two spaces a level (for line diffs)");
    AddReadOptions(*app, options->read);
    app->footer(
        "Exit codes:\n"
        "  0  OUT was written\n"
        "  1  usage error\n"
        "  2  IN cannot be loaded: missing, unreadable, not well-formed, not valid against the\n"
        "     schema it names, or no CAL-DATA element\n"
        "  4  conversion error: the converter refused the content; with --strict, a warning\n"
        "     (OUT is then not written)\n"
        "  5  OUT cannot be written (an existing OUT stays as it was)\n"
        "With --output-dir, files are converted on -j threads at once and the exit code is the\n"
        "highest of any file.");
    return {app, [options] { return RunConvert(*options); }};
}

}  // namespace kest::tool
