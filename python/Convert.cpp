#include <pybind11/numpy.h>

#include <cmath>
#include <cstdint>
#include <limits>
#include <string>

#include "Bindings.h"
#include "ops/JsonFormat.h"
#include "ops/ValueLayout.h"
#include "platform/ComError.h"
#include "platform/KestCalmorphDLLError.h"

namespace kest::python {

namespace {

bool IsTextFormat(const std::optional<std::string>& format) {
    return format && (*format == "STRING" || *format == "LABEL");
}

py::tuple ShapeTuple(const std::vector<std::size_t>& shape) {
    py::tuple tuple(shape.size());
    for (std::size_t i = 0; i < shape.size(); ++i) tuple[i] = py::int_(shape[i]);
    return tuple;
}

std::string ShapeText(py::handle shape) { return py::str(shape).cast<std::string>(); }

std::string Quoted(const std::optional<std::string>& name) {
    return "'" + name.value_or(std::string()) + "'";
}

}  // namespace

std::string TextArg(py::handle value, const std::string& what) {
    if (!py::isinstance<py::str>(value)) {
        throw py::type_error(what + " must be str, not " +
                             std::string(py::str(value.get_type().attr("__name__"))));
    }
    Py_ssize_t size = 0;
    const char* utf8 = PyUnicode_AsUTF8AndSize(value.ptr(), &size);
    if (utf8 == nullptr) throw py::error_already_set();
    return std::string(utf8, static_cast<std::size_t>(size));
}

std::optional<std::string> OptionalTextArg(py::handle value, const std::string& what) {
    if (value.is_none()) return std::nullopt;
    return TextArg(value, what);
}

py::object TextOut(const std::optional<std::string>& text) {
    if (!text) return py::none();
    return py::str(*text);
}

std::string PathArg(py::handle path) {
    py::module_ os = py::module_::import("os");
    py::object encoded = os.attr("fsencode")(path);
    std::string bytes = encoded.cast<std::string>();
    PyObject* decoded =
        PyUnicode_DecodeUTF8(bytes.data(), static_cast<Py_ssize_t>(bytes.size()), "strict");
    if (decoded == nullptr) {
        PyErr_Clear();
        throw py::value_error("the file name " + py::repr(path).cast<std::string>() +
                              " is not valid UTF-8; the library takes UTF-8 file names only");
    }
    Py_DECREF(decoded);
    if (bytes.find('\0') != std::string::npos) {
        throw py::value_error("the file name holds a NUL character");
    }
    if (os.attr("path").attr("isdir")(encoded).cast<bool>()) {
        PyErr_SetObject(PyExc_IsADirectoryError,
                        py::str("'" + bytes + "' is a directory, not a CDF file").ptr());
        throw py::error_already_set();
    }
    return bytes;
}

namespace {

// The elements as a new array of `shape`, filled in C order.
py::object NumbersOut(const std::vector<ops::Value>& elements,
                      const std::vector<std::size_t>& shape) {
    bool integers = true;
    for (const ops::Value& value : elements) {
        integers = integers && value.GetKind() == ops::Value::Kind::kInteger;
    }
    std::vector<py::ssize_t> dims(shape.begin(), shape.end());
    if (integers) {
        py::array_t<std::int32_t> array(dims);
        std::int32_t* out = array.mutable_data();
        for (const ops::Value& value : elements) *out++ = value.Integer();
        return std::move(array);
    }
    py::array_t<double> array(dims);
    double* out = array.mutable_data();
    for (const ops::Value& value : elements) {
        *out++ = value.IsNumber() ? value.Number() : std::numeric_limits<double>::quiet_NaN();
    }
    return std::move(array);
}

}  // namespace

py::object PointsOut(const ops::ValueList& points) {
    if (!points.present) return py::none();
    return NumbersOut(points.elements, {points.elements.size()});
}

py::object ValuesOut(const ops::Item& item) {
    const std::vector<ops::Value>& elements = item.values.elements;
    bool texts = false;
    for (const ops::Value& value : elements) {
        texts = texts || value.GetKind() == ops::Value::Kind::kString;
    }
    if (IsTextFormat(item.format)) {
        py::list list;
        for (const ops::Value& value : elements) list.append(py::str(value.ToText()));
        return std::move(list);
    }
    if (texts) {
        // A NUMERIC item holding texts (a finding of check): each element as it is.
        py::list list;
        for (const ops::Value& value : elements) {
            switch (value.GetKind()) {
                case ops::Value::Kind::kInteger:
                    list.append(py::int_(value.Integer()));
                    break;
                case ops::Value::Kind::kDouble:
                    list.append(py::float_(value.Number()));
                    break;
                case ops::Value::Kind::kString:
                    list.append(py::str(value.Text()));
                    break;
                case ops::Value::Kind::kEmpty:
                    list.append(py::none());
                    break;
            }
        }
        return std::move(list);
    }
    // The layout's shape holds exactly the elements (else it is their count, 1-D).
    return NumbersOut(elements, ops::LayoutOf(item).shape);
}

std::vector<ops::Value> NumbersIn(py::handle input, const std::string& what) {
    py::module_ np = py::module_::import("numpy");
    py::array array = np.attr("ascontiguousarray")(input);
    const char kind = array.dtype().kind();
    std::vector<ops::Value> values;
    values.reserve(static_cast<std::size_t>(array.size()));
    if (kind == 'i' || kind == 'u') {
        py::array_t<std::int64_t> wide = np.attr("asarray")(array, "int64").attr("ravel")();
        if (kind == 'u' && array.dtype().itemsize() == 8) {
            // uint64 beyond int64 wraps in the cast; compare before it.
            py::object maximum = array.attr("max")();
            if (array.size() > 0 && maximum.cast<std::uint64_t>() > 0x7fffffffu) {
                throw py::value_error(what + ": " + py::str(maximum).cast<std::string>() +
                                      " does not fit a 32-bit integer");
            }
        }
        auto in = wide.unchecked<1>();
        for (py::ssize_t i = 0; i < in.shape(0); ++i) {
            if (in(i) < std::numeric_limits<std::int32_t>::min() ||
                in(i) > std::numeric_limits<std::int32_t>::max()) {
                throw py::value_error(what + ": " + std::to_string(in(i)) +
                                      " does not fit a 32-bit integer; pass floats to store "
                                      "it as a double");
            }
            values.push_back(ops::Value::Integer(static_cast<std::int32_t>(in(i))));
        }
        return values;
    }
    if (kind == 'f') {
        py::array_t<double> wide = np.attr("asarray")(array, "float64").attr("ravel")();
        auto in = wide.unchecked<1>();
        for (py::ssize_t i = 0; i < in.shape(0); ++i) values.push_back(ops::Value::Double(in(i)));
        return values;
    }
    throw py::type_error(what +
                         " must be numbers (an integer or float array or scalar), not "
                         "an array of dtype " +
                         py::str(array.dtype()).cast<std::string>());
}

void PointsIn(ops::Axis& axis, py::handle points, const std::string& item) {
    const std::string what = "axis points of item '" + item + "'";
    py::module_ np = py::module_::import("numpy");
    py::array array = np.attr("asarray")(points);
    if (array.ndim() != 1) {
        throw py::value_error(what + " must be a 1-D array, not one of shape " +
                              ShapeText(array.attr("shape")));
    }
    const std::size_t length = ops::AxisLength(axis);
    if (static_cast<std::size_t>(array.size()) != length) {
        throw py::value_error(what + ": the axis has " + std::to_string(length) + " points, got " +
                              std::to_string(array.size()));
    }
    std::vector<ops::Value> values = NumbersIn(array, what);
    axis.points.elements = std::move(values);
    axis.points.present = true;
}

void ValuesIn(ops::Item& item, py::handle input) {
    const std::string what = "values of item " + Quoted(item.name);
    if (!item.HasValue()) throw py::value_error(what + ": the item has no value object");
    const std::size_t count = item.values.elements.size();
    if (IsTextFormat(item.format)) {
        if (py::isinstance<py::str>(input) || !py::isinstance<py::sequence>(input)) {
            throw py::type_error(what + " must be a list of str for a " + *item.format + " item");
        }
        py::sequence sequence = py::reinterpret_borrow<py::sequence>(input);
        if (!item.axes.empty() && sequence.size() != count) {
            throw py::value_error(what + ": the item's axes hold " + std::to_string(count) +
                                  " values, got " + std::to_string(sequence.size()));
        }
        std::vector<ops::Value> values;
        for (py::handle element : sequence) {
            values.push_back(ops::Value::String(TextArg(element, what + " elements")));
        }
        item.values.elements = std::move(values);
        item.values.present = true;
        return;
    }
    py::module_ np = py::module_::import("numpy");
    py::array array = np.attr("asarray")(input);
    py::object shape;
    if (!item.axes.empty()) {
        // Along axes the shape is fixed by the axes; a scalar fills every element.
        const ops::ValueLayout layout = ops::LayoutOf(item);
        shape = ShapeTuple(layout.shape);
        if (!py::object(array.attr("shape")).equal(shape) && array.ndim() != 0) {
            throw py::value_error(what + " have shape " + ShapeText(shape) + ", got shape " +
                                  ShapeText(array.attr("shape")));
        }
        array = np.attr("broadcast_to")(array, shape);
    } else if (array.ndim() > 1) {
        throw py::value_error(what +
                              ": an item without axes takes a scalar or a 1-D array, "
                              "got shape " +
                              ShapeText(array.attr("shape")));
    }
    std::vector<ops::Value> values = NumbersIn(array, what);
    bool integers = count > 0;
    for (const ops::Value& value : item.values.elements) {
        integers = integers && value.GetKind() == ops::Value::Kind::kInteger;
    }
    if (integers) {
        for (const ops::Value& value : values) {
            if (value.GetKind() == ops::Value::Kind::kDouble && std::isnan(value.Number())) {
                throw py::value_error(what +
                                      " are integers; NaN is not one (assign a float "
                                      "array without NaN, or set the element apart)");
            }
        }
    }
    item.values.elements = std::move(values);
    item.values.present = true;
}

void Raise(const char* kind, const std::string& message, py::dict fields) {
    py::object type = py::module_::import("kestcalmorph._errors").attr(kind);
    py::object error = type(message, **fields);
    PyErr_SetObject(type.ptr(), error.ptr());
    throw py::error_already_set();
}

void RaiseCurrent(const std::string& file, const std::string& item) {
    try {
        throw;
    } catch (const KestCalmorphDLLError& error) {
        const std::string text = error.GetReasonString().Length() != 0
                                     ? error.GetReasonString().ToString()
                                     : std::string();
        std::string message = std::string(ReasonText(error.GetReason()));
        if (!text.empty()) message += " (" + text + ")";
        Raise("ConversionError", message,
              py::dict(py::arg("reason") = error.GetReason(),
                       py::arg("item") = item.empty() ? text : item, py::arg("file") = file));
    } catch (const _com_error& error) {
        Raise("WriteError", file + ": " + error.Description(),
              py::dict(py::arg("reason") = static_cast<long>(error.Error()), py::arg("item") = item,
                       py::arg("file") = file));
    } catch (const ops::JsonImportError& error) {
        Raise("JsonError", error.what(),
              py::dict(py::arg("path") = error.Path(), py::arg("file") = file));
    }
}

}  // namespace kest::python
