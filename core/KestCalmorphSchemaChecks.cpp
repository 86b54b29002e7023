// The converter's schema checks: is the DOM service usable, which schema a data file names,
// can that schema be reached, and is a data file valid against a given schema file.

#include <sys/stat.h>

#include <cstdio>
#include <cstring>
#include <string>

#include "KestCalmorph.h"

namespace kest {

namespace {

constexpr const char* kNotInstalledMessage = "\nError: MSXML 4.0 is not installed. Exiting.\n";
constexpr const OLECHAR* kSchemaLocationAttribute = u"xsi:schemaLocation";

bool IsDigit(char c) noexcept { return c >= '0' && c <= '9'; }

// True when the path names something that can be opened for reading as a file. A directory can
// be opened for reading on this platform, but it is no schema, so it does not count.
bool CanOpenForReading(const std::string& path) {
    if (path.empty()) return false;
    std::FILE* file = std::fopen(path.c_str(), "rb");
    if (!file) return false;
    struct stat info {};
    bool regular = fstat(fileno(file), &info) == 0 && !S_ISDIR(info.st_mode);
    std::fclose(file);
    return regular;
}

CComBSTR ParseErrorReason(const IXMLDOMDocument2Ptr& document) {
    IXMLDOMParseErrorPtr parseError = document->GetparseError();
    if (!parseError) throw E_POINTER;
    return CComBSTR(parseError->Getreason().View());
}

}  // namespace

bool KestCalmorph::IsMSXML4Installed() {
    bool usable = false;
    try {
        if (IXMLDOMSchemaCollection::ValidatorUsable()) {
            IXMLDOMDocument2Ptr document;
            if (SUCCEEDED(document.CreateInstance(kProgIdDOMDocument40))) {
                document->Putasync(VARIANT_FALSE);
                usable =
                    document->loadXML(_bstr_t(u"<probe a=\"1\"><x/></probe>")) != VARIANT_FALSE;
            }
        }
    } catch (...) {
        usable = false;
    }
    if (!usable) std::fputs(kNotInstalledMessage, stderr);
    return usable;
}

bool KestCalmorph::IsSupportedServerFileName(const char* fileName) {
    if (!fileName) return false;
    // The server is registered by its full path; only the file name decides.
    const char* name = fileName;
    for (const char* p = fileName; *p; ++p) {
        if (*p == '\\' || *p == '/') name = p + 1;
    }
    if (std::strncmp(name, "msxml", 5) != 0) return false;
    // A plain decimal number must follow: digits with an optional fraction. Read by hand so that
    // neither the process locale nor the wider syntax of strtod ("inf", hex, blanks, signs)
    // can turn a foreign file name into a version.
    const char* p = name + 5;
    if (!IsDigit(*p) && !(*p == '.' && IsDigit(p[1]))) return false;
    double version = 0.0;
    for (; IsDigit(*p); ++p) version = version * 10.0 + (*p - '0');
    if (*p == '.') {
        double scale = 0.1;
        for (++p; IsDigit(*p); ++p, scale /= 10.0) version += (*p - '0') * scale;
    }
    return version >= 4.0;
}

std::string KestCalmorph::GetFilePath(CComBSTR path) {
    std::string narrow = path.ToString();
    std::string::size_type separator = narrow.find_last_of("\\/");
    if (separator == std::string::npos) return std::string();
    return narrow.substr(0, separator + 1);
}

CComBSTR KestCalmorph::DetectSchemaLocation(CComBSTR path, CComBSTR& message) {
    message = u"";
    m_lastLoadError = KestLoadError();
    m_usedBuiltinSchema = false;
    IXMLDOMDocument2Ptr document;
    HRESULT hr = document.CreateInstance(kProgIdDOMDocument40);
    if (FAILED(hr)) throw hr;
    try {
        document->Putasync(VARIANT_FALSE);
    } catch (const _com_error&) {
        return CComBSTR(u"");
    }
    PrepareReadDocument(document, m_readOptions.validate);

    bool loaded = document->load(_variant_t(static_cast<const OLECHAR*>(path))) != VARIANT_FALSE;
    RecordLoadResult(document->GetparseError(), document, path);
    if (loaded) {
        IXMLDOMElementPtr root = document->GetdocumentElement();
        IXMLDOMAttributePtr attribute = root->getAttributeNode(_bstr_t(kSchemaLocationAttribute));
        if (!attribute) KestCalmorphDLLError::Raise(reason::kSchemaLocationAbsent);
        std::string value = _bstr_t(attribute->GetnodeValue()).ToString();
        std::string::size_type blank = value.find(' ');
        // Pairs of namespace and location are separated by a blank; a value without any blank
        // holds a location alone, which is the location itself.
        std::string location = blank == std::string::npos ? value : value.substr(blank + 1);
        return CComBSTR(location);
    }

    IXMLDOMParseErrorPtr parseError = document->GetparseError();
    if (!parseError) throw E_POINTER;
    if (parseError->GeterrorCode() == 0) KestCalmorphDLLError::Raise(reason::kSchemaNotLoaded);
    message = CComBSTR(parseError->Getreason().ToString());
    return CComBSTR(u"");
}

bool KestCalmorph::IsSchemaLocationValid(CComBSTR location, CComBSTR path) {
    // Nothing to reach: a missing location is not a valid one.
    if (location == nullptr) return false;
    std::string narrow = location.ToString();

    if (narrow.compare(0, 4, "http") == 0) {
        IXMLDOMDocument2Ptr document;
        HRESULT hr = document.CreateInstance(kProgIdDOMDocument40);
        if (FAILED(hr)) throw hr;
        document->Putasync(VARIANT_FALSE);
        document->setProperty(_bstr_t(u"ServerHTTPRequest"),
                              _variant_t(m_readOptions.allowNetwork));
        return document->load(_variant_t(static_cast<const OLECHAR*>(location))) != VARIANT_FALSE;
    }
    if (location.View() == std::u16string_view(u"cdf.xsd")) {
        return CanOpenForReading(GetFilePath(std::move(path)) + narrow);
    }
    return CanOpenForReading(narrow);
}

CComBSTR KestCalmorph::ValidateXMLFileWithLocaleXSD(CComBSTR dataPath, CComBSTR schemaPath) {
    CComBSTR message(u"");
    m_lastLoadError = KestLoadError();
    m_usedBuiltinSchema = false;
    if (dataPath == nullptr) throw _com_error(E_POINTER);

    IXMLDOMDocument2Ptr data;
    HRESULT hr = data.CreateInstance(kProgIdDOMDocument40);
    if (FAILED(hr)) throw hr;
    data->Putasync(VARIANT_FALSE);
    data->PutvalidateOnParse(VARIANT_FALSE);

    if (data->load(_variant_t(static_cast<const OLECHAR*>(dataPath))) != VARIANT_FALSE) {
        IXMLDOMDocument2Ptr schema;
        if (FAILED(schema.CreateInstance(kClsidDOMDocument40))) throw _com_error(E_POINTER);
        schema->Putasync(VARIANT_FALSE);
        schema->setProperty(_bstr_t(u"ServerHTTPRequest"), _variant_t(m_readOptions.allowNetwork));
        if (schema->load(_variant_t(static_cast<const OLECHAR*>(schemaPath))) != VARIANT_FALSE) {
            IXMLDOMSchemaCollectionPtr cache;
            cache.CreateInstance(kProgIdXMLSchemaCache40);
            cache->PutserverHttpRequest(m_readOptions.allowNetwork);
            cache->add(_bstr_t(kCdfNamespaceURI),
                       _variant_t(static_cast<const OLECHAR*>(schemaPath)));
            data->putref_schemas(cache);
            IXMLDOMParseErrorPtr result = data->validate();
            message = CComBSTR(result->Getreason().View());
            RecordLoadResult(result, data, dataPath);
        } else {
            RecordLoadResult(schema->GetparseError(), schema, schemaPath);
            IXMLDOMParseErrorPtr parseError = data->GetparseError();
            if (!parseError) throw E_POINTER;
            if (parseError->GeterrorCode() == 0)
                KestCalmorphDLLError::Raise(reason::kSchemaNotLoaded);
            message = CComBSTR(parseError->Getreason().View());
        }
    } else {
        RecordLoadResult(data->GetparseError(), data, dataPath);
        message = ParseErrorReason(data);
        if (message.Length() == 0) message = u"FAIL";
    }
    return message;
}

}  // namespace kest
