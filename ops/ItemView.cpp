#include "ItemView.h"

#include <algorithm>
#include <cmath>

#include "ValueLayout.h"

namespace kest {
namespace ops {

namespace {

std::string Printable(const std::string& text) {
    std::string out;
    out.reserve(text.size());
    for (char c : text) {
        if (c == '\n')
            out += "\\n";
        else if (c == '\r')
            out += "\\r";
        else if (c == '\t')
            out += "\\t";
        else
            out += c;
    }
    return out;
}

std::string Show(const std::optional<std::string>& text) {
    return text ? Printable(*text) : std::string("(none)");
}

std::string Cell(const Value& value) { return Printable(value.ToText()); }

std::string CellAt(const std::vector<Value>& values, std::size_t i) {
    return i < values.size() ? Cell(values[i]) : std::string();
}

// Display width in characters: UTF-8 continuation bytes take no column.
std::size_t Width(const std::string& text) {
    std::size_t width = 0;
    for (char c : text) width += (static_cast<unsigned char>(c) & 0xC0) != 0x80;
    return width;
}

// Rows of cells, right-aligned in columns, each row indented by four spaces.
void AppendTable(std::string& out, const std::vector<std::vector<std::string>>& rows) {
    std::vector<std::size_t> widths;
    for (const auto& row : rows) {
        if (widths.size() < row.size()) widths.resize(row.size(), 0);
        for (std::size_t c = 0; c < row.size(); ++c) widths[c] = std::max(widths[c], Width(row[c]));
    }
    for (const auto& row : rows) {
        std::string line = "   ";
        for (std::size_t c = 0; c < row.size(); ++c) {
            line += ' ';
            line.append(widths[c] - Width(row[c]), ' ');
            line += row[c];
        }
        out += line + '\n';
    }
}

std::string AxisLabel(const Axis& axis, std::size_t index) {
    return axis.units.empty() ? "axis " + std::to_string(index + 1) : Printable(axis.units);
}

std::string PositionText(const std::vector<std::size_t>& position) {
    std::string text = "[";
    for (std::size_t d = 0; d < position.size(); ++d) {
        if (d) text += ',';
        text += std::to_string(position[d]);
    }
    return text + "]";
}

// ---------------------------------------------------------------------------------------------
// JSON

void JsonString(std::string& out, const std::string& text) {
    out += '"';
    for (char ch : text) {
        const unsigned char c = static_cast<unsigned char>(ch);
        if (c == '"' || c == '\\') {
            out += '\\';
            out += ch;
        } else if (c < 0x20) {
            static const char kHex[] = "0123456789abcdef";
            out += "\\u00";
            out += kHex[c >> 4];
            out += kHex[c & 15];
        } else {
            out += ch;
        }
    }
    out += '"';
}

void JsonNullable(std::string& out, const std::optional<std::string>& text) {
    if (text)
        JsonString(out, *text);
    else
        out += "null";
}

void JsonValue(std::string& out, const Value& value) {
    if (value.IsNumber() && std::isfinite(value.Number()))
        out += FormatNumber(value.Number());
    else if (value.GetKind() == Value::Kind::kEmpty)
        out += "null";
    else
        JsonString(out, value.ToText());
}

// The values nested by the shape, written without recursion (a file may hold many axes).
void JsonNested(std::string& out, const std::vector<Value>& values,
                const std::vector<std::size_t>& shape) {
    if (shape.empty()) {
        if (values.empty())
            out += "null";
        else
            JsonValue(out, values[0]);
        return;
    }
    if (values.empty()) {
        out += "[]";
        return;
    }
    for (std::size_t k = 0; k < values.size(); ++k) {
        // A value opens an array for each trailing dimension it starts and closes each it
        // ends: [[1, 2], [3, 4]].
        if (k) out += ", ";
        for (std::size_t d = shape.size(), rest = k; d-- > 0 && rest % shape[d] == 0;) {
            out += '[';
            rest /= shape[d];
        }
        JsonValue(out, values[k]);
        for (std::size_t d = shape.size(), rest = k + 1; d-- > 0 && rest % shape[d] == 0;) {
            out += ']';
            rest /= shape[d];
        }
    }
}

}  // namespace

std::string ItemText(const ItemRef& ref) {
    const Item& item = *ref.item;
    const std::string listName = ref.list->name.value_or(std::string());
    std::string out = "item " + Show(item.name) + "\n";
    out += "  list: " + Show(ref.list->name) + "\n";
    out += "  format: " + Show(item.format) + ", units: " + Show(item.units) + "\n";
    out += "  annotation: " + Show(item.annotation) + "\n";
    out += "  note: " + Show(item.note) + "\n";
    const std::vector<Value>& values = item.values.elements;
    if (!item.HasValue() || !item.values.present) {
        out += "  value: (none)\n";
        return out;
    }
    const ValueLayout layout = LayoutOf(item, listName);
    const std::string valueLabel = item.units->empty() ? "value" : Printable(*item.units);
    if (layout.shape.empty()) {
        out += "  value: " + Cell(values[0]) + "\n";
        return out;
    }
    if (layout.alongAxes && layout.shape.size() == 1) {
        out += "  curve: " + std::to_string(values.size()) + " points\n";
        std::vector<std::vector<std::string>> rows{{AxisLabel(item.axes[0], 0), valueLabel}};
        for (std::size_t k = 0; k < values.size(); ++k)
            rows.push_back({CellAt(item.axes[0].points.elements, k), Cell(values[k])});
        AppendTable(out, rows);
        return out;
    }
    if (layout.alongAxes && layout.shape.size() == 2) {
        const std::size_t rowsCount = layout.shape[0], columns = layout.shape[1];
        out += "  map: " + std::to_string(rowsCount) + " x " + std::to_string(columns) + " (" +
               AxisLabel(item.axes[0], 0) + " down, " + AxisLabel(item.axes[1], 1) +
               " across, " + valueLabel + ")\n";
        std::vector<std::vector<std::string>> rows(1 + rowsCount);
        rows[0].push_back(AxisLabel(item.axes[0], 0) + " \\ " + AxisLabel(item.axes[1], 1));
        for (std::size_t c = 0; c < columns; ++c)
            rows[0].push_back(CellAt(item.axes[1].points.elements, c));
        for (std::size_t r = 0; r < rowsCount; ++r) {
            rows[1 + r].push_back(CellAt(item.axes[0].points.elements, r));
            for (std::size_t c = 0; c < columns; ++c)
                rows[1 + r].push_back(Cell(values[r * columns + c]));
        }
        AppendTable(out, rows);
        return out;
    }
    // Three or more axes, values that do not fit their axes, or a list without axes.
    if (layout.finding) out += "  finding: " + layout.finding->message + "\n";
    std::string dims;
    for (std::size_t d = 0; d < layout.shape.size(); ++d)
        dims += (d ? " x " : "") + std::to_string(layout.shape[d]);
    out += "  values: " + dims + "\n";
    for (std::size_t a = 0; a < item.axes.size(); ++a) {
        out += "    axis " + std::to_string(a + 1) + " (" + AxisLabel(item.axes[a], a) + "):";
        for (const Value& point : item.axes[a].points.elements) out += " " + Cell(point);
        out += '\n';
    }
    std::vector<std::vector<std::string>> rows;
    for (std::size_t k = 0; k < values.size(); ++k)
        rows.push_back({PositionText(layout.PositionOf(k)), Cell(values[k])});
    AppendTable(out, rows);
    return out;
}

std::string ItemsJson(const std::vector<ItemRef>& items) {
    std::string out = "{\"items\": [";
    for (std::size_t i = 0; i < items.size(); ++i) {
        const Item& item = *items[i].item;
        const ValueLayout layout = LayoutOf(item, items[i].list->name.value_or(std::string()));
        out += i ? ",\n  {" : "\n  {";
        out += "\"list\": ";
        JsonNullable(out, items[i].list->name);
        out += ", \"name\": ";
        JsonNullable(out, item.name);
        out += ", \"format\": ";
        JsonNullable(out, item.format);
        out += ", \"units\": ";
        JsonNullable(out, item.units);
        out += ", \"annotation\": ";
        JsonNullable(out, item.annotation);
        out += ", \"note\": ";
        JsonNullable(out, item.note);
        out += ", \"shape\": [";
        for (std::size_t d = 0; d < layout.shape.size(); ++d)
            out += (d ? ", " : "") + std::to_string(layout.shape[d]);
        out += "], \"axes\": [";
        for (std::size_t a = 0; a < item.axes.size(); ++a) {
            out += a ? ", {\"units\": " : "{\"units\": ";
            JsonString(out, item.axes[a].units);
            out += ", \"points\": ";
            JsonNested(out, item.axes[a].points.elements,
                       {item.axes[a].points.elements.size()});
            out += '}';
        }
        out += "], \"values\": ";
        if (item.values.present)
            JsonNested(out, item.values.elements, layout.shape);
        else
            out += "null";
        out += ", \"finding\": ";
        if (layout.finding)
            JsonString(out, layout.finding->message);
        else
            out += "null";
        out += '}';
    }
    out += items.empty() ? "]}\n" : "\n]}\n";
    return out;
}

}  // namespace ops
}  // namespace kest
