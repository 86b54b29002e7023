// calmorph show, export and import, run as the real binary on the files in tests/data/: one
// table per command, then the round trip export -> import against convert on every file.
#include <gtest/gtest.h>

#include <regex>
#include <string>
#include <vector>

#include "support/TestFiles.h"
#include "support/ToolRun.h"

namespace fs = std::filesystem;
using kest::test::ReadWholeFile;
using kest::test::ScratchDir;

namespace {

const std::vector<std::string> kDataFiles = {"examples/sample.cdf", "tests/data/ops/edge.cdf",
                                             "tests/data/schema/valid-compact.cdf",
                                             "tests/data/schema/valid-indented.cdf"};

// A scratch folder with the schema and the data files (by their file names).
struct Folder {
    ScratchDir dir;
    std::vector<std::string> inputs{"cdf.xsd"};
    Folder() {
        fs::copy_file(std::string(KEST_SOURCE_DIR) + "/schema/cdf.xsd", dir / "cdf.xsd");
        for (const std::string& file : kDataFiles) Add(fs::path(file).filename(), file);
    }
    void Add(const std::string& name, const std::string& source) {
        fs::copy_file(std::string(KEST_SOURCE_DIR) + "/" + source, dir / name);
        inputs.push_back(name);
    }
    int Run(const std::string& args, std::string& out, std::string& err) const {
        return kest::test::RunTool(dir, args, out, err);
    }
    void Check(const std::vector<kest::test::ToolRow>& rows) const {
        kest::test::CheckTool(dir, inputs, rows);
    }
};

TEST(CalmorphShow, PrintsItemsByTheirLayout) {
    Folder folder;
    folder.Check({
        {"show sample.cdf TorqueLimit",
         0,
         {"item TorqueLimit\n  list: EngineControl\n  format: NUMERIC, units: Nm\n",
          "map: 4 x 3 (rpm down, % across, Nm)\n    rpm \\ %    20    60     100\n"
          "       1000  45.5    98  120.25\n       2000    52 110.5     145\n"},
         {},
         {}},
        {"show sample.cdf 'Idle*'", 0, {"curve: 5 points\n    degC  rpm\n     -20 1200\n"}, {}, {}},
        {"show sample.cdf KnockRetardMax DiagProtocol",
         0,
         {"  value: 6.5\n", "\n\nitem DiagProtocol", "  value: UDS_ON_CAN\n"},
         {},
         {}},
        {"show sample.cdf --list Diagnostics",
         0,
         {"item FaultLampMode", "    MEDIUM BLINK\n"},
         {},
         {}},
        {"show edge.cdf Cube CountMismatch",
         0,
         {"  values: 2 x 2 x 2\n", "    [1,1,0] 6\n", "finding: 2 values, but the axes give 3\n"},
         {"edge.cdf:40:56: warning: item Spaces: token \"\" read as 0\n"},
         {}},
        {"show sample.cdf 'Torque?imit' --json",
         0,
         {"\"shape\": [4, 3]", "\"values\": [[45.5, 98, 120.25], [52, 110.5, 145]"},
         {},
         {}},
        {"show sample.cdf Idle Nope*", 7, {}, {"sample.cdf: error: no item matches \"Idle\""}, {}},
        {"show sample.cdf --list Nowhere", 7, {}, {"error: no list named \"Nowhere\""}, {}},
    });
}

TEST(CalmorphExport, WritesJsonAndCsv) {
    Folder folder;
    folder.Check({
        {"export sample.cdf --format json -o s.json", 0, {}, {}, {"s.json"}},
        {"export sample.cdf --format json",
         0,
         {"{\n  \"format\": \"kestcalmorph-cdf\",", "\"values\": [1200.0, 980, 850, 780, 760]"},
         {},
         {}},
        {"export sample.cdf --format csv",
         0,
         {"list,item,format,units,index,x,y,value\r\n",
          "\r\nEngineControl,TorqueLimit,NUMERIC,Nm,5,2000,100,145\r\n",
          "\r\nDiagnostics,FaultLampMode,STRING,-,1,MEDIUM,,BLINK\r\n"},
         {},
         {}},
        {"export edge.cdf --format csv -o -",
         0,
         {"\r\n\"Edge,List\",Words,STRING,\"in \"\"q\"\"\",0,\"low, cold\",,\"a,b\"\r\n"},
         {"edge.cdf:40:56: warning: item Spaces: token \"\" read as 0\n"},
         {}},
        {"export missing.cdf --format json -o s.json", 2, {}, {"missing.cdf: error: "}, {}},
        {"export sample.cdf --format xml", 1, {}, {"--format: xml not in {json,csv}"}, {}},
        {"export sample.cdf --format csv -o nowhere/s.csv", 5, {}, {"error: "}, {}},
    });
}

TEST(CalmorphImport, WritesTheFileOrNamesThePathOfTheFault) {
    Folder folder;
    std::string json, err;
    ASSERT_EQ(folder.Run("export sample.cdf --format json", json, err), 0);
    auto variant = [&](const std::string& name, const std::string& from, const std::string& to) {
        std::string text = json;
        text.replace(text.find(from), from.size(), to);
        folder.dir.Write(name, text);
        folder.inputs.push_back(name);
    };
    variant("sample.json", "", "");
    variant("wrongtype.json", "\"name\": \"TorqueLimit\"", "\"name\": 5");
    variant("nameless.json", "\"name\": \"Diagnostics\"", "\"name\": null");
    variant("notjson.json", "\"version\": 1,", "\"version\": 1,,");
    folder.Check({
        {"import sample.json -o out.cdf", 0, {}, {}, {"out.cdf"}},
        {"import sample.json -o out.cdf --indent", 0, {}, {}, {"out.cdf"}},
        {"import sample.json -o -", 0, {"<?xml", "<VALUE sw-units-ref=\"rpm\""}, {}, {}},
        {"import wrongtype.json -o out.cdf",
         2,
         {},
         {"wrongtype.json: error: lists[0].items[1].name: expected a string, found an integer"},
         {}},
        {"import notjson.json -o out.cdf", 2, {}, {"notjson.json: error: version: not JSON"}, {}},
        {"import nameless.json -o out.cdf", 4, {}, {"reason code 30"}, {}},
        {"import missing.json -o out.cdf", 2, {}, {"missing.json: error: cannot read"}, {}},
        {"import sample.json", 1, {}, {"--output is required"}, {}},
    });
}

TEST(CalmorphImport, ExportThenImportWritesWhatConvertWrites) {
    Folder folder;
    for (const std::string& file : kDataFiles) {
        const std::string name = fs::path(file).filename();
        SCOPED_TRACE(name);
        for (const char* indent : {"", " --indent"}) {
            std::string out, err;
            EXPECT_EQ(folder.Run("export " + name +
                                     " --format json -o e.json && '" KEST_CALMORPH_EXE
                                     "' import e.json -o imported.cdf" +
                                     indent + " && '" KEST_CALMORPH_EXE "' convert " + name +
                                     " converted.cdf" + indent,
                                 out, err),
                      0)
                << err;
            // A change entry without a date is dated when it is read, so two runs may differ
            // there by a second.
            const std::regex date("<DATE>[^<]*</DATE>");
            EXPECT_EQ(std::regex_replace(ReadWholeFile(folder.dir / "imported.cdf"), date, ""),
                      std::regex_replace(ReadWholeFile(folder.dir / "converted.cdf"), date, ""));
        }
    }
}

}  // namespace
