#include "ValueLayout.h"

namespace kest {
namespace ops {

std::vector<std::size_t> ValueLayout::PositionOf(std::size_t k) const {
    std::vector<std::size_t> position(shape.size());
    for (std::size_t d = shape.size(); d-- > 0;) {
        if (shape[d] == 0) continue;
        position[d] = k % shape[d];
        k /= shape[d];
    }
    return position;
}

std::size_t AxisLength(const Axis& axis) {
    if (axis.points.present) return axis.points.elements.size();
    return axis.size > 0 ? static_cast<std::size_t>(axis.size) : 0;
}

ValueLayout LayoutOf(const Item& item, const std::string& list) {
    ValueLayout layout;
    const std::size_t count = item.values.elements.size();
    if (item.axes.empty()) {
        if (count != 1) layout.shape.push_back(count);
        return layout;
    }
    std::size_t product = 1;
    bool overflow = false;
    std::string sizes;
    for (const Axis& axis : item.axes) {
        const std::size_t n = AxisLength(axis);
        if (n != 0 && product > static_cast<std::size_t>(-1) / n) overflow = true;
        product *= n;
        if (!sizes.empty()) sizes += " x ";
        sizes += std::to_string(n);
    }
    if (!overflow && product == count) {
        for (const Axis& axis : item.axes) layout.shape.push_back(AxisLength(axis));
        layout.alongAxes = true;
        return layout;
    }
    layout.shape.push_back(count);
    layout.finding = Finding{"value-count", list, item.name.value_or(std::string()),
                             std::to_string(count) + " values, but the axes give " + sizes +
                                 (item.axes.size() > 1 && !overflow
                                      ? " = " + std::to_string(product)
                                      : std::string())};
    return layout;
}

const Value* AxisPoint(const Item& item, std::size_t axis, std::size_t position) {
    if (axis >= item.axes.size()) return nullptr;
    const std::vector<Value>& points = item.axes[axis].points.elements;
    return position < points.size() ? &points[position] : nullptr;
}

}  // namespace ops
}  // namespace kest
