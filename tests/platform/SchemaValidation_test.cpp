// XSD validation against the schemas a document names, the compiled-schema cache, and http
// fetching. Servers used here listen on 127.0.0.1 only.
#include "platform/detail/SchemaValidation.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <stdexcept>
#include <thread>

#include "support/HttpServer.h"

namespace fs = std::filesystem;
using kest::S_OK;
using kest::XML_E_INVALID;
using kest::XML_E_PARSEFAILED;
using kest::detail::HttpGet;
using kest::detail::SchemaRef;
using kest::detail::ValidateAgainstNamedSchemas;
using kest::detail::ValidationOutcome;

namespace {

const std::string kCdfNs = "http://kest.dev/schemas/cdf/1.0";
const std::string kCdfXsd = std::string(KEST_SOURCE_DIR) + "/schema/cdf.xsd";
const std::string kDataDir = std::string(KEST_TEST_DATA_DIR) + "/schema";

std::string ReadFile(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

void WriteFile(const fs::path& path, const std::string& text) {
    fs::create_directories(path.parent_path());
    std::ofstream(path, std::ios::binary) << text;
}

class TempDir {
  public:
    TempDir() {
        std::string pattern = (fs::temp_directory_path() / "kest-schema-XXXXXX").string();
        if (!::mkdtemp(pattern.data())) throw std::runtime_error("mkdtemp failed");
        m_path = pattern;
    }
    ~TempDir() {
        std::error_code ignored;
        fs::remove_all(m_path, ignored);
    }
    const fs::path& Path() const { return m_path; }
    std::string operator/(const std::string& name) const { return (m_path / name).string(); }

  private:
    fs::path m_path;
};

/// A tiny schema: root <r> in `ns` holding one <v> of the given simple type.
std::string TinySchema(const std::string& ns, const std::string& type) {
    return "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\" targetNamespace=\"" + ns +
           "\" elementFormDefault=\"qualified\"><xs:element name=\"r\"><xs:complexType>"
           "<xs:sequence><xs:element name=\"v\" type=\"" +
           type +
           "\"/></xs:sequence>"
           "</xs:complexType></xs:element></xs:schema>";
}

std::string TinyDocument(const std::string& ns, const std::string& value) {
    return "<r xmlns=\"" + ns + "\"><v>" + value + "</v></r>";
}

/// Answers one http request on 127.0.0.1 with a fixed response, from a thread; gives up after
/// a few seconds when no request comes.
class CannedResponder {
  public:
    explicit CannedResponder(std::string response) : m_response(std::move(response)) {
        m_socket = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        socklen_t length = sizeof address;
        if (m_socket < 0 || ::bind(m_socket, reinterpret_cast<sockaddr*>(&address), length) != 0 ||
            ::getsockname(m_socket, reinterpret_cast<sockaddr*>(&address), &length) != 0 ||
            ::listen(m_socket, 4) != 0)
            throw std::runtime_error("cannot listen on 127.0.0.1");
        m_port = ntohs(address.sin_port);
        m_thread = std::thread([this] {
            pollfd waiting{m_socket, POLLIN, 0};
            if (::poll(&waiting, 1, 5000) != 1) return;
            int client = ::accept(m_socket, nullptr, nullptr);
            if (client < 0) return;
            char request[4096];
            (void)::recv(client, request, sizeof request, 0);
            (void)::send(client, m_response.data(), m_response.size(), MSG_NOSIGNAL);
            ::close(client);
        });
    }
    ~CannedResponder() {
        m_thread.join();
        ::close(m_socket);
    }
    std::string Url() const { return "http://127.0.0.1:" + std::to_string(m_port) + "/s.xsd"; }

  private:
    std::string m_response;
    int m_socket = -1;
    int m_port = 0;
    std::thread m_thread;
};

void SetModificationTime(const std::string& path, time_t seconds) {
    struct timespec times[2] = {{seconds, 0}, {seconds, 0}};
    ASSERT_EQ(::utimensat(AT_FDCWD, path.c_str(), times, 0), 0);
}

}  // namespace

TEST(SchemaValidation, CdfDocumentsAgainstTheCdfSchema) {
    struct Row {
        const char* file;
        kest::HRESULT code;
        long line;
        const char* fragment;
    };
    const Row rows[] = {
        {"valid-compact.cdf", S_OK, 0, ""},
        {"valid-indented.cdf", S_OK, 0, ""},
        {"missing-filename.cdf", XML_E_INVALID, 7,
         "CAL-LIST': This element is not expected. Expected is ( "
         "{http://kest.dev/schemas/cdf/1.0}FILENAME )."},
        {"wrong-order.cdf", XML_E_INVALID, 6, "FILENAME': This element is not expected."},
        {"bad-crc32.cdf", XML_E_INVALID, 10, "attribute 'crc32': [facet 'pattern']"},
        {"bad-date.cdf", XML_E_INVALID, 9, "The value '2024-05-06 07:08:09' is not accepted"},
        {"missing-value.cdf", XML_E_INVALID, 13, "CAL-ITEM': Missing child element(s)."},
        {"bad-axis-size.cdf", XML_E_INVALID, 13, "'4294967295' is not a valid value"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.file);
        std::string path = kDataDir + "/" + row.file;
        ValidationOutcome outcome =
            ValidateAgainstNamedSchemas(ReadFile(path), path, {{kCdfNs, kCdfXsd}}, false);
        EXPECT_EQ(outcome.code, row.code) << outcome.reason;
        EXPECT_EQ(outcome.line, row.line);
        if (row.code == S_OK) {
            EXPECT_EQ(outcome.reason, "");
        } else {
            EXPECT_EQ(outcome.reason.rfind(path + ":" + std::to_string(row.line) + ": ", 0), 0u)
                << outcome.reason;
            EXPECT_NE(outcome.reason.find(row.fragment), std::string::npos) << outcome.reason;
        }
    }
}

TEST(SchemaValidation, XmllintAgreesWithTheCdfSchema) {
    if (std::system("xmllint --version > /dev/null 2>&1") != 0) GTEST_SKIP() << "no xmllint";
    const char* valid[] = {"valid-compact.cdf", "valid-indented.cdf"};
    const char* invalid[] = {"missing-filename.cdf", "wrong-order.cdf",   "bad-crc32.cdf",
                             "bad-date.cdf",         "missing-value.cdf", "bad-axis-size.cdf"};
    auto run = [](const char* file) {
        std::string command = "xmllint --noout --schema '" + kCdfXsd + "' '" + kDataDir + "/" +
                              file + "' > /dev/null 2>&1";
        return std::system(command.c_str());
    };
    EXPECT_EQ(std::system(("xmllint --noout '" + kCdfXsd + "'").c_str()), 0);
    for (const char* file : valid) EXPECT_EQ(run(file), 0) << file;
    for (const char* file : invalid) EXPECT_NE(run(file), 0) << file;
}

TEST(SchemaValidation, RelativeLocationsResolveAgainstTheDocumentDirectory) {
    TempDir dir;
    WriteFile(dir.Path() / "data" / "cdf.xsd", ReadFile(kCdfXsd));
    WriteFile(dir.Path() / "schemas" / "cdf.xsd", ReadFile(kCdfXsd));
    WriteFile(dir.Path() / "with space %20" / "cdf.xsd", ReadFile(kCdfXsd));
    std::string document = ReadFile(kDataDir + "/valid-compact.cdf");
    std::string documentPath = dir / "data/a.cdf";
    const char* locations[] = {"cdf.xsd", "./cdf.xsd", "../schemas/cdf.xsd",
                               "../schemas/../data/cdf.xsd", "../with space %20/cdf.xsd"};
    for (const char* location : locations) {
        SCOPED_TRACE(location);
        ValidationOutcome outcome =
            ValidateAgainstNamedSchemas(document, documentPath, {{kCdfNs, location}}, false);
        EXPECT_EQ(outcome.code, S_OK) << outcome.reason;
    }
    // A file: URL names the same file.
    std::string fileUrl = "file://" + (dir / "schemas/cdf.xsd");
    EXPECT_EQ(ValidateAgainstNamedSchemas(document, documentPath, {{kCdfNs, fileUrl}}, false).code,
              S_OK);
}

TEST(SchemaValidation, UnusableSchemasFailNamingTheLocation) {
    TempDir dir;
    WriteFile(dir.Path() / "broken.xsd",
              "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\">\n<xs:element");
    WriteFile(dir.Path() / "not-a-schema.xsd", ReadFile(kDataDir + "/valid-compact.cdf"));
    WriteFile(dir.Path() / "bad-type.xsd", TinySchema(kCdfNs, "xs:nosuchtype"));
    std::string withEntity = TinySchema(kCdfNs, "xs:int");
    withEntity.insert(withEntity.find("<xs:element"),
                      "<xs:annotation><xs:documentation>&e;</xs:documentation></xs:annotation>");
    WriteFile(dir.Path() / "entity.xsd",
              "<!DOCTYPE xs:schema [<!ENTITY e SYSTEM \"" + kCdfXsd + "\">]>" + withEntity);
    fs::create_directories(dir.Path() / "folder.xsd");
    struct Row {
        std::string location;
        std::string fragment;
    };
    const Row rows[] = {
        {"missing.xsd", "missing.xsd cannot be read: No such file or directory"},
        {"broken.xsd", "broken.xsd:2: "},
        {"not-a-schema.xsd", "is not a schema document"},
        {"bad-type.xsd", "nosuchtype' does not resolve to a(n) type definition"},
        {"folder.xsd", "not a regular file"},
        {"entity.xsd", "external resource '" + kCdfXsd + "' refused"},
        {"ftp://127.0.0.1/cdf.xsd", "unsupported scheme"},
        {"http://127.0.0.1:9/cdf.xsd",
         "schema location http://127.0.0.1:9/cdf.xsd requires the ServerHTTPRequest property"},
        {"", "empty schema location"},
    };
    std::string document = ReadFile(kDataDir + "/valid-compact.cdf");
    for (const Row& row : rows) {
        SCOPED_TRACE(row.location);
        ValidationOutcome outcome =
            ValidateAgainstNamedSchemas(document, dir / "a.cdf", {{kCdfNs, row.location}}, false);
        EXPECT_EQ(outcome.code, XML_E_PARSEFAILED);
        EXPECT_NE(outcome.reason.find(row.fragment), std::string::npos) << outcome.reason;
    }
}

TEST(SchemaValidation, SchemaForAnotherNamespaceIsRefused) {
    std::string document = ReadFile(kDataDir + "/valid-compact.cdf");
    ValidationOutcome outcome =
        ValidateAgainstNamedSchemas(document, "a.cdf", {{"urn:other", kCdfXsd}}, false);
    EXPECT_EQ(outcome.code, XML_E_PARSEFAILED);
    EXPECT_NE(outcome.reason.find("has target namespace '" + kCdfNs +
                                  "', but the document names it for 'urn:other'"),
              std::string::npos)
        << outcome.reason;
}

TEST(SchemaValidation, MalformedDocumentGivesParseFailureWithPosition) {
    std::string document =
        "<?xml version=\"1.0\"?>\n<CAL-DATA xmlns=\"" + kCdfNs + "\"><CHANGE-HISTORY>\n</CAL-DATA>";
    ValidationOutcome outcome =
        ValidateAgainstNamedSchemas(document, "/d/m.cdf", {{kCdfNs, kCdfXsd}}, false);
    EXPECT_EQ(outcome.code, XML_E_PARSEFAILED);
    EXPECT_EQ(outcome.line, 3);
    EXPECT_GT(outcome.column, 0);
    EXPECT_EQ(outcome.reason.rfind("/d/m.cdf:3: ", 0), 0u) << outcome.reason;

    outcome = ValidateAgainstNamedSchemas("", "/d/empty.cdf", {{kCdfNs, kCdfXsd}}, false);
    EXPECT_EQ(outcome.code, XML_E_PARSEFAILED);
    EXPECT_NE(outcome.reason.find("/d/empty.cdf"), std::string::npos) << outcome.reason;
}

TEST(SchemaValidation, ExternalEntitiesAndDtdsAreNeverRead) {
    TempDir dir;
    // Were either file read, the document would stop being well-formed.
    WriteFile(dir.Path() / "broken.ent", "<unclosed");
    WriteFile(dir.Path() / "broken.dtd", "<!ELEMENT");
    std::string document =
        "<?xml version=\"1.0\"?>\n<!DOCTYPE r SYSTEM \"broken.dtd\" [\n"
        "<!ENTITY ext SYSTEM \"broken.ent\">]>\n" +
        std::string("<r xmlns=\"urn:t\"><v>&ext;</v></r>");
    WriteFile(dir.Path() / "t.xsd", TinySchema("urn:t", "xs:string"));
    ValidationOutcome outcome =
        ValidateAgainstNamedSchemas(document, dir / "doc.xml", {{"urn:t", "t.xsd"}}, false);
    EXPECT_EQ(outcome.code, S_OK) << outcome.reason;
}

TEST(SchemaValidation, CacheFollowsTheSchemaFileModificationTime) {
    TempDir dir;
    std::string schemaPath = dir / "t.xsd";
    std::string intSchema = TinySchema("urn:t", "xs:int");
    std::string stringSchema = TinySchema("urn:t", "xs:string");
    // Same size, so only the modification time tells the versions apart.
    intSchema.insert(intSchema.find("<xs:element"), stringSchema.size() - intSchema.size(), ' ');
    ASSERT_EQ(intSchema.size(), stringSchema.size());
    std::string document = TinyDocument("urn:t", "text");
    auto validate = [&] {
        return ValidateAgainstNamedSchemas(document, dir / "d.xml", {{"urn:t", "t.xsd"}}, false)
            .code;
    };

    WriteFile(schemaPath, intSchema);
    SetModificationTime(schemaPath, 1000000000);
    EXPECT_EQ(validate(), XML_E_INVALID);

    // Content changed behind an unchanged time and size: the compiled schema is reused.
    WriteFile(schemaPath, stringSchema);
    SetModificationTime(schemaPath, 1000000000);
    EXPECT_EQ(validate(), XML_E_INVALID);

    SetModificationTime(schemaPath, 1000000060);
    EXPECT_EQ(validate(), S_OK);

    // A change of size with the time kept also makes it recompile.
    WriteFile(schemaPath, TinySchema("urn:t", "xs:int"));
    SetModificationTime(schemaPath, 1000000060);
    EXPECT_EQ(validate(), XML_E_INVALID);
}

TEST(SchemaValidation, ConcurrentValidationsShareCompiledSchemas) {
    TempDir dir;
    WriteFile(dir.Path() / "int.xsd", TinySchema("urn:i", "xs:int"));
    const std::string cdfValid = ReadFile(kDataDir + "/valid-compact.cdf");
    const std::string cdfInvalid = ReadFile(kDataDir + "/bad-crc32.cdf");
    std::atomic<int> wrong{0};
    auto work = [&](int thread) {
        for (int i = 0; i < 20; ++i) {
            int which = (thread + i) % 4;
            ValidationOutcome outcome;
            kest::HRESULT expected = S_OK;
            switch (which) {
                case 0:
                    outcome =
                        ValidateAgainstNamedSchemas(cdfValid, "v.cdf", {{kCdfNs, kCdfXsd}}, false);
                    break;
                case 1:
                    outcome = ValidateAgainstNamedSchemas(cdfInvalid, "i.cdf", {{kCdfNs, kCdfXsd}},
                                                          false);
                    expected = XML_E_INVALID;
                    break;
                case 2:
                    outcome = ValidateAgainstNamedSchemas(
                        TinyDocument("urn:i", "42"), dir / "d.xml", {{"urn:i", "int.xsd"}}, false);
                    break;
                default:
                    outcome = ValidateAgainstNamedSchemas(TinyDocument("urn:i", "x"), dir / "d.xml",
                                                          {{"urn:i", "int.xsd"}}, false);
                    expected = XML_E_INVALID;
            }
            if (outcome.code != expected || (expected != S_OK && outcome.line != 1 && which == 3))
                ++wrong;
        }
    };
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t) threads.emplace_back(work, t);
    for (auto& thread : threads) thread.join();
    EXPECT_EQ(wrong.load(), 0);
}

TEST(SchemaValidation, SeveralNamedSchemasValidateTogether) {
    TempDir dir;
    WriteFile(dir.Path() / "a.xsd",
              "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\" targetNamespace=\"urn:a\" "
              "elementFormDefault=\"qualified\"><xs:element name=\"r\"><xs:complexType>"
              "<xs:sequence><xs:any namespace=\"urn:b\" processContents=\"strict\"/>"
              "</xs:sequence></xs:complexType></xs:element></xs:schema>");
    WriteFile(dir.Path() / "dir with space" / "b.xsd",
              "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\" targetNamespace=\"urn:b\">"
              "<xs:element name=\"n\" type=\"xs:int\"/></xs:schema>");
    std::vector<SchemaRef> refs = {{"urn:a", "a.xsd"}, {"urn:b", "dir with space/b.xsd"}};
    auto validate = [&](const std::string& value) {
        return ValidateAgainstNamedSchemas(
            "<r xmlns=\"urn:a\"><n xmlns=\"urn:b\">" + value + "</n></r>", dir / "d.xml", refs,
            false);
    };
    EXPECT_EQ(validate("7").code, S_OK) << validate("7").reason;
    ValidationOutcome outcome = validate("seven");
    EXPECT_EQ(outcome.code, XML_E_INVALID);
    EXPECT_NE(outcome.reason.find("'seven' is not a valid value"), std::string::npos)
        << outcome.reason;

    // One of them missing fails as an unusable schema, naming it.
    refs[1].location = "gone.xsd";
    outcome = validate("7");
    EXPECT_EQ(outcome.code, XML_E_PARSEFAILED);
    EXPECT_NE(outcome.reason.find("gone.xsd"), std::string::npos) << outcome.reason;
}

TEST(SchemaValidation, NoSchemaNamedIsInvalid) {
    ValidationOutcome outcome = ValidateAgainstNamedSchemas("<r/>", "d.xml", {}, false);
    EXPECT_EQ(outcome.code, XML_E_INVALID);
    EXPECT_NE(outcome.reason.find("names no schema"), std::string::npos);
}

TEST(SchemaValidation, ValidatorIsUsable) { EXPECT_TRUE(kest::detail::SchemaValidatorUsable()); }

TEST(SchemaValidation, HttpSchemasNeedPermissionAndResolveAgainstHttpDocuments) {
    TempDir dir;
    WriteFile(dir.Path() / "schemas" / "cdf.xsd", ReadFile(kCdfXsd));
    WriteFile(dir.Path() / "schemas" / "wrapper.xsd",
              "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\" targetNamespace=\"" +
                  kCdfNs + "\"><xs:include schemaLocation=\"cdf.xsd\"/></xs:schema>");
    kest::test::LocalHttpServer server(dir.Path().string());
    if (!server.Started()) GTEST_SKIP() << server.Error();
    std::string document = ReadFile(kDataDir + "/valid-compact.cdf");
    std::string invalid = ReadFile(kDataDir + "/wrong-order.cdf");
    std::string url = server.Url("schemas/cdf.xsd");

    ValidationOutcome outcome =
        ValidateAgainstNamedSchemas(document, "/d/a.cdf", {{kCdfNs, url}}, false);
    EXPECT_EQ(outcome.code, XML_E_PARSEFAILED);
    EXPECT_EQ(outcome.reason,
              "schema location " + url + " requires the ServerHTTPRequest property");

    EXPECT_EQ(ValidateAgainstNamedSchemas(document, "/d/a.cdf", {{kCdfNs, url}}, true).code, S_OK);
    EXPECT_EQ(ValidateAgainstNamedSchemas(invalid, "/d/a.cdf", {{kCdfNs, url}}, true).code,
              XML_E_INVALID);
    // A relative location of a document loaded over http; the schema includes a relative
    // neighbour, fetched the same way.
    outcome = ValidateAgainstNamedSchemas(document, server.Url("data/a.cdf"),
                                          {{kCdfNs, "../schemas/wrapper.xsd"}}, true);
    EXPECT_EQ(outcome.code, S_OK) << outcome.reason;

    outcome =
        ValidateAgainstNamedSchemas(document, "/d/a.cdf", {{kCdfNs, server.Url("none.xsd")}}, true);
    EXPECT_EQ(outcome.code, XML_E_PARSEFAILED);
    EXPECT_NE(outcome.reason.find("HTTP status 404"), std::string::npos) << outcome.reason;
    EXPECT_NE(outcome.reason.find(server.Url("none.xsd")), std::string::npos) << outcome.reason;
}

TEST(SchemaValidation, LocalSchemaImportingHttpNeedsPermission) {
    TempDir dir;
    WriteFile(dir.Path() / "a.xsd",
              "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\" targetNamespace=\"urn:a\">"
              "<xs:import namespace=\"urn:b\" schemaLocation=\"http://127.0.0.1:9/b.xsd\"/>"
              "<xs:element name=\"r\" type=\"xs:string\"/></xs:schema>");
    ValidationOutcome outcome = ValidateAgainstNamedSchemas("<r xmlns=\"urn:a\"/>", dir / "d.xml",
                                                            {{"urn:a", "a.xsd"}}, false);
    EXPECT_EQ(outcome.code, XML_E_PARSEFAILED);
    EXPECT_NE(
        outcome.reason.find("http://127.0.0.1:9/b.xsd requires the ServerHTTPRequest property"),
        std::string::npos)
        << outcome.reason;
}

// ---------------------------------------------------------------------------------------------

TEST(HttpGet, FetchesFollowsRedirectsAndReportsStatus) {
    TempDir dir;
    std::string body(100000, 'x');
    WriteFile(dir.Path() / "big.txt", body);
    WriteFile(dir.Path() / "folder" / "index.html", "<p>index</p>");
    kest::test::LocalHttpServer server(dir.Path().string());
    if (!server.Started()) GTEST_SKIP() << server.Error();

    kest::detail::HttpResult result = HttpGet(server.Url("big.txt"), 10);
    EXPECT_TRUE(result.ok) << result.error;
    EXPECT_EQ(result.body, body);

    // The server answers "folder" with a redirect to "folder/".
    result = HttpGet(server.Url("folder"), 10);
    EXPECT_TRUE(result.ok) << result.error;
    EXPECT_EQ(result.body, "<p>index</p>");

    result = HttpGet(server.Url("missing.txt"), 10);
    EXPECT_FALSE(result.ok);
    EXPECT_EQ(result.error, "cannot fetch " + server.Url("missing.txt") + ": HTTP status 404");

    result = HttpGet(server.Url("big.txt"), 10, 1000);
    EXPECT_FALSE(result.ok);
    EXPECT_NE(result.error.find("exceeds 1000 bytes"), std::string::npos) << result.error;
    EXPECT_TRUE(result.body.empty());

    result = HttpGet(server.Url("big.txt"), 10, body.size());
    EXPECT_TRUE(result.ok) << result.error;
}

TEST(HttpGet, SilentServerTimesOut) {
    kest::test::SilentServer server;
    ASSERT_TRUE(server.Started());
    auto start = std::chrono::steady_clock::now();
    kest::detail::HttpResult result = HttpGet(server.Url("x.xsd"), 1);
    double seconds =
        std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
    EXPECT_FALSE(result.ok);
    EXPECT_NE(result.error.find(server.Url("x.xsd")), std::string::npos) << result.error;
    EXPECT_GE(seconds, 0.9);
    EXPECT_LT(seconds, 5.0);
}

TEST(HttpGet, OnlyHttpAndHttpsAreFetched) {
    const char* urls[] = {"file:///etc/passwd", "ftp://127.0.0.1/x",  "gopher://127.0.0.1/x",
                          "/etc/passwd",        "dict://127.0.0.1/x", ""};
    for (const char* url : urls) {
        SCOPED_TRACE(url);
        kest::detail::HttpResult result = HttpGet(url, 2);
        EXPECT_FALSE(result.ok);
        EXPECT_TRUE(result.body.empty());
        EXPECT_NE(result.error.find("only http and https"), std::string::npos) << result.error;
    }
    // Connection refused is reported, not hidden.
    int port = kest::test::FindFreeLocalPort();
    kest::detail::HttpResult result = HttpGet("http://127.0.0.1:" + std::to_string(port) + "/x", 2);
    EXPECT_FALSE(result.ok);
    EXPECT_FALSE(result.error.empty());
}

TEST(HttpGet, RedirectsStayOnHttp) {
    const char* targets[] = {"file:///etc/passwd", "ftp://127.0.0.1/s.xsd"};
    for (const char* target : targets) {
        SCOPED_TRACE(target);
        CannedResponder server(std::string("HTTP/1.1 302 Found\r\nLocation: ") + target +
                               "\r\nContent-Length: 0\r\nConnection: close\r\n\r\n");
        kest::detail::HttpResult result = HttpGet(server.Url(), 5);
        EXPECT_FALSE(result.ok);
        EXPECT_TRUE(result.body.empty());
        EXPECT_NE(result.error.find("cannot fetch " + server.Url()), std::string::npos)
            << result.error;
        EXPECT_NE(result.error.find("not supported or disabled"), std::string::npos)
            << result.error;
    }
}
