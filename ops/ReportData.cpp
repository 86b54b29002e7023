#include "ReportData.h"

#include <array>
#include <cmath>
#include <cstdio>
#include <fstream>
#include <limits>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "ValueLayout.h"

namespace kest {
namespace ops {

namespace {

void AppendString(std::string& out, const std::string& text) {
    out += '"';
    for (unsigned char c : text) {
        switch (c) {
            case '"':
                out += "\\\"";
                break;
            case '\\':
                out += "\\\\";
                break;
            case '\n':
                out += "\\n";
                break;
            case '\r':
                out += "\\r";
                break;
            case '\t':
                out += "\\t";
                break;
            case '<':
                out += "\\u003c";
                break;  // never "</script" or "<!--" inside the element
            default:
                if (c < 0x20) {
                    char buffer[8];
                    std::snprintf(buffer, sizeof buffer, "\\u%04x", c);
                    out += buffer;
                } else {
                    out += static_cast<char>(c);
                }
        }
    }
    out += '"';
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
    std::uint32_t actual = 0;
    if (!folder.empty())
        state = !FileCrc32(folder + BaseName(ref->name), actual) ? "missing"
                : actual == ref->crc                             ? "match"
                                                                 : "mismatch";
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

bool SameAxes(const Item& a, const Item& b) {
    if (a.axes.size() != b.axes.size()) return false;
    for (std::size_t i = 0; i < a.axes.size(); ++i) {
        const auto& pa = a.axes[i].points.elements;
        const auto& pb = b.axes[i].points.elements;
        if (pa.size() != pb.size() || a.axes[i].units != b.axes[i].units) return false;
        for (std::size_t k = 0; k < pa.size(); ++k)
            if (!pa[k].SameAs(pb[k])) return false;
    }
    return true;
}

struct ItemRef {
    const Item* item;
};

void AppendItem(std::string& out, std::size_t list, const Item& item, const std::string& listName,
                const char* state, const Item* old) {
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
        const auto& now = item.values.elements;
        const auto& was = old->values.elements;
        out += ",[";
        bool first = true;
        for (std::size_t k = 0; k < std::max(now.size(), was.size()); ++k) {
            if (k < now.size() && k < was.size() && now[k].SameAs(was[k])) continue;
            if (!first) out += ',';
            first = false;
            out += std::to_string(k);
        }
        out += "],";
        AppendValues(out, was);
        out += ',';
        AppendAxes(out, *old);
    }
    out += ']';
}

bool Changed(const Item& a, const Item& b) {
    if (a.format != b.format || a.units != b.units || !SameAxes(a, b) ||
        a.values.elements.size() != b.values.elements.size())
        return true;
    for (std::size_t k = 0; k < a.values.elements.size(); ++k)
        if (!a.values.elements[k].SameAs(b.values.elements[k])) return true;
    return false;
}

}  // namespace

bool FileCrc32(const std::string& path, std::uint32_t& crc) {
    static const auto table = [] {
        std::array<std::uint32_t, 256> t{};
        for (std::uint32_t n = 0; n < 256; ++n) {
            std::uint32_t c = n;
            for (int k = 0; k < 8; ++k) c = (c & 1) ? 0xEDB88320u ^ (c >> 1) : c >> 1;
            t[n] = c;
        }
        return t;
    }();
    std::ifstream in(path, std::ios::binary);
    if (!in) return false;
    std::uint32_t c = 0xFFFFFFFFu;
    std::vector<char> buffer(1 << 16);
    while (in) {
        in.read(buffer.data(), static_cast<std::streamsize>(buffer.size()));
        const auto got = static_cast<std::size_t>(in.gcount());
        for (std::size_t i = 0; i < got; ++i)
            c = table[(c ^ static_cast<unsigned char>(buffer[i])) & 0xFFu] ^ (c >> 8);
    }
    // A directory opens on some systems but reads nothing and sets badbit.
    if (in.bad()) return false;
    crc = c ^ 0xFFFFFFFFu;
    return true;
}

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

    // Items are matched by list and item name; a repeated name pairs in order of appearance.
    std::unordered_map<std::string, std::vector<ItemRef>> oldItems;
    std::vector<std::string> listNames;
    auto indexOfList = [&](const std::string& name) {
        for (std::size_t i = 0; i < listNames.size(); ++i)
            if (listNames[i] == name) return i;
        listNames.push_back(name);
        return listNames.size() - 1;
    };
    auto keyOf = [](const std::string& list, const Item& item) {
        return list + '\x1f' + item.name.value_or(std::string());
    };
    if (old.document)
        for (const CalList& list : old.document->lists)
            for (const Item& item : list.items)
                oldItems[keyOf(list.name.value_or(std::string()), item)].push_back({&item});
    std::unordered_map<std::string, std::size_t> taken;

    out += "],\"items\":[";
    first = true;
    for (const CalList& list : doc.lists) {
        const std::string name = list.name.value_or(std::string());
        const std::size_t index = indexOfList(name);
        for (const Item& item : list.items) {
            if (!first) out += ',';
            first = false;
            if (!old.document) {
                AppendItem(out, index, item, name, "", nullptr);
                continue;
            }
            const std::string key = keyOf(name, item);
            const auto found = oldItems.find(key);
            std::size_t& next = taken[key];
            if (found == oldItems.end() || next >= found->second.size()) {
                AppendItem(out, index, item, name, "added", nullptr);
                continue;
            }
            const Item& was = *found->second[next++].item;
            // Old values travel only with changed items: the page draws them under the new.
            if (Changed(item, was))
                AppendItem(out, index, item, name, "changed", &was);
            else
                AppendItem(out, index, item, name, "same", nullptr);
        }
    }
    if (old.document) {
        // Old items past those paired with a current item were removed; listed in old order.
        std::unordered_set<const Item*> removed;
        for (const auto& entry : oldItems)
            for (std::size_t i = taken[entry.first]; i < entry.second.size(); ++i)
                removed.insert(entry.second[i].item);
        for (const CalList& list : old.document->lists) {
            const std::string name = list.name.value_or(std::string());
            for (const Item& item : list.items) {
                if (!removed.count(&item)) continue;
                if (!first) out += ',';
                first = false;
                AppendItem(out, indexOfList(name), item, name, "removed", nullptr);
            }
        }
    }
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
