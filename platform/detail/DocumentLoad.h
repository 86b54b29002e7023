#pragma once
// Loading a DOM document from a file, standard input or bytes, validating it against the schemas
// its root names while it loads, and validating loaded content later. Private to the platform.

#include <string>
#include <string_view>

#include "DomDocument.h"

namespace kest {
namespace detail {

/// The first element among the children of `parentOfRoot`, or null.
const DomNode* RootElement(const DomNode* parentOfRoot);

/// Parses `bytes` and, if they are well-formed (and valid where validate-on-parse is on), makes
/// them the document's content; a failure empties the document and fills its error. Relative
/// schema locations resolve against the directory of `baseUrl` ("" for the current directory).
VARIANT_BOOL LoadFromBytes(DomDocument& doc, std::string_view bytes, const char* encoding,
                           const std::string& url, const std::string& baseUrl);

/// Loads a file path ("-" for standard input). Pipes and standard input are read once: their
/// bytes feed both the validator and the parser, and relative schema locations resolve against
/// the current directory.
VARIANT_BOOL LoadFromFile(DomDocument& doc, const std::string& path, const std::string& url);

/// Empties the document and records the failure.
VARIANT_BOOL FailLoad(DomDocument& doc, HRESULT code, std::string reason, std::string url);

/// Validates the document's content against its attached schemas, or those its root names, and
/// records the outcome as the document's error.
void ValidateContent(DomDocument& doc);

}  // namespace detail
}  // namespace kest
