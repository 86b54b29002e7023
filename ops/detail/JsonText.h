#pragma once
// One JSON string writer for the ops forms that build their text by hand for speed.

#include <string>
#include <string_view>

namespace kest {
namespace ops {
namespace detail {

/// Appends `text` as a quoted JSON string. With `forScript`, '<' is written as \u003c too, so the
/// text can never close or open markup when the JSON sits inside an HTML script element.
void AppendJsonString(std::string& out, std::string_view text, bool forScript = false);

}  // namespace detail
}  // namespace ops
}  // namespace kest
