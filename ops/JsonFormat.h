#pragma once
// The JSON form of a calibration document (docs/json-format.md, docs/cdf-json.schema.json):
// lossless both ways, so that import of an export gives back the document it came from.

#include <functional>
#include <stdexcept>
#include <string>
#include <string_view>

#include "../platform/Export.h"

#include "Document.h"

namespace kest {
namespace ops {

/// The value of the document's "format" member, and the version this library writes and reads.
constexpr const char* kJsonFormatName = "kestcalmorph-cdf";
constexpr int kJsonFormatVersion = 1;
/// The longest text import accepts in one JSON string, in bytes.
constexpr std::size_t kJsonMaxTextBytes = 16u * 1024 * 1024;
/// The deepest nesting of arrays and objects import accepts (the format needs 8).
constexpr int kJsonMaxDepth = 32;

/// A JSON text that import refuses: where (`path`, such as "lists[0].items[3].values[7]", or
/// empty for the text as a whole) and why (`reason`, without the path). what() gives both.
class KEST_API JsonImportError : public std::runtime_error {
  public:
    JsonImportError(std::string path, std::string reason);
    const std::string& Path() const noexcept { return m_path; }
    const std::string& Reason() const noexcept { return m_reason; }

  private:
    std::string m_path;
    std::string m_reason;
};

/// Receives written text in pieces (each valid for the call only); may throw to stop.
using JsonSink = std::function<void(std::string_view)>;

/// The document as JSON text, two-space indented, ending in a line break.
KEST_API std::string ExportJson(const Document& document);
/// The same text, handed to `sink` in pieces of about a megabyte as it is written.
KEST_API void ExportJson(const Document& document, const JsonSink& sink);

/// The document a JSON text holds. Throws JsonImportError for text that is not JSON, nested
/// deeper than kJsonMaxDepth, or not a document of this format: a member missing, unknown or
/// of the wrong type, a format type other than "NUMERIC", "STRING" and "LABEL", a number out of
/// range, a text beyond kJsonMaxTextBytes, a date KestCdfDate refuses.
KEST_API Document ImportJson(std::string_view text);

}  // namespace ops
}  // namespace kest
