#pragma once
// Picking items of a document by name: exact names, or globs when a name holds '*' or '?'.

#include <string>
#include <vector>

#include "../platform/Export.h"

#include "Document.h"

namespace kest {
namespace ops {

/// One item of a document with the list it belongs to.
struct KEST_API ItemRef {
    const CalList* list = nullptr;
    const Item* item = nullptr;
    std::size_t listIndex = 0;
    std::size_t itemIndex = 0;
};

struct KEST_API ItemSelection {
    /// The items picked, in document order, each once.
    std::vector<ItemRef> items;
    /// The patterns that picked nothing, in the order given.
    std::vector<std::string> unmatched;
};

/// True when `name` matches `pattern`: exactly, or as a glob ('*' any run of characters, '?'
/// one character, counted in bytes) when the pattern holds '*' or '?'.
KEST_API bool NameMatches(const std::string& pattern, const std::string& name);

/// The items whose name matches any of `patterns` (every item when there are none), in lists
/// named `list` exactly (every list when it is empty).
KEST_API ItemSelection SelectItems(const Document& document,
                                   const std::vector<std::string>& patterns,
                                   const std::string& list = std::string());

}  // namespace ops
}  // namespace kest
