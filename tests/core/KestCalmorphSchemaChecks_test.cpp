// The converter's schema checks: service probe, schema location, reachability and validation.
#include <gtest/gtest.h>

#include <string>

#include "core/KestCalmorph.h"
#include "model/ModelTestDom.h"
#include "support/HttpServer.h"
#include "support/TestFiles.h"

namespace fs = std::filesystem;
using namespace kest;
using test::ReadWholeFile;
using test::ScratchDir;
using test::WriteWholeFile;

namespace {

const std::string kSchema = std::string(KEST_SOURCE_DIR) + "/schema/cdf.xsd";
const std::string kCdfNs = "http://kest.dev/schemas/cdf/1.0";
const std::string kNamed = "xsi:schemaLocation=\"" + kCdfNs + " cdf.xsd\"";

// A small CDF document whose root carries the given schema attributes.
std::string Cdf(const std::string& rootAttributes,
                const std::string& body = "<FILENAME>f</FILENAME>") {
    return "<CAL-DATA xmlns=\"" + kCdfNs +
           "\" xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\" " + rootAttributes +
           "><CHANGE-HISTORY/>" + body + "</CAL-DATA>";
}

std::string CdfAt(const std::string& location) {
    return Cdf("xsi:schemaLocation=\"" + location + "\"");
}

// Changes the current directory for the life of the object.
class CurrentDirectory {
  public:
    explicit CurrentDirectory(const fs::path& directory) : m_previous(fs::current_path()) {
        fs::current_path(directory);
    }
    ~CurrentDirectory() { fs::current_path(m_previous); }

  private:
    fs::path m_previous;
};

}  // namespace

TEST(KestCalmorphSchemaChecks, ExampleSchemaIsACopyOfTheSchema) {
    ASSERT_FALSE(ReadWholeFile(kSchema).empty());
    EXPECT_EQ(ReadWholeFile(std::string(KEST_SOURCE_DIR) + "/examples/cdf.xsd"),
              ReadWholeFile(kSchema));
}

TEST(KestCalmorphSchemaChecks, ServerFileNameNeedsVersionFourOrLater) {
    for (const char* name : {"msxml4.dll", "msxml10.dll", "msxml4.5x.dll", "msxml04.dll", "msxml4",
                             "C:\\WINDOWS\\system32\\msxml4.dll", "/usr/lib/msxml6.dll"}) {
        EXPECT_TRUE(KestCalmorph::IsSupportedServerFileName(name)) << name;
    }
    for (const char* name :
         {"msxml3.dll", "msxml3.99.dll", "msxml.5.dll", "C:\\WINDOWS\\system32\\msxml3.dll",
          "MSXML4.dll", "msxml.dll", "xmsxml6.dll", "msxml 6.dll", "msxml+6.dll", "msxmlinf.dll",
          "msxml0x10.dll", ""}) {
        EXPECT_FALSE(KestCalmorph::IsSupportedServerFileName(name)) << name;
    }
    EXPECT_FALSE(KestCalmorph::IsSupportedServerFileName(nullptr));
}

TEST(KestCalmorphSchemaChecks, ServiceIsInstalledAndSaysNothing) {
    KestCalmorph converter;
    testing::internal::CaptureStderr();
    EXPECT_TRUE(converter.IsMSXML4Installed());
    EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
}

TEST(KestCalmorphSchemaChecks, DetectsTheLocationAfterTheFirstBlank) {
    ScratchDir dir;
    fs::copy_file(kSchema, dir / "cdf.xsd");
    WriteWholeFile(dir / "other.xsd",
                   "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\" "
                   "targetNamespace=\"urn:other\"><xs:element name=\"o\"/></xs:schema>");
    const std::string longDirectory(150, 'd');
    WriteWholeFile(dir / (longDirectory + "/cdf.xsd"), ReadWholeFile(kSchema));
    struct Row {
        const char* label;
        std::string document;  // empty: no file at all
        std::string location;  // "45": reason code 45; "!": empty with a message
    } rows[] = {
        {"namespace and cdf.xsd", CdfAt(kCdfNs + " cdf.xsd"), "cdf.xsd"},
        {"two pairs", CdfAt(kCdfNs + " cdf.xsd urn:other other.xsd"),
         "cdf.xsd urn:other other.xsd"},
        {"a location alone", CdfAt("cdf.xsd"), "cdf.xsd"},
        {"longer than any fixed buffer", CdfAt(kCdfNs + " " + longDirectory + "/cdf.xsd"),
         longDirectory + "/cdf.xsd"},
        {"no schema attributes", "<CAL-DATA a=\"1\" b=\"2\" c=\"3\"/>", "45"},
        {"another prefix for the schema instance",
         "<CAL-DATA xmlns=\"" + kCdfNs +
             "\" xmlns:s=\"http://www.w3.org/2001/XMLSchema-instance\" " + "s:schemaLocation=\"" +
             kCdfNs + " cdf.xsd\"><CHANGE-HISTORY/><FILENAME/></CAL-DATA>",
         "45"},
        {"not well-formed", "<CAL-DATA " + kNamed + "><FILENAME></CAL-DATA>", "!"},
        {"not valid against the schema it names", Cdf(kNamed, "<NOTE>no FILENAME</NOTE>"), "!"},
        {"missing file", "", "!"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        const std::string path = dir / "data.cdf";
        fs::remove(path);
        if (!row.document.empty()) WriteWholeFile(path, row.document);
        KestCalmorph converter;
        CComBSTR message(u"stale");
        try {
            CComBSTR location = converter.DetectSchemaLocation(CComBSTR(path), message);
            EXPECT_EQ(location.ToString(), row.location == "!" ? "" : row.location);
            ASSERT_NE(message.m_str, nullptr);
            EXPECT_EQ(message.Length() != 0, row.location == "!") << message.ToString();
            EXPECT_NE(message.ToString(), "stale");
        } catch (const KestCalmorphDLLError& error) {
            EXPECT_EQ(row.location, "45");
            EXPECT_EQ(error.GetReason(), reason::kSchemaLocationAbsent);
        }
    }
}

TEST(KestCalmorphSchemaChecks, LocalLocationsAreLookedUpWhereTheyBelong) {
    ScratchDir dir;
    for (const char* file : {"beside/cdf.xsd", "cwd-with/cdf.xsd", "cwd-with/CDF.XSD",
                             "cwd-with/schemas/other.xsd", "cwd-with/HTTP:/host/cdf.xsd"}) {
        WriteWholeFile(dir / file, "schema");
    }
    fs::create_directories(dir / "cwd-without");
    const std::string with = dir / "cwd-with", without = dir / "cwd-without";
    const std::string beside = dir / "beside/data.cdf";
    struct Row {
        const char* label;
        CComBSTR location;
        std::string dataPath;
        std::string currentDirectory;
        bool valid;
    } rows[] = {
        {"cdf.xsd beside the data file", CComBSTR(u"cdf.xsd"), beside, without, true},
        {"cdf.xsd only in the current directory", CComBSTR(u"cdf.xsd"), dir / "alone/data.cdf",
         with, false},
        {"data path without separator uses the current directory", CComBSTR(u"cdf.xsd"), "data.cdf",
         with, true},
        {"data path without separator, nothing there", CComBSTR(u"cdf.xsd"), "data.cdf", without,
         false},
        {"CDF.XSD is a path of its own, not the conventional name", CComBSTR(u"CDF.XSD"), beside,
         without, false},
        {"CDF.XSD in the current directory", CComBSTR(u"CDF.XSD"), beside, with, true},
        {"relative path against the current directory", CComBSTR(u"schemas/other.xsd"), beside,
         with, true},
        {"absolute path", CComBSTR((dir / "beside/cdf.xsd").c_str()), "", without, true},
        {"absolute path, missing", CComBSTR((dir / "beside/none.xsd").c_str()), "", without, false},
        {"a directory is no schema", CComBSTR((dir / "beside").c_str()), "", without, false},
        {"empty location", CComBSTR(u""), beside, with, false},
        {"null location", CComBSTR(), beside, with, false},
        {"upper-case HTTP is a file path", CComBSTR(u"HTTP://host/cdf.xsd"), beside, with, true},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        CurrentDirectory cwd(row.currentDirectory);
        KestCalmorph converter;
        EXPECT_EQ(converter.IsSchemaLocationValid(row.location, CComBSTR(row.dataPath)), row.valid);
    }
}

TEST(KestCalmorphSchemaChecks, HttpLocationsAreFetched) {
    ScratchDir dir;
    fs::copy_file(kSchema, dir / "cdf.xsd");
    WriteWholeFile(dir / "notes.txt", "plain text, not XML");
    test::LocalHttpServer server(dir.str());
    if (!server.Started()) GTEST_SKIP() << server.Error();
    const std::string closed =
        "http://127.0.0.1:" + std::to_string(test::FindFreeLocalPort()) + "/cdf.xsd";
    const struct {
        std::string url;
        bool valid;
    } rows[] = {{server.Url("cdf.xsd"), true},
                {server.Url("missing.xsd"), false},
                {server.Url("notes.txt"), false},
                {closed, false}};
    for (const auto& row : rows) {
        SCOPED_TRACE(row.url);
        KestCalmorph converter;
        EXPECT_EQ(converter.IsSchemaLocationValid(CComBSTR(row.url), CComBSTR(u"data.cdf")),
                  row.valid);
    }
}

TEST(KestCalmorphSchemaChecks, ValidatesAgainstTheGivenSchema) {
    ScratchDir dir;
    const std::string schema = dir / "cdf.xsd", data = dir / "data.cdf";
    fs::copy_file(kSchema, schema);
    struct Row {
        const char* label;
        std::string document;  // empty: no file
        const char* mentions;  // nullptr: valid; otherwise text of the non-empty reason
    } rows[] = {
        {"valid", Cdf(kNamed), nullptr},
        {"the schema the file names is not consulted", CdfAt(kCdfNs + " nowhere.xsd"), nullptr},
        {"missing element", Cdf(kNamed, "<NOTE>n</NOTE>"), "FILENAME"},
        {"not well-formed", "<CAL-DATA><FILENAME></CAL-DATA>", ""},
        {"missing file", "", ""},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        fs::remove(data);
        if (!row.document.empty()) WriteWholeFile(data, row.document);
        KestCalmorph converter;
        std::string message =
            converter.ValidateXMLFileWithLocaleXSD(CComBSTR(data), CComBSTR(schema)).ToString();
        if (!row.mentions) {
            EXPECT_EQ(message, "");
        } else {
            EXPECT_NE(message, "");
            EXPECT_NE(message.find(row.mentions), std::string::npos) << message;
        }
    }

    // Problems of the schema itself are errors, not findings about the data.
    WriteWholeFile(data, Cdf(kNamed));
    WriteWholeFile(dir / "broken.xsd", "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\">");
    WriteWholeFile(dir / "foreign.xsd",
                   "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\" "
                   "targetNamespace=\"urn:foreign\"><xs:element name=\"CAL-DATA\"/></xs:schema>");
    KestCalmorph converter;
    for (const char* name : {"none.xsd", "broken.xsd"}) {
        SCOPED_TRACE(name);
        test::ExpectDllError(
            [&] { converter.ValidateXMLFileWithLocaleXSD(CComBSTR(data), CComBSTR(dir / name)); },
            reason::kSchemaNotLoaded);
    }
    EXPECT_THROW(
        converter.ValidateXMLFileWithLocaleXSD(CComBSTR(data), CComBSTR(dir / "foreign.xsd")),
        _com_error);
    test::ExpectComError(
        [&] { converter.ValidateXMLFileWithLocaleXSD(CComBSTR(), CComBSTR(schema)); }, E_POINTER);
}
