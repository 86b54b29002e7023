#pragma once
// The Python package's binding code: how Python objects become library arguments and library
// results become Python objects. The tree itself is an ops::Document owned by a shared Tree that
// every view holds, so a view outlives its CalData safely.

#include <pybind11/pybind11.h>

#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "core/KestReadWarning.h"
#include "ops/Document.h"

namespace kest::python {

namespace py = pybind11;

/// One calibration tree as Python sees it: the document and the warnings of the read it came
/// from. Only touched with the GIL held.
struct Tree {
    ops::Document document;
    std::vector<KestReadWarning> warnings;
    /// The file the tree was read from (empty for a tree made in Python or from JSON).
    std::string path;
};
using TreePtr = std::shared_ptr<Tree>;

/// A str as UTF-8; TypeError for anything else (None included), UnicodeEncodeError for a str
/// holding lone surrogates. `what` names the argument in the message.
std::string TextArg(py::handle value, const std::string& what);
/// As TextArg, with None as a missing text.
std::optional<std::string> OptionalTextArg(py::handle value, const std::string& what);
/// A missing text is None.
py::object TextOut(const std::optional<std::string>& text);
/// A file path (str or os.PathLike) as UTF-8. ValueError for a name that is not UTF-8 (bytes
/// that os.fsencode cannot make UTF-8), IsADirectoryError for a directory.
std::string PathArg(py::handle path);

/// An item's values: a numpy array shaped by the layout for a NUMERIC item (int32 when every
/// element is an integer, float64 otherwise, an empty element as NaN), a list of str for STRING
/// and LABEL items, a flat list for a NUMERIC item holding texts.
py::object ValuesOut(const ops::Item& item);
/// Replaces an item's values, leaving it unchanged when anything is refused.
void ValuesIn(ops::Item& item, py::handle values);
/// The points of an axis as a 1-D array, or None when the axis holds none.
py::object PointsOut(const ops::ValueList& points);
/// Replaces an axis's points with the same number of numbers.
void PointsIn(ops::Axis& axis, py::handle points, const std::string& item);
/// Numbers of any shape as elements in C order: integral dtypes as integers (OverflowError
/// beyond int32), floating ones as doubles; TypeError for anything else.
std::vector<ops::Value> NumbersIn(py::handle array, const std::string& what);

/// Raises kestcalmorph.<kind> (a class of kestcalmorph._errors) with `message` and `fields` as
/// its attributes.
[[noreturn]] void Raise(const char* kind, const std::string& message, py::dict fields);
/// Raises the Python form of the exception in flight: library errors as kestcalmorph errors.
[[noreturn]] void RaiseCurrent(const std::string& file, const std::string& item = std::string());

/// Binds CalData, CalList, CalItem, Axis, Change and their sequences.
void BindTree(py::module_& module);
/// A CalData over `tree`.
py::object MakeCalData(TreePtr tree);
/// The tree of a CalData (TypeError for anything else).
TreePtr TreeOf(py::handle caldata);

}  // namespace kest::python
