#include "Merge.h"

#include <algorithm>
#include <map>
#include <set>
#include <utility>

#include "DiffSupport.h"

namespace kest {
namespace ops {

namespace {

using detail::IndexedItem;
using Text = std::optional<std::string>;

bool SameList(const ValueList& x, const ValueList& y) {
    if (x.present != y.present || x.elements.size() != y.elements.size()) return false;
    for (std::size_t i = 0; i < x.elements.size(); ++i)
        if (!x.elements[i].SameAs(y.elements[i])) return false;
    return true;
}

bool SameAxes(const Item& x, const Item& y) {
    if (x.axes.size() != y.axes.size() || !SameList(x.values, y.values)) return false;
    for (std::size_t i = 0; i < x.axes.size(); ++i) {
        const Axis& a = x.axes[i];
        const Axis& b = y.axes[i];
        if (a.size != b.size || a.units != b.units || a.format != b.format ||
            !SameList(a.points, b.points))
            return false;
    }
    return true;
}

bool SameItem(const Item& x, const Item& y) {
    return x.units == y.units && x.format == y.format && x.annotation == y.annotation &&
           x.note == y.note && SameAxes(x, y);
}

// The dimensions of an item: axis sizes and lengths, value count.
std::string Dimensions(const Item& item) {
    std::string text = std::to_string(item.values.elements.size()) + " values";
    for (const Axis& axis : item.axes) {
        text += ", axis size " + std::to_string(axis.size) + " with " +
                std::to_string(axis.points.elements.size()) + " points";
    }
    return text;
}

class Merger {
  public:
    Merger(MergePrefer prefer, std::vector<MergeConflict>& conflicts)
        : m_prefer(prefer), m_conflicts(conflicts) {}

    // The three-way merge of one field; `where` names it in a conflict.
    template <typename T, typename Same, typename Show>
    T Pick(const std::string& list, const std::string& item, const std::string& element,
           const T* base, const T& ours, const T& theirs, Same same, Show show) {
        if (same(ours, theirs)) return ours;
        if (base && same(*base, ours)) return theirs;
        if (base && same(*base, theirs)) return ours;
        m_conflicts.push_back(
            {list, item, element, base ? show(*base) : Text(), show(ours), show(theirs)});
        if (m_prefer == MergePrefer::kTheirs) return theirs;
        if (m_prefer == MergePrefer::kOurs || !base) return ours;
        return *base;
    }

    Text PickText(const std::string& list, const std::string& item, const std::string& element,
                  const Text* base, const Text& ours, const Text& theirs) {
        return Pick(
            list, item, element, base, ours, theirs,
            [](const Text& x, const Text& y) { return x == y; }, [](const Text& x) { return x; });
    }

    ValueList PickList(const ItemKey& key, const std::string& part, const ValueList* base,
                       const ValueList& ours, const ValueList& theirs) {
        ValueList out = ours;
        for (std::size_t i = 0; i < ours.elements.size(); ++i) {
            const Value* b = base ? &base->elements[i] : nullptr;
            out.elements[i] = Pick(
                key.list, key.item, part + "[" + std::to_string(i) + "]", b, ours.elements[i],
                theirs.elements[i], [](const Value& x, const Value& y) { return x.SameAs(y); },
                [](const Value& x) -> Text { return x.ToText(); });
        }
        return out;
    }

    Item MergeItem(const ItemKey& key, const Item* base, const Item& ours, const Item& theirs) {
        Item out = ours;
        out.units = PickText(key.list, key.item, "units", base ? &base->units : nullptr, ours.units,
                             theirs.units);
        out.format = PickText(key.list, key.item, "format", base ? &base->format : nullptr,
                              ours.format, theirs.format);
        out.annotation =
            PickText(key.list, key.item, "annotation", base ? &base->annotation : nullptr,
                     ours.annotation, theirs.annotation);
        out.note = PickText(key.list, key.item, "note", base ? &base->note : nullptr, ours.note,
                            theirs.note);
        if (SameAxes(ours, theirs) || (base && SameAxes(*base, theirs))) return out;
        if (base && SameAxes(*base, ours)) {
            out.axes = theirs.axes;
            out.values = theirs.values;
            return out;
        }
        const std::string shape = Dimensions(ours);
        if (shape != Dimensions(theirs) || (base && shape != Dimensions(*base))) {
            // Both sides changed the dimensions, or one changed them and the other values.
            const Item& chosen = Pick(
                key.list, key.item, "dimensions", base, ours, theirs,
                [](const Item& x, const Item& y) { return SameAxes(x, y); },
                [](const Item& x) -> Text { return Dimensions(x); });
            out.axes = chosen.axes;
            out.values = chosen.values;
            return out;
        }
        for (std::size_t i = 0; i < out.axes.size(); ++i) {
            const std::string part = "axis[" + std::to_string(i) + "]";
            const Axis* b = base ? &base->axes[i] : nullptr;
            const Axis& o = ours.axes[i];
            const Axis& t = theirs.axes[i];
            const Text baseUnits = b ? Text(b->units) : Text();
            const Text baseFormat = b ? Text(b->format) : Text();
            out.axes[i].units = *PickText(key.list, key.item, part + ".units",
                                          b ? &baseUnits : nullptr, o.units, t.units);
            out.axes[i].format = *PickText(key.list, key.item, part + ".format",
                                           b ? &baseFormat : nullptr, o.format, t.format);
            out.axes[i].points = PickList(key, part, b ? &b->points : nullptr, o.points, t.points);
        }
        out.values =
            PickList(key, "values", base ? &base->values : nullptr, ours.values, theirs.values);
        return out;
    }

    // An item present in `kept` and `base` but deleted on the other side.
    bool KeepAgainstDeletion(const ItemKey& key, const Item& base, const Item& kept,
                             bool keptIsOurs) {
        if (SameItem(base, kept)) return false;
        m_conflicts.push_back({key.list, key.item, "item", std::string("present"),
                               keptIsOurs ? Text("changed") : Text(),
                               keptIsOurs ? Text() : Text("changed")});
        if (m_prefer == MergePrefer::kNone) return true;
        return (m_prefer == MergePrefer::kOurs) == keptIsOurs;
    }

  private:
    MergePrefer m_prefer;
    std::vector<MergeConflict>& m_conflicts;
};

std::vector<Change> JoinHistories(const Document& base, const Document& ours,
                                  const Document& theirs) {
    std::vector<Change> out;
    std::set<std::string> seen;
    for (const Document* document : {&base, &ours, &theirs}) {
        for (const Change& change : document->history) {
            if (seen.insert(detail::ChangeText(change)).second) out.push_back(change);
        }
    }
    std::stable_sort(out.begin(), out.end(),
                     [](const Change& x, const Change& y) { return x.date < y.date; });
    return out;
}

const CalList* FindList(const Document& document, const std::string& name) {
    for (const CalList& list : document.lists)
        if (list.name.value_or("") == name) return &list;
    return nullptr;
}

}  // namespace

MergeResult Merge(const Document& base, const Document& ours, const Document& theirs,
                  MergePrefer prefer) {
    MergeResult result;
    Merger merger(prefer, result.conflicts);
    Document& out = result.merged;
    out = ours;
    const std::string none;
    const Text baseNs(base.ns);
    out.ns = *merger.PickText(none, none, "header.namespace", &baseNs, ours.ns, theirs.ns);
    const Text baseFile(base.fileName);
    out.fileName =
        *merger.PickText(none, none, "header.filename", &baseFile, ours.fileName, theirs.fileName);
    out.schemaInstance = merger.PickText(none, none, "header.schema-instance", &base.schemaInstance,
                                         ours.schemaInstance, theirs.schemaInstance);
    out.schemaLocation = merger.PickText(none, none, "header.schema-location", &base.schemaLocation,
                                         ours.schemaLocation, theirs.schemaLocation);
    out.company =
        merger.PickText(none, none, "header.company", &base.company, ours.company, theirs.company);
    out.note = merger.PickText(none, none, "header.note", &base.note, ours.note, theirs.note);
    out.history = JoinHistories(base, ours, theirs);

    // Lists in the order of ours, then those only theirs has.
    std::vector<std::string> names;
    std::set<std::string> named;
    for (const Document* document : {&ours, &theirs})
        for (const CalList& list : document->lists)
            if (named.insert(list.name.value_or("")).second)
                names.push_back(list.name.value_or(""));

    std::vector<std::string> duplicates;
    std::vector<IndexedItem> itemsBase = detail::IndexItems(base, duplicates);
    std::vector<IndexedItem> itemsOurs = detail::IndexItems(ours, duplicates);
    std::vector<IndexedItem> itemsTheirs = detail::IndexItems(theirs, duplicates);
    std::map<ItemKey, const Item*> inBase, inOurs, inTheirs;
    for (const IndexedItem& entry : itemsBase) inBase.emplace(entry.key, entry.item);
    for (const IndexedItem& entry : itemsOurs) inOurs.emplace(entry.key, entry.item);
    for (const IndexedItem& entry : itemsTheirs) inTheirs.emplace(entry.key, entry.item);
    auto find = [](const std::map<ItemKey, const Item*>& items, const ItemKey& key) {
        auto found = items.find(key);
        return found == items.end() ? nullptr : found->second;
    };

    out.lists.clear();
    for (const std::string& name : names) {
        const CalList* b = FindList(base, name);
        const CalList* o = FindList(ours, name);
        const CalList* t = FindList(theirs, name);
        CalList list = o ? *o : *t;
        list.items.clear();
        if (o && t) {
            list.note =
                merger.PickText(name, none, "note", b ? &b->note : nullptr, o->note, t->note);
            const auto same = [](const std::optional<FileRef>& x, const std::optional<FileRef>& y) {
                return detail::OptionalFileRef(x) == detail::OptionalFileRef(y);
            };
            list.symbolicFile =
                merger.Pick(name, none, "symbolic-file", b ? &b->symbolicFile : nullptr,
                            o->symbolicFile, t->symbolicFile, same, detail::OptionalFileRef);
            list.targetImage =
                merger.Pick(name, none, "target-image", b ? &b->targetImage : nullptr,
                            o->targetImage, t->targetImage, same, detail::OptionalFileRef);
        }
        std::vector<ItemKey> keys;
        for (const auto* items : {&itemsOurs, &itemsTheirs, &itemsBase})
            for (const IndexedItem& entry : *items)
                if (entry.key.list == name) keys.push_back(entry.key);
        std::set<ItemKey> done;
        for (const ItemKey& key : keys) {
            if (!done.insert(key).second) continue;
            const Item* ib = find(inBase, key);
            const Item* io = find(inOurs, key);
            const Item* it = find(inTheirs, key);
            if (io && it) {
                list.items.push_back(merger.MergeItem(key, ib, *io, *it));
            } else if (io && (!ib || merger.KeepAgainstDeletion(key, *ib, *io, true))) {
                list.items.push_back(*io);
            } else if (it && (!ib || merger.KeepAgainstDeletion(key, *ib, *it, false))) {
                list.items.push_back(*it);
            }
        }
        // A list one side deleted goes when none of its items stays.
        if ((o && t) || !b || !list.items.empty()) out.lists.push_back(std::move(list));
    }
    result.resolved = prefer != MergePrefer::kNone && !result.conflicts.empty();
    return result;
}

std::string MergeJson(const MergeResult& result) {
    nlohmann::ordered_json conflicts = nlohmann::ordered_json::array();
    for (const MergeConflict& conflict : result.conflicts) {
        conflicts.push_back({{"list", conflict.list},
                             {"item", conflict.item},
                             {"element", conflict.element},
                             {"base", detail::OptionalJson(conflict.base)},
                             {"ours", detail::OptionalJson(conflict.ours)},
                             {"theirs", detail::OptionalJson(conflict.theirs)}});
    }
    nlohmann::ordered_json out = {{"conflicts", conflicts}, {"resolved", result.resolved}};
    return out.dump(2) + "\n";
}

}  // namespace ops
}  // namespace kest
