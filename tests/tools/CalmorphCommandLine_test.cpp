// calmorph's command line as a user meets it: help, version, option errors, standard input and
// output, and the check of what convert writes. Each row runs the real binary.
#include <gtest/gtest.h>
#include <sys/wait.h>

#include <algorithm>
#include <string>
#include <vector>

#include "support/TestFiles.h"

namespace fs = std::filesystem;
using kest::test::ReadWholeFile;
using kest::test::ScratchDir;

namespace {

const std::string kCdfNs = "http://kest.dev/schemas/cdf/1.0";

// A CAL-DATA root in `ns` whose schema attribute is `attribute`="`ns` `location`".
std::string Root(const std::string& ns, const std::string& attribute, const std::string& location,
                 const std::string& body = "<CHANGE-HISTORY/><FILENAME>f</FILENAME>") {
    return "<CAL-DATA xmlns=\"" + ns +
           "\" xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\" " + attribute + "=\"" + ns +
           " " + location + "\">" + body + "</CAL-DATA>";
}

struct Row {
    std::string command;  // shell words after calmorph, run in the scratch folder
    int code;
    std::vector<std::string> out, err;  // parts each stream must hold; {} for an empty stream
    std::vector<std::string> files;     // every file the folder holds afterwards, besides inputs
};

}  // namespace

TEST(CalmorphCommandLine, CommandsAnswerAsTheirHelpSays) {
    ScratchDir dir;
    fs::copy_file(std::string(KEST_SOURCE_DIR) + "/examples/cdf.xsd", dir / "cdf.xsd");
    fs::copy_file(std::string(KEST_SOURCE_DIR) + "/examples/sample.cdf", dir / "sample.cdf");
    dir.Write("notaschema.xsd", "<x/>");
    dir.Write("badschema.cdf", Root(kCdfNs, "xsi:schemaLocation", "notaschema.xsd"));
    // Read without validation (the schema attribute is misspelled), written with a proper one.
    dir.Write("misspelled.cdf", Root("urn:other", "xsi:schemaLocaton", "nowhere.xsd"));
    dir.Write("elsewhere.cdf", Root(kCdfNs, "xsi:schemaLocation", "nowhere.xsd"));
    dir.Write("remote.cdf", Root(kCdfNs, "xsi:schemaLocation", "http://127.0.0.1:9/cdf.xsd"));
    dir.Write("foreign.cdf", Root("urn:other", "xsi:schemaLocation", "nowhere.xsd"));
    dir.Write("invalid.cdf", Root(kCdfNs, "xsi:schemaLocation", "cdf.xsd", "<CHANGE-HISTORY/>"));
    dir.Write("warned.cdf",
              Root(kCdfNs, "xsi:schemaLocation", "cdf.xsd",
                   "<CHANGE-HISTORY/><FILENAME>f</FILENAME><CAL-LIST><NAME>L</NAME><SYMBOLIC-FILE "
                   "crc32=\"0x00000001\">s</SYMBOLIC-FILE><CAL-ITEM><NAME>Idle</NAME><VALUE "
                   "sw-units-ref=\"-\" format-type=\"NUMERIC\">1 98O</VALUE></CAL-ITEM>"
                   "</CAL-LIST>"));
    const std::vector<std::string> inputs = {
        "warned.cdf", "badschema.cdf", "cdf.xsd",    "misspelled.cdf", "notaschema.xsd",
        "sample.cdf", "elsewhere.cdf", "remote.cdf", "foreign.cdf",    "invalid.cdf"};
    const std::string fallback = "note: the schema it names (nowhere.xsd) is not at hand; ";
    const Row rows[] = {
        {"--version", 0, {"calmorph " KEST_PROJECT_VERSION "\n"}, {}, {}},
        {"info --help", 0, {"Usage: calmorph info", "--items", "Exit codes:\n  0  "}, {}, {}},
        {"convert --help", 0, {"--comment TEXT", "\n  5  OUT cannot be written"}, {}, {}},
        {"validate --help", 0, {"--schema XSD", "\n  3  a file is not valid"}, {}, {}},
        {"schema-location --help", 0, {"\n  6  FILE names no schema"}, {}, {}},
        {"info --bogus sample.cdf",
         1,
         {},
         {"error: ", "--bogus", "see 'calmorph info --help'"},
         {}},
        {"convert -x a b", 1, {}, {"error: ", "-x", "see 'calmorph convert --help'"}, {}},
        {"validate", 1, {}, {"error: FILE is required", "see 'calmorph validate --help'"}, {}},
        {"frobnicate", 1, {}, {"calmorph: error: unknown command 'frobnicate'"}, {}},
        {"convert sample.cdf - --comment c", 0, {"<?xml", "<!--c-->", "</CAL-DATA>"}, {}, {}},
        {"convert sample.cdf out.cdf", 0, {}, {}, {"out.cdf"}},
        {"convert misspelled.cdf out.cdf",
         0,
         {},
         {"out.cdf: warning: the output would not read back: ", "nowhere.xsd"},
         {"out.cdf"}},
        {"validate badschema.cdf", 2, {}, {"badschema.cdf: error: ", "notaschema.xsd"}, {}},
        {"info --items - <sample.cdf", 0, {"file: -\n", "item TorqueLimit"}, {}, {}},
        {"validate - <invalid.cdf", 3, {}, {"<stdin>:1:", "error: not valid against cdf.xsd"}, {}},
        {"info elsewhere.cdf",
         0,
         {"schema location: " + kCdfNs},
         {"elsewhere.cdf: " + fallback},
         {}},
        {"info --offline remote.cdf", 0, {"file: remote.cdf"}, {"remote.cdf: note: "}, {}},
        {"info --schema cdf.xsd elsewhere.cdf", 0, {"file: elsewhere.cdf"}, {}, {}},
        {"info foreign.cdf",
         2,
         {},
         {"foreign.cdf: error: ", "hint: use --schema or --no-validate\n"},
         {}},
        {"info --no-validate foreign.cdf", 0, {"namespace: urn:other"}, {}, {}},
        {"convert --strict misspelled.cdf out.cdf", 4, {}, {"out.cdf: warning: "}, {}},
        {"info warned.cdf",
         0,
         {"items: 1"},
         {"warned.cdf:1:", ": warning: item Idle: token \"98O\" read as 98\n"},
         {}},
        {"info --strict warned.cdf", 4, {}, {"warning: item Idle"}, {}},
        {"convert --strict warned.cdf out.cdf", 4, {}, {"warning: item Idle"}, {}},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.command);
        std::string command = "cd '" + dir.str() + "' && '" KEST_CALMORPH_EXE "' " + row.command +
                              " >'" + dir / "stdout" + "' 2>'" + dir / "stderr" + "'";
        const int status = std::system(command.c_str());
        const std::string out = ReadWholeFile(dir / "stdout"), err = ReadWholeFile(dir / "stderr");
        EXPECT_EQ(WIFEXITED(status) ? WEXITSTATUS(status) : -1, row.code) << err;
        for (const auto& [text, parts] : {std::pair{out, row.out}, std::pair{err, row.err}}) {
            if (parts.empty()) {
                EXPECT_EQ(text, "");
            }
            for (const std::string& part : parts) EXPECT_NE(text.find(part), text.npos) << text;
        }
        fs::remove(dir / "stdout");
        fs::remove(dir / "stderr");
        std::vector<std::string> left;
        for (const auto& entry : fs::directory_iterator(dir.Path())) {
            std::string name = entry.path().filename().string();
            if (std::find(inputs.begin(), inputs.end(), name) == inputs.end()) left.push_back(name);
        }
        EXPECT_EQ(left, row.files);
        for (const std::string& name : left) fs::remove(dir / name);
    }
}
