#pragma once
// The library's own copy of schema/cdf.xsd, generated into the build from that file, so that
// files whose schema is missing can still be validated from a build tree or an installed copy.

#include <cstddef>

namespace kest {
namespace detail {

extern const char kBuiltinCdfSchema[];
extern const std::size_t kBuiltinCdfSchemaSize;

}  // namespace detail
}  // namespace kest
