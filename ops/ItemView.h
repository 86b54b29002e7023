#pragma once
// What `calmorph show` prints for items: a text block per item, or one JSON document.
//
// The text block names the item, its list, format type, units, annotation and note, then its
// values by their layout (ValueLayout.h): a scalar on one line; a curve as a table of axis
// point and value; a map as a grid with the first axis down and the second across, the axis
// points as row and column headers; three or more axes, and values that do not fit their axes,
// one value a line with its position. Texts are shown as they are, with line breaks and tabs
// escaped (\n, \r, \t) so that every field stays on its line.

#include <string>
#include <vector>

#include "../platform/Export.h"

#include "ItemSelection.h"

namespace kest {
namespace ops {

/// The text block of one item, ending in a line break.
KEST_API std::string ItemText(const ItemRef& ref);

/// The items as one JSON document: {"items": [...]}, each with list, name, format, units,
/// annotation, note, shape, axes (units and points), values nested by the shape (a scalar
/// alone) and finding (null or its message). Numbers are written by value.
KEST_API std::string ItemsJson(const std::vector<ItemRef>& items);

}  // namespace ops
}  // namespace kest
