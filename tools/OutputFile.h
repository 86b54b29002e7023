#pragma once
// Text output of export: a file given with -o, staged and published only when complete, or
// standard output, written as it comes.

#include <cstdio>
#include <memory>
#include <string>
#include <string_view>

#include "StagedOutput.h"

namespace kest::tool {

class OutputFile {
  public:
    /// `target` is the path of -o, or "" for standard output. Throws ToolError when no staged
    /// file can be made.
    explicit OutputFile(const std::string& target);
    ~OutputFile();
    OutputFile(const OutputFile&) = delete;
    OutputFile& operator=(const OutputFile&) = delete;

    /// Appends text; throws ToolError (exit 5) when it cannot be written.
    void Write(std::string_view text);
    /// Ends the output: publishes the staged file, or flushes standard output.
    void Finish();
    /// The path written while staging ("" for standard output), for messages.
    std::string StagedPath() const { return m_staged ? m_staged->Path() : std::string(); }

  private:
    std::string m_target;
    std::unique_ptr<StagedOutput> m_staged;
    std::FILE* m_file = nullptr;
};

}  // namespace kest::tool
