// The calmorph command-line tool, run as a separate process: exit codes, output, messages.
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/wait.h>

#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

namespace fs = std::filesystem;

namespace {

const std::string kExe = KEST_CALMORPH_EXE;
const std::string kExamples = std::string(KEST_SOURCE_DIR) + "/examples";
const std::string kGolden = std::string(KEST_TEST_DATA_DIR) + "/calmorph";
constexpr const char* kCdfNs = "http://kest.dev/schemas/cdf/1.0";

class TempDir {
  public:
    TempDir() {
        std::string pattern = (fs::temp_directory_path() / "kest-tool-XXXXXX").string();
        if (!mkdtemp(pattern.data())) throw std::runtime_error("mkdtemp failed");
        m_path = pattern;
    }
    ~TempDir() {
        std::error_code ignored;
        fs::remove_all(m_path, ignored);
    }
    std::string operator/(const std::string& name) const { return (m_path / name).string(); }
    std::string str() const { return m_path.string(); }

  private:
    fs::path m_path;
};

void WriteFile(const std::string& path, const std::string& text) {
    std::ofstream out(path, std::ios::binary);
    out << text;
}

std::string ReadFile(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

std::string Quote(const std::string& arg) {
    std::string quoted = "'";
    for (char c : arg) {
        if (c == '\'') {
            quoted += "'\\''";
        } else {
            quoted += c;
        }
    }
    return quoted + "'";
}

struct Result {
    int code = -1;
    std::string out;
    std::string err;
};

// Runs calmorph with `args` in `directory`, capturing both output streams.
Result RunTool(const std::vector<std::string>& args, const std::string& directory) {
    TempDir capture;
    std::string outFile = capture / "out.txt";
    std::string errFile = capture / "err.txt";
    std::string command = "cd " + Quote(directory) + " && " + Quote(kExe);
    for (const std::string& arg : args) command += " " + Quote(arg);
    command += " >" + Quote(outFile) + " 2>" + Quote(errFile);
    int status = std::system(command.c_str());
    Result result;
    result.code = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    result.out = ReadFile(outFile);
    result.err = ReadFile(errFile);
    return result;
}

bool Contains(const std::string& text, const std::string& part) {
    return text.find(part) != std::string::npos;
}

std::string Cdf(const std::string& rootAttributes, const std::string& body) {
    return std::string("<CAL-DATA xmlns=\"") + kCdfNs +
           "\" xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\" " + rootAttributes +
           "><CHANGE-HISTORY/>" + body + "</CAL-DATA>";
}

const std::string kNamed = "xsi:schemaLocation=\"" + std::string(kCdfNs) + " cdf.xsd\"";

// A directory holding the schema, a valid file, an invalid one and a malformed one.
struct Files {
    TempDir dir;
    Files() {
        fs::copy_file(kExamples + "/cdf.xsd", dir / "cdf.xsd");
        fs::copy_file(kExamples + "/sample.cdf", dir / "sample.cdf");
        WriteFile(dir / "invalid.cdf", Cdf(kNamed, "\n<NOTE>no FILENAME before me</NOTE>"));
        WriteFile(dir / "malformed.cdf", Cdf(kNamed, "\n<FILENAME>f</NOTE>"));
        WriteFile(dir / "unnamed.cdf", "<CAL-DATA a=\"\" b=\"i\" c=\"l\"><FILENAME/></CAL-DATA>");
    }
};

}  // namespace

TEST(Calmorph, HelpListsEveryCommandAndExitCode) {
    Result help = RunTool({"--help"}, kExamples);
    EXPECT_EQ(help.code, 0);
    EXPECT_EQ(help.err, "");
    for (const char* part : {"info FILE [--items]", "convert IN OUT [--comment TEXT]",
                             "validate FILE... [--schema XSD]", "schema-location FILE", "--help"}) {
        EXPECT_TRUE(Contains(help.out, part)) << part;
    }
    for (int code = 0; code <= 6; ++code) {
        EXPECT_TRUE(Contains(help.out, "\n  " + std::to_string(code) + "  ")) << "code " << code;
    }

    Result bare = RunTool({}, kExamples);
    EXPECT_EQ(bare.code, 1);
    EXPECT_EQ(bare.out, "");
    EXPECT_TRUE(Contains(bare.err, "Usage:"));
}

TEST(Calmorph, UsageErrorsExitWithOne) {
    const std::vector<std::vector<std::string>> rows = {
        {"frobnicate"},
        {"info"},
        {"info", "a.cdf", "b.cdf"},
        {"info", "--bogus", "sample.cdf"},
        {"convert", "sample.cdf"},
        {"convert", "sample.cdf", "out.cdf", "extra.cdf"},
        {"convert", "sample.cdf", "out.cdf", "--comment"},
        {"convert", "sample.cdf", ""},
        {"validate"},
        {"validate", "sample.cdf", "--schema"},
        {"schema-location"},
        {"schema-location", "a.cdf", "b.cdf"},
    };
    for (const auto& args : rows) {
        std::string label;
        for (const auto& arg : args) label += arg + " ";
        SCOPED_TRACE(label);
        Result result = RunTool(args, kExamples);
        EXPECT_EQ(result.code, 1);
        EXPECT_EQ(result.out, "");
        EXPECT_TRUE(Contains(result.err, "calmorph: ")) << result.err;
    }
}

TEST(Calmorph, InfoPrintsTheSampleAsRecorded) {
    struct Row {
        std::vector<std::string> args;
        const char* golden;
    } rows[] = {
        {{"info", "sample.cdf"}, "sample-info.txt"},
        {{"info", "sample.cdf", "--items"}, "sample-info-items.txt"},
        {{"info", "--items", "sample.cdf"}, "sample-info-items.txt"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.golden);
        Result result = RunTool(row.args, kExamples);
        EXPECT_EQ(result.code, 0);
        EXPECT_EQ(result.err, "");
        EXPECT_EQ(result.out, ReadFile(kGolden + "/" + row.golden));
    }
}

TEST(Calmorph, InfoFailuresNameTheFileAndWhere) {
    Files files;
    WriteFile(files.dir / "twoattrs.cdf", "<CAL-DATA a=\"1\" b=\"2\"/>");
    WriteFile(files.dir / "brokenitem.cdf",
              "<CAL-DATA a=\"\" b=\"i\" c=\"l\"><CAL-LIST><NAME>L</NAME>"
              "<CAL-ITEM><NAME>Broken Item</NAME><AXIS/></CAL-ITEM></CAL-LIST></CAL-DATA>");
    WriteFile(files.dir / "other.xml", "<other><thing/></other>");
    struct Row {
        const char* file;
        int code;
        std::vector<std::string> mentions;
    } rows[] = {
        {"malformed.cdf", 2, {"calmorph: malformed.cdf:2:", "cannot load"}},
        {"invalid.cdf", 2, {"calmorph: invalid.cdf:2", "NOTE"}},
        {"missing.cdf", 2, {"calmorph: missing.cdf", "cannot load"}},
        {"other.xml", 2, {"calmorph: other.xml: no CAL-DATA element"}},
        {"twoattrs.cdf", 4, {"calmorph: twoattrs.cdf: conversion error: reason code 42"}},
        {"brokenitem.cdf", 4, {"reason code 11", "in item \"Broken Item\""}},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.file);
        Result result = RunTool({"info", row.file}, files.dir.str());
        EXPECT_EQ(result.code, row.code);
        EXPECT_EQ(result.out, "");
        for (const std::string& part : row.mentions) {
            EXPECT_TRUE(Contains(result.err, part)) << result.err;
        }
    }
}

TEST(Calmorph, ConvertWritesAValidFileWithTheComment) {
    Files files;
    Result result = RunTool({"convert", "sample.cdf", "out.cdf", "--comment", "from the test"},
                            files.dir.str());
    EXPECT_EQ(result.code, 0);
    EXPECT_EQ(result.out + result.err, "");
    std::string text = ReadFile(files.dir / "out.cdf");
    EXPECT_EQ(text.rfind("<?xml", 0), 0u);
    EXPECT_TRUE(Contains(text, "<!--from the test--><CHANGE-HISTORY>"));

    Result check = RunTool({"validate", "out.cdf"}, files.dir.str());
    EXPECT_EQ(check.code, 0) << check.err;
    Result info = RunTool({"info", "out.cdf"}, files.dir.str());
    Result original = RunTool({"info", "sample.cdf"}, files.dir.str());
    EXPECT_EQ(info.out.substr(info.out.find('\n')), original.out.substr(original.out.find('\n')));
}

TEST(Calmorph, ConvertFailuresLeaveTheOutputAlone) {
    Files files;
    WriteFile(files.dir / "nameless.cdf",
              "<CAL-DATA a=\"\" b=\"i\" c=\"l\"><CHANGE-HISTORY/><FILENAME/><CAL-LIST>"
              "<SYMBOLIC-FILE crc32=\"0x00000001\">s.a2l</SYMBOLIC-FILE></CAL-LIST></CAL-DATA>");
    struct Row {
        const char* label;
        std::string in;
        std::string out;
        int code;
        const char* mentions;
    } rows[] = {
        {"input does not load", "malformed.cdf", "existing.cdf", 2, "malformed.cdf:2:"},
        {"list without name", "nameless.cdf", "existing.cdf", 4, "reason code 30"},
        {"output directory missing", "sample.cdf", "missing/out.cdf", 5,
         "calmorph: missing/out.cdf: cannot write"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        WriteFile(files.dir / "existing.cdf", "keep me");
        Result result = RunTool({"convert", row.in, row.out}, files.dir.str());
        EXPECT_EQ(result.code, row.code);
        EXPECT_TRUE(Contains(result.err, row.mentions)) << result.err;
        EXPECT_EQ(ReadFile(files.dir / "existing.cdf"), "keep me");
        EXPECT_FALSE(fs::exists(files.dir / "missing"));
    }
}

TEST(Calmorph, ValidateReportsEachFile) {
    Files files;
    WriteFile(files.dir / "elsewhere.cdf",
              Cdf("xsi:schemaLocation=\"" + std::string(kCdfNs) + " nowhere.xsd\"",
                  "<FILENAME>f</FILENAME>"));
    struct Row {
        const char* label;
        std::vector<std::string> args;
        int code;
        std::vector<std::string> out;
        std::vector<std::string> err;
    } rows[] = {
        {"valid against the schema it names",
         {"validate", "sample.cdf"},
         0,
         {"sample.cdf: valid against cdf.xsd\n"},
         {}},
        {"invalid",
         {"validate", "invalid.cdf"},
         3,
         {},
         {"calmorph: invalid.cdf:2", "not valid against cdf.xsd", "FILENAME"}},
        {"malformed", {"validate", "malformed.cdf"}, 2, {}, {"calmorph: malformed.cdf:2:"}},
        {"names no schema", {"validate", "unnamed.cdf"}, 6, {}, {"unnamed.cdf: names no schema"}},
        {"named schema missing", {"validate", "elsewhere.cdf"}, 2, {}, {"nowhere.xsd"}},
        {"several files: the highest code",
         {"validate", "sample.cdf", "invalid.cdf", "malformed.cdf"},
         3,
         {"sample.cdf: valid"},
         {"invalid.cdf:2", "malformed.cdf:2:"}},
        {"given schema",
         {"validate", "sample.cdf", "elsewhere.cdf", "--schema", "cdf.xsd"},
         0,
         {"sample.cdf: valid against cdf.xsd\n", "elsewhere.cdf: valid against cdf.xsd\n"},
         {}},
        {"given schema, invalid file",
         {"validate", "--schema", "cdf.xsd", "invalid.cdf"},
         3,
         {},
         {"calmorph: invalid.cdf: not valid against cdf.xsd", "FILENAME"}},
        {"given schema, malformed file",
         {"validate", "--schema", "cdf.xsd", "malformed.cdf"},
         2,
         {},
         {"calmorph: malformed.cdf:2:"}},
        {"given schema missing",
         {"validate", "--schema", "none.xsd", "sample.cdf"},
         2,
         {},
         {"calmorph: none.xsd: the schema file cannot be loaded"}},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        Result result = RunTool(row.args, files.dir.str());
        EXPECT_EQ(result.code, row.code) << result.err;
        for (const std::string& part : row.out)
            EXPECT_TRUE(Contains(result.out, part)) << result.out;
        for (const std::string& part : row.err)
            EXPECT_TRUE(Contains(result.err, part)) << result.err;
        if (row.out.empty()) {
            EXPECT_EQ(result.out, "");
        }
    }
}

TEST(Calmorph, SchemaLocationPrintsWhatTheFileNames) {
    Files files;
    struct Row {
        const char* file;
        int code;
        const char* out;
        const char* err;
    } rows[] = {
        {"sample.cdf", 0, "cdf.xsd\n", ""},
        {"unnamed.cdf", 6, "", "calmorph: unnamed.cdf: names no schema"},
        {"malformed.cdf", 2, "", "calmorph: malformed.cdf:2:"},
        {"missing.cdf", 2, "", "calmorph: missing.cdf"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.file);
        Result result = RunTool({"schema-location", row.file}, files.dir.str());
        EXPECT_EQ(result.code, row.code);
        EXPECT_EQ(result.out, row.out);
        EXPECT_TRUE(Contains(result.err, row.err)) << result.err;
    }
}
