#include "Diagnostics.h"

#include <cstdio>

namespace kest::tool {

namespace {

struct ReasonEntry {
    int code;
    const char* text;
};

constexpr ReasonEntry kReasonTexts[] = {
    {0, "CAL-DATA was not converted"},
    {11, "an AXIS attribute is missing"},
    {12, "a CAL-ITEM could not be read"},
    {13, "the document could not be walked"},
    {14, "a CAL-LIST could not be read"},
    {15, "CAL-DATA could not be read"},
    {16, "a CAL-DATA attribute is not an attribute node"},
    {17, "the TARGET-IMAGE attribute is not an attribute node"},
    {18, "SYMBOLIC-FILE has no crc32 attribute"},
    {19, "a VALUE attribute is not an attribute node"},
    {20, "an AXIS element has no attributes"},
    {21, "the XML service refused a new element"},
    {22, "a new element could not be created"},
    {23, "the schema-instance namespace (xmlns:xsi) is not set"},
    {24, "the schema location is not set"},
    {25, "a calibration list has no symbolic file"},
    {26, "an axis has no value"},
    {27, "an AXIS element has no attribute map"},
    {29, "an item has no value"},
    {30, "a calibration list has no name"},
    {31, "an item has no name"},
    {32, "the item count of a list is not set"},
    {33, "the change count is not set"},
    {34, "a year is out of range (1900..2300)"},
    {35, "a month is out of range"},
    {36, "a day is out of range"},
    {37, "an hour is out of range"},
    {38, "a minute is out of range"},
    {39, "a second is out of range"},
    {40, "a date text has the wrong length"},
    {41, "CAL-DATA has no attributes"},
    {42, "CAL-DATA lacks one of its three attributes (xmlns, xmlns:xsi, schema location)"},
    {44, "the schema file cannot be loaded"},
    {45, "the root names no schema (no xsi:schemaLocation)"},
};

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

void ReportError(const std::string& where, const std::string& text, const std::string& hint) {
    Report(where, "error", text);
    if (!hint.empty()) PrintError("hint: " + hint + "\n");
}

void ReportWarning(const std::string& where, const std::string& text) {
    Report(where, "warning", text);
}

void ReportNote(const std::string& where, const std::string& text) { Report(where, "note", text); }

const char* ReasonMeaning(int code) {
    for (const ReasonEntry& reason : kReasonTexts) {
        if (reason.code == code) return reason.text;
    }
    return "unknown reason";
}

}  // namespace kest::tool
