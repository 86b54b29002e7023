// kestcalmorph._core: whole-file work (read, validate, write, JSON) and the tree's bindings.
// The GIL is released only while the library works on a tree no Python object can reach.

#include <pybind11/pybind11.h>

#include <string>

#include "Bindings.h"
#include "core/KestCalmorph.h"
#include "ops/Check.h"
#include "ops/Diff.h"
#include "ops/JsonFormat.h"
#include "ops/Merge.h"

#include <fstream>
#include <sstream>
#include "platform/HResult.h"
#include "platform/KestCalmorphDLLError.h"

namespace kest::python {

namespace {

KestReadOptions OptionsOf(const std::optional<std::string>& schema, bool validate, bool offline) {
    KestReadOptions options;
    options.validate = validate;
    options.allowNetwork = !offline;
    options.schemaPath = schema.value_or(std::string());
    // A file naming a schema that is not at hand is checked against the built-in cdf.xsd.
    options.builtinSchemaFallback = true;
    return options;
}

py::dict LoadFields(const KestLoadError& error, const std::string& path) {
    return py::dict(py::arg("reason") = error.code,
                    py::arg("file") = error.file.empty() ? path : error.file,
                    py::arg("line") = error.line, py::arg("column") = error.column,
                    py::arg("hint") = error.hint);
}

[[noreturn]] void RaiseLoad(const KestLoadError& error, const std::string& path) {
    const char* kind = error.code == XML_E_INVALID ? "ValidationError" : "LoadError";
    std::string where = error.file.empty() ? path : error.file;
    if (error.line > 0) where += ":" + std::to_string(error.line);
    if (error.line > 0 && error.column > 0) where += ":" + std::to_string(error.column);
    Raise(kind, where + ": " + error.reason, LoadFields(error, path));
}

py::object Read(py::handle pathArg, py::handle schemaArg, bool validate, bool offline) {
    const std::string path = PathArg(pathArg);
    std::optional<std::string> schema;
    if (!schemaArg.is_none()) schema = PathArg(schemaArg);
    KestCalmorph converter;
    converter.SetReadOptions(OptionsOf(schema, validate, offline));
    auto tree = std::make_shared<Tree>();
    CComBSTR message;
    bool found = true;
    try {
        py::gil_scoped_release release;
        KestCdfCalData data = converter.ConvertXMLtoCPP(CComBSTR(path), true, message);
        // Reading CAL-DATA always sets the namespace; a null one means none was found.
        found = data.GetNamespace().m_string != nullptr;
        if (converter.GetLastLoadError().code == 0 && message.Length() == 0 && found) {
            tree->document = ops::FromCalData(data);
        }
    } catch (...) {
        RaiseCurrent(path);
    }
    if (converter.GetLastLoadError().code != 0) RaiseLoad(converter.GetLastLoadError(), path);
    if (message.Length() != 0) {
        Raise("LoadError", path + ": " + message.ToString(), py::dict(py::arg("file") = path));
    }
    if (!found) {
        Raise("LoadError", path + ": no CAL-DATA element", py::dict(py::arg("file") = path));
    }
    tree->warnings = converter.GetReadWarnings();
    tree->path = path;
    return MakeCalData(tree);
}

py::list Validate(py::handle pathArg, py::handle schemaArg) {
    const std::string path = PathArg(pathArg);
    std::optional<std::string> schema;
    if (!schemaArg.is_none()) schema = PathArg(schemaArg);
    KestCalmorph converter;
    converter.SetReadOptions(OptionsOf(schema, true, false));
    CComBSTR message;
    try {
        py::gil_scoped_release release;
        (void)converter.ConvertXMLtoCPP(CComBSTR(path), true, message);
    } catch (...) {
        RaiseCurrent(path);
    }
    py::list problems;
    const KestLoadError& error = converter.GetLastLoadError();
    py::object problem = py::module_::import("kestcalmorph._errors").attr("Problem");
    if (error.code != 0) {
        problems.append(problem(error.file.empty() ? path : error.file, error.line, error.column,
                                error.code, error.reason, error.hint));
    } else if (message.Length() != 0) {
        problems.append(problem(path, 0, 0, 0, message.ToString(), ""));
    }
    return problems;
}

void Write(py::handle caldata, py::handle pathArg, py::handle commentArg, bool indent) {
    const std::string path = PathArg(pathArg);
    const std::string comment = TextArg(commentArg, "comment");
    TreePtr tree = TreeOf(caldata);
    KestCalmorph converter;
    KestWriteOptions options;
    options.indent = indent;
    converter.SetWriteOptions(options);
    try {
        // The tree is copied with the GIL held; the file is written from the copy.
        KestCdfCalData data = ops::ToCalData(tree->document);
        py::gil_scoped_release release;
        if (!converter.ConvertCPPToXML(data, CComBSTR(path), CComBSTR(comment))) {
            throw _com_error(E_INVALIDARG, "the path is empty");
        }
    } catch (...) {
        RaiseCurrent(path);
    }
}

std::string ToJson(py::handle caldata) {
    TreePtr tree = TreeOf(caldata);
    return ops::ExportJson(tree->document);
}

py::object FromJson(py::handle textArg) {
    const std::string text = TextArg(textArg, "JSON text");
    auto tree = std::make_shared<Tree>();
    try {
        py::gil_scoped_release release;
        tree->document = ops::ImportJson(text);
    } catch (...) {
        RaiseCurrent("");
    }
    return MakeCalData(tree);
}

py::object Loads(const std::string& json) {
    return py::module_::import("json").attr("loads")(json);
}

py::object DiffOf(py::handle a, py::handle b, double tolerance, double relTolerance,
                  bool ignoreHistory) {
    ops::DiffOptions options;
    options.tolerance = tolerance;
    options.relTolerance = relTolerance;
    options.ignoreHistory = ignoreHistory;
    if (!(tolerance >= 0) || !(relTolerance >= 0)) {
        throw py::value_error("tolerances must be numbers of at least 0");
    }
    return Loads(ops::DiffJson(ops::Diff(TreeOf(a)->document, TreeOf(b)->document, options)));
}

py::object MergeOf(py::handle base, py::handle ours, py::handle theirs, py::handle preferArg) {
    ops::MergePrefer prefer = ops::MergePrefer::kNone;
    if (!preferArg.is_none()) {
        const std::string side = TextArg(preferArg, "prefer");
        if (side == "ours") {
            prefer = ops::MergePrefer::kOurs;
        } else if (side == "theirs") {
            prefer = ops::MergePrefer::kTheirs;
        } else {
            throw py::value_error("prefer must be None, 'ours' or 'theirs', not '" + side + "'");
        }
    }
    ops::MergeResult result = ops::Merge(TreeOf(base)->document, TreeOf(ours)->document,
                                         TreeOf(theirs)->document, prefer);
    py::dict out = Loads(ops::MergeJson(result));
    auto tree = std::make_shared<Tree>();
    tree->document = std::move(result.merged);
    out["merged"] = MakeCalData(tree);
    return std::move(out);
}

py::object CheckOf(py::handle caldata, bool verifyCrc) {
    TreePtr tree = TreeOf(caldata);
    ops::CheckSource source;
    source.file = tree->path;
    source.warnings = tree->warnings;
    if (!tree->path.empty()) {
        // The text places findings at their items; a file gone since the read only loses that.
        std::ifstream in(tree->path, std::ios::binary);
        std::ostringstream text;
        text << in.rdbuf();
        source.text = text.str();
    }
    ops::CheckOptions options;
    options.verifyCrc = verifyCrc;
    return Loads(ops::CheckJson(ops::Check(tree->document, source, options)))["findings"];
}

}  // namespace

}  // namespace kest::python

PYBIND11_MODULE(_core, m) {
    namespace py = pybind11;
    using namespace kest::python;
    m.doc() = "The compiled part of kestcalmorph; import kestcalmorph instead.";
    BindTree(m);
    py::object cls = m.attr("CalData");
    auto method = [&cls](const char* name, py::cpp_function function) {
        cls.attr(name) = function;
    };
    method("write", py::cpp_function(&Write, py::is_method(cls), py::name("write"), py::arg("path"),
                                     py::arg("comment") = "", py::arg("indent") = false,
                                     "Writes the tree to a CDF file (UTF-8)."));
    method("to_json", py::cpp_function(&ToJson, py::is_method(cls), py::name("to_json"),
                                       "The tree as the library's lossless JSON text."));
    m.def("read", &Read, py::arg("path"), py::arg("schema") = py::none(),
          py::arg("validate") = true, py::arg("offline") = false);
    m.def("validate", &Validate, py::arg("path"), py::arg("schema") = py::none());
    m.def("from_json", &FromJson, py::arg("text"));
    m.def("diff", &DiffOf, py::arg("a"), py::arg("b"), py::arg("tolerance") = 0.0,
          py::arg("rel_tolerance") = 0.0, py::arg("ignore_history") = false);
    m.def("merge", &MergeOf, py::arg("base"), py::arg("ours"), py::arg("theirs"),
          py::arg("prefer") = py::none());
    m.def("check", &CheckOf, py::arg("caldata"), py::arg("verify_crc") = false);
}
