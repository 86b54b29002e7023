#include "CsvFormat.h"

#include "ValueLayout.h"

namespace kest {
namespace ops {

namespace {

void Field(std::string& out, const std::string& text) {
    if (text.find_first_of(",\"\r\n") == std::string::npos) {
        out += text;
        return;
    }
    out += '"';
    for (char c : text) {
        if (c == '"') out += '"';
        out += c;
    }
    out += '"';
}

}  // namespace

std::string ExportCsv(const Document& document) {
    std::string out = "list,item,format,units,index,x,y,value\r\n";
    for (const CalList& list : document.lists) {
        const std::string listName = list.name.value_or(std::string());
        for (const Item& item : list.items) {
            const ValueLayout layout = LayoutOf(item, listName);
            // The fields every row of the item shares.
            std::string prefix;
            Field(prefix, listName);
            prefix += ',';
            Field(prefix, item.name.value_or(std::string()));
            prefix += ',';
            Field(prefix, item.format.value_or(std::string()));
            prefix += ',';
            Field(prefix, item.units.value_or(std::string()));
            prefix += ',';
            for (std::size_t k = 0; k < item.values.elements.size(); ++k) {
                out += prefix;
                out += std::to_string(k);
                out += ',';
                if (layout.alongAxes) {
                    const std::vector<std::size_t> at = layout.PositionOf(k);
                    if (const Value* x = AxisPoint(item, 0, at[0])) Field(out, x->ToText());
                    out += ',';
                    if (at.size() > 1)
                        if (const Value* y = AxisPoint(item, 1, at[1])) Field(out, y->ToText());
                } else {
                    out += ',';
                }
                out += ',';
                Field(out, item.values.elements[k].ToText());
                out += "\r\n";
            }
        }
    }
    return out;
}

}  // namespace ops
}  // namespace kest
