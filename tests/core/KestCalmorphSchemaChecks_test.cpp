// The converter's schema checks: service probe, schema location, reachability and validation.
#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>

#include "core/KestCalmorph.h"
#include "support/HttpServer.h"

namespace fs = std::filesystem;
using namespace kest;

namespace {

const std::string kExamples = std::string(KEST_SOURCE_DIR) + "/examples";
const std::string kSchema = std::string(KEST_SOURCE_DIR) + "/schema/cdf.xsd";
constexpr const char* kCdfNs = "http://kest.dev/schemas/cdf/1.0";

class TempDir {
  public:
    TempDir() {
        std::string pattern = (fs::temp_directory_path() / "kest-schema-XXXXXX").string();
        if (!mkdtemp(pattern.data())) throw std::runtime_error("mkdtemp failed");
        m_path = pattern;
    }
    ~TempDir() {
        std::error_code ignored;
        fs::remove_all(m_path, ignored);
    }
    std::string operator/(const std::string& name) const { return (m_path / name).string(); }
    const fs::path& path() const { return m_path; }

  private:
    fs::path m_path;
};

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

void WriteFile(const std::string& path, const std::string& text) {
    fs::create_directories(fs::path(path).parent_path());
    std::ofstream out(path, std::ios::binary);
    out << text;
}

std::string ReadFile(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

// A small valid CDF document whose root carries the given schema attributes.
std::string Cdf(const std::string& rootAttributes, const std::string& body = "") {
    return std::string("<CAL-DATA xmlns=\"") + kCdfNs +
           "\" xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\" " + rootAttributes +
           "><CHANGE-HISTORY/>" + (body.empty() ? "<FILENAME>f.cdf</FILENAME>" : body) +
           "</CAL-DATA>";
}

std::string CdfAt(const std::string& location) {
    return Cdf("xsi:schemaLocation=\"" + location + "\"");
}

}  // namespace

TEST(KestCalmorphSchemaChecks, ExampleSchemaIsACopyOfTheSchema) {
    std::string schema = ReadFile(kSchema);
    ASSERT_FALSE(schema.empty());
    EXPECT_EQ(ReadFile(kExamples + "/cdf.xsd"), schema);
}

TEST(KestCalmorphSchemaChecks, ServerFileNameNeedsVersionFourOrLater) {
    struct Row {
        const char* name;
        bool supported;
    } rows[] = {
        {"msxml4.dll", true},
        {"msxml6.dll", true},
        {"msxml3.dll", false},
        {"msxml10.dll", true},
        {"msxml4.5x.dll", true},
        {"msxml3.99.dll", false},
        {"msxml04.dll", true},
        {"msxml.5.dll", false},
        {"msxml4", true},
        {"C:\\WINDOWS\\system32\\msxml4.dll", true},
        {"C:\\WINDOWS\\system32\\msxml3.dll", false},
        {"/usr/lib/msxml6.dll", true},
        {"MSXML4.dll", false},
        {"msxml", false},
        {"msxml.dll", false},
        {"xmsxml6.dll", false},
        {"msxml 6.dll", false},
        {"msxml+6.dll", false},
        {"msxmlinf.dll", false},
        {"msxml0x10.dll", false},
        {"", false},
        {nullptr, false},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.name ? row.name : "(null)");
        EXPECT_EQ(KestCalmorph::IsSupportedServerFileName(row.name), row.supported);
    }
}

TEST(KestCalmorphSchemaChecks, ServiceIsInstalledAndSaysNothing) {
    KestCalmorph converter;
    testing::internal::CaptureStderr();
    bool installed = converter.IsMSXML4Installed();
    std::string written = testing::internal::GetCapturedStderr();
    EXPECT_TRUE(installed);
    EXPECT_EQ(written, "");
}

TEST(KestCalmorphSchemaChecks, DetectsTheLocationAfterTheFirstBlank) {
    TempDir dir;
    fs::copy_file(kSchema, dir / "cdf.xsd");
    WriteFile(dir / "other.xsd",
              "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\" "
              "targetNamespace=\"urn:other\"><xs:element name=\"o\"/></xs:schema>");
    const std::string longDirectory(150, 'd');
    fs::create_directories(dir / longDirectory);
    fs::copy_file(kSchema, dir / (longDirectory + "/cdf.xsd"));

    struct Row {
        const char* label;
        std::string document;
        std::string location;
    } rows[] = {
        {"namespace and cdf.xsd", CdfAt(std::string(kCdfNs) + " cdf.xsd"), "cdf.xsd"},
        {"two pairs", CdfAt(std::string(kCdfNs) + " cdf.xsd urn:other other.xsd"),
         "cdf.xsd urn:other other.xsd"},
        {"a location alone", CdfAt("cdf.xsd"), "cdf.xsd"},
        {"longer than any fixed buffer",
         CdfAt(std::string(kCdfNs) + " " + longDirectory + "/cdf.xsd"), longDirectory + "/cdf.xsd"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        WriteFile(dir / "data.cdf", row.document);
        KestCalmorph converter;
        CComBSTR message(u"stale");
        CComBSTR location = converter.DetectSchemaLocation(CComBSTR(dir / "data.cdf"), message);
        EXPECT_EQ(location.ToString(), row.location);
        EXPECT_NE(message.m_str, nullptr);
        EXPECT_EQ(message.ToString(), "");
    }
}

TEST(KestCalmorphSchemaChecks, DetectionFailures) {
    TempDir dir;
    fs::copy_file(kSchema, dir / "cdf.xsd");
    const std::string named = "xsi:schemaLocation=\"" + std::string(kCdfNs) + " cdf.xsd\"";
    struct Row {
        const char* label;
        std::string document;  // empty: no file at all
        bool throws45;
    } rows[] = {
        {"no schema attributes", "<CAL-DATA a=\"1\" b=\"2\" c=\"3\"/>", true},
        {"another prefix for the schema instance",
         "<CAL-DATA xmlns=\"" + std::string(kCdfNs) +
             "\" xmlns:s=\"http://www.w3.org/2001/XMLSchema-instance\" s:schemaLocation=\"" +
             kCdfNs + " cdf.xsd\"><CHANGE-HISTORY/><FILENAME/></CAL-DATA>",
         true},
        {"not well-formed", "<CAL-DATA " + named + "><FILENAME></CAL-DATA>", false},
        {"not valid against the schema it names", Cdf(named, "<NOTE>no FILENAME</NOTE>"), false},
        {"missing file", "", false},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        std::string path = dir / "data.cdf";
        fs::remove(path);
        if (!row.document.empty()) WriteFile(path, row.document);
        KestCalmorph converter;
        CComBSTR message(u"stale");
        if (row.throws45) {
            try {
                converter.DetectSchemaLocation(CComBSTR(path), message);
                ADD_FAILURE() << "no error";
            } catch (const KestCalmorphDLLError& error) {
                EXPECT_EQ(error.GetReason(), reason::kSchemaLocationAbsent);
            }
        } else {
            CComBSTR location = converter.DetectSchemaLocation(CComBSTR(path), message);
            EXPECT_EQ(location.Length(), 0u);
            EXPECT_NE(message.ToString(), "");
            EXPECT_NE(message.ToString(), "stale");
        }
    }
}

TEST(KestCalmorphSchemaChecks, LocalLocationsAreLookedUpWhereTheyBelong) {
    TempDir dir;
    WriteFile(dir / "beside/data.cdf", "<x/>");
    WriteFile(dir / "beside/cdf.xsd", "schema");
    WriteFile(dir / "alone/data.cdf", "<x/>");
    WriteFile(dir / "cwd-with/cdf.xsd", "schema");
    WriteFile(dir / "cwd-with/CDF.XSD", "schema");
    WriteFile(dir / "cwd-with/schemas/other.xsd", "schema");
    WriteFile(dir / "cwd-with/HTTP:/host/cdf.xsd", "schema");
    fs::create_directories(dir / "cwd-without");
    const std::string withSchemas = dir / "cwd-with";
    const std::string withoutSchemas = dir / "cwd-without";

    struct Row {
        const char* label;
        CComBSTR location;
        std::string dataPath;
        std::string currentDirectory;
        bool valid;
    } rows[] = {
        {"cdf.xsd beside the data file", CComBSTR(u"cdf.xsd"), dir / "beside/data.cdf",
         withoutSchemas, true},
        {"cdf.xsd only in the current directory", CComBSTR(u"cdf.xsd"), dir / "alone/data.cdf",
         withSchemas, false},
        {"data path without separator uses the current directory", CComBSTR(u"cdf.xsd"), "data.cdf",
         withSchemas, true},
        {"data path without separator, nothing there", CComBSTR(u"cdf.xsd"), "data.cdf",
         withoutSchemas, false},
        {"CDF.XSD is a path of its own, not the conventional name", CComBSTR(u"CDF.XSD"),
         dir / "beside/data.cdf", withoutSchemas, false},
        {"CDF.XSD in the current directory", CComBSTR(u"CDF.XSD"), dir / "beside/data.cdf",
         withSchemas, true},
        {"relative path against the current directory", CComBSTR(u"schemas/other.xsd"),
         dir / "beside/data.cdf", withSchemas, true},
        {"absolute path", CComBSTR((dir / "beside/cdf.xsd").c_str()), "", withoutSchemas, true},
        {"absolute path, missing", CComBSTR((dir / "beside/none.xsd").c_str()), "", withoutSchemas,
         false},
        {"a directory is no schema", CComBSTR((dir / "beside").c_str()), "", withoutSchemas, false},
        {"empty location", CComBSTR(u""), dir / "beside/data.cdf", withSchemas, false},
        {"null location", CComBSTR(), dir / "beside/data.cdf", withSchemas, false},
        {"upper-case HTTP is a file path", CComBSTR(u"HTTP://host/cdf.xsd"),
         dir / "beside/data.cdf", withSchemas, true},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        CurrentDirectory cwd(row.currentDirectory);
        KestCalmorph converter;
        EXPECT_EQ(converter.IsSchemaLocationValid(row.location, CComBSTR(row.dataPath)), row.valid);
    }
}

TEST(KestCalmorphSchemaChecks, HttpLocationsAreFetched) {
    TempDir dir;
    fs::copy_file(kSchema, dir / "cdf.xsd");
    WriteFile(dir / "notes.txt", "plain text, not XML");
    test::LocalHttpServer server(dir.path().string());
    if (!server.Started()) GTEST_SKIP() << server.Error();
    int closedPort = test::FindFreeLocalPort();

    struct Row {
        const char* label;
        std::string url;
        bool valid;
    } rows[] = {
        {"schema served", server.Url("cdf.xsd"), true},
        {"not found", server.Url("missing.xsd"), false},
        {"served but not XML", server.Url("notes.txt"), false},
        {"nobody listening", "http://127.0.0.1:" + std::to_string(closedPort) + "/cdf.xsd", false},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        KestCalmorph converter;
        EXPECT_EQ(converter.IsSchemaLocationValid(CComBSTR(row.url), CComBSTR(u"data.cdf")),
                  row.valid);
    }
}

TEST(KestCalmorphSchemaChecks, ValidatesAgainstTheGivenSchema) {
    TempDir dir;
    const std::string schema = dir / "cdf.xsd";
    fs::copy_file(kSchema, schema);
    const std::string named = "xsi:schemaLocation=\"" + std::string(kCdfNs) + " cdf.xsd\"";

    struct Row {
        const char* label;
        std::string document;  // empty: no file
        const char* expect;    // "" valid, "FAIL", or nullptr: some other non-empty reason
        const char* mentions;  // text the reason contains, if any
    } rows[] = {
        {"valid", Cdf(named), "", nullptr},
        {"the schema the file names is not consulted",
         Cdf("xsi:schemaLocation=\"" + std::string(kCdfNs) + " nowhere.xsd\""), "", nullptr},
        {"missing element", Cdf(named, "<NOTE>n</NOTE>"), nullptr, "FILENAME"},
        {"not well-formed", "<CAL-DATA><FILENAME></CAL-DATA>", nullptr, nullptr},
        {"missing file", "", nullptr, nullptr},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        const std::string data = dir / "data.cdf";
        fs::remove(data);
        if (!row.document.empty()) WriteFile(data, row.document);
        KestCalmorph converter;
        std::string message =
            converter.ValidateXMLFileWithLocaleXSD(CComBSTR(data), CComBSTR(schema)).ToString();
        if (row.expect) {
            EXPECT_EQ(message, row.expect);
        } else {
            EXPECT_NE(message, "");
        }
        if (row.mentions) {
            EXPECT_NE(message.find(row.mentions), std::string::npos) << message;
        }
    }
}

TEST(KestCalmorphSchemaChecks, SchemaFileProblemsThrow) {
    TempDir dir;
    const std::string data = dir / "data.cdf";
    WriteFile(data, CdfAt(std::string(kCdfNs) + " cdf.xsd"));
    WriteFile(dir / "broken.xsd", "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\">");
    WriteFile(dir / "foreign.xsd",
              "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\" "
              "targetNamespace=\"urn:foreign\"><xs:element name=\"CAL-DATA\"/></xs:schema>");

    struct Row {
        const char* label;
        std::string schema;
    } rows44[] = {
        {"schema missing", dir / "none.xsd"},
        {"schema not well-formed", dir / "broken.xsd"},
    };
    for (const Row& row : rows44) {
        SCOPED_TRACE(row.label);
        KestCalmorph converter;
        try {
            converter.ValidateXMLFileWithLocaleXSD(CComBSTR(data), CComBSTR(row.schema));
            ADD_FAILURE() << "no error";
        } catch (const KestCalmorphDLLError& error) {
            EXPECT_EQ(error.GetReason(), reason::kSchemaNotLoaded);
        }
    }

    KestCalmorph converter;
    EXPECT_THROW(
        converter.ValidateXMLFileWithLocaleXSD(CComBSTR(data), CComBSTR(dir / "foreign.xsd")),
        _com_error);
    try {
        converter.ValidateXMLFileWithLocaleXSD(CComBSTR(), CComBSTR(kSchema.c_str()));
        ADD_FAILURE() << "no error";
    } catch (const _com_error& error) {
        EXPECT_EQ(error.Error(), E_POINTER);
    }
}
