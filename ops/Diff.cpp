#include "Diff.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <map>
#include <nlohmann/json.hpp>
#include <set>
#include <tuple>
#include <utility>

#include "DiffSupport.h"
#include "ValueLayout.h"

namespace kest {
namespace ops {

bool ValuesEqual(const Value& a, const Value& b, const DiffOptions& options) {
    if (a.SameAs(b)) return true;
    if (!a.IsNumber() || !b.IsNumber()) return false;
    const double x = a.Number(), y = b.Number();
    if (std::isnan(x) || std::isnan(y) || std::isinf(x) || std::isinf(y)) return false;
    const double allowed =
        std::max(options.tolerance, options.relTolerance * std::max(std::fabs(x), std::fabs(y)));
    return std::fabs(x - y) <= allowed;
}

bool DocumentDiff::Equal() const noexcept {
    return fields.empty() && onlyInA.empty() && onlyInB.empty() && changed.empty() &&
           listsOnlyInA.empty() && listsOnlyInB.empty();
}

namespace detail {

std::string FileRefText(const std::optional<FileRef>& ref) {
    if (!ref) return std::string();
    char crc[16];
    std::snprintf(crc, sizeof crc, "0x%08X", static_cast<unsigned>(ref->crc));
    return ref->name + " (crc32 " + crc + ")";
}

std::optional<std::string> OptionalFileRef(const std::optional<FileRef>& ref) {
    if (!ref) return std::nullopt;
    return FileRefText(ref);
}

std::string ChangeText(const Change& change) {
    std::string text = change.date + " " + change.user;
    if (change.tool) text += " tool=" + *change.tool;
    if (change.dataVersion) text += " version=" + *change.dataVersion;
    if (change.note) text += " note=" + *change.note;
    return text;
}

std::vector<IndexedItem> IndexItems(const Document& document,
                                    std::vector<std::string>& duplicates) {
    std::vector<IndexedItem> out;
    std::map<std::pair<std::string, std::string>, std::size_t> seen;
    for (const CalList& list : document.lists) {
        for (const Item& item : list.items) {
            ItemKey key{list.name.value_or(""), item.name.value_or(""), 0};
            std::size_t& count = seen[{key.list, key.item}];
            key.occurrence = count++;
            if (key.occurrence == 1) duplicates.push_back(key.list + "/" + key.item);
            out.push_back({key, &item});
        }
    }
    return out;
}

}  // namespace detail

namespace {

using detail::IndexedItem;

void Field(std::vector<FieldChange>& out, const std::string& name,
           const std::optional<std::string>& a, const std::optional<std::string>& b) {
    if (a != b) out.push_back({name, a, b});
}

void CompareLists(ItemDiff& diff, const std::string& part, const ValueList& a, const ValueList& b,
                  const Item* itemB, const DiffOptions& options) {
    const std::size_t n = std::max(a.elements.size(), b.elements.size());
    std::optional<ValueLayout> layout;
    for (std::size_t i = 0; i < n; ++i) {
        const Value* x = i < a.elements.size() ? &a.elements[i] : nullptr;
        const Value* y = i < b.elements.size() ? &b.elements[i] : nullptr;
        if (x && y && ValuesEqual(*x, *y, options)) continue;
        ElementChange change;
        change.part = part;
        change.index = i;
        if (x) change.a = *x;
        if (y) change.b = *y;
        if (x && y && x->IsNumber() && y->IsNumber()) change.difference = y->Number() - x->Number();
        if (itemB && !itemB->axes.empty()) {
            if (!layout) layout = LayoutOf(*itemB);
            if (layout->alongAxes && i < b.elements.size()) {
                const std::vector<std::size_t> position = layout->PositionOf(i);
                for (std::size_t axis = 0; axis < position.size(); ++axis) {
                    const Value* point = AxisPoint(*itemB, axis, position[axis]);
                    change.axisPoints.push_back(point ? point->ToText() : std::string());
                }
            }
        }
        diff.elements.push_back(std::move(change));
    }
    if (a.present != b.present) {
        diff.fields.push_back(
            {part + ".present", a.present ? "yes" : "no", b.present ? "yes" : "no"});
    }
}

ItemDiff CompareItems(const ItemKey& key, const Item& a, const Item& b,
                      const DiffOptions& options) {
    ItemDiff diff;
    diff.key = key;
    Field(diff.fields, "units", a.units, b.units);
    Field(diff.fields, "format", a.format, b.format);
    Field(diff.fields, "annotation", a.annotation, b.annotation);
    Field(diff.fields, "note", a.note, b.note);
    if (a.axes.size() != b.axes.size()) {
        diff.fields.push_back(
            {"axes", std::to_string(a.axes.size()), std::to_string(b.axes.size())});
    }
    const std::size_t common = std::min(a.axes.size(), b.axes.size());
    for (std::size_t i = 0; i < common; ++i) {
        const std::string part = "axis[" + std::to_string(i) + "]";
        const Axis& x = a.axes[i];
        const Axis& y = b.axes[i];
        if (x.size != y.size)
            diff.fields.push_back({part + ".size", std::to_string(x.size), std::to_string(y.size)});
        Field(diff.fields, part + ".units", x.units, y.units);
        Field(diff.fields, part + ".format", x.format, y.format);
        CompareLists(diff, part, x.points, y.points, nullptr, options);
    }
    CompareLists(diff, "values", a.values, b.values, &b, options);
    return diff;
}

void CompareHeader(const Document& a, const Document& b, const DiffOptions& options,
                   DocumentDiff& out) {
    Field(out.fields, "namespace", a.ns, b.ns);
    Field(out.fields, "schema-instance", a.schemaInstance, b.schemaInstance);
    Field(out.fields, "schema-location", a.schemaLocation, b.schemaLocation);
    Field(out.fields, "filename", a.fileName, b.fileName);
    Field(out.fields, "company", a.company, b.company);
    Field(out.fields, "note", a.note, b.note);
    if (!options.ignoreHistory) {
        const std::size_t n = std::max(a.history.size(), b.history.size());
        for (std::size_t i = 0; i < n; ++i) {
            std::optional<std::string> x, y;
            if (i < a.history.size()) x = detail::ChangeText(a.history[i]);
            if (i < b.history.size()) y = detail::ChangeText(b.history[i]);
            Field(out.fields, "history[" + std::to_string(i) + "]", x, y);
        }
    }
    std::map<std::string, const CalList*> listsB;
    for (const CalList& list : b.lists) listsB.emplace(list.name.value_or(""), &list);
    std::set<std::string> namesA;
    for (const CalList& list : a.lists) {
        const std::string name = list.name.value_or("");
        if (!namesA.insert(name).second) continue;
        auto found = listsB.find(name);
        if (found == listsB.end()) {
            out.listsOnlyInA.push_back(name);
            continue;
        }
        const CalList& other = *found->second;
        const std::string where = "list " + name + ".";
        Field(out.fields, where + "note", list.note, other.note);
        Field(out.fields, where + "symbolic-file", detail::OptionalFileRef(list.symbolicFile),
              detail::OptionalFileRef(other.symbolicFile));
        Field(out.fields, where + "target-image", detail::OptionalFileRef(list.targetImage),
              detail::OptionalFileRef(other.targetImage));
    }
    for (const auto& [name, list] : listsB) {
        if (!namesA.count(name)) out.listsOnlyInB.push_back(name);
    }
}

}  // namespace

DocumentDiff Diff(const Document& a, const Document& b, const DiffOptions& options) {
    DocumentDiff out;
    CompareHeader(a, b, options, out);
    std::vector<IndexedItem> itemsA = detail::IndexItems(a, out.duplicates);
    std::vector<IndexedItem> itemsB = detail::IndexItems(b, out.duplicates);
    std::sort(out.duplicates.begin(), out.duplicates.end());
    out.duplicates.erase(std::unique(out.duplicates.begin(), out.duplicates.end()),
                         out.duplicates.end());
    std::map<ItemKey, const Item*> byKey;
    for (const IndexedItem& entry : itemsB) byKey.emplace(entry.key, entry.item);
    for (const IndexedItem& entry : itemsA) {
        auto found = byKey.find(entry.key);
        if (found == byKey.end()) {
            out.onlyInA.push_back(entry.key);
            continue;
        }
        ItemDiff diff = CompareItems(entry.key, *entry.item, *found->second, options);
        if (!diff.fields.empty() || !diff.elements.empty()) out.changed.push_back(std::move(diff));
        byKey.erase(found);
    }
    for (const IndexedItem& entry : itemsB) {
        if (byKey.count(entry.key)) out.onlyInB.push_back(entry.key);
    }
    return out;
}

namespace detail {

nlohmann::ordered_json ValueJson(const Value& value) {
    switch (value.GetKind()) {
        case Value::Kind::kEmpty:
            return nullptr;
        case Value::Kind::kString:
            return value.Text();
        case Value::Kind::kInteger:
            return value.Integer();
        case Value::Kind::kDouble:
            if (std::isfinite(value.Number())) return value.Number();
            return FormatNumber(value.Number());
    }
    return nullptr;
}

nlohmann::ordered_json OptionalJson(const std::optional<std::string>& text) {
    if (!text) return nullptr;
    return *text;
}

}  // namespace detail

namespace {

nlohmann::ordered_json KeyJson(const ItemKey& key) {
    return {{"list", key.list}, {"item", key.item}, {"occurrence", key.occurrence}};
}

nlohmann::ordered_json FieldsJson(const std::vector<FieldChange>& fields) {
    nlohmann::ordered_json out = nlohmann::ordered_json::array();
    for (const FieldChange& field : fields) {
        out.push_back({{"field", field.field},
                       {"a", detail::OptionalJson(field.a)},
                       {"b", detail::OptionalJson(field.b)}});
    }
    return out;
}

}  // namespace

std::string DiffJson(const DocumentDiff& diff) {
    using nlohmann::ordered_json;
    ordered_json out;
    out["equal"] = diff.Equal();
    out["fields"] = FieldsJson(diff.fields);
    out["listsOnlyInA"] = diff.listsOnlyInA;
    out["listsOnlyInB"] = diff.listsOnlyInB;
    ordered_json onlyA = ordered_json::array(), onlyB = ordered_json::array();
    for (const ItemKey& key : diff.onlyInA) onlyA.push_back(KeyJson(key));
    for (const ItemKey& key : diff.onlyInB) onlyB.push_back(KeyJson(key));
    out["onlyInA"] = onlyA;
    out["onlyInB"] = onlyB;
    ordered_json changed = ordered_json::array();
    for (const ItemDiff& item : diff.changed) {
        ordered_json entry = KeyJson(item.key);
        entry["fields"] = FieldsJson(item.fields);
        ordered_json elements = ordered_json::array();
        for (const ElementChange& change : item.elements) {
            ordered_json element = {{"part", change.part}, {"index", change.index}};
            element["axisPoints"] = change.axisPoints;
            element["a"] = change.a ? detail::ValueJson(*change.a) : ordered_json();
            element["b"] = change.b ? detail::ValueJson(*change.b) : ordered_json();
            element["difference"] = change.difference && std::isfinite(*change.difference)
                                        ? ordered_json(*change.difference)
                                        : ordered_json();
            elements.push_back(std::move(element));
        }
        entry["elements"] = std::move(elements);
        changed.push_back(std::move(entry));
    }
    out["changed"] = std::move(changed);
    out["duplicates"] = diff.duplicates;
    return out.dump(2) + "\n";
}

}  // namespace ops
}  // namespace kest
