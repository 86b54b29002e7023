// Files naming http schemas: the converter fetches them (and their includes) through the bounded
// client, from servers on 127.0.0.1 that the tests start and stop.
#include <gtest/gtest.h>

#include "core/KestCalmorph.h"
#include "platform/detail/XsdSchema.h"
#include "support/HttpServer.h"
#include "support/TestFiles.h"

using namespace kest;
using test::ReadWholeFile;

TEST(KestCalmorphFetch, HttpSchemasAreFetchedWithinLimits) {
    const std::string schema = ReadWholeFile(std::string(KEST_SOURCE_DIR) + "/schema/cdf.xsd");
    const std::string open = schema.substr(0, schema.find('>', schema.find("<xs:schema")) + 1);
    test::ScratchDir dir;
    dir.Write("cdf.xsd", schema);
    dir.Write("inc.xsd", open + "<xs:include schemaLocation=\"cdf.xsd\"/></xs:schema>");
    dir.Write("self.xsd", open + "<xs:include schemaLocation=\"self.xsd\"/></xs:schema>");
    test::LocalHttpServer server(dir.str());
    if (!server.Started()) GTEST_SKIP() << server.Error();
    test::CannedHttpServer toFile("HTTP/1.1 302 Found\r\nLocation: file:///etc/passwd\r\n\r\n");
    test::CannedHttpServer huge("HTTP/1.1 200 OK\r\nContent-Length: 1073741824\r\n\r\n<xs:");
    test::SilentServer silent;
    detail::HttpLimits limits = detail::SchemaFetchLimits();
    limits.timeoutSeconds = 1;
    detail::SetSchemaFetchLimits(limits);
    struct Row {
        std::string url;
        bool network;
        std::string message;
    } rows[] = {
        {server.Url("cdf.xsd"), true, ""},
        {server.Url("inc.xsd"), true, ""},
        {server.Url("cdf.xsd"), false, "requires the ServerHTTPRequest property"},
        {server.Url("self.xsd"), true, "cannot include itself"},
        {toFile.Url("cdf.xsd"), true, "redirected to a scheme that is not followed"},
        {huge.Url("cdf.xsd"), true, "the response exceeds 67108864 bytes"},
        {silent.Url("cdf.xsd"), true, "no complete answer within 1 s"},
    };
    std::string valid =
        ReadWholeFile(std::string(KEST_TEST_DATA_DIR) + "/schema/valid-compact.cdf");
    for (const Row& row : rows) {
        SCOPED_TRACE(row.url);
        std::string text = valid;
        std::string path = dir.Write("a.cdf", text.replace(text.find("cdf.xsd"), 7, row.url));
        KestCalmorph converter;
        converter.SetReadOptions(KestReadOptions{true, row.network, "", false});
        CComBSTR message;
        converter.ConvertXMLtoCPP(CComBSTR(path), true, message);
        EXPECT_NE(message.ToString().find(row.message), std::string::npos) << message.ToString();
        EXPECT_EQ(message.Length() == 0, row.message.empty()) << message.ToString();
        if (!row.network || !row.message.empty()) continue;
        EXPECT_EQ(converter.DetectSchemaLocation(CComBSTR(path), message).ToString(), row.url);
        EXPECT_EQ(
            converter.ValidateXMLFileWithLocaleXSD(CComBSTR(path), CComBSTR(row.url)).ToString(),
            "");
    }
}
