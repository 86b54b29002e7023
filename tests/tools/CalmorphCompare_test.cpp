// calmorph diff, merge and check, and many files at once, run as the real binary on variants
// of examples/sample.cdf written into a scratch folder: one table per command.
#include <gtest/gtest.h>
#include <sys/wait.h>

#include <string>
#include <utility>
#include <vector>

#include "support/TestFiles.h"

namespace fs = std::filesystem;
using kest::test::ReadWholeFile;
using kest::test::ScratchDir;
using kest::test::WriteWholeFile;

namespace {

struct Row {
    std::string command;  // shell text; `calmorph` runs the binary, in the scratch folder
    int code;
    std::vector<std::string> out;  // parts standard output must hold, in this order
    std::vector<std::string> absent = {};
};

// sample.cdf with each (from, to) replaced once.
std::string Variant(const std::vector<std::pair<std::string, std::string>>& edits) {
    std::string text = ReadWholeFile(std::string(KEST_SOURCE_DIR) + "/examples/sample.cdf");
    for (const auto& [from, to] : edits) {
        const auto at = text.find(from);
        if (at == std::string::npos) ADD_FAILURE() << from;
        if (at != std::string::npos) text.replace(at, from.size(), to);
    }
    return text;
}

struct Folder {
    ScratchDir dir;
    Folder(const std::vector<std::pair<std::string, std::string>>& files) {
        fs::copy_file(std::string(KEST_SOURCE_DIR) + "/schema/cdf.xsd", dir / "cdf.xsd");
        for (const auto& [name, text] : files) WriteWholeFile(dir / name, text);
    }
    void Check(const std::vector<Row>& rows) const {
        for (const Row& row : rows) {
            SCOPED_TRACE(row.command);
            const std::string command =
                "cd '" + dir.str() + "' && calmorph() { '" KEST_CALMORPH_EXE "' \"$@\"; } && { " +
                row.command + "; } >.out 2>.err";
            const int status = std::system(command.c_str());
            const std::string out = ReadWholeFile(dir / ".out");
            EXPECT_EQ(WIFEXITED(status) ? WEXITSTATUS(status) : -1, row.code)
                << out << ReadWholeFile(dir / ".err");
            std::size_t from = 0;
            for (const std::string& part : row.out) {
                const std::size_t at = out.find(part, from);
                EXPECT_NE(at, out.npos) << part << "\n in: " << out;
                if (at != out.npos) from = at + part.size();
            }
            for (const std::string& part : row.absent) EXPECT_EQ(out.find(part), out.npos) << out;
        }
    }
};

const std::pair<std::string, std::string> kTorque{"110.5 145", "111 145"};
const std::pair<std::string, std::string> kIdle{"1200 980", "1250 980"};

TEST(CalmorphDiff, ReportsChangedItemsAndElementsByValue) {
    Folder folder({{"a.cdf", Variant({})},
                   {"b.cdf", Variant({kTorque})},
                   {"c.cdf", Variant({{"Kest Automotive", "Kestrel Automotive"},
                                      {"<NAME>KnockRetardMax", "<NAME>KnockRetardLimit"},
                                      {"size=\"5\"", "size=\"6\""},
                                      {"sbrandt", "jdoe"}})},
                   {"d.cdf", Variant({{"45.5 98 ", "45.5 98.0 "}, {"6.5<", "6.50<"}})},
                   {"e.cdf", Variant({{"<NAME>TorqueLimit", "<NAME>IdleSpeedTarget"}})}});
    folder.Check({
        {"calmorph diff a.cdf a.cdf", 0, {}},
        {"calmorph diff a.cdf d.cdf", 0, {}},
        {"calmorph diff a.cdf b.cdf",
         1,
         {"changed EngineControl/TorqueLimit\n  values[4] at (2000, 60): 110.5 -> 111 (difference "
          "0.5)\n"}},
        {"calmorph diff a.cdf b.cdf --tolerance 0.5", 0, {}},
        {"calmorph diff a.cdf b.cdf --tolerance 0.49", 1, {"values[4]"}},
        {"calmorph diff a.cdf b.cdf --rel-tolerance 0.0046", 0, {}},
        {"calmorph diff a.cdf b.cdf --rel-tolerance 0.0044", 1, {"values[4]"}},
        {"calmorph diff a.cdf c.cdf",
         1,
         {"company: \"Kest Automotive Engineering\" -> \"Kestrel Automotive Engineering\"",
          "history[1]: \"2024-04-02T16:05:48 sbrandt",
          "only in a.cdf: EngineControl/KnockRetardMax",
          "only in c.cdf: EngineControl/KnockRetardLimit",
          "changed EngineControl/IdleSpeedTarget\n  axis[0].size: \"5\" -> \"6\""}},
        {"calmorph diff a.cdf c.cdf --ignore-history", 1, {"company"}, {"history"}},
        {"calmorph diff e.cdf a.cdf",
         1,
         {"only in e.cdf: EngineControl/IdleSpeedTarget (occurrence 2)",
          "only in a.cdf: EngineControl/TorqueLimit",
          "note: EngineControl/IdleSpeedTarget occurs more than once"}},
        {"calmorph diff a.cdf b.cdf --json",
         1,
         {"\"equal\": false", "\"item\": \"TorqueLimit\"", "\"axisPoints\": [\n", "\"2000\"",
          "\"a\": 110.5", "\"b\": 111", "\"difference\": 0.5"}},
        {"calmorph diff a.cdf", 2, {}},
        {"calmorph diff a.cdf missing.cdf", 2, {}},
        {"calmorph diff --help", 0, {"0  A and B are equal", "1  A and B differ", "2  usage"}},
    });
}

TEST(CalmorphMerge, TakesOneSidedChangesAndRefusesConflicts) {
    const auto history = [](const char* date) {
        return std::pair<std::string, std::string>{
            "  </CHANGE-HISTORY>", std::string("    <CHANGE><USERNAME>x</USERNAME><DATE>") + date +
                                       "</DATE></CHANGE>\n  </CHANGE-HISTORY>"};
    };
    Folder folder({{"base.cdf", Variant({})},
                   {"ours.cdf", Variant({kIdle, history("2025-02-01T00:00:00")})},
                   {"theirs.cdf", Variant({kTorque, history("2025-01-01T00:00:00")})},
                   {"clash.cdf", Variant({{"1200 980", "1300 980"}})},
                   {"gone.cdf", Variant({{"<NAME>KnockRetardMax", "<NAME>Gone"}})},
                   {"knock.cdf", Variant({{"6.5<", "7<"}})},
                   {"want.cdf", Variant({kIdle, kTorque})}});
    folder.Check({
        {"calmorph merge base.cdf ours.cdf theirs.cdf -o m.cdf && calmorph diff m.cdf want.cdf",
         1,
         {"history[2]: \"2025-01-01T00:00:00 x\" -> (none)",
          "history[3]: \"2025-02-01T00:00:00 x\" -> (none)"},
         {"changed"}},
        {"calmorph merge base.cdf base.cdf base.cdf -o - | calmorph diff - base.cdf", 0, {}},
        {"(calmorph merge base.cdf ours.cdf clash.cdf -o x.cdf; c=$?; test ! -e x.cdf && exit $c)",
         1,
         {"conflict: EngineControl/IdleSpeedTarget values[0]: base \"1200\", ours \"1250\", "
          "theirs \"1300\""}},
        {"calmorph merge base.cdf ours.cdf clash.cdf -o x.cdf --prefer theirs && calmorph diff "
         "x.cdf clash.cdf --ignore-history",
         0,
         {"resolved to theirs: EngineControl/IdleSpeedTarget values[0]"}},
        {"calmorph merge base.cdf gone.cdf theirs.cdf -o x.cdf && calmorph diff x.cdf base.cdf",
         1,
         {"only in x.cdf: EngineControl/Gone", "only in base.cdf: EngineControl/KnockRetardMax",
          "changed EngineControl/TorqueLimit"}},
        {"calmorph merge base.cdf gone.cdf knock.cdf -o x.cdf --json",
         1,
         {"\"item\": \"KnockRetardMax\"", "\"element\": \"item\""}},
        {"calmorph merge base.cdf ours.cdf -o x.cdf", 2, {}},
        {"calmorph merge --help", 0, {"1  conflicts and no --prefer"}},
    });
}

TEST(CalmorphCheck, ReportsFindingsWithTheirPlaceAndVerifiesCrcs) {
    Folder folder(
        {{"a.cdf", Variant({})},
         {"bad.cdf", Variant({{"<NAME>KnockRetardMax", "<NAME>TorqueLimit"},
                              {"size=\"5\" sw-units=\"degC\" format-type=\"NUMERIC\">-20 "
                               "0 20 40",
                               "size=\"6\" sw-units=\"degC\" format-type=\"NUMERIC\">-20 "
                               "0 40 20"},
                              {"980 850", "98x 850"},
                              {"45.5 98 120.25", "45.5 98"}})},
         {"crc.cdf", Variant({{"0x3A5F19C2", "0x3610A686"}, {"0x0000002A", "0x3610A687"}})},
         {"EC16_V0412.a2l", "hello"},
         {"DIAG_V0107.a2l", "hello"},
         {"EC16_V0412.hex/x", ""}});
    folder.Check({
        {"calmorph check a.cdf", 0, {}},
        {"calmorph check bad.cdf",
         1,
         {"bad.cdf:31:", ": read-warning: IdleSpeedTarget: the token \"98x\" was read as 98",
          "bad.cdf:28:5: axis-size: EngineControl/IdleSpeedTarget: axis 1 has size 6 but 5",
          "bad.cdf:28:5: axis-order: EngineControl/IdleSpeedTarget: axis 1 points are not "
          "strictly monotonic at point 3 (40 then 20)",
          "bad.cdf:34:5: value-count: EngineControl/TorqueLimit:",
          "bad.cdf:42:5: duplicate-item: EngineControl/TorqueLimit"}},
        {"calmorph check crc.cdf --verify-crc",
         1,
         {"crc.cdf:23:3: crc-match: EngineControl: SYMBOLIC-FILE EC16_V0412.a2l: CRC-32 "
          "0x3610A686 matches",
          "crc-directory: EngineControl: TARGET-IMAGE EC16_V0412.hex",
          "crc-mismatch: Diagnostics: SYMBOLIC-FILE DIAG_V0107.a2l: CRC-32 is 0x3610A686, the "
          "file states 0x3610A687",
          "crc-missing: Diagnostics: TARGET-IMAGE DIAG_V0107.hex"}},
        {"calmorph check bad.cdf a.cdf --json", 1, {"\"line\": 28", "\"kind\": \"axis-size\""}},
        {"calmorph check --help", 0, {"0  no findings", "1  findings", "2  usage"}},
    });
}

TEST(CalmorphManyFiles, KeepsTheOrderOfTheArguments) {
    std::vector<std::pair<std::string, std::string>> files;
    for (char c = 'a'; c <= 'f'; ++c) files.push_back({std::string(1, c) + ".cdf", Variant({})});
    files.push_back({"bad.cdf", Variant({{"980 850", "98x 850"}})});
    files.push_back({"out/.keep", ""});
    Folder folder(files);
    folder.Check({
        {"calmorph validate f.cdf a.cdf e.cdf b.cdf d.cdf c.cdf -j 3",
         0,
         {"f.cdf: valid", "a.cdf: valid", "e.cdf: valid", "b.cdf: valid", "d.cdf: valid",
          "c.cdf: valid"}},
        {"calmorph check a.cdf bad.cdf b.cdf x.cdf -j 2 2>&1", 2, {"bad.cdf:31:", "x.cdf: error"}},
        {"(calmorph convert a.cdf b.cdf x.cdf c.cdf --output-dir out -j 2; c=$?; ls out; exit $c)",
         2,
         {"a.cdf\nb.cdf\nc.cdf\n"}},
        {"calmorph convert a.cdf b.cdf c.cdf", 1, {}},
    });
}

}  // namespace
