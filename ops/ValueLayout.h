#pragma once
// The layout of an item's values: where value k of an item stands among its axes.
//
// The first AXIS is the outer index, the second the inner one: value k of a map with axis
// sizes n0 and n1 stands at (k / n1, k % n1); three or more axes extend the same order (the
// last axis varies fastest). An axis's size is the number of its points (its size attribute
// when it holds no points). An item without axes is a scalar when it has one value, else a
// 1-D array. When the number of values differs from the product of the axis sizes, the values
// are a 1-D array and the layout carries a finding.

#include <cstddef>
#include <optional>
#include <string>
#include <vector>

#include "../platform/Export.h"

#include "Document.h"

namespace kest {
namespace ops {

/// Something about an item that the schema cannot see, for the check command and the reports.
struct KEST_API Finding {
    /// A short stable name of the kind, such as "value-count".
    std::string kind;
    std::string list;
    std::string item;
    /// What is wrong, in a sentence without the list and item names.
    std::string message;
};

struct KEST_API ValueLayout {
    /// The dimensions: empty for a scalar, one entry for a 1-D array, one per axis for a curve
    /// or map laid out along its axes.
    std::vector<std::size_t> shape;
    /// True when the values are laid out along the item's axes (shape has one entry per axis).
    bool alongAxes = false;
    /// Set when the value count differs from the product of the axis sizes.
    std::optional<Finding> finding;

    /// The position of value k in the shape (one index per dimension; none for a scalar).
    std::vector<std::size_t> PositionOf(std::size_t k) const;
};

/// The number of points an axis stands for: its points, or its size attribute without them.
KEST_API std::size_t AxisLength(const Axis& axis);

/// The layout of an item's values; `list` names the item's list in the finding.
KEST_API ValueLayout LayoutOf(const Item& item, const std::string& list = std::string());

/// The point of axis `axis` at `position`, or null when the item has no such axis or point.
KEST_API const Value* AxisPoint(const Item& item, std::size_t axis, std::size_t position);

}  // namespace ops
}  // namespace kest
