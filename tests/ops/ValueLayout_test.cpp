// The layout of values: shapes along the axes, positions in them, and the finding when the
// count does not fit.
#include "ops/ValueLayout.h"

#include <gtest/gtest.h>

#include <cmath>

using namespace kest::ops;

namespace {

ValueList Numbers(std::size_t count) {
    ValueList list{true, {}};
    for (std::size_t i = 0; i < count; ++i) list.elements.push_back(Value::Integer(int(i)));
    return list;
}

Item ItemOf(std::size_t values, std::vector<std::size_t> axisPoints) {
    Item item;
    item.name = "I";
    item.values = Numbers(values);
    for (std::size_t n : axisPoints) item.axes.push_back(Axis{0, "", "NUMERIC", Numbers(n)});
    return item;
}

TEST(ValueLayout, ShapesFollowTheAxesOrFallBackToOneDimension) {
    const struct {
        const char* label;
        Item item;
        std::vector<std::size_t> shape;
        bool alongAxes;
        const char* finding;
    } cases[] = {
        {"scalar", ItemOf(1, {}), {}, false, nullptr},
        {"array without axes", ItemOf(4, {}), {4}, false, nullptr},
        {"no values, no axes", ItemOf(0, {}), {0}, false, nullptr},
        {"curve", ItemOf(5, {5}), {5}, true, nullptr},
        {"map", ItemOf(12, {4, 3}), {4, 3}, true, nullptr},
        {"cube", ItemOf(8, {2, 2, 2}), {2, 2, 2}, true, nullptr},
        {"too few", ItemOf(11, {4, 3}), {11}, false, "11 values, but the axes give 4 x 3 = 12"},
        {"curve too long", ItemOf(3, {2}), {3}, false, "3 values, but the axes give 2"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.label);
        const ValueLayout layout = LayoutOf(c.item, "L");
        EXPECT_EQ(layout.shape, c.shape);
        EXPECT_EQ(layout.alongAxes, c.alongAxes);
        ASSERT_EQ(layout.finding.has_value(), c.finding != nullptr);
        if (c.finding) {
            EXPECT_EQ(layout.finding->message, c.finding);
            EXPECT_EQ(layout.finding->kind + " " + layout.finding->list + " " + layout.finding->item,
                      "value-count L I");
        }
    }
}

TEST(ValueLayout, FirstAxisIsOuter) {
    const ValueLayout map = LayoutOf(ItemOf(12, {4, 3}));
    EXPECT_EQ(map.PositionOf(0), (std::vector<std::size_t>{0, 0}));
    EXPECT_EQ(map.PositionOf(5), (std::vector<std::size_t>{1, 2}));
    EXPECT_EQ(map.PositionOf(11), (std::vector<std::size_t>{3, 2}));
    const ValueLayout cube = LayoutOf(ItemOf(24, {2, 3, 4}));
    EXPECT_EQ(cube.PositionOf(17), (std::vector<std::size_t>{1, 1, 1}));
    // An axis without points stands for as many as its size attribute says.
    Item sized = ItemOf(6, {3});
    sized.axes.push_back(Axis{2, "", "NUMERIC", ValueList{}});
    EXPECT_EQ(LayoutOf(sized).shape, (std::vector<std::size_t>{3, 2}));
}

TEST(Value, NumbersCompareAndPrintByValue) {
    const double nan = std::nan("");
    EXPECT_TRUE(Value::Integer(-464).SameAs(Value::Double(-464.0)));
    EXPECT_FALSE(Value::Integer(-464) == Value::Double(-464.0));
    EXPECT_TRUE(Value::Double(nan).SameAs(Value::Double(nan)));
    EXPECT_TRUE(Value::Double(-0.0).SameAs(Value::Integer(0)));
    EXPECT_FALSE(Value::Double(-0.0) == Value::Double(0.0));
    EXPECT_FALSE(Value::String("1").SameAs(Value::Integer(1)));
    EXPECT_FALSE(Value().SameAs(Value::Integer(0)));
    const struct {
        Value value;
        const char* text;
    } prints[] = {{Value::Double(-464.0), "-464"}, {Value::Integer(-464), "-464"},
                  {Value::Double(0.1 + 0.2), "0.30000000000000004"},
                  {Value::Double(1e20), "1e+20"}, {Value::Double(-0.0), "-0"},
                  {Value::Double(-HUGE_VAL), "-inf"}, {Value::Double(nan), "nan"},
                  {Value::String("a b"), "a b"}, {Value(), ""}};
    for (const auto& p : prints) EXPECT_EQ(p.value.ToText(), p.text);
}

}  // namespace
