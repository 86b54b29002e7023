#include "Diagnostics.h"

#include <cstdio>

namespace kest::tool {

namespace {

thread_local CapturedOutput* t_capture = nullptr;

void Report(const std::string& where, const char* kind, const std::string& text) {
    PrintError((where.empty() ? "calmorph" : where) + ": " + kind + ": " + text + "\n");
}

}  // namespace

void CaptureOutput(CapturedOutput* capture) { t_capture = capture; }

void Print(const std::string& text) {
    if (t_capture) {
        t_capture->out += text;
    } else {
        std::fwrite(text.data(), 1, text.size(), stdout);
    }
}

void PrintError(const std::string& text) {
    if (t_capture) {
        t_capture->err += text;
    } else {
        std::fwrite(text.data(), 1, text.size(), stderr);
    }
}

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
    if (!hint.empty()) PrintError("hint: " + hint + "\n");
}

void ReportWarning(const std::string& where, const std::string& text) {
    Report(where, "warning", text);
}

void ReportNote(const std::string& where, const std::string& text) { Report(where, "note", text); }

}  // namespace kest::tool
