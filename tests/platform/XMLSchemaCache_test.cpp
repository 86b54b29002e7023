// The schema collection ("Msxml2.XMLSchemaCache.4.0") and validation against it.
#include <gtest/gtest.h>

#include <filesystem>

#include "platform/IXMLDOMDocument.h"
#include "platform/IXMLDOMSchemaCollection.h"
#include "platform/detail/SchemaValidation.h"
#include "support/TestFiles.h"

using namespace kest;
using detail::ValidateAgainstCollection;
using test::ReadWholeFile;
using test::ScratchDir;

namespace {

const std::string kCdfNs = "http://kest.dev/schemas/cdf/1.0";
const std::string kCdfXsd = std::string(KEST_SOURCE_DIR) + "/schema/cdf.xsd";
const std::string kDataDir = std::string(KEST_TEST_DATA_DIR) + "/schema";

IXMLDOMSchemaCollectionPtr NewCache() {
    IXMLDOMSchemaCollectionPtr cache;
    ThrowIfFailed(cache.CreateInstance(kProgIdXMLSchemaCache40));
    return cache;
}

std::string Schema(const std::string& ns, const std::string& type) {
    return "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\" targetNamespace=\"" + ns +
           "\"><xs:element name=\"v\" type=\"" + type + "\"/></xs:schema>";
}

/// Calls add and returns the _com_error it throws (code 0 when it does not throw).
_com_error AddError(IXMLDOMSchemaCollection& cache, const std::string& ns,
                    const _variant_t& location) {
    try {
        cache.add(_bstr_t(ns), location);
    } catch (const _com_error& error) {
        return error;
    }
    return _com_error(S_OK);
}

}  // namespace

TEST(XMLSchemaCache, CreateInstanceKnowsOnlyTheSchemaCacheProgId) {
    struct Row {
        const OLECHAR* progId;
        HRESULT expected;
    } rows[] = {
        {u"msxml2.xmlschemacache.4.0", S_OK},  // ProgIDs ignore case
        {u"MSXML2.XMLSCHEMACACHE.4.0", S_OK},
        {u"Msxml2.XMLSchemaCache.6.0", REGDB_E_CLASSNOTREG},
        {u"Msxml2.DOMDocument.4.0", REGDB_E_CLASSNOTREG},
        {u"Msxml2.XMLSchemaCache.4.0 ", REGDB_E_CLASSNOTREG},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(_bstr_t(row.progId).ToString());
        IXMLDOMSchemaCollectionPtr cache;
        EXPECT_EQ(cache.CreateInstance(row.progId), row.expected);
        EXPECT_EQ(bool(cache), row.expected == S_OK);
    }
    IXMLDOMSchemaCollection* raw = nullptr;
    EXPECT_EQ(IXMLDOMSchemaCollection::CreateInstance(nullptr, &raw), E_INVALIDARG);
    EXPECT_EQ(IXMLDOMSchemaCollection::CreateInstance(kProgIdXMLSchemaCache40, nullptr), E_POINTER);
}

TEST(XMLSchemaCache, AddListReplaceAndRemove) {
    ScratchDir dir;
    IXMLDOMSchemaCollectionPtr cache = NewCache();
    EXPECT_EQ(cache->Getlength(), 0);
    cache->add(_bstr_t("urn:a"), _variant_t(dir.Write("a1.xsd", Schema("urn:a", "xs:int"))));
    cache->add(_bstr_t(kCdfNs), _variant_t(kCdfXsd));
    cache->add(_bstr_t("urn:b"), _variant_t(dir.Write("b.xsd", Schema("urn:b", "xs:int"))));
    ASSERT_EQ(cache->Getlength(), 3);
    EXPECT_EQ(cache->GetnamespaceURI(1), _bstr_t(kCdfNs));
    for (long index : {-1L, 3L}) {
        SCOPED_TRACE(index);
        try {
            cache->GetnamespaceURI(index);
            ADD_FAILURE() << "no error";
        } catch (const _com_error& error) {
            EXPECT_EQ(error.Error(), E_INVALIDARG);
        }
    }
    // Adding a namespace again replaces its schema in place.
    cache->add(_bstr_t("urn:a"), _variant_t(dir.Write("a2.xsd", Schema("urn:a", "xs:string"))));
    EXPECT_EQ(cache->Getlength(), 3);
    EXPECT_EQ(cache->GetnamespaceURI(0), _bstr_t("urn:a"));
    EXPECT_EQ(ValidateAgainstCollection("<v xmlns=\"urn:a\">text</v>", "d.xml", *cache).code, S_OK);

    cache->remove(_bstr_t(kCdfNs));
    cache->remove(_bstr_t("urn:unknown"));
    ASSERT_EQ(cache->Getlength(), 2);
    EXPECT_EQ(cache->GetnamespaceURI(1), _bstr_t("urn:b"));
    // A schema without target namespace goes under the empty namespace.
    cache->add(_bstr_t(""), _variant_t(dir.Write("none.xsd", Schema("", "xs:int"))));
    EXPECT_EQ(cache->Getlength(), 3);
}

TEST(XMLSchemaCache, RefusedSchemasLeaveTheCollectionUnchanged) {
    // Reading and compiling are shared with named-schema validation and tested there.
    ScratchDir dir;
    struct Row {
        std::string ns;
        _variant_t location;
        HRESULT code;
        std::string fragment;
    } rows[] = {
        {"urn:other", _variant_t(kCdfXsd), E_FAIL,
         "has target namespace '" + kCdfNs + "', not the namespace 'urn:other'"},
        {kCdfNs, _variant_t(dir / "missing.xsd"), E_FAIL,
         "missing.xsd cannot be read: No such file or directory"},
        {kCdfNs, _variant_t(42), E_INVALIDARG, "must be a path or URL"},
        {kCdfNs, _variant_t("ftp://127.0.0.1/cdf.xsd"), E_FAIL, "unsupported scheme"},
    };
    IXMLDOMSchemaCollectionPtr cache = NewCache();
    cache->add(_bstr_t("urn:o"), _variant_t(dir.Write("other.xsd", Schema("urn:o", "xs:int"))));
    for (const Row& row : rows) {
        SCOPED_TRACE(row.fragment);
        _com_error error = AddError(*cache, row.ns, row.location);
        EXPECT_EQ(error.Error(), row.code);
        EXPECT_NE(error.Description().find(row.fragment), std::string::npos) << error.Description();
        EXPECT_EQ(cache->Getlength(), 1);
    }
}

TEST(XMLSchemaCache, ValidatesDocumentsAgainstItsSchemas) {
    IXMLDOMSchemaCollectionPtr cache = NewCache();
    std::string validPath = kDataDir + "/valid-indented.cdf";
    std::string invalidPath = kDataDir + "/bad-date.cdf";
    detail::ValidationOutcome outcome =
        ValidateAgainstCollection(ReadWholeFile(validPath), validPath, *cache);
    EXPECT_EQ(outcome.code, XML_E_INVALID);
    EXPECT_NE(outcome.reason.find("schema collection is empty"), std::string::npos);

    cache->add(_bstr_t(kCdfNs), _variant_t(kCdfXsd));
    outcome = ValidateAgainstCollection(ReadWholeFile(validPath), validPath, *cache);
    EXPECT_EQ(outcome.code, S_OK) << outcome.reason;
    outcome = ValidateAgainstCollection(ReadWholeFile(invalidPath), invalidPath, *cache);
    EXPECT_EQ(outcome.code, XML_E_INVALID);
    EXPECT_EQ(outcome.line, 9);
    EXPECT_EQ(outcome.reason.rfind(invalidPath + ":9: ", 0), 0u) << outcome.reason;

    // With a second namespace the schemas are used together.
    ScratchDir dir;
    std::string wrapper =
        dir.Write("w.xsd",
                  "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\" targetNamespace="
                  "\"urn:w\" elementFormDefault=\"qualified\"><xs:element name=\"w\">"
                  "<xs:complexType><xs:sequence><xs:any namespace=\"" +
                      kCdfNs +
                      "\" processContents=\"strict\"/></xs:sequence></xs:complexType>"
                      "</xs:element></xs:schema>");
    cache->add(_bstr_t("urn:w"), _variant_t(wrapper));
    auto wrapped = [](const std::string& path) {
        std::string text = ReadWholeFile(path);
        return "<w xmlns=\"urn:w\">" + text.substr(text.find("<CAL-DATA")) + "</w>";
    };
    outcome = ValidateAgainstCollection(wrapped(validPath), "w.xml", *cache);
    EXPECT_EQ(outcome.code, S_OK) << outcome.reason;
    outcome = ValidateAgainstCollection(wrapped(invalidPath), "w.xml", *cache);
    EXPECT_EQ(outcome.code, XML_E_INVALID);
    EXPECT_NE(outcome.reason.find("DATE"), std::string::npos) << outcome.reason;
}

TEST(XMLSchemaCache, RelativeLocationsAreTakenFromTheCurrentDirectory) {
    ScratchDir dir;
    dir.Write("rel.xsd", Schema("urn:r", "xs:int"));
    std::filesystem::path previous = std::filesystem::current_path();
    std::filesystem::current_path(dir.Path());
    IXMLDOMSchemaCollectionPtr cache = NewCache();
    _com_error error = AddError(*cache, "urn:r", _variant_t("rel.xsd"));
    std::filesystem::current_path(previous);
    EXPECT_EQ(error.Error(), S_OK) << error.Description();
    EXPECT_EQ(ValidateAgainstCollection("<v xmlns=\"urn:r\">5</v>", "", *cache).code, S_OK);
    EXPECT_EQ(ValidateAgainstCollection("<v xmlns=\"urn:r\">x</v>", "", *cache).code,
              XML_E_INVALID);
}
