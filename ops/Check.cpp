#include "Check.h"

#include <zlib.h>

#include <cctype>
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <map>
#include <memory>
#include <utility>

#include "DiffSupport.h"
#include "ValueLayout.h"

namespace kest {
namespace ops {

namespace {

struct Position {
    long line = 0;
    long column = 0;
};

// Where each start tag `<NAME` (followed by '>', '/' or a blank) stands in `text`, in order.
// Columns count bytes, as the reader's do.
std::vector<Position> TagPositions(const std::string& text, const std::string& name) {
    std::vector<Position> out;
    const std::string open = "<" + name;
    long line = 1;
    std::size_t lineStart = 0, scanned = 0;
    for (std::size_t at = text.find(open); at != std::string::npos;
         at = text.find(open, at + open.size())) {
        const std::size_t next = at + open.size();
        if (next < text.size() && text[next] != '>' && text[next] != '/' &&
            !std::isspace(static_cast<unsigned char>(text[next])))
            continue;
        for (; scanned < at; ++scanned) {
            if (text[scanned] == '\n') {
                ++line;
                lineStart = scanned + 1;
            }
        }
        out.push_back({line, static_cast<long>(at - lineStart + 1)});
    }
    return out;
}

class Checker {
  public:
    Checker(const CheckSource& source, std::vector<CheckFinding>& out)
        : m_source(source), m_out(out) {}

    void Add(Position at, const std::string& list, const std::string& item, const std::string& kind,
             const std::string& message, bool problem = true) {
        m_out.push_back({m_source.file, at.line, at.column, list, item, kind, message, problem});
    }

    void CheckPoints(Position at, const std::string& list, const Item& item, std::size_t index,
                     const Axis& axis) {
        const std::string name = item.name.value_or("");
        const std::string which = "axis " + std::to_string(index + 1);
        const std::vector<Value>& points = axis.points.elements;
        if (axis.points.present && !points.empty() &&
            (axis.size < 0 || points.size() != static_cast<std::size_t>(axis.size))) {
            Add(at, list, name, "axis-size",
                which + " has size " + std::to_string(axis.size) + " but " +
                    std::to_string(points.size()) + " points");
        }
        if (axis.format == "NUMERIC") {
            for (std::size_t i = 0; i < points.size(); ++i) {
                if (points[i].GetKind() == Value::Kind::kString) {
                    Add(at, list, name, "text-value",
                        which + " point " + std::to_string(i) + " is the text \"" +
                            points[i].Text() + "\" on a NUMERIC axis");
                    break;
                }
            }
        }
        int direction = 0;  // +1 rising, -1 falling, once known
        for (std::size_t i = 1; i < points.size(); ++i) {
            const Value& x = points[i - 1];
            const Value& y = points[i];
            if (!x.IsNumber() || !y.IsNumber()) continue;
            const int step = y.Number() > x.Number() ? 1 : y.Number() < x.Number() ? -1 : 0;
            if (step != 0 && (direction == 0 || step == direction)) {
                direction = step;
                continue;
            }
            Add(at, list, name, "axis-order",
                which + " points are not strictly monotonic at point " + std::to_string(i) + " (" +
                    x.ToText() + " then " + y.ToText() + ")");
            break;
        }
    }

    void CheckItem(Position at, const std::string& list, const Item& item) {
        const std::string name = item.name.value_or("");
        for (std::size_t i = 0; i < item.axes.size(); ++i)
            CheckPoints(at, list, item, i, item.axes[i]);
        const ValueLayout layout = LayoutOf(item, list);
        if (layout.finding) Add(at, list, name, layout.finding->kind, layout.finding->message);
        if (item.format == "NUMERIC") {
            const std::vector<Value>& values = item.values.elements;
            for (std::size_t i = 0; i < values.size(); ++i) {
                if (values[i].GetKind() == Value::Kind::kString) {
                    Add(at, list, name, "text-value",
                        "value " + std::to_string(i) + " is the text \"" + values[i].Text() +
                            "\" on a NUMERIC item");
                    break;
                }
            }
        }
    }

    void CheckFile(Position at, const std::string& list, const char* element,
                   const std::optional<FileRef>& ref) {
        if (!ref) return;
        namespace fs = std::filesystem;
        fs::path path(ref->name);
        if (path.is_relative() && m_source.file != "-")
            path = fs::path(m_source.file).parent_path() / path;
        char stored[16];
        std::snprintf(stored, sizeof stored, "0x%08X", static_cast<unsigned>(ref->crc));
        const std::string what = std::string(element) + " " + ref->name;
        std::error_code code;
        const fs::file_status status = fs::status(path, code);
        if (!fs::exists(status)) {
            Add(at, list, "", "crc-missing", what + ": no such file " + path.string());
            return;
        }
        if (fs::is_directory(status)) {
            Add(at, list, "", "crc-directory", what + ": " + path.string() + " is a directory");
            return;
        }
        std::string error;
        const std::optional<std::uint32_t> crc = FileCrc32(path.string(), error);
        if (!crc) {
            Add(at, list, "", "crc-unreadable", what + ": " + error);
            return;
        }
        char actual[16];
        std::snprintf(actual, sizeof actual, "0x%08X", static_cast<unsigned>(*crc));
        if (*crc != ref->crc) {
            Add(at, list, "", "crc-mismatch",
                what + ": CRC-32 is " + actual + ", the file states " + stored);
        } else {
            Add(at, list, "", "crc-match", what + ": CRC-32 " + actual + " matches", false);
        }
    }

  private:
    const CheckSource& m_source;
    std::vector<CheckFinding>& m_out;
};

}  // namespace

std::vector<CheckFinding> Check(const Document& document, const CheckSource& source,
                                const CheckOptions& options) {
    std::vector<CheckFinding> out;
    Checker checker(source, out);
    for (const KestReadWarning& warning : source.warnings) {
        std::string message = warning.kind == "empty"
                                  ? "an empty token was read as " + warning.valueRead
                                  : "the token \"" + warning.token + "\" was read as " +
                                        warning.valueRead + " (" + warning.kind + ")";
        out.push_back({source.file, warning.line, warning.column, "", warning.item, "read-warning",
                       message, true});
    }
    if (source.warningsOmitted > 0) {
        checker.Add({}, "", "", "read-warning",
                    std::to_string(source.warningsOmitted) + " further read warnings omitted");
    }
    // Positions are taken from the text only when its tags match the document one to one.
    std::vector<Position> items = TagPositions(source.text, "CAL-ITEM");
    std::vector<Position> lists = TagPositions(source.text, "CAL-LIST");
    if (items.size() != document.ItemCount()) items.clear();
    if (lists.size() != document.lists.size()) lists.clear();
    std::size_t itemIndex = 0;
    for (std::size_t l = 0; l < document.lists.size(); ++l) {
        const CalList& list = document.lists[l];
        const std::string listName = list.name.value_or("");
        const Position listAt = lists.empty() ? Position() : lists[l];
        std::map<std::string, std::size_t> seen;
        for (const Item& item : list.items) {
            const Position at = items.empty() ? Position() : items[itemIndex];
            ++itemIndex;
            const std::string name = item.name.value_or("");
            if (seen[name]++ == 1) {
                checker.Add(at, listName, name, "duplicate-item",
                            "the name occurs more than once in the list");
            }
            checker.CheckItem(at, listName, item);
        }
        if (options.verifyCrc) {
            checker.CheckFile(listAt, listName, "SYMBOLIC-FILE", list.symbolicFile);
            checker.CheckFile(listAt, listName, "TARGET-IMAGE", list.targetImage);
        }
    }
    return out;
}

std::optional<std::uint32_t> FileCrc32(const std::string& path, std::string& error) {
    std::error_code code;
    if (std::filesystem::is_directory(path, code)) {
        error = path + " is a directory";
        return std::nullopt;
    }
    std::unique_ptr<std::FILE, int (*)(std::FILE*)> file(std::fopen(path.c_str(), "rb"),
                                                         &std::fclose);
    if (!file) {
        error = "cannot open " + path + ": " + std::strerror(errno);
        return std::nullopt;
    }
    std::vector<unsigned char> buffer(1 << 20);
    uLong crc = crc32(0L, Z_NULL, 0);
    for (;;) {
        const std::size_t n = std::fread(buffer.data(), 1, buffer.size(), file.get());
        if (n > 0) crc = crc32(crc, buffer.data(), static_cast<uInt>(n));
        if (n < buffer.size()) break;
    }
    if (std::ferror(file.get())) {
        error = "cannot read " + path + ": " + std::strerror(errno);
        return std::nullopt;
    }
    return static_cast<std::uint32_t>(crc);
}

std::string CheckJson(const std::vector<CheckFinding>& findings) {
    nlohmann::ordered_json list = nlohmann::ordered_json::array();
    for (const CheckFinding& finding : findings) {
        list.push_back({{"file", finding.file},
                        {"line", finding.line},
                        {"column", finding.column},
                        {"list", finding.list},
                        {"item", finding.item},
                        {"kind", finding.kind},
                        {"message", finding.message},
                        {"problem", finding.problem}});
    }
    return nlohmann::ordered_json{{"findings", list}}.dump(2) + "\n";
}

}  // namespace ops
}  // namespace kest
