#pragma once
// kest::ops::Merge: a three-way merge of calibration documents, as version control merges
// text, by item and by element.
//
// A change made on one side only is taken; the same change on both sides is taken once; an item
// added on one side is added; an item deleted on one side and unchanged on the other is deleted.
// Conflicts: different changes to the same element, a deletion against a change, changes of
// dimensions or format type on both sides that differ, header fields and file references (name
// with CRC, one element) changed differently. Elements compare by value (Value::SameAs).
// Change histories are joined in date order without duplicates.

#include <optional>
#include <string>
#include <vector>

#include "../platform/Export.h"

#include "Document.h"

namespace kest {
namespace ops {

enum class MergePrefer { kNone, kOurs, kTheirs };

struct KEST_API MergeConflict {
    /// "" for header fields.
    std::string list;
    std::string item;
    /// "values[3]", "axis[0]", "format", "units", "item" (deleted against changed),
    /// "header.company", "symbolic-file", ...
    std::string element;
    /// The three sides as text; null where the side has none.
    std::optional<std::string> base;
    std::optional<std::string> ours;
    std::optional<std::string> theirs;
};

struct KEST_API MergeResult {
    /// The merge; with conflicts and MergePrefer::kNone, conflicting elements keep the base.
    Document merged;
    std::vector<MergeConflict> conflicts;
    /// True when conflicts were resolved to the preferred side.
    bool resolved = false;
};

KEST_API MergeResult Merge(const Document& base, const Document& ours, const Document& theirs,
                           MergePrefer prefer = MergePrefer::kNone);

/// The conflicts as one JSON document: {"conflicts": [...], "resolved": bool}.
KEST_API std::string MergeJson(const MergeResult& result);

}  // namespace ops
}  // namespace kest
