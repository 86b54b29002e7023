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
#include <stdexcept>
#include <thread>

#include "support/HttpServer.h"
#include "support/TestFiles.h"

using namespace kest;
using namespace kest::detail;
using namespace kest::test;

namespace {

const std::string kCdfNs = "http://kest.dev/schemas/cdf/1.0";
const std::string kCdfXsd = std::string(KEST_SOURCE_DIR) + "/schema/cdf.xsd";
const std::string kDataDir = std::string(KEST_TEST_DATA_DIR) + "/schema";
const std::string kValidCdf = ReadWholeFile(kDataDir + "/valid-compact.cdf");
const std::string kXsdOpen = "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\" ";

ValidationOutcome Validate(const std::string& document, const std::string& path,
                           const std::vector<SchemaRef>& refs, bool http = false) {
    return ValidateAgainstNamedSchemas(document, path, refs, http);
}

/// A tiny schema: root <r> in `ns` holding one <v> of the given simple type.
std::string TinySchema(const std::string& ns, const std::string& type) {
    return kXsdOpen + "targetNamespace=\"" + ns +
           "\" elementFormDefault=\"qualified\"><xs:element name=\"r\"><xs:complexType>"
           "<xs:sequence><xs:element name=\"v\" type=\"" +
           type + "\"/></xs:sequence></xs:complexType></xs:element></xs:schema>";
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

#define EXPECT_CONTAINS(text, fragment) \
    EXPECT_NE((text).find(fragment), std::string::npos) << (text)

}  // namespace

TEST(SchemaValidation, CdfDocumentsAgainstTheCdfSchema) {
    struct Row {
        const char* file;
        HRESULT code;
        long line;
        const char* fragment;
    } rows[] = {
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
        ValidationOutcome outcome = Validate(ReadWholeFile(path), path, {{kCdfNs, kCdfXsd}});
        EXPECT_EQ(outcome.code, row.code) << outcome.reason;
        EXPECT_EQ(outcome.line, row.line);
        std::string prefix = row.code == S_OK ? "" : path + ":" + std::to_string(row.line) + ": ";
        EXPECT_EQ(outcome.reason.rfind(prefix, 0), 0u) << outcome.reason;
        EXPECT_CONTAINS(outcome.reason, row.fragment);
        EXPECT_EQ(outcome.reason.empty(), row.code == S_OK) << outcome.reason;
    }
    ValidationOutcome outcome = Validate("<r/>", "d.xml", {});
    EXPECT_EQ(outcome.code, XML_E_INVALID);
    EXPECT_CONTAINS(outcome.reason, "names no schema");
}

TEST(SchemaValidation, RelativeLocationsResolveAgainstTheDocumentDirectory) {
    ScratchDir dir;
    for (const char* folder : {"data", "schemas", "with space %20"}) {
        dir.Write(std::string(folder) + "/cdf.xsd", ReadWholeFile(kCdfXsd));
    }
    std::string fileUrl = "file://" + (dir / "schemas/cdf.xsd");
    for (std::string location :
         {"cdf.xsd", "../schemas/../data/cdf.xsd", "../with space %20/cdf.xsd", fileUrl.c_str()}) {
        SCOPED_TRACE(location);
        ValidationOutcome outcome = Validate(kValidCdf, dir / "data/a.cdf", {{kCdfNs, location}});
        EXPECT_EQ(outcome.code, S_OK) << outcome.reason;
    }
}

TEST(SchemaValidation, UnusableSchemasFailNamingTheLocation) {
    ScratchDir dir;
    dir.Write("broken.xsd", kXsdOpen + ">\n<xs:element");
    dir.Write("not-a-schema.xsd", kValidCdf);
    dir.Write("bad-type.xsd", TinySchema(kCdfNs, "xs:nosuchtype"));
    std::string withEntity = TinySchema(kCdfNs, "xs:int");
    withEntity.insert(withEntity.find("<xs:element"),
                      "<xs:annotation><xs:documentation>&e;</xs:documentation></xs:annotation>");
    dir.Write("entity.xsd",
              "<!DOCTYPE xs:schema [<!ENTITY e SYSTEM \"" + kCdfXsd + "\">]>" + withEntity);
    std::filesystem::create_directories(dir.Path() / "folder.xsd");
    dir.Write("imports-http.xsd", kXsdOpen + "targetNamespace=\"" + kCdfNs +
                                      "\"><xs:import namespace=\"urn:b\" schemaLocation="
                                      "\"http://127.0.0.1:9/b.xsd\"/></xs:schema>");
    struct Row {
        std::string ns, location, fragment;
    } rows[] = {
        {kCdfNs, "missing.xsd", "missing.xsd cannot be read: No such file or directory"},
        {kCdfNs, "broken.xsd", "broken.xsd:2: "},
        {kCdfNs, "not-a-schema.xsd", "is not a schema document"},
        {kCdfNs, "bad-type.xsd", "nosuchtype' does not resolve to a(n) type definition"},
        {kCdfNs, "folder.xsd", "not a regular file"},
        {kCdfNs, "entity.xsd", "external resource '" + kCdfXsd + "' refused"},
        {kCdfNs, "ftp://127.0.0.1/cdf.xsd", "unsupported scheme"},
        {kCdfNs, "file://otherhost/cdf.xsd", "is not a local file URL"},
        {kCdfNs, "http://127.0.0.1:9/cdf.xsd",
         "schema location http://127.0.0.1:9/cdf.xsd requires the ServerHTTPRequest property"},
        {kCdfNs, "", "empty schema location"},
        {kCdfNs, "imports-http.xsd",
         "http://127.0.0.1:9/b.xsd requires the ServerHTTPRequest property"},
        {"urn:other", kCdfXsd,
         "has target namespace '" + kCdfNs + "', but the document names it for 'urn:other'"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.location);
        ValidationOutcome outcome = Validate(kValidCdf, dir / "a.cdf", {{row.ns, row.location}});
        EXPECT_EQ(outcome.code, XML_E_PARSEFAILED);
        EXPECT_CONTAINS(outcome.reason, row.fragment);
    }
}

TEST(SchemaValidation, MalformedDocumentGivesParseFailureWithPosition) {
    std::string document =
        "<?xml version=\"1.0\"?>\n<CAL-DATA xmlns=\"" + kCdfNs + "\"><CHANGE-HISTORY>\n</CAL-DATA>";
    ValidationOutcome outcome = Validate(document, "/d/m.cdf", {{kCdfNs, kCdfXsd}});
    EXPECT_EQ(outcome.code, XML_E_PARSEFAILED);
    EXPECT_EQ(outcome.line, 3);
    EXPECT_GT(outcome.column, 0);
    EXPECT_EQ(outcome.reason.rfind("/d/m.cdf:3: ", 0), 0u) << outcome.reason;
    outcome = Validate("", "/d/empty.cdf", {{kCdfNs, kCdfXsd}});
    EXPECT_EQ(outcome.code, XML_E_PARSEFAILED);
    EXPECT_CONTAINS(outcome.reason, "/d/empty.cdf");
}

TEST(SchemaValidation, ExternalEntitiesAndDtdsAreNeverRead) {
    ScratchDir dir;
    // Were either file read, the document would stop being well-formed.
    dir.Write("broken.ent", "<unclosed");
    dir.Write("broken.dtd", "<!ELEMENT");
    dir.Write("t.xsd", TinySchema("urn:t", "xs:string"));
    std::string document =
        "<?xml version=\"1.0\"?>\n<!DOCTYPE r SYSTEM \"broken.dtd\" [\n"
        "<!ENTITY ext SYSTEM \"broken.ent\">]>\n<r xmlns=\"urn:t\"><v>&ext;</v></r>";
    ValidationOutcome outcome = Validate(document, dir / "doc.xml", {{"urn:t", "t.xsd"}});
    EXPECT_EQ(outcome.code, S_OK) << outcome.reason;
}

TEST(SchemaValidation, CacheFollowsTheSchemaFileModificationTime) {
    ScratchDir dir;
    std::string schemaPath = dir / "t.xsd";
    std::string intSchema = TinySchema("urn:t", "xs:int");
    std::string stringSchema = TinySchema("urn:t", "xs:string");
    // Same size, so only the modification time tells the versions apart.
    intSchema.insert(intSchema.find("<xs:element"), stringSchema.size() - intSchema.size(), ' ');
    auto validate = [&](const std::string& schema, time_t seconds) {
        dir.Write("t.xsd", schema);
        SetModificationTime(schemaPath, seconds);
        return Validate(TinyDocument("urn:t", "text"), dir / "d.xml", {{"urn:t", "t.xsd"}}).code;
    };
    EXPECT_EQ(validate(intSchema, 1000000000), XML_E_INVALID);
    // Content changed behind an unchanged time and size: the compiled schema is reused.
    EXPECT_EQ(validate(stringSchema, 1000000000), XML_E_INVALID);
    EXPECT_EQ(validate(stringSchema, 1000000060), S_OK);
    // A change of size with the time kept also makes it recompile.
    EXPECT_EQ(validate(TinySchema("urn:t", "xs:int"), 1000000060), XML_E_INVALID);
}

TEST(SchemaValidation, ConcurrentValidationsShareCompiledSchemas) {
    ScratchDir dir;
    dir.Write("int.xsd", TinySchema("urn:i", "xs:int"));
    const std::string cdfInvalid = ReadWholeFile(kDataDir + "/bad-crc32.cdf");
    struct Case {
        std::string document, path;
        SchemaRef schema;
        HRESULT code;
        long line;
    } cases[] = {
        {kValidCdf, "v.cdf", {kCdfNs, kCdfXsd}, S_OK, 0},
        {cdfInvalid, "i.cdf", {kCdfNs, kCdfXsd}, XML_E_INVALID, 10},
        {TinyDocument("urn:i", "42"), dir / "d.xml", {"urn:i", "int.xsd"}, S_OK, 0},
        {TinyDocument("urn:i", "x"), dir / "d.xml", {"urn:i", "int.xsd"}, XML_E_INVALID, 1},
    };
    std::atomic<int> wrong{0};
    auto work = [&](int thread) {
        for (int i = 0; i < 20; ++i) {
            const Case& c = cases[(thread + i) % 4];
            ValidationOutcome outcome = Validate(c.document, c.path, {c.schema});
            if (outcome.code != c.code || outcome.line != c.line) ++wrong;
        }
    };
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t) threads.emplace_back(work, t);
    for (auto& thread : threads) thread.join();
    EXPECT_EQ(wrong.load(), 0);
}

TEST(SchemaValidation, SeveralNamedSchemasValidateTogether) {
    ScratchDir dir;
    dir.Write("a.xsd", kXsdOpen +
                           "targetNamespace=\"urn:a\" elementFormDefault=\"qualified\">"
                           "<xs:element name=\"r\"><xs:complexType><xs:sequence><xs:any "
                           "namespace=\"urn:b\" processContents=\"strict\"/></xs:sequence>"
                           "</xs:complexType></xs:element></xs:schema>");
    dir.Write("dir with space/b.xsd",
              kXsdOpen +
                  "targetNamespace=\"urn:b\"><xs:element name=\"n\" type=\"xs:int\"/>"
                  "</xs:schema>");
    std::vector<SchemaRef> refs = {{"urn:a", "a.xsd"}, {"urn:b", "dir with space/b.xsd"}};
    auto validate = [&](const std::string& value) {
        std::string document = "<r xmlns=\"urn:a\"><n xmlns=\"urn:b\">" + value + "</n></r>";
        return Validate(document, dir / "d.xml", refs);
    };
    EXPECT_EQ(validate("7").code, S_OK) << validate("7").reason;
    ValidationOutcome outcome = validate("seven");
    EXPECT_EQ(outcome.code, XML_E_INVALID);
    EXPECT_CONTAINS(outcome.reason, "'seven' is not a valid value");
    // One of them missing fails as an unusable schema, naming it.
    refs[1].location = "gone.xsd";
    outcome = validate("7");
    EXPECT_EQ(outcome.code, XML_E_PARSEFAILED);
    EXPECT_CONTAINS(outcome.reason, "gone.xsd");
}

TEST(SchemaValidation, HttpSchemasNeedPermissionAndResolveAgainstHttpDocuments) {
    ScratchDir dir;
    dir.Write("schemas/cdf.xsd", ReadWholeFile(kCdfXsd));
    dir.Write("schemas/wrapper.xsd", kXsdOpen + "targetNamespace=\"" + kCdfNs +
                                         "\"><xs:include schemaLocation=\"cdf.xsd\"/></xs:schema>");
    LocalHttpServer server(dir.Path().string());
    if (!server.Started()) GTEST_SKIP() << server.Error();
    std::string invalid = ReadWholeFile(kDataDir + "/wrong-order.cdf");
    std::string url = server.Url("schemas/cdf.xsd");

    ValidationOutcome outcome = Validate(kValidCdf, "/d/a.cdf", {{kCdfNs, url}});
    EXPECT_EQ(outcome.code, XML_E_PARSEFAILED);
    EXPECT_EQ(outcome.reason,
              "schema location " + url + " requires the ServerHTTPRequest property");
    EXPECT_EQ(Validate(kValidCdf, "/d/a.cdf", {{kCdfNs, url}}, true).code, S_OK);
    EXPECT_EQ(Validate(invalid, "/d/a.cdf", {{kCdfNs, url}}, true).code, XML_E_INVALID);
    // A relative location of a document loaded over http; the schema includes a relative
    // neighbour, fetched the same way.
    outcome =
        Validate(kValidCdf, server.Url("data/a.cdf"), {{kCdfNs, "../schemas/wrapper.xsd"}}, true);
    EXPECT_EQ(outcome.code, S_OK) << outcome.reason;
    outcome = Validate(kValidCdf, "/d/a.cdf", {{kCdfNs, server.Url("none.xsd")}}, true);
    EXPECT_EQ(outcome.code, XML_E_PARSEFAILED);
    EXPECT_CONTAINS(outcome.reason, "HTTP status 404");
    EXPECT_CONTAINS(outcome.reason, server.Url("none.xsd"));
}

TEST(HttpGet, FetchesFollowsRedirectsAndReportsStatus) {
    ScratchDir dir;
    std::string body(100000, 'x');
    dir.Write("big.txt", body);
    dir.Write("folder/index.html", "<p>index</p>");
    LocalHttpServer server(dir.Path().string());
    if (!server.Started()) GTEST_SKIP() << server.Error();

    HttpResult result = HttpGet(server.Url("big.txt"), 10, body.size());
    EXPECT_TRUE(result.ok) << result.error;
    EXPECT_EQ(result.body, body);
    // The server answers "folder" with a redirect to "folder/".
    result = HttpGet(server.Url("folder"), 10);
    EXPECT_EQ(result.body, "<p>index</p>") << result.error;
    result = HttpGet(server.Url("missing.txt"), 10);
    EXPECT_FALSE(result.ok);
    EXPECT_EQ(result.error, "cannot fetch " + server.Url("missing.txt") + ": HTTP status 404");
    result = HttpGet(server.Url("big.txt"), 10, 1000);
    EXPECT_FALSE(result.ok);
    EXPECT_CONTAINS(result.error, "exceeds 1000 bytes");
    EXPECT_TRUE(result.body.empty());
}

TEST(HttpGet, SilentServerTimesOut) {
    SilentServer server;
    ASSERT_TRUE(server.Started());
    HttpResult result = HttpGet(server.Url("x.xsd"), 1);
    EXPECT_FALSE(result.ok);
    EXPECT_TRUE(result.body.empty());
    EXPECT_CONTAINS(result.error, server.Url("x.xsd"));
}

TEST(HttpGet, OnlyHttpAndHttpsAreFetched) {
    for (const char* url : {"file:///etc/passwd", "ftp://127.0.0.1/x", "/etc/passwd", ""}) {
        SCOPED_TRACE(url);
        HttpResult result = HttpGet(url, 2);
        EXPECT_FALSE(result.ok);
        EXPECT_TRUE(result.body.empty());
        EXPECT_CONTAINS(result.error, "only http and https");
    }
    // Connection refused is reported, not hidden.
    int port = FindFreeLocalPort();
    HttpResult result = HttpGet("http://127.0.0.1:" + std::to_string(port) + "/x", 2);
    EXPECT_FALSE(result.ok);
    EXPECT_FALSE(result.error.empty());
    // Redirects stay on http too.
    for (const char* target : {"file:///etc/passwd", "ftp://127.0.0.1/s.xsd"}) {
        SCOPED_TRACE(target);
        CannedResponder server(std::string("HTTP/1.1 302 Found\r\nLocation: ") + target +
                               "\r\nContent-Length: 0\r\nConnection: close\r\n\r\n");
        result = HttpGet(server.Url(), 5);
        EXPECT_FALSE(result.ok);
        EXPECT_TRUE(result.body.empty());
        EXPECT_CONTAINS(result.error, "cannot fetch " + server.Url());
        EXPECT_CONTAINS(result.error, "not supported or disabled");
    }
}
