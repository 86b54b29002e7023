#pragma once
// kest::ops::Diff: what differs between two documents, item by item and element by element.
//
// Items are matched by list name and item name, not by position; when a name occurs more than
// once in a list, its occurrences are matched in order of appearance and the duplicate is
// reported. Two numbers are equal when they have the same value (an integer and a double of
// the same value; NaN and NaN; -0 and 0) or when |a - b| <= max(tolerance, relTolerance *
// max(|a|, |b|)); texts are equal when identical.

#include <cstddef>
#include <optional>
#include <string>
#include <vector>

#include "../platform/Export.h"

#include "Document.h"

namespace kest {
namespace ops {

struct KEST_API DiffOptions {
    double tolerance = 0.0;      ///< absolute tolerance between two numbers
    double relTolerance = 0.0;   ///< relative tolerance, of the larger magnitude
    bool ignoreHistory = false;  ///< change entries are not compared
};

/// Equal elements under `options` (see the top of this file).
KEST_API bool ValuesEqual(const Value& a, const Value& b, const DiffOptions& options);

/// A field holding a text on either side: a header field, a namespace, a file reference, a
/// change entry, an item's units or format type, an axis size. A null side means "absent".
struct KEST_API FieldChange {
    /// Where the field is: "header.company", "list EngineControl.symbolic-file",
    /// "history[2]", "axis[0].size", "format".
    std::string field;
    std::optional<std::string> a;
    std::optional<std::string> b;
};

/// One changed element of an item's values or of one of its axes.
struct KEST_API ElementChange {
    /// "values" or "axis[N]".
    std::string part;
    std::size_t index = 0;
    /// For values of a curve or map: the axis points of the element, one per axis (texts as
    /// the reader sees them); empty otherwise.
    std::vector<std::string> axisPoints;
    /// Absent when the element exists on one side only (the list grew or shrank).
    std::optional<Value> a;
    std::optional<Value> b;
    /// b - a when both are numbers.
    std::optional<double> difference;
};

struct KEST_API ItemKey {
    std::string list;
    std::string item;
    /// 0 for the first item of this name in the list, 1 for the second, ...
    std::size_t occurrence = 0;
};

struct KEST_API ItemDiff {
    ItemKey key;
    std::vector<FieldChange> fields;
    std::vector<ElementChange> elements;
};

struct KEST_API DocumentDiff {
    /// Header, namespaces, schema location, change entries, list notes and file references.
    std::vector<FieldChange> fields;
    std::vector<ItemKey> onlyInA;
    std::vector<ItemKey> onlyInB;
    std::vector<ItemDiff> changed;
    /// Lists present on one side only (by name).
    std::vector<std::string> listsOnlyInA;
    std::vector<std::string> listsOnlyInB;
    /// Item names occurring more than once in a list of A or B ("list/item").
    std::vector<std::string> duplicates;

    bool Equal() const noexcept;
};

KEST_API DocumentDiff Diff(const Document& a, const Document& b,
                           const DiffOptions& options = DiffOptions());

/// The difference as one JSON document (the content `calmorph diff --json` prints).
KEST_API std::string DiffJson(const DocumentDiff& diff);

}  // namespace ops
}  // namespace kest
