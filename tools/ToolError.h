#pragma once
// ToolError: a failure a command has already put into words; the guarded runner prints it and
// exits with its code.

#include <stdexcept>
#include <string>

#include "ExitCode.h"

namespace kest::tool {

class ToolError : public std::runtime_error {
  public:
    /// `where` is the file (with its position when known) the message is about; `hint` says what
    /// to do, when there is something to say.
    ToolError(ExitCode code, std::string where, const std::string& text, std::string hint = {})
        : std::runtime_error(text),
          m_code(code),
          m_where(std::move(where)),
          m_hint(std::move(hint)) {}

    ExitCode Code() const { return m_code; }
    const std::string& Where() const { return m_where; }
    const std::string& Hint() const { return m_hint; }

  private:
    ExitCode m_code;
    std::string m_where;
    std::string m_hint;
};

}  // namespace kest::tool
