#pragma once
// Generator of realistic CDF files for the benchmarks: a change history, several calibration
// lists with file references, and a mix of single values, curves and maps, written as text in
// the element forms the library itself writes, so that the files validate against cdf.xsd.

#include <cstdint>
#include <string>

namespace kest {
namespace bench {

struct CdfGenOptions {
    /// Number of calibration items in the whole file.
    long items = 60000;
    /// Number of calibration lists; the items are spread evenly over them. 0: one list per
    /// 5000 items, at least one.
    int lists = 0;
    std::uint64_t seed = 1;
    /// True: the root names cdf.xsd under the CDF namespace in xsi:schemaLocation. False: the
    /// root names no schema; its third attribute is then a namespace declaration
    /// (xmlns:cdf), which no schema validator sees as an attribute and which the reader, taking
    /// the root's first three attributes by position, still finds.
    bool schema = true;
    /// Indentation between elements (white space only between elements, never inside texts).
    bool indent = true;
};

/// What a generation produced.
struct CdfGenResult {
    std::uint64_t bytes = 0;
    long items = 0;
    long values = 0;
    long curves = 0;
    long maps = 0;
    int lists = 0;
};

/// Writes the file; throws std::runtime_error naming the path when it cannot be written.
CdfGenResult GenerateCdf(const CdfGenOptions& options, const std::string& path);

/// The namespace URI of CDF documents.
constexpr const char* kCdfNamespace = "http://kest.dev/schemas/cdf/1.0";

}  // namespace bench
}  // namespace kest
