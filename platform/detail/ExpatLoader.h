#pragma once
// Builds DOM content from XML bytes with expat (namespace processing off, no external entity
// or DTD ever read, expat's amplification limits on, nesting bounded).

#include <memory>
#include <string>
#include <string_view>

#include "DomDocument.h"

namespace kest {
namespace detail {

/// Freshly parsed content: the top-level nodes are the children of `top`, all in `store`.
struct ParsedContent {
    std::unique_ptr<DomStore> store;
    DomNode* top = nullptr;
};

/// Parses `bytes`. `forcedEncoding` (e.g. "UTF-8") overrides BOM and declaration detection;
/// null lets expat detect the encoding. `url` names the source in error reasons (may be empty).
/// Returns the content, or an empty store with `error` filled. Never throws.
ParsedContent ParseXml(std::string_view bytes, const char* forcedEncoding, const std::string& url,
                       long maxElementDepth, DomError& error) noexcept;

/// "<what> at line L, column C in URL" (the " in URL" part when url is not empty).
std::string DescribeLocation(const std::string& what, long line, long column,
                             const std::string& url);

}  // namespace detail
}  // namespace kest
