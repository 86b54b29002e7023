#include "CdfInput.h"

#include <cstdio>

#include "Diagnostics.h"
#include "ToolError.h"

namespace kest::tool {

namespace {

// Reads "line N, column M" from a parser's reason text; false when it holds no position.
bool PositionInReason(const std::string& reason, long& line, long& column) {
    std::string::size_type at = reason.find("at line ");
    if (at == std::string::npos) return false;
    return std::sscanf(reason.c_str() + at, "at line %ld, column %ld", &line, &column) == 2 &&
           line > 0;
}

}  // namespace

std::string InputPath(const std::string& argument) {
    return argument == "-" ? "/dev/stdin" : argument;
}

void ThrowLoadFailure(const std::string& argument, const std::string& message, bool validated) {
    long line = 0;
    long column = 0;
    if (!PositionInReason(message, line, column) && argument != "-") {
        try {
            IXMLDOMDocument2Ptr document;
            if (SUCCEEDED(document.CreateInstance(kProgIdDOMDocument40))) {
                document->Putasync(VARIANT_FALSE);
                document->PutvalidateOnParse(validated ? VARIANT_TRUE : VARIANT_FALSE);
                if (document->load(_variant_t(argument)) == VARIANT_FALSE) {
                    IXMLDOMParseErrorPtr parseError = document->GetparseError();
                    line = parseError->Getline();
                    column = parseError->Getlinepos();
                }
            }
        } catch (...) {
            // The reason alone still says what went wrong.
        }
    }
    throw ToolError(kExitCannotLoad, Where(DisplayName(argument), line, column), message);
}

void ReadCdf(KestCalmorph& converter, const std::string& argument, KestCdfCalData& data) {
    CComBSTR message;
    data = converter.ConvertXMLtoCPP(CComBSTR(InputPath(argument)), true, message);
    if (message.Length() != 0) ThrowLoadFailure(argument, message.ToString(), true);
    // Reading CAL-DATA always sets the namespace (empty when the root has none); a tree whose
    // namespace is still null found no CAL-DATA to convert.
    if (data.GetNamespace().m_string == nullptr) {
        throw ToolError(kExitCannotLoad, DisplayName(argument), "no CAL-DATA element");
    }
}

}  // namespace kest::tool
