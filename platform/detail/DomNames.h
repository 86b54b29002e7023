#pragma once
// Name checks and the pseudo-attributes of the XML declaration.

#include <string>
#include <string_view>

#include "DomDocument.h"

namespace kest {
namespace detail {

/// True for a plausible XML qualified name: not empty, no markup or white space characters, not
/// starting with a digit, '-', '.' or ':'. Characters beyond ASCII are accepted as they are.
bool IsXmlName(std::string_view name) noexcept;

/// True for an encoding name that means UTF-8 ("UTF-8" or "UTF8", in any case).
bool IsUtf8EncodingName(std::string_view name) noexcept;

/// The declaration's value as text: `version="1.0" encoding="UTF-8"`.
std::string DeclarationText(const DomNode* declaration);

/// Replaces the declaration's pseudo-attributes with those in `text` (name="value" pairs, single
/// or double quotes). Throws _com_error(E_FAIL) when the text is not such a list.
void SetDeclarationText(DomDocument& document, DomNode* declaration, std::string_view text);

}  // namespace detail
}  // namespace kest
