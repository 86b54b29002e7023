#include "Diagnostics.h"

#include <cstdio>

namespace kest::tool {

namespace {

void Report(const std::string& where, const char* kind, const std::string& text) {
    std::fprintf(stderr, "%s: %s: %s\n", where.empty() ? "calmorph" : where.c_str(), kind,
                 text.c_str());
}

}  // namespace

std::string Where(const std::string& file, long line, long column) {
    std::string where = file;
    if (line > 0) where += ":" + std::to_string(line);
    if (line > 0 && column > 0) where += ":" + std::to_string(column);
    return where;
}

std::string DisplayName(const std::string& path, bool output) {
    if (path == "-") return output ? "<stdout>" : "<stdin>";
    return path;
}

std::string ReasonOf(const KestCalmorphDLLError& error) {
    std::string text = "reason code " + std::to_string(error.GetReason()) + " (" +
                       ReasonText(error.GetReason()) + ")";
    std::string item = error.GetReasonString().ToString();
    if (!item.empty()) text += " in item \"" + item + "\"";
    return text;
}

void ReportError(const std::string& where, const std::string& text, const std::string& hint) {
    Report(where, "error", text);
    if (!hint.empty()) std::fprintf(stderr, "hint: %s\n", hint.c_str());
}

void ReportWarning(const std::string& where, const std::string& text) {
    Report(where, "warning", text);
}

void ReportNote(const std::string& where, const std::string& text) { Report(where, "note", text); }

}  // namespace kest::tool
