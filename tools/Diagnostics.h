#pragma once
// What calmorph says on standard error, in one shape for every command:
//   WHERE: error: TEXT      (WHERE is FILE, FILE:LINE or FILE:LINE:COL; "calmorph" when no file)
//   WHERE: warning: TEXT
//   WHERE: note: TEXT
//   hint: WHAT TO DO        (after an error, when there is something to do)

#include <kest/calmorph.h>

#include <string>

namespace kest::tool {

/// What a file's run printed, kept while files run on several threads so that the report keeps
/// the order of the arguments.
struct CapturedOutput {
    std::string out;
    std::string err;
};

/// Sends this thread's Print, PrintError and reports to `capture` (null: the streams again).
void CaptureOutput(CapturedOutput* capture);

/// Standard output, or this thread's capture.
void Print(const std::string& text);
/// Standard error, or this thread's capture.
void PrintError(const std::string& text);

/// "FILE:LINE:COL", "FILE:LINE" or "FILE", as far as the position is known.
std::string Where(const std::string& file, long line, long column);

/// The name a message uses for an input or output path: "<stdin>" / "<stdout>" for "-".
std::string DisplayName(const std::string& path, bool output = false);

/// "reason code N (what it means)", with ` in item "NAME"` when the error names an item.
std::string ReasonOf(const KestCalmorphDLLError& error);

void ReportError(const std::string& where, const std::string& text,
                 const std::string& hint = std::string());
void ReportWarning(const std::string& where, const std::string& text);
void ReportNote(const std::string& where, const std::string& text);

}  // namespace kest::tool
