#include "ReportData.h"

#include <cmath>
#include <cstdio>
#include <limits>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "Check.h"
#include "Diff.h"
#include "ValueLayout.h"
#include "detail/JsonText.h"

namespace kest {
namespace ops {

namespace {

// Every "<" escaped: the data sits inside the page's script element.
void AppendString(std::string& out, const std::string& text) {
    detail::AppendJsonString(out, text, true);
}

void AppendOptional(std::string& out, const std::optional<std::string>& text) {
    if (text)
        AppendString(out, *text);
    else
        out += "null";
}

// Numbers as JSON numbers; what JSON cannot carry as {"f":"nan"}, so that a text value "nan"
// stays a text.
void AppendValue(std::string& out, const Value& value) {
    switch (value.GetKind()) {
        case Value::Kind::kEmpty:
            out += "null";
            break;
        case Value::Kind::kString:
            AppendString(out, value.Text());
            break;
        default:
            if (std::isfinite(value.Number())) {
                out += FormatNumber(value.Number());
            } else {
                out += "{\"f\":";
                AppendString(out, FormatNumber(value.Number()));
                out += '}';
            }
    }
}

void AppendValues(std::string& out, const std::vector<Value>& values) {
    out += '[';
    for (std::size_t i = 0; i < values.size(); ++i) {
        if (i) out += ',';
        AppendValue(out, values[i]);
    }
    out += ']';
}

void AppendAxes(std::string& out, const Item& item) {
    out += '[';
    for (std::size_t i = 0; i < item.axes.size(); ++i) {
        if (i) out += ',';
        out += '[';
        AppendString(out, item.axes[i].units);
        out += ',';
        AppendValues(out, item.axes[i].points.elements);
        out += ']';
    }
    out += ']';
}

std::string Folder(const std::string& path) {
    if (path.empty() || path == "-") return std::string();
    const auto slash = path.find_last_of('/');
    return slash == std::string::npos ? std::string("./") : path.substr(0, slash + 1);
}

std::string BaseName(const std::string& path) {
    const auto slash = path.find_last_of('/');
    return slash == std::string::npos ? path : path.substr(slash + 1);
}

void AppendFileRef(std::string& out, bool& first, const std::string& list, const char* kind,
                   const std::optional<FileRef>& ref, const std::string& folder) {
    if (!ref) return;
    if (!first) out += ',';
    first = false;
    char crcText[16];
    std::snprintf(crcText, sizeof crcText, "0x%08X", static_cast<unsigned>(ref->crc));
    std::string state;
    // A name that climbs out of the folder or names a path is looked up only by its last part.
    std::string error;
    const auto actual =
        folder.empty() ? std::nullopt : FileCrc32(folder + BaseName(ref->name), error);
    if (!folder.empty()) state = !actual ? "missing" : actual == ref->crc ? "match" : "mismatch";
    out += '[';
    AppendString(out, list);
    out += ",\"";
    out += kind;
    out += "\",";
    AppendString(out, ref->name);
    out += ",\"";
    out += crcText;
    out += "\",";
    AppendString(out, state);
    out += ']';
}

struct Span {
    double min = std::numeric_limits<double>::infinity();
    double max = -std::numeric_limits<double>::infinity();
};

Span SpanOf(const std::vector<Value>& values) {
    Span span;
    for (const Value& v : values) {
        if (!v.IsNumber() || std::isnan(v.Number())) continue;
        span.min = std::min(span.min, v.Number());
        span.max = std::max(span.max, v.Number());
    }
    return span;
}

void AppendItem(std::string& out, std::size_t list, const Item& item, const std::string& listName,
                const char* state, const Item* old = nullptr, const ItemDiff* diff = nullptr) {
    const ValueLayout layout = LayoutOf(item, listName);
    const Span span = SpanOf(item.values.elements);
    out += '[';
    out += std::to_string(list);
    out += ',';
    AppendOptional(out, item.name);
    out += ',';
    AppendOptional(out, item.format);
    out += ',';
    AppendOptional(out, item.units);
    out += ",[";
    for (std::size_t i = 0; i < layout.shape.size(); ++i) {
        if (i) out += ',';
        out += std::to_string(layout.shape[i]);
    }
    out += "],";
    Value bound = Value::Double(span.min);
    if (span.min <= span.max)
        AppendValue(out, bound);
    else
        out += "null";
    out += ',';
    bound = Value::Double(span.max);
    if (span.min <= span.max)
        AppendValue(out, bound);
    else
        out += "null";
    out += ",\"";
    out += state;
    out += "\",";
    out += layout.alongAxes ? "1," : "0,";
    AppendValues(out, item.values.elements);
    out += ',';
    AppendAxes(out, item);
    out += ',';
    if (layout.finding)
        AppendString(out, layout.finding->message);
    else
        out += "null";
    if (old) {
        // Changed elements: every index whose value differs, or is on one side only.
        out += ",[";
        bool first = true;
        for (const ElementChange& change : diff->elements) {
            if (change.part != "values") continue;
            if (!first) out += ',';
            first = false;
            out += std::to_string(change.index);
        }
        out += "],";
        AppendValues(out, old->values.elements);
        out += ',';
        AppendAxes(out, *old);
    }
    out += ']';
}

}  // namespace

std::string ReportJson(const ReportSource& current, const ReportSource& old) {
    const Document& doc = *current.document;
    std::string out;
    out.reserve(1 << 20);
    out += "{\"file\":";
    AppendString(out, BaseName(current.path));
    out += ",\"old\":";
    if (old.document)
        AppendString(out, BaseName(old.path));
    else
        out += "null";
    out += ",\"header\":[";
    AppendString(out, doc.fileName);
    out += ',';
    AppendOptional(out, doc.company);
    out += ',';
    AppendOptional(out, doc.note);
    out += ',';
    AppendString(out, doc.ns);
    out += "],\"history\":[";
    for (std::size_t i = 0; i < doc.history.size(); ++i) {
        const Change& c = doc.history[i];
        if (i) out += ',';
        out += '[';
        AppendString(out, c.user);
        out += ',';
        AppendString(out, c.date);
        out += ',';
        AppendOptional(out, c.tool);
        out += ',';
        AppendOptional(out, c.note);
        out += ',';
        AppendOptional(out, c.dataVersion);
        out += ']';
    }
    out += "],\"refs\":[";
    bool first = true;
    const std::string folder = Folder(current.path);
    for (const CalList& list : doc.lists) {
        const std::string name = list.name.value_or(std::string());
        AppendFileRef(out, first, name, "SYMBOLIC-FILE", list.symbolicFile, folder);
        AppendFileRef(out, first, name, "TARGET-IMAGE", list.targetImage, folder);
    }

    std::vector<std::string> listNames;
    auto indexOfList = [&](const std::string& name) {
        for (std::size_t i = 0; i < listNames.size(); ++i)
            if (listNames[i] == name) return i;
        listNames.push_back(name);
        return listNames.size() - 1;
    };
    // Items pair as Diff pairs them: by list and item name, a repeated name in order.
    DocumentDiff diff;
    std::unordered_map<std::string, const ItemDiff*> changed;
    std::unordered_set<std::string> added;
    std::unordered_set<std::string> removed;
    std::unordered_map<std::string, const Item*> oldItems;
    auto keyOf = [](const ItemKey& key) {
        return key.list + '\x1f' + key.item + '\x1f' + std::to_string(key.occurrence);
    };
    // Calls `visit(listIndex, listName, item, key)` for every item of `document`, in order.
    auto forEachItem = [&](const Document& document, auto&& visit) {
        std::unordered_map<std::string, std::size_t> seen;
        for (const CalList& list : document.lists) {
            const std::string name = list.name.value_or(std::string());
            const std::size_t index = indexOfList(name);
            for (const Item& item : list.items) {
                ItemKey key{name, item.name.value_or(std::string()), 0};
                key.occurrence = seen[name + '\x1f' + key.item]++;
                visit(index, name, item, keyOf(key));
            }
        }
    };
    if (old.document) {
        diff = Diff(*old.document, doc);
        for (const ItemDiff& item : diff.changed) changed[keyOf(item.key)] = &item;
        for (const ItemKey& key : diff.onlyInB) added.insert(keyOf(key));
        for (const ItemKey& key : diff.onlyInA) removed.insert(keyOf(key));
        std::vector<std::string> keepOrder = listNames;
        forEachItem(*old.document, [&](std::size_t, const std::string&, const Item& item,
                                       const std::string& key) { oldItems[key] = &item; });
        listNames = keepOrder;  // lists are numbered in the order of the current file first
    }

    out += "],\"items\":[";
    first = true;
    forEachItem(doc, [&](std::size_t index, const std::string& name, const Item& item,
                         const std::string& key) {
        if (!first) out += ',';
        first = false;
        const auto change = changed.find(key);
        if (!old.document)
            AppendItem(out, index, item, name, "");
        else if (added.count(key))
            AppendItem(out, index, item, name, "added");
        else if (change != changed.end())
            // Old values travel only with changed items: the page draws them under the new.
            AppendItem(out, index, item, name, "changed", oldItems[key], change->second);
        else
            AppendItem(out, index, item, name, "same");
    });
    if (old.document)
        forEachItem(*old.document, [&](std::size_t index, const std::string& name, const Item& item,
                                       const std::string& key) {
            if (!removed.count(key)) return;
            if (!first) out += ',';
            first = false;
            AppendItem(out, index, item, name, "removed");
        });
    out += "],\"lists\":[";
    for (std::size_t i = 0; i < listNames.size(); ++i) {
        if (i) out += ',';
        AppendString(out, listNames[i]);
    }
    out += "]}";
    return out;
}

}  // namespace ops
}  // namespace kest
