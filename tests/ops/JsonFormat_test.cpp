// The JSON form: lossless round trips through files, the schema beside it, and refusals of JSON
// that is not ours, each with its path.
#include "ops/JsonFormat.h"

#include <gtest/gtest.h>

#include <cmath>
#include <functional>
#include <limits>
#include <nlohmann/json.hpp>

#include "ops/OpsTestUtil.h"

using namespace kest;
using namespace kest::ops;
using test::ScratchDir;

namespace {

std::string Exported(const std::string& file, const ScratchDir& dir) {
    return ExportJson(FromCalData(test::ReadSourceFile(file, dir)));
}

TEST(JsonFormat, ExportThenImportWritesWhatConvertWrites) {
    for (const char* file : test::kOpsDataFiles) {
        SCOPED_TRACE(file);
        ScratchDir dir;
        const KestCdfCalData tree = test::ReadSourceFile(file, dir);
        const std::string json = ExportJson(FromCalData(tree));
        const Document imported = ImportJson(json);
        const std::string converted = test::WrittenBytes(tree, dir);
        EXPECT_EQ(test::WrittenBytes(ToCalData(imported), dir), converted);
        EXPECT_EQ(converted.compare(0, 5, "<?xml"), 0) << converted.substr(0, 60);
        EXPECT_EQ(ExportJson(imported), json);
    }
}

TEST(JsonFormat, ExportsValidateAgainstTheSchema) {
    if (std::system("/usr/bin/python3 -c 'import jsonschema' 2>/dev/null") != 0)
        GTEST_SKIP() << "python3-jsonschema is not installed";
    ScratchDir dir;
    std::string command = "/usr/bin/python3 -c 'import json, sys, jsonschema\n"
                          "schema = json.load(open(sys.argv[1]))\n"
                          "for f in sys.argv[2:]: jsonschema.validate(json.load(open(f)), schema)' " +
                          std::string(KEST_SOURCE_DIR) + "/docs/cdf-json.schema.json";
    int n = 0;
    for (const char* file : test::kOpsDataFiles)
        command += " " + dir.Write(std::to_string(n++) + ".json", Exported(file, dir));
    EXPECT_EQ(std::system(command.c_str()), 0);
    // The schema is not a blank check: a document with an unknown format type fails it.
    nlohmann::json bad = nlohmann::json::parse(Exported("examples/sample.cdf", dir));
    bad["lists"][0]["items"][0]["format"] = "FOO";
    const std::string badFile = dir.Write("bad.json", bad.dump());
    EXPECT_NE(std::system((command + " " + badFile + " 2>/dev/null").c_str()), 0);
}

TEST(JsonFormat, ElementsKeepKindAndValue) {
    const double inf = std::numeric_limits<double>::infinity();
    Item item;
    item.name = "Kinds";
    item.units = "-";
    item.format = "NUMERIC";
    item.values.present = true;
    item.values.elements = {Value::Integer(3), Value::Double(3.0), Value::Double(-0.0),
                            Value::Double(inf), Value::Double(-inf),
                            Value::Double(std::nan("")), Value::String("inf"), Value(),
                            Value::Integer(-2147483647 - 1), Value::Double(0.1 + 0.2)};
    Document document;
    document.lists.push_back(CalList{"L", FileRef{"f", 0}, std::nullopt, std::nullopt, {item}});
    const std::string json = ExportJson(document);
    EXPECT_NE(json.find("\"types\": \"idddddseid\""), std::string::npos) << json;
    EXPECT_NE(json.find("[3, 3.0, -0.0, \"inf\", \"-inf\", \"nan\", \"inf\", null, -2147483648, "
                        "0.30000000000000004]"),
              std::string::npos)
        << json;
    const std::vector<Value> back = ImportJson(json).lists[0].items[0].values.elements;
    ASSERT_EQ(back.size(), item.values.elements.size());
    for (std::size_t i = 0; i < back.size(); ++i) {
        SCOPED_TRACE(i);
        EXPECT_TRUE(back[i] == item.values.elements[i]);
    }
    EXPECT_TRUE(std::signbit(back[2].Number()));
}

struct Refusal {
    const char* label;
    std::function<void(nlohmann::json&)> change;
    const char* path;
    const char* reason;
};

TEST(JsonFormat, RefusesForeignJsonWithItsPath) {
    ScratchDir dir;
    const nlohmann::json base = nlohmann::json::parse(Exported("examples/sample.cdf", dir));
    using J = nlohmann::json;
    const Refusal refusals[] = {
        {"wrong type", [](J& j) { j["lists"][0]["items"][1]["name"] = 5; },
         "lists[0].items[1].name", "expected a string, found an integer"},
        {"missing member", [](J& j) { j.erase("fileName"); }, "fileName", "missing member"},
        {"unknown member", [](J& j) { j["lists"][1]["colour"] = "red"; }, "lists[1].colour",
         "unknown member"},
        {"not ours", [](J& j) { j["format"] = "other"; }, "format", "not a calibration document"},
        {"unknown format type", [](J& j) { j["lists"][0]["items"][2]["format"] = "numeric"; },
         "lists[0].items[2].format", "unknown format type \"numeric\""},
        {"axis format", [](J& j) { j["lists"][0]["items"][1]["axes"][1]["format"] = nullptr; },
         "lists[0].items[1].axes[1].format", "expected a string, found null"},
        {"integer out of range",
         [](J& j) {
             j["lists"][0]["items"][0]["types"] = "i";
             j["lists"][0]["items"][0]["values"] = {1, 2, 3, 3000000000LL, 5};
         },
         "lists[0].items[0].values[3]", "out of the 32-bit range"},
        {"text for a double", [](J& j) { j["lists"][0]["items"][2]["values"][0] = "1e9"; },
         "lists[0].items[2].values[0]", "expected a number, \"inf\""},
        {"text for an empty element",
         [](J& j) {
             j["lists"][0]["items"][2]["types"] = "e";
             j["lists"][0]["items"][2]["values"][0] = "x";
         },
         "lists[0].items[2].values[0]", "expected null"},
        {"types and values disagree", [](J& j) { j["lists"][0]["items"][0]["types"] = "ii"; },
         "lists[0].items[0].types", "2 letters for 5 values"},
        {"unknown type letter", [](J& j) { j["lists"][0]["items"][0]["types"] = "x"; },
         "lists[0].items[0].types", "letters other than"},
        {"axis size", [](J& j) { j["lists"][0]["items"][1]["axes"][0]["size"] = 1LL << 33; },
         "lists[0].items[1].axes[0].size", "out of the 32-bit range"},
        {"crc", [](J& j) { j["lists"][1]["symbolicFile"]["crc32"] = "0x12"; },
         "lists[1].symbolicFile.crc32", "eight hexadecimal digits"},
        {"date", [](J& j) { j["changeHistory"][1]["date"] = "2024-13-01T00:00:00"; },
         "changeHistory[1].date", "reason code 35"},
        {"half a value", [](J& j) { j["lists"][0]["items"][0]["units"] = nullptr; },
         "lists[0].items[0].units", "null together"},
        {"lists not an array", [](J& j) { j["lists"] = J::object(); }, "lists",
         "expected an array, found an object"},
    };
    for (const Refusal& refusal : refusals) {
        SCOPED_TRACE(refusal.label);
        nlohmann::json changed = base;
        refusal.change(changed);
        try {
            ImportJson(changed.dump());
            ADD_FAILURE() << "accepted";
        } catch (const JsonImportError& error) {
            EXPECT_EQ(error.Path(), refusal.path);
            EXPECT_NE(error.Reason().find(refusal.reason), std::string::npos) << error.what();
        }
    }
}

TEST(JsonFormat, RefusesTextThatIsNoDocument) {
    ScratchDir dir;
    const std::string sample = Exported("examples/sample.cdf", dir);
    auto replaced = [&](const std::string& from, const std::string& to) {
        std::string text = sample;
        return text.replace(text.find(from), from.size(), to);
    };
    std::string deepPath;
    for (int i = 0; i < kJsonMaxDepth; ++i) deepPath += "[0]";
    const struct {
        std::string text;
        const char* path;
        const char* reason;
    } cases[] = {
        {"", "", "not JSON"},
        {"{\"format\": \"kestcalmorph-cdf\",}", "format", "not JSON"},
        {"[1, 2]", "", "expected an object, found an array"},
        {std::string(100000, '[') + std::string(100000, ']'), deepPath.c_str(),
         "nested deeper than 32"},
        {replaced("EC16_base.cdf", std::string(kJsonMaxTextBytes + 1, 'a')), "fileName",
         "longer than 16777216"},
        {replaced("[6.5]", "[1e999]"), "lists[0].items[2].values[0]", "number overflow"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.text.substr(0, 40));
        try {
            ImportJson(c.text);
            ADD_FAILURE() << "accepted";
        } catch (const JsonImportError& error) {
            EXPECT_EQ(error.Path(), c.path);
            EXPECT_NE(error.Reason().find(c.reason), std::string::npos) << error.what();
        }
    }
}

}  // namespace
