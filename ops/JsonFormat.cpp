#include "JsonFormat.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <cstdio>
#include <limits>
#include <nlohmann/json.hpp>
#include <utility>

#include "../platform/KestCalmorphDLLError.h"
#include "../text/KestCdfDate.h"
#include "detail/JsonText.h"

namespace kest {
namespace ops {

JsonImportError::JsonImportError(std::string path, std::string reason)
    : std::runtime_error(path.empty() ? reason : path + ": " + reason),
      m_path(std::move(path)),
      m_reason(std::move(reason)) {}

namespace {

// ---------------------------------------------------------------------------------------------
// Export: written directly, member by member, in the documented order; a large document is
// written in one pass with no intermediate JSON tree.

class Writer {
  public:
    std::string out;

    void Line(int depth) {
        out += '\n';
        out.append(static_cast<std::size_t>(depth) * 2, ' ');
    }
    void Key(int depth, const char* key, bool first = false) {
        if (!first) out += ',';
        Line(depth);
        out += '"';
        out += key;
        out += "\": ";
    }
    void String(std::string_view text) { detail::AppendJsonString(out, text); }
    void Nullable(const std::optional<std::string>& text) {
        if (text)
            String(*text);
        else
            out += "null";
    }
    void Number(double value) {
        if (!std::isfinite(value)) {
            String(FormatNumber(value));
            return;
        }
        char buffer[40];
        char* end = std::to_chars(buffer, buffer + sizeof buffer - 2, value).ptr;
        // A double keeps a fraction or an exponent, so readers that look at the number alone
        // still see a double.
        if (std::find_if(buffer, end, [](char c) { return c == '.' || c == 'e'; }) == end) {
            *end++ = '.';
            *end++ = '0';
        }
        out.append(buffer, end);
    }
    void Integer(long long value) {
        char buffer[24];
        out.append(buffer, std::to_chars(buffer, buffer + sizeof buffer, value).ptr);
    }
    /// Hands what is written so far to the sink once it holds a megabyte or so.
    void Flush(bool always = false) {
        if (!sink || (!always && out.size() < (1u << 20))) return;
        (*sink)(out);
        out.clear();
    }
    const JsonSink* sink = nullptr;
};

char TypeLetter(Value::Kind kind) {
    switch (kind) {
        case Value::Kind::kInteger:
            return 'i';
        case Value::Kind::kDouble:
            return 'd';
        case Value::Kind::kString:
            return 's';
        case Value::Kind::kEmpty:
            break;
    }
    return 'e';
}

// "types" then "values", the list's elements on one line.
void WriteValueList(Writer& w, int depth, const ValueList& list) {
    w.Key(depth, "types");
    if (!list.present) {
        w.out += "null";
        w.Key(depth, "values");
        w.out += "null";
        return;
    }
    std::string types;
    types.reserve(list.elements.size());
    for (const Value& v : list.elements) types += TypeLetter(v.GetKind());
    if (!types.empty() && types.find_first_not_of(types[0]) == std::string::npos) types.resize(1);
    w.String(types);
    w.Key(depth, "values");
    w.out += '[';
    bool first = true;
    for (const Value& v : list.elements) {
        if (!first) w.out += ", ";
        first = false;
        switch (v.GetKind()) {
            case Value::Kind::kInteger:
                w.Integer(v.Integer());
                break;
            case Value::Kind::kDouble:
                w.Number(v.Number());
                break;
            case Value::Kind::kString:
                w.String(v.Text());
                break;
            case Value::Kind::kEmpty:
                w.out += "null";
                break;
        }
    }
    w.out += ']';
}

void WriteFileRef(Writer& w, int depth, const std::optional<FileRef>& ref) {
    if (!ref) {
        w.out += "null";
        return;
    }
    char crc[16];
    std::snprintf(crc, sizeof crc, "0x%08X", static_cast<unsigned>(ref->crc));
    w.out += "{\"name\": ";
    w.String(ref->name);
    w.out += ", \"crc32\": ";
    w.String(crc);
    w.out += '}';
    (void)depth;
}

void WriteItem(Writer& w, int depth, const Item& item) {
    w.out += '{';
    w.Key(depth + 1, "name", true);
    w.Nullable(item.name);
    w.Key(depth + 1, "units");
    w.Nullable(item.units);
    w.Key(depth + 1, "format");
    w.Nullable(item.format);
    w.Key(depth + 1, "annotation");
    w.Nullable(item.annotation);
    w.Key(depth + 1, "note");
    w.Nullable(item.note);
    w.Key(depth + 1, "axes");
    w.out += '[';
    for (std::size_t i = 0; i < item.axes.size(); ++i) {
        const Axis& axis = item.axes[i];
        if (i) w.out += ',';
        w.Line(depth + 2);
        w.out += '{';
        w.Key(depth + 3, "size", true);
        w.Integer(axis.size);
        w.Key(depth + 3, "units");
        w.String(axis.units);
        w.Key(depth + 3, "format");
        w.String(axis.format);
        WriteValueList(w, depth + 3, axis.points);
        w.Line(depth + 2);
        w.out += '}';
    }
    if (!item.axes.empty()) w.Line(depth + 1);
    w.out += ']';
    WriteValueList(w, depth + 1, item.values);
    w.Line(depth);
    w.out += '}';
}

// ---------------------------------------------------------------------------------------------
// Import: the text is parsed by nlohmann::json (depth-limited), then every member is checked
// with its path as the document is built.

using Json = nlohmann::json;

class Path {
  public:
    explicit Path(std::string text = std::string()) : m_text(std::move(text)) {}
    Path Member(const char* key) const { return Path(m_text.empty() ? key : m_text + "." + key); }
    Path Index(std::size_t i) const { return Path(m_text + "[" + std::to_string(i) + "]"); }
    [[noreturn]] void Fail(const std::string& reason) const {
        throw JsonImportError(m_text, reason);
    }
    const std::string& Text() const { return m_text; }

  private:
    std::string m_text;
};

const char* TypeName(const Json& value) {
    switch (value.type()) {
        case Json::value_t::null:
            return "null";
        case Json::value_t::object:
            return "an object";
        case Json::value_t::array:
            return "an array";
        case Json::value_t::string:
            return "a string";
        case Json::value_t::boolean:
            return "a boolean";
        case Json::value_t::number_integer:
        case Json::value_t::number_unsigned:
            return "an integer";
        case Json::value_t::number_float:
            return "a number with a fraction";
        default:
            break;
    }
    return "a value of another kind";
}

[[noreturn]] void WrongType(const Path& path, const char* expected, const Json& value) {
    path.Fail(std::string("expected ") + expected + ", found " + TypeName(value));
}

// The members of an object, checked against the keys it must have (all of them, no others).
class Members {
  public:
    Members(const Json& value, const Path& path, std::initializer_list<const char*> keys)
        : m_value(value), m_path(path) {
        if (!value.is_object()) WrongType(path, "an object", value);
        for (const auto& member : value.items()) {
            bool known = false;
            for (const char* key : keys) known = known || member.key() == key;
            if (!known) path.Member(member.key().c_str()).Fail("unknown member");
        }
        for (const char* key : keys)
            if (!value.contains(key)) path.Member(key).Fail("missing member");
    }
    const Json& operator[](const char* key) const { return m_value[key]; }
    Path At(const char* key) const { return m_path.Member(key); }

    std::string String(const char* key) const { return ReadString(m_value[key], At(key)); }
    std::optional<std::string> Nullable(const char* key) const {
        const Json& value = m_value[key];
        if (value.is_null()) return std::nullopt;
        return ReadString(value, At(key));
    }
    static std::string ReadString(const Json& value, const Path& path) {
        if (!value.is_string()) WrongType(path, "a string", value);
        const std::string& text = value.get_ref<const std::string&>();
        if (text.size() > kJsonMaxTextBytes)
            path.Fail("text of " + std::to_string(text.size()) + " bytes is longer than " +
                      std::to_string(kJsonMaxTextBytes));
        return text;
    }

  private:
    const Json& m_value;
    Path m_path;
};

const Json& Array(const Json& value, const Path& path) {
    if (!value.is_array()) WrongType(path, "an array", value);
    return value;
}

std::string FormatType(const Members& m, const char* key) {
    std::string format = m.String(key);
    if (format != "NUMERIC" && format != "STRING" && format != "LABEL")
        m.At(key).Fail("unknown format type \"" + format + "\" (NUMERIC, STRING or LABEL)");
    return format;
}

Value ReadElement(const Json& value, char type, const Path& path) {
    switch (type) {
        case 'i': {
            if (!value.is_number_integer()) WrongType(path, "an integer", value);
            if (value.is_number_unsigned() ? value.get<std::uint64_t>() > 2147483647u
                                           : (value.get<std::int64_t>() < -2147483648LL ||
                                              value.get<std::int64_t>() > 2147483647LL))
                path.Fail("integer out of the 32-bit range");
            return Value::Integer(static_cast<std::int32_t>(value.get<std::int64_t>()));
        }
        case 'd': {
            if (value.is_number()) {
                const double number = value.get<double>();
                if (!std::isfinite(number)) path.Fail("number out of the range of a double");
                return Value::Double(number);
            }
            if (value.is_string()) {
                const std::string& text = value.get_ref<const std::string&>();
                if (text == "inf") return Value::Double(std::numeric_limits<double>::infinity());
                if (text == "-inf") return Value::Double(-std::numeric_limits<double>::infinity());
                if (text == "nan") return Value::Double(std::numeric_limits<double>::quiet_NaN());
                path.Fail("expected a number, \"inf\", \"-inf\" or \"nan\", found \"" +
                          text.substr(0, 40) + "\"");
            }
            WrongType(path, "a number", value);
        }
        case 's':
            return Value::String(Members::ReadString(value, path));
        default:
            if (!value.is_null()) WrongType(path, "null (an empty element)", value);
            return Value();
    }
}

ValueList ReadValueList(const Members& m) {
    ValueList list;
    const Json& types = m["types"];
    const Json& values = m["values"];
    if (values.is_null()) {
        if (!types.is_null()) m.At("types").Fail("must be null when \"values\" is null");
        return list;
    }
    const Json& elements = Array(values, m.At("values"));
    const std::string letters = Members::ReadString(types, m.At("types"));
    if (letters.find_first_not_of("idse") != std::string::npos)
        m.At("types").Fail("letters other than i, d, s, e");
    if (letters.size() != 1 && letters.size() != elements.size())
        m.At("types").Fail(std::to_string(letters.size()) + " letters for " +
                           std::to_string(elements.size()) +
                           " values (one letter for all, or one per value)");
    if (letters.empty() && !elements.empty()) m.At("types").Fail("no letters for the values");
    list.present = true;
    list.elements.reserve(elements.size());
    const Path at = m.At("values");
    for (std::size_t i = 0; i < elements.size(); ++i)
        list.elements.push_back(
            ReadElement(elements[i], letters.size() == 1 ? letters[0] : letters[i], at.Index(i)));
    return list;
}

std::optional<FileRef> ReadFileRef(const Json& value, const Path& path) {
    if (value.is_null()) return std::nullopt;
    const Members m(value, path, {"name", "crc32"});
    FileRef ref;
    ref.name = m.String("name");
    const std::string crc = m.String("crc32");
    bool ok = crc.size() == 10 && crc[0] == '0' && (crc[1] == 'x' || crc[1] == 'X');
    for (std::size_t i = 2; ok && i < crc.size(); ++i)
        ok = std::isxdigit(static_cast<unsigned char>(crc[i])) != 0;
    if (!ok)
        m.At("crc32").Fail("expected \"0x\" and eight hexadecimal digits, found \"" +
                           crc.substr(0, 40) + "\"");
    ref.crc = static_cast<std::uint32_t>(std::stoul(crc.substr(2), nullptr, 16));
    return ref;
}

Item ReadItem(const Json& value, const Path& path) {
    const Members m(value, path,
                    {"name", "units", "format", "annotation", "note", "axes", "types", "values"});
    Item item;
    item.name = m.Nullable("name");
    item.annotation = m.Nullable("annotation");
    item.note = m.Nullable("note");
    if (m["units"].is_null() != m["format"].is_null())
        m.At(m["units"].is_null() ? "units" : "format")
            .Fail("units and format are null together (an item without a value) or not at all");
    if (!m["format"].is_null()) {
        item.units = m.String("units");
        item.format = FormatType(m, "format");
        item.values = ReadValueList(m);
    } else if (!m["values"].is_null() || !m["types"].is_null()) {
        m.At("values").Fail("an item without units and format has no values");
    }
    const Json& axes = Array(m["axes"], m.At("axes"));
    for (std::size_t i = 0; i < axes.size(); ++i) {
        const Path at = m.At("axes").Index(i);
        const Members a(axes[i], at, {"size", "units", "format", "types", "values"});
        Axis axis;
        const Json& size = a["size"];
        if (!size.is_number_integer()) WrongType(a.At("size"), "an integer", size);
        if (size.is_number_unsigned() ? size.get<std::uint64_t>() > 4294967295u
                                      : size.get<std::int64_t>() < -2147483648LL)
            a.At("size").Fail("size out of the 32-bit range");
        axis.size = static_cast<std::int32_t>(static_cast<std::uint32_t>(size.get<std::int64_t>()));
        axis.units = a.String("units");
        axis.format = FormatType(a, "format");
        axis.points = ReadValueList(a);
        item.axes.push_back(std::move(axis));
    }
    return item;
}

Change ReadChange(const Json& value, const Path& path) {
    const Members m(value, path, {"user", "date", "tool", "note", "dataVersion"});
    Change change;
    change.user = m.String("user");
    change.date = m.String("date");
    try {
        KestCdfDate date;
        date.SetDate(CComBSTR(change.date));
    } catch (const KestCalmorphDLLError& error) {
        m.At("date").Fail("not a date YYYY-MM-DDThh:mm:ss between 1900 and 2300 (reason code " +
                          std::to_string(error.GetReason()) + ")");
    }
    change.tool = m.Nullable("tool");
    change.note = m.Nullable("note");
    change.dataVersion = m.Nullable("dataVersion");
    return change;
}

// Builds the JSON tree while it keeps the path of the value being parsed, so that a number out
// of range or a nesting too deep is reported where it is.
class PathTrackingParser {
  public:
    using number_integer_t = Json::number_integer_t;
    using number_unsigned_t = Json::number_unsigned_t;
    using number_float_t = Json::number_float_t;
    using string_t = Json::string_t;
    using binary_t = Json::binary_t;

    explicit PathTrackingParser(Json& result) : m_dom(result, true) {}

    bool null() { return Value(), m_dom.null(); }
    bool boolean(bool value) { return Value(), m_dom.boolean(value); }
    bool number_integer(number_integer_t value) { return Value(), m_dom.number_integer(value); }
    bool number_unsigned(number_unsigned_t value) { return Value(), m_dom.number_unsigned(value); }
    bool number_float(number_float_t value, const string_t& text) {
        return Value(), m_dom.number_float(value, text);
    }
    bool string(string_t& value) { return Value(), m_dom.string(value); }
    bool binary(binary_t& value) { return Value(), m_dom.binary(value); }
    bool start_object(std::size_t size) { return Open(false), m_dom.start_object(size); }
    bool key(string_t& key) {
        m_frames.back().key = key;
        return m_dom.key(key);
    }
    bool end_object() { return m_frames.pop_back(), m_dom.end_object(); }
    bool start_array(std::size_t size) { return Open(true), m_dom.start_array(size); }
    bool end_array() { return m_frames.pop_back(), m_dom.end_array(); }
    bool parse_error(std::size_t, const std::string&, const nlohmann::detail::exception& error) {
        // nlohmann's message names the byte; its type prefix ("[json.exception...] ") goes.
        std::string reason = error.what();
        const std::string::size_type end = reason.find("] ");
        if (end != std::string::npos) reason.erase(0, end + 2);
        throw JsonImportError(PathOf(true), "not JSON: " + reason);
    }

  private:
    struct Frame {
        bool array = false;
        std::size_t count = 0;  // values started in this array
        std::string key;        // the member being parsed in this object
    };

    void Value() {
        if (!m_frames.empty()) ++m_frames.back().count;
    }
    void Open(bool array) {
        Value();
        if (m_frames.size() >= static_cast<std::size_t>(kJsonMaxDepth))
            throw JsonImportError(
                PathOf(false), "nested deeper than " + std::to_string(kJsonMaxDepth) + " levels");
        m_frames.push_back(Frame{array, 0, std::string()});
    }
    // The path of the last value started, or (`next`) of the one about to be.
    std::string PathOf(bool next) const {
        std::string path;
        for (std::size_t i = 0; i < m_frames.size(); ++i) {
            const Frame& frame = m_frames[i];
            if (frame.array) {
                std::size_t index = frame.count;
                if (!(next && i + 1 == m_frames.size()) && index > 0) --index;
                path += "[" + std::to_string(index) + "]";
            } else if (!frame.key.empty() || i + 1 < m_frames.size()) {
                if (!path.empty()) path += '.';
                path += frame.key;
            }
        }
        return path;
    }

    nlohmann::detail::json_sax_dom_parser<Json> m_dom;
    std::vector<Frame> m_frames;
};

}  // namespace

std::string ExportJson(const Document& document) {
    std::string text;
    text.reserve(256 + document.ItemCount() * 256);
    ExportJson(document, [&](std::string_view piece) { text += piece; });
    return text;
}

namespace {

// The document's members up to the opening of "lists".
void WriteHead(Writer& w, const Document& document) {
    w.out += '{';
    w.Key(1, "format", true);
    w.String(kJsonFormatName);
    w.Key(1, "version");
    w.out += std::to_string(kJsonFormatVersion);
    w.Key(1, "namespace");
    w.String(document.ns);
    w.Key(1, "schemaInstance");
    w.Nullable(document.schemaInstance);
    w.Key(1, "schemaLocation");
    w.Nullable(document.schemaLocation);
    w.Key(1, "fileName");
    w.String(document.fileName);
    w.Key(1, "company");
    w.Nullable(document.company);
    w.Key(1, "note");
    w.Nullable(document.note);
    w.Key(1, "changeHistory");
    w.out += '[';
    for (std::size_t i = 0; i < document.history.size(); ++i) {
        const Change& change = document.history[i];
        if (i) w.out += ',';
        w.Line(2);
        w.out += '{';
        w.Key(3, "user", true);
        w.String(change.user);
        w.Key(3, "date");
        w.String(change.date);
        w.Key(3, "tool");
        w.Nullable(change.tool);
        w.Key(3, "note");
        w.Nullable(change.note);
        w.Key(3, "dataVersion");
        w.Nullable(change.dataVersion);
        w.Line(2);
        w.out += '}';
    }
    if (!document.history.empty()) w.Line(1);
    w.out += ']';
    w.Key(1, "lists");
    w.out += '[';
}

void WriteList(Writer& w, const CalList& list, bool first) {
    if (!first) w.out += ',';
    w.Line(2);
    w.out += '{';
    w.Key(3, "name", true);
    w.Nullable(list.name);
    w.Key(3, "symbolicFile");
    WriteFileRef(w, 3, list.symbolicFile);
    w.Key(3, "targetImage");
    WriteFileRef(w, 3, list.targetImage);
    w.Key(3, "note");
    w.Nullable(list.note);
    w.Key(3, "items");
    w.out += '[';
    for (std::size_t j = 0; j < list.items.size(); ++j) {
        if (j) w.out += ',';
        w.Line(4);
        WriteItem(w, 4, list.items[j]);
        w.Flush();
    }
    if (!list.items.empty()) w.Line(3);
    w.out += ']';
    w.Line(2);
    w.out += '}';
}

void WriteTail(Writer& w, bool anyList) {
    if (anyList) w.Line(1);
    w.out += ']';
    w.Line(0);
    w.out += "}\n";
    w.Flush(true);
}

}  // namespace

void ExportJson(const Document& document, const JsonSink& sink) {
    Writer w;
    w.sink = &sink;
    w.out.reserve((1u << 20) + 64 * 1024);
    WriteHead(w, document);
    for (std::size_t i = 0; i < document.lists.size(); ++i) WriteList(w, document.lists[i], i == 0);
    WriteTail(w, !document.lists.empty());
}

void ExportJson(const KestCdfCalData& data, const JsonSink& sink) {
    Writer w;
    w.sink = &sink;
    w.out.reserve((1u << 20) + 64 * 1024);
    WriteHead(w, HeaderOf(data));
    const std::size_t count = ListCount(data);
    for (std::size_t i = 0; i < count; ++i) WriteList(w, ListOf(data, i), i == 0);
    WriteTail(w, count != 0);
}

Document ImportJson(std::string_view text) {
    Json root;
    PathTrackingParser parser(root);
    Json::sax_parse(text.begin(), text.end(), &parser);
    const Members m(root, Path(),
                    {"format", "version", "namespace", "schemaInstance", "schemaLocation",
                     "fileName", "company", "note", "changeHistory", "lists"});
    if (!m["format"].is_string() || m["format"].get<std::string>() != kJsonFormatName)
        m.At("format").Fail(std::string("expected \"") + kJsonFormatName +
                            "\": this is not a calibration document of calmorph");
    if (!m["version"].is_number_integer() || m["version"].get<std::int64_t>() != kJsonFormatVersion)
        m.At("version").Fail("expected " + std::to_string(kJsonFormatVersion));
    Document document;
    document.ns = m.String("namespace");
    document.schemaInstance = m.Nullable("schemaInstance");
    document.schemaLocation = m.Nullable("schemaLocation");
    document.fileName = m.String("fileName");
    document.company = m.Nullable("company");
    document.note = m.Nullable("note");
    const Json& history = Array(m["changeHistory"], m.At("changeHistory"));
    for (std::size_t i = 0; i < history.size(); ++i)
        document.history.push_back(ReadChange(history[i], m.At("changeHistory").Index(i)));
    const Json& lists = Array(m["lists"], m.At("lists"));
    for (std::size_t i = 0; i < lists.size(); ++i) {
        const Path at = m.At("lists").Index(i);
        const Members l(lists[i], at, {"name", "symbolicFile", "targetImage", "note", "items"});
        CalList list;
        list.name = l.Nullable("name");
        list.symbolicFile = ReadFileRef(l["symbolicFile"], l.At("symbolicFile"));
        list.targetImage = ReadFileRef(l["targetImage"], l.At("targetImage"));
        list.note = l.Nullable("note");
        const Json& items = Array(l["items"], l.At("items"));
        list.items.reserve(items.size());
        for (std::size_t j = 0; j < items.size(); ++j)
            list.items.push_back(ReadItem(items[j], l.At("items").Index(j)));
        document.lists.push_back(std::move(list));
    }
    return document;
}

}  // namespace ops
}  // namespace kest
