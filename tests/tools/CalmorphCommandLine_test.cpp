// calmorph's command line as a user meets it: help, version, option errors, standard input and
// output, and the check of what convert writes. Each row runs the real binary.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "support/TestFiles.h"
#include "support/ToolRun.h"

namespace fs = std::filesystem;
using kest::test::ReadWholeFile;
using kest::test::RunTool;
using kest::test::ScratchDir;

namespace {

const std::string kGolden = std::string(KEST_TEST_DATA_DIR) + "/calmorph/";
const std::string kCdfNs = "http://kest.dev/schemas/cdf/1.0";

// A CAL-DATA root in `ns` whose schema attribute is `attribute`="`ns` `location`".
std::string Root(const std::string& ns, const std::string& attribute, const std::string& location,
                 const std::string& body = "<CHANGE-HISTORY/><FILENAME>f</FILENAME>") {
    return "<CAL-DATA xmlns=\"" + ns +
           "\" xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\" " + attribute + "=\"" + ns +
           " " + location + "\">" + body + "</CAL-DATA>";
}

// A folder holding the schema, the sample and files that fail in each of the ways the tool tells
// apart.
struct Files {
    ScratchDir dir;
    Files() {
        fs::copy_file(std::string(KEST_SOURCE_DIR) + "/examples/cdf.xsd", dir / "cdf.xsd");
        fs::copy_file(std::string(KEST_SOURCE_DIR) + "/examples/sample.cdf", dir / "sample.cdf");
        const std::string ns = "xsi:schemaLocation";
        dir.Write("notaschema.xsd", "<x/>");
        dir.Write("badschema.cdf", Root(kCdfNs, ns, "notaschema.xsd"));
        // Read without validation (the schema attribute is misspelled), written with a proper one.
        dir.Write("misspelled.cdf", Root("urn:other", "xsi:schemaLocaton", "nowhere.xsd"));
        dir.Write("elsewhere.cdf", Root(kCdfNs, ns, "nowhere.xsd"));
        dir.Write("remote.cdf", Root(kCdfNs, ns, "http://127.0.0.1:9/cdf.xsd"));
        dir.Write("foreign.cdf", Root("urn:other", ns, "nowhere.xsd"));
        dir.Write("nofilename.cdf", Root(kCdfNs, ns, "cdf.xsd", "<CHANGE-HISTORY/>"));
        dir.Write(
            "warned.cdf",
            Root(kCdfNs, ns, "cdf.xsd",
                 "<CHANGE-HISTORY/><FILENAME>f</FILENAME><CAL-LIST><NAME>L</NAME><SYMBOLIC-"
                 "FILE crc32=\"0x00000001\">s</SYMBOLIC-FILE><CAL-ITEM><NAME>Idle</NAME><VALUE "
                 "sw-units-ref=\"-\" format-type=\"NUMERIC\">1 98O</VALUE></CAL-ITEM>"
                 "</CAL-LIST>"));
        dir.Write("invalid.cdf", Root(kCdfNs, ns, "cdf.xsd",
                                      "<CHANGE-HISTORY/>\n<NOTE>no FILENAME before me</NOTE>"));
        dir.Write("malformed.cdf",
                  Root(kCdfNs, ns, "cdf.xsd", "<CHANGE-HISTORY/>\n<FILENAME>f</NOTE>"));
        dir.Write("unnamed.cdf", "<CAL-DATA a=\"\" b=\"i\" c=\"l\"><FILENAME/></CAL-DATA>");
        dir.Write("twoattrs.cdf", "<CAL-DATA a=\"1\" b=\"2\"/>");
        dir.Write("other.xml", "<other><thing/></other>");
        dir.Write("brokenitem.cdf",
                  "<CAL-DATA a=\"\" b=\"i\" c=\"l\"><CAL-LIST><NAME>L</NAME><CAL-ITEM><NAME>"
                  "Broken Item</NAME><AXIS/></CAL-ITEM></CAL-LIST></CAL-DATA>");
        dir.Write("nameless.cdf",
                  "<CAL-DATA a=\"\" b=\"i\" c=\"l\"><CHANGE-HISTORY/><FILENAME/><CAL-LIST>"
                  "<SYMBOLIC-FILE crc32=\"0x1\">s.a2l</SYMBOLIC-FILE></CAL-LIST></CAL-DATA>");
        dir.Write("existing.cdf", "keep me");
    }
    // The files the folder holds now: the inputs of a table.
    std::vector<std::string> Names() const {
        std::vector<std::string> names;
        for (const auto& entry : fs::directory_iterator(dir.Path()))
            names.push_back(entry.path().filename().string());
        return names;
    }
};

}  // namespace

TEST(CalmorphCommandLine, CommandsAnswerAsTheirHelpSays) {
    Files files;
    const std::string fallback = "note: the schema it names (nowhere.xsd) is not at hand; ";
    const std::vector<kest::test::ToolRow> rows = {
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
        {"validate - <nofilename.cdf",
         3,
         {},
         {"<stdin>:1:", "error: not valid against cdf.xsd"},
         {}},
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
    kest::test::CheckTool(files.dir, files.Names(), rows);
}

TEST(Calmorph, InfoPrintsTheSampleAsRecorded) {
    Files files;
    for (const std::string args :
         {"info sample.cdf", "info sample.cdf --items", "info --items sample.cdf"}) {
        SCOPED_TRACE(args);
        std::string out, err;
        EXPECT_EQ(RunTool(files.dir, args, out, err), 0);
        EXPECT_EQ(err, "");
        EXPECT_EQ(out,
                  ReadWholeFile(kGolden + (args == "info sample.cdf" ? "sample-info.txt"
                                                                     : "sample-info-items.txt")));
    }
}

TEST(Calmorph, ConvertWritesAValidFileWithTheComment) {
    Files files;
    std::string out, err, info, original;
    EXPECT_EQ(RunTool(files.dir, "convert sample.cdf out.cdf --comment 'from the test'", out, err),
              0);
    EXPECT_EQ(out + err, "");
    std::string text = ReadWholeFile(files.dir / "out.cdf");
    EXPECT_EQ(text.rfind("<?xml", 0), 0u);
    EXPECT_NE(text.find("<!--from the test--><CHANGE-HISTORY>"), text.npos);

    EXPECT_EQ(RunTool(files.dir, "validate out.cdf", out, err), 0);
    RunTool(files.dir, "info out.cdf", info, err);
    RunTool(files.dir, "info sample.cdf", original, err);
    EXPECT_EQ(info.substr(info.find('\n')), original.substr(original.find('\n')));
}

// Help lists every code; the failures exit with theirs, name the file and leave an existing
// output as it was.
TEST(Calmorph, FailuresExitWithTheirCodeAndNameTheFile) {
    Files files;
    kest::test::CheckTool(
        files.dir, files.Names(),
        {
            {"--help",
             0,
             {"info FILE [--items]", "convert IN OUT [--comment TEXT]",
              "validate FILE... [--schema XSD]", "schema-location FILE", "\n  0  ", "\n  1  ",
              "\n  2  ", "\n  3  ", "\n  4  ", "\n  5  ", "\n  6  "},
             {},
             {}},
            // Usage errors.
            {"", 1, {}, {"Usage:"}, {}},
            {"info a.cdf b.cdf", 1, {}, {"calmorph: "}, {}},
            {"convert sample.cdf existing.cdf --comment", 1, {}, {"calmorph: "}, {}},
            {"convert sample.cdf ''", 1, {}, {"calmorph: "}, {}},
            {"schema-location", 1, {}, {"calmorph: "}, {}},
            // info
            {"info malformed.cdf",
             2,
             {},
             {"malformed.cdf:2:14: error: mismatched tag; expected </FILENAME>\n"},
             {}},
            {"info invalid.cdf", 2, {}, {"invalid.cdf:2: error: ", "NOTE"}, {}},
            {"info missing.cdf", 2, {}, {"missing.cdf: error: cannot open"}, {}},
            {"info other.xml", 2, {}, {"other.xml: error: no CAL-DATA element"}, {}},
            {"info twoattrs.cdf",
             4,
             {},
             {"twoattrs.cdf: error: conversion error: reason code 42"},
             {}},
            {"info brokenitem.cdf", 4, {}, {"reason code 11", "in item \"Broken Item\""}, {}},
            // convert: an existing output stays as it was
            {"convert malformed.cdf existing.cdf", 2, {}, {"malformed.cdf:2:"}, {}},
            {"convert nameless.cdf existing.cdf", 4, {}, {"reason code 30"}, {}},
            {"convert sample.cdf missing/out.cdf",
             5,
             {},
             {"calmorph: error: cannot save to missing/out.cdf: No such file"},
             {}},
            // validate
            {"validate invalid.cdf",
             3,
             {},
             {"invalid.cdf:2: error: not valid against cdf.xsd", "FILENAME"},
             {}},
            {"validate malformed.cdf", 2, {}, {"malformed.cdf:2:14: error: "}, {}},
            {"validate unnamed.cdf", 6, {}, {"unnamed.cdf: error: names no schema"}, {}},
            {"validate elsewhere.cdf", 2, {}, {"nowhere.xsd"}, {}},
            {"validate sample.cdf invalid.cdf malformed.cdf",
             3,
             {"sample.cdf: valid against cdf.xsd\n"},
             {"invalid.cdf:2", "malformed.cdf:2:"},
             {}},
            {"validate sample.cdf elsewhere.cdf --schema cdf.xsd",
             0,
             {"elsewhere.cdf: valid against cdf.xsd\n"},
             {},
             {}},
            {"validate --schema cdf.xsd invalid.cdf",
             3,
             {},
             {"invalid.cdf:2: error: not valid against cdf.xsd", "FILENAME"},
             {}},
            {"validate --schema none.xsd sample.cdf",
             2,
             {},
             {"none.xsd: error: the schema file cannot be loaded"},
             {}},
            // schema-location
            {"schema-location sample.cdf", 0, {"cdf.xsd\n"}, {}, {}},
            {"schema-location unnamed.cdf", 6, {}, {"unnamed.cdf: error: names no schema"}, {}},
            {"schema-location malformed.cdf", 2, {}, {"malformed.cdf:2:14: error: "}, {}},
        });
    EXPECT_EQ(ReadWholeFile(files.dir / "existing.cdf"), "keep me");
}
