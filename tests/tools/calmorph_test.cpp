// The calmorph command-line tool, run as a separate process: exit codes, output, messages.
#include <gtest/gtest.h>
#include <sys/wait.h>

#include <string>
#include <vector>

#include "support/TestFiles.h"

namespace fs = std::filesystem;
using kest::test::ReadWholeFile;
using kest::test::ScratchDir;
using kest::test::WriteWholeFile;

namespace {

const std::string kExamples = std::string(KEST_SOURCE_DIR) + "/examples";
const std::string kGolden = std::string(KEST_TEST_DATA_DIR) + "/calmorph/";
const std::string kCdfNs = "http://kest.dev/schemas/cdf/1.0";

std::string Quote(const std::string& arg) {
    std::string quoted = "'";
    for (char c : arg) quoted += c == '\'' ? std::string("'\\''") : std::string(1, c);
    return quoted + "'";
}

struct Result {
    int code = -1;
    std::string out;
    std::string err;
};

// Runs calmorph with `args` in `directory`, capturing both output streams.
Result RunTool(const std::vector<std::string>& args, const std::string& directory) {
    ScratchDir capture;
    std::string command = "cd " + Quote(directory) + " && " + Quote(KEST_CALMORPH_EXE);
    for (const std::string& arg : args) command += " " + Quote(arg);
    command += " >" + Quote(capture / "out") + " 2>" + Quote(capture / "err");
    const int status = std::system(command.c_str());
    return {WIFEXITED(status) ? WEXITSTATUS(status) : -1, ReadWholeFile(capture / "out"),
            ReadWholeFile(capture / "err")};
}

bool Contains(const std::string& text, const std::string& part) {
    return text.find(part) != std::string::npos;
}

std::string Cdf(const std::string& location, const std::string& body) {
    return "<CAL-DATA xmlns=\"" + kCdfNs +
           "\" xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\" xsi:schemaLocation=\"" +
           kCdfNs + " " + location + "\"><CHANGE-HISTORY/>" + body + "</CAL-DATA>";
}

// A directory holding the schema, the sample and files that fail in each of the ways the tool
// tells apart.
struct Files {
    ScratchDir dir;
    Files() {
        fs::copy_file(kExamples + "/cdf.xsd", dir / "cdf.xsd");
        fs::copy_file(kExamples + "/sample.cdf", dir / "sample.cdf");
        WriteWholeFile(dir / "invalid.cdf", Cdf("cdf.xsd", "\n<NOTE>no FILENAME before me</NOTE>"));
        WriteWholeFile(dir / "malformed.cdf", Cdf("cdf.xsd", "\n<FILENAME>f</NOTE>"));
        WriteWholeFile(dir / "elsewhere.cdf", Cdf("nowhere.xsd", "<FILENAME>f</FILENAME>"));
        WriteWholeFile(dir / "unnamed.cdf",
                       "<CAL-DATA a=\"\" b=\"i\" c=\"l\"><FILENAME/></CAL-DATA>");
        WriteWholeFile(dir / "twoattrs.cdf", "<CAL-DATA a=\"1\" b=\"2\"/>");
        WriteWholeFile(dir / "other.xml", "<other><thing/></other>");
        WriteWholeFile(dir / "brokenitem.cdf",
                       "<CAL-DATA a=\"\" b=\"i\" c=\"l\"><CAL-LIST><NAME>L</NAME><CAL-ITEM><NAME>"
                       "Broken Item</NAME><AXIS/></CAL-ITEM></CAL-LIST></CAL-DATA>");
        WriteWholeFile(dir / "nameless.cdf",
                       "<CAL-DATA a=\"\" b=\"i\" c=\"l\"><CHANGE-HISTORY/><FILENAME/><CAL-LIST>"
                       "<SYMBOLIC-FILE crc32=\"0x1\">s.a2l</SYMBOLIC-FILE></CAL-LIST></CAL-DATA>");
    }
};

}  // namespace

TEST(Calmorph, HelpListsEveryCommandAndExitCode) {
    Result help = RunTool({"--help"}, kExamples);
    EXPECT_EQ(help.code, 0);
    EXPECT_EQ(help.err, "");
    for (const char* part : {"info FILE [--items]", "convert IN OUT [--comment TEXT]",
                             "validate FILE... [--schema XSD]", "schema-location FILE"}) {
        EXPECT_TRUE(Contains(help.out, part)) << part;
    }
    for (int code = 0; code <= 6; ++code) {
        EXPECT_TRUE(Contains(help.out, "\n  " + std::to_string(code) + "  ")) << "code " << code;
    }
}

TEST(Calmorph, InfoPrintsTheSampleAsRecorded) {
    for (const auto& args :
         std::vector<std::vector<std::string>>{{"info", "sample.cdf"},
                                               {"info", "sample.cdf", "--items"},
                                               {"info", "--items", "sample.cdf"}}) {
        SCOPED_TRACE(args.back());
        Result result = RunTool(args, kExamples);
        EXPECT_EQ(result.code, 0);
        EXPECT_EQ(result.err, "");
        EXPECT_EQ(result.out,
                  ReadWholeFile(kGolden +
                                (args.size() == 2 ? "sample-info.txt" : "sample-info-items.txt")));
    }
}

TEST(Calmorph, ConvertWritesAValidFileWithTheComment) {
    Files files;
    Result result = RunTool({"convert", "sample.cdf", "out.cdf", "--comment", "from the test"},
                            files.dir.str());
    EXPECT_EQ(result.code, 0);
    EXPECT_EQ(result.out + result.err, "");
    std::string text = ReadWholeFile(files.dir / "out.cdf");
    EXPECT_EQ(text.rfind("<?xml", 0), 0u);
    EXPECT_TRUE(Contains(text, "<!--from the test--><CHANGE-HISTORY>"));

    EXPECT_EQ(RunTool({"validate", "out.cdf"}, files.dir.str()).code, 0);
    Result info = RunTool({"info", "out.cdf"}, files.dir.str());
    Result original = RunTool({"info", "sample.cdf"}, files.dir.str());
    EXPECT_EQ(info.out.substr(info.out.find('\n')), original.out.substr(original.out.find('\n')));
}

TEST(Calmorph, FailuresExitWithTheirCodeAndNameTheFile) {
    Files files;
    struct Row {
        std::vector<std::string> args;
        int code;
        std::vector<std::string> err;  // parts of the error output
        const char* out;               // part of the output; nullptr: no output at all
    } rows[] = {
        // Usage errors.
        {{}, 1, {"Usage:"}, nullptr},
        {{"frobnicate"}, 1, {"calmorph: "}, nullptr},
        {{"info", "a.cdf", "b.cdf"}, 1, {"calmorph: "}, nullptr},
        {{"info", "--bogus", "sample.cdf"}, 1, {"calmorph: "}, nullptr},
        {{"convert", "sample.cdf", "existing.cdf", "--comment"}, 1, {"calmorph: "}, nullptr},
        {{"convert", "sample.cdf", ""}, 1, {"calmorph: "}, nullptr},
        {{"schema-location"}, 1, {"calmorph: "}, nullptr},
        // info
        {{"info", "malformed.cdf"},
         2,
         {"malformed.cdf:2:14: error: mismatched tag; expected </FILENAME>\n"},
         nullptr},
        {{"info", "invalid.cdf"}, 2, {"invalid.cdf:2: error: ", "NOTE"}, nullptr},
        {{"info", "missing.cdf"}, 2, {"missing.cdf: error: cannot open"}, nullptr},
        {{"info", "other.xml"}, 2, {"other.xml: error: no CAL-DATA element"}, nullptr},
        {{"info", "twoattrs.cdf"},
         4,
         {"twoattrs.cdf: error: conversion error: reason code 42"},
         nullptr},
        {{"info", "brokenitem.cdf"}, 4, {"reason code 11", "in item \"Broken Item\""}, nullptr},
        // convert: an existing output stays as it was
        {{"convert", "malformed.cdf", "existing.cdf"}, 2, {"malformed.cdf:2:"}, nullptr},
        {{"convert", "nameless.cdf", "existing.cdf"}, 4, {"reason code 30"}, nullptr},
        {{"convert", "sample.cdf", "missing/out.cdf"},
         5,
         {"calmorph: error: cannot save to missing/out.cdf: No such file"},
         nullptr},
        // validate
        {{"validate", "invalid.cdf"},
         3,
         {"invalid.cdf:2: error: not valid against cdf.xsd", "FILENAME"},
         nullptr},
        {{"validate", "malformed.cdf"}, 2, {"malformed.cdf:2:14: error: "}, nullptr},
        {{"validate", "unnamed.cdf"}, 6, {"unnamed.cdf: error: names no schema"}, nullptr},
        {{"validate", "elsewhere.cdf"}, 2, {"nowhere.xsd"}, nullptr},
        {{"validate", "sample.cdf", "invalid.cdf", "malformed.cdf"},
         3,
         {"invalid.cdf:2", "malformed.cdf:2:"},
         "sample.cdf: valid against cdf.xsd\n"},
        {{"validate", "sample.cdf", "elsewhere.cdf", "--schema", "cdf.xsd"},
         0,
         {},
         "elsewhere.cdf: valid against cdf.xsd\n"},
        {{"validate", "--schema", "cdf.xsd", "invalid.cdf"},
         3,
         {"invalid.cdf:2: error: not valid against cdf.xsd", "FILENAME"},
         nullptr},
        {{"validate", "--schema", "none.xsd", "sample.cdf"},
         2,
         {"none.xsd: error: the schema file cannot be loaded"},
         nullptr},
        // schema-location
        {{"schema-location", "sample.cdf"}, 0, {}, "cdf.xsd\n"},
        {{"schema-location", "unnamed.cdf"}, 6, {"unnamed.cdf: error: names no schema"}, nullptr},
        {{"schema-location", "malformed.cdf"}, 2, {"malformed.cdf:2:14: error: "}, nullptr},
    };
    for (const Row& row : rows) {
        std::string label;
        for (const auto& arg : row.args) label += "'" + arg + "' ";
        SCOPED_TRACE(label);
        WriteWholeFile(files.dir / "existing.cdf", "keep me");
        Result result = RunTool(row.args, files.dir.str());
        EXPECT_EQ(result.code, row.code) << result.err;
        for (const std::string& part : row.err)
            EXPECT_TRUE(Contains(result.err, part)) << result.err;
        if (row.err.empty()) {
            EXPECT_EQ(result.err, "");
        }
        if (row.out) {
            EXPECT_TRUE(Contains(result.out, row.out)) << result.out;
        } else {
            EXPECT_EQ(result.out, "");
        }
        EXPECT_EQ(ReadWholeFile(files.dir / "existing.cdf"), "keep me");
        EXPECT_FALSE(fs::exists(files.dir / "missing"));
    }
}
