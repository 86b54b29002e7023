#pragma once
// kest::ops::Check: what a CDF file may get wrong that the schema cannot see.
//
// Findings: numbers the reader did not take whole ("read-warning"), axis sizes that differ from
// the number of points ("axis-size"), a value count that differs from the product of the axis
// sizes ("value-count"), duplicate item names in a list ("duplicate-item"), axis points not
// strictly monotonic ("axis-order"), text values on a NUMERIC item ("text-value"); with CRC
// verification, the files a list references ("crc-missing", "crc-mismatch", "crc-match",
// "crc-unreadable", "crc-directory").

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "../core/KestReadWarning.h"
#include "../platform/Export.h"

#include "Document.h"

namespace kest {
namespace ops {

struct KEST_API CheckFinding {
    std::string file;
    /// 1-based position of the item (or of the token of a read warning); 0 when unknown.
    long line = 0;
    long column = 0;
    std::string list;
    std::string item;
    std::string kind;
    std::string message;
    /// False for a finding that reports nothing wrong ("crc-match").
    bool problem = true;
};

/// What the check knows of a file besides its document.
struct KEST_API CheckSource {
    /// The path as given; referenced files are looked up in its folder.
    std::string file;
    /// The file's text, to place findings at their item; may be empty.
    std::string text;
    std::vector<KestReadWarning> warnings;
    std::size_t warningsOmitted = 0;
};

struct KEST_API CheckOptions {
    bool verifyCrc = false;
};

KEST_API std::vector<CheckFinding> Check(const Document& document, const CheckSource& source,
                                         const CheckOptions& options = CheckOptions());

/// The CRC-32 (zlib's) of a file's bytes, read in blocks; null with `error` set when the file
/// is missing, a directory or unreadable.
KEST_API std::optional<std::uint32_t> FileCrc32(const std::string& path, std::string& error);

/// The findings as one JSON document: {"findings": [...]}.
KEST_API std::string CheckJson(const std::vector<CheckFinding>& findings);

}  // namespace ops
}  // namespace kest
