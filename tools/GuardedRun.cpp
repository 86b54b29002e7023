#include "GuardedRun.h"

#include <kest/calmorph.h>

#include <new>

#include "Diagnostics.h"
#include "ExitCode.h"
#include "ToolError.h"

namespace kest::tool {

namespace {

// A description naming the staged path names the file the user asked for instead.
std::string Unstaged(std::string text, const Subject& subject) {
    if (subject.stagedPath.empty()) return text;
    for (std::string::size_type at = text.find(subject.stagedPath); at != std::string::npos;
         at = text.find(subject.stagedPath, at + subject.file.size())) {
        text.replace(at, subject.stagedPath.size(), subject.file);
    }
    return text;
}

}  // namespace

int GuardedRun(const Subject& subject, const std::function<int()>& step) {
    const bool writing = subject.stage == Subject::Stage::kWrite;
    const std::string where = DisplayName(subject.file, writing);
    try {
        return step();
    } catch (const ToolError& error) {
        ReportError(error.Where(), error.what(), error.Hint());
        return error.Code();
    } catch (const KestCalmorphDLLError& error) {
        ReportError(where, "conversion error: " + ReasonOf(error));
        return kExitConversion;
    } catch (const _com_error& error) {
        // The description names the path and the system's reason; the failure code adds nothing
        // a user can act on.
        std::string text = error.Description().empty() ? error.what() : error.Description();
        if (writing) {
            // The description names the path already.
            ReportError("calmorph", Unstaged(text, subject));
            return kExitCannotWrite;
        }
        ReportError(where, "conversion error: " + text);
        return kExitConversion;
    } catch (HRESULT) {
        ReportError(where, "no XML document can be created");
        return writing ? kExitCannotWrite : kExitCannotLoad;
    } catch (const std::bad_alloc&) {
        ReportError(where, "out of memory");
        return kExitConversion;
    } catch (const std::exception& error) {
        ReportError(where, error.what());
        return kExitConversion;
    }
}

}  // namespace kest::tool
