// The views: small handles (the shared tree and indices) that find their element on each use,
// so a view of a list or item that was removed raises instead of reaching freed memory.

#include <pybind11/numpy.h>
#include <pybind11/stl.h>

#include <cstdio>
#include <string>

#include "Bindings.h"
#include "core/KestCalmorph.h"
#include "ops/ValueLayout.h"
#include "platform/KestCalmorphDLLError.h"

namespace kest::python {

namespace {

std::size_t Index(py::ssize_t index, std::size_t size, const char* what) {
    const py::ssize_t count = static_cast<py::ssize_t>(size);
    if (index < 0) index += count;
    if (index < 0 || index >= count) throw py::index_error(std::string(what) + " out of range");
    return static_cast<std::size_t>(index);
}

struct CalDataView {
    TreePtr tree;
};

struct ListRef {
    TreePtr tree;
    std::size_t list;
    ops::CalList& Get() const {
        if (list >= tree->document.lists.size()) {
            throw py::index_error("this CalList is no longer in its CalData");
        }
        return tree->document.lists[list];
    }
};

struct ItemRef {
    TreePtr tree;
    std::size_t list, item;
    ops::Item& Get() const {
        ops::CalList& owner = ListRef{tree, list}.Get();
        if (item >= owner.items.size()) {
            throw py::index_error("this CalItem is no longer in its CalList");
        }
        return owner.items[item];
    }
    std::string Name() const { return Get().name.value_or(std::string()); }
};

struct AxisRef {
    ItemRef owner;
    std::size_t axis;
    ops::Axis& Get() const {
        ops::Item& item = owner.Get();
        if (axis >= item.axes.size()) throw py::index_error("this Axis is no longer in its item");
        return item.axes[axis];
    }
};

struct ChangeRef {
    TreePtr tree;
    std::size_t index;
    ops::Change& Get() const {
        if (index >= tree->document.history.size()) {
            throw py::index_error("this Change is no longer in its history");
        }
        return tree->document.history[index];
    }
};

struct Lists {
    TreePtr tree;
};
struct Items {
    ListRef list;
};
struct Axes {
    ItemRef item;
};
struct History {
    TreePtr tree;
};

// "YYYY-MM-DDThh:mm:ss" and back; the library's date rules decide what a tree may hold.
py::object DateOut(const std::string& text) {
    py::module_ datetime = py::module_::import("datetime");
    try {
        return datetime.attr("datetime").attr("strptime")(text.substr(0, 19), "%Y-%m-%dT%H:%M:%S");
    } catch (const py::error_already_set&) {
        return py::str(text);  // a date the reader kept as written
    }
}

std::string DateIn(py::handle date) {
    py::module_ datetime = py::module_::import("datetime");
    if (!py::isinstance(date, datetime.attr("datetime"))) {
        throw py::type_error("a change date must be a datetime.datetime");
    }
    const std::string text = date.attr("strftime")("%Y-%m-%dT%H:%M:%S").cast<std::string>();
    ops::Document probe;
    probe.history.push_back(ops::Change{"", text, std::nullopt, std::nullopt, std::nullopt});
    try {
        (void)ops::ToCalData(probe);
    } catch (const KestCalmorphDLLError& error) {
        throw py::value_error("the date " + text +
                              " cannot be kept: " + ReasonText(error.GetReason()));
    }
    return text;
}

py::object FileRefOut(const std::optional<ops::FileRef>& file) {
    if (!file) return py::none();
    return py::make_tuple(file->name, file->crc);
}

std::optional<ops::FileRef> FileRefIn(py::handle value, const std::string& what) {
    if (value.is_none()) return std::nullopt;
    if (!py::isinstance<py::tuple>(value) || py::len(value) != 2) {
        throw py::type_error(what + " must be a (name, crc32) tuple or None");
    }
    py::tuple tuple = py::reinterpret_borrow<py::tuple>(value);
    ops::FileRef file;
    file.name = TextArg(tuple[0], what + " name");
    const long long crc = tuple[1].cast<long long>();
    if (crc < 0 || crc > 0xffffffffLL) throw py::value_error(what + " crc32 must fit 32 bits");
    file.crc = static_cast<std::uint32_t>(crc);
    return file;
}

// A text property of a view: `Get` gives the field, `optional` whether None is allowed.
template <typename View, typename Field>
void TextProperty(py::class_<View>& cls, const char* name, Field field, bool optional) {
    cls.def_property(
        name,
        [field](const View& view) -> py::object {
            if constexpr (std::is_same_v<std::decay_t<decltype(view.Get().*field)>, std::string>) {
                return py::str(view.Get().*field);
            } else {
                return TextOut(view.Get().*field);
            }
        },
        [field, name, optional](const View& view, py::handle value) {
            auto& target = view.Get().*field;
            if constexpr (std::is_same_v<std::decay_t<decltype(target)>, std::string>) {
                target = TextArg(value, name);
            } else {
                target = optional ? OptionalTextArg(value, name)
                                  : std::optional<std::string>(TextArg(value, name));
            }
        });
}

ops::Axis AxisIn(py::handle given, const std::string& item) {
    ops::Axis axis;
    axis.format = "NUMERIC";
    axis.units = "";
    if (py::isinstance<py::int_>(given)) {
        axis.size = given.cast<std::int32_t>();
        return axis;
    }
    py::module_ np = py::module_::import("numpy");
    py::array array = np.attr("asarray")(given);
    if (array.ndim() != 1) throw py::value_error("axis points must be a 1-D array");
    axis.points.elements = NumbersIn(array, "axis points of item '" + item + "'");
    axis.points.present = true;
    axis.size = static_cast<std::int32_t>(axis.points.elements.size());
    return axis;
}

template <typename Seq>
py::list AllOf(const Seq& seq, std::size_t count) {
    py::list list;
    for (std::size_t i = 0; i < count; ++i) list.append(py::cast(seq(i)));
    return list;
}

}  // namespace

py::object MakeCalData(TreePtr tree) { return py::cast(CalDataView{std::move(tree)}); }

TreePtr TreeOf(py::handle caldata) {
    if (!py::isinstance<CalDataView>(caldata)) throw py::type_error("expected a CalData");
    return caldata.cast<const CalDataView&>().tree;
}

void BindTree(py::module_& m) {
    py::class_<CalDataView> caldata(m, "CalData");
    caldata.def(py::init([] {
        KestCalmorph converter;
        auto tree = std::make_shared<Tree>();
        tree->document = ops::FromCalData(converter.ConvertCPPToXML());
        tree->document.ns = "http://kest.dev/schemas/cdf/1.0";
        tree->document.schemaInstance = "http://www.w3.org/2001/XMLSchema-instance";
        tree->document.schemaLocation = "http://kest.dev/schemas/cdf/1.0 cdf.xsd";
        return CalDataView{tree};
    }));
    auto text = [&caldata](const char* name, auto field, bool optional) {
        caldata.def_property(
            name,
            [field](const CalDataView& view) -> py::object {
                auto& value = view.tree->document.*field;
                if constexpr (std::is_same_v<std::decay_t<decltype(value)>, std::string>) {
                    return py::str(value);
                } else {
                    return TextOut(value);
                }
            },
            [field, name, optional](const CalDataView& view, py::handle value) {
                auto& target = view.tree->document.*field;
                if constexpr (std::is_same_v<std::decay_t<decltype(target)>, std::string>) {
                    target = TextArg(value, name);
                } else {
                    target = optional ? OptionalTextArg(value, name)
                                      : std::optional<std::string>(TextArg(value, name));
                }
            });
    };
    text("file_name", &ops::Document::fileName, false);
    text("company", &ops::Document::company, true);
    text("note", &ops::Document::note, true);
    text("namespace", &ops::Document::ns, false);
    text("schema_instance", &ops::Document::schemaInstance, false);
    text("schema_location", &ops::Document::schemaLocation, false);
    caldata.def_property_readonly("lists", [](const CalDataView& v) { return Lists{v.tree}; });
    caldata.def_property_readonly("history", [](const CalDataView& v) { return History{v.tree}; });
    caldata.def_property_readonly("warnings", [](const CalDataView& v) {
        py::object type = py::module_::import("kestcalmorph._errors").attr("TokenWarning");
        py::list list;
        for (const KestReadWarning& w : v.tree->warnings) {
            list.append(type(w.file, w.line, w.column, w.item, w.token, w.valueRead, w.kind));
        }
        return list;
    });
    caldata.def("__repr__", [](const CalDataView& v) {
        return "<CalData " + v.tree->document.fileName + ": " +
               std::to_string(v.tree->document.lists.size()) + " lists, " +
               std::to_string(v.tree->document.ItemCount()) + " items>";
    });

    py::class_<Lists>(m, "CalLists")
        .def("__len__", [](const Lists& s) { return s.tree->document.lists.size(); })
        .def("__getitem__",
             [](const Lists& s, py::ssize_t i) {
                 return ListRef{s.tree, Index(i, s.tree->document.lists.size(), "list index")};
             })
        .def("__getitem__",
             [](const Lists& s, const std::string& name) {
                 const auto& lists = s.tree->document.lists;
                 for (std::size_t i = 0; i < lists.size(); ++i) {
                     if (lists[i].name && *lists[i].name == name) return ListRef{s.tree, i};
                 }
                 throw py::key_error(name);
             })
        .def("__iter__",
             [](const Lists& s) {
                 return AllOf(
                            [&s](std::size_t i) {
                                return ListRef{s.tree, i};
                            },
                            s.tree->document.lists.size())
                     .attr("__iter__")();
             })
        .def(
            "new",
            [](const Lists& s, py::handle name, py::handle symbolic_file, py::handle target_image,
               py::handle note) {
                ops::CalList list;
                list.name = TextArg(name, "list name");
                list.symbolicFile = FileRefIn(symbolic_file, "symbolic_file");
                list.targetImage = FileRefIn(target_image, "target_image");
                list.note = OptionalTextArg(note, "note");
                s.tree->document.lists.push_back(std::move(list));
                return ListRef{s.tree, s.tree->document.lists.size() - 1};
            },
            py::arg("name"), py::kw_only(), py::arg("symbolic_file") = py::make_tuple("", 0),
            py::arg("target_image") = py::none(), py::arg("note") = py::none());

    py::class_<ListRef> callist(m, "CalList");
    TextProperty(callist, "name", &ops::CalList::name, false);
    TextProperty(callist, "note", &ops::CalList::note, true);
    callist
        .def_property(
            "symbolic_file", [](const ListRef& r) { return FileRefOut(r.Get().symbolicFile); },
            [](const ListRef& r, py::handle v) {
                r.Get().symbolicFile = FileRefIn(v, "symbolic_file");
            })
        .def_property(
            "target_image", [](const ListRef& r) { return FileRefOut(r.Get().targetImage); },
            [](const ListRef& r, py::handle v) {
                r.Get().targetImage = FileRefIn(v, "target_image");
            })
        .def_property_readonly("items",
                               [](const ListRef& r) {
                                   r.Get();
                                   return Items{r};
                               })
        .def("__repr__", [](const ListRef& r) {
            return "<CalList " + r.Get().name.value_or("") + ": " +
                   std::to_string(r.Get().items.size()) + " items>";
        });

    py::class_<Items>(m, "CalItems")
        .def("__len__", [](const Items& s) { return s.list.Get().items.size(); })
        .def("__getitem__",
             [](const Items& s, py::ssize_t i) {
                 return ItemRef{s.list.tree, s.list.list,
                                Index(i, s.list.Get().items.size(), "item index")};
             })
        .def("__getitem__",
             [](const Items& s, const std::string& name) {
                 const auto& items = s.list.Get().items;
                 for (std::size_t i = 0; i < items.size(); ++i) {
                     if (items[i].name && *items[i].name == name) {
                         return ItemRef{s.list.tree, s.list.list, i};
                     }
                 }
                 throw py::key_error(name);
             })
        .def("__contains__",
             [](const Items& s, const std::string& name) {
                 for (const ops::Item& item : s.list.Get().items) {
                     if (item.name && *item.name == name) return true;
                 }
                 return false;
             })
        .def("__iter__",
             [](const Items& s) {
                 return AllOf(
                            [&s](std::size_t i) {
                                return ItemRef{s.list.tree, s.list.list, i};
                            },
                            s.list.Get().items.size())
                     .attr("__iter__")();
             })
        .def(
            "new",
            [](const Items& s, py::handle name, py::handle values, py::handle format,
               py::handle units, py::handle axes, py::handle annotation, py::handle note) {
                ops::Item item;
                item.name = TextArg(name, "item name");
                const bool texts = py::isinstance<py::list>(values) && py::len(values) > 0 &&
                                   py::isinstance<py::str>(values.cast<py::list>()[0]);
                item.format = format.is_none() ? std::string(texts ? "STRING" : "NUMERIC")
                                               : TextArg(format, "format");
                item.units = TextArg(units, "units");
                item.annotation = OptionalTextArg(annotation, "annotation");
                item.note = OptionalTextArg(note, "note");
                if (!axes.is_none()) {
                    for (py::handle given : axes) item.axes.push_back(AxisIn(given, *item.name));
                }
                // Values go in against the finished axes; a new item starts with as many
                // elements as they hold, so ValuesIn can check the shape.
                std::size_t count = item.axes.empty() ? 0 : 1;
                for (const ops::Axis& axis : item.axes) count *= ops::AxisLength(axis);
                item.values.elements.assign(count, ops::Value::Double(0.0));
                item.values.present = true;
                ValuesIn(item, values);
                ops::CalList& list = s.list.Get();
                list.items.push_back(std::move(item));
                return ItemRef{s.list.tree, s.list.list, list.items.size() - 1};
            },
            py::arg("name"), py::arg("values"), py::kw_only(), py::arg("format") = py::none(),
            py::arg("units") = "", py::arg("axes") = py::none(), py::arg("annotation") = py::none(),
            py::arg("note") = py::none());

    py::class_<ItemRef> calitem(m, "CalItem");
    TextProperty(calitem, "name", &ops::Item::name, false);
    TextProperty(calitem, "format", &ops::Item::format, false);
    TextProperty(calitem, "units", &ops::Item::units, false);
    TextProperty(calitem, "annotation", &ops::Item::annotation, true);
    TextProperty(calitem, "note", &ops::Item::note, true);
    calitem
        .def_property(
            "values", [](const ItemRef& r) { return ValuesOut(r.Get()); },
            [](const ItemRef& r, py::handle v) { ValuesIn(r.Get(), v); })
        .def_property_readonly("axes",
                               [](const ItemRef& r) {
                                   r.Get();
                                   return Axes{r};
                               })
        .def_property_readonly("list",
                               [](const ItemRef& r) {
                                   return ListRef{r.tree, r.list};
                               })
        .def_property_readonly(
            "shape",
            [](const ItemRef& r) { return py::tuple(py::cast(ops::LayoutOf(r.Get()).shape)); })
        .def("__repr__", [](const ItemRef& r) {
            return "<CalItem " + r.Name() + " " + r.Get().format.value_or("") + ">";
        });

    py::class_<Axes>(m, "Axes")
        .def("__len__", [](const Axes& s) { return s.item.Get().axes.size(); })
        .def("__getitem__",
             [](const Axes& s, py::ssize_t i) {
                 return AxisRef{s.item, Index(i, s.item.Get().axes.size(), "axis index")};
             })
        .def("__iter__", [](const Axes& s) {
            return AllOf(
                       [&s](std::size_t i) {
                           return AxisRef{s.item, i};
                       },
                       s.item.Get().axes.size())
                .attr("__iter__")();
        });

    py::class_<AxisRef> axis(m, "Axis");
    TextProperty(axis, "units", &ops::Axis::units, false);
    TextProperty(axis, "format", &ops::Axis::format, false);
    axis.def_property_readonly("size", [](const AxisRef& r) { return ops::AxisLength(r.Get()); })
        .def_property(
            "points", [](const AxisRef& r) { return PointsOut(r.Get().points); },
            [](const AxisRef& r, py::handle v) { PointsIn(r.Get(), v, r.owner.Name()); });

    py::class_<History>(m, "History")
        .def("__len__", [](const History& s) { return s.tree->document.history.size(); })
        .def(
            "__getitem__",
            [](const History& s, py::ssize_t i) {
                return ChangeRef{s.tree, Index(i, s.tree->document.history.size(), "change index")};
            })
        .def("__iter__",
             [](const History& s) {
                 return AllOf(
                            [&s](std::size_t i) {
                                return ChangeRef{s.tree, i};
                            },
                            s.tree->document.history.size())
                     .attr("__iter__")();
             })
        .def(
            "new",
            [](const History& s, py::handle user, py::handle date, py::handle tool, py::handle note,
               py::handle version) {
                ops::Change change;
                change.user = TextArg(user, "user");
                change.date = DateIn(date);
                change.tool = OptionalTextArg(tool, "tool");
                change.note = OptionalTextArg(note, "note");
                change.dataVersion = OptionalTextArg(version, "data_version");
                s.tree->document.history.push_back(std::move(change));
                return ChangeRef{s.tree, s.tree->document.history.size() - 1};
            },
            py::arg("user"), py::arg("date"), py::kw_only(), py::arg("tool") = py::none(),
            py::arg("note") = py::none(), py::arg("data_version") = py::none());

    py::class_<ChangeRef> change(m, "Change");
    TextProperty(change, "user", &ops::Change::user, false);
    TextProperty(change, "tool", &ops::Change::tool, true);
    TextProperty(change, "note", &ops::Change::note, true);
    TextProperty(change, "data_version", &ops::Change::dataVersion, true);
    change.def_property(
        "date", [](const ChangeRef& r) { return DateOut(r.Get().date); },
        [](const ChangeRef& r, py::handle v) { r.Get().date = DateIn(v); });
}

}  // namespace kest::python
