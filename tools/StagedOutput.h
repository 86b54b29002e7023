#pragma once
// StagedOutput: where convert writes before the output is checked and published. A file target
// is staged beside itself (so that a schema location resolves as it will for the target) and
// renamed over it; standard output is staged in the current folder (a private temporary folder
// when that is not writable) and copied out. The staged file is removed when the object goes or
// the process is interrupted; one left by a killed process goes with the next save of the same
// target.

#include <string>

namespace kest::tool {

class StagedOutput {
  public:
    /// `target` is the path the user gave, "-" for standard output. Throws ToolError when no
    /// place for the staged file can be made.
    explicit StagedOutput(std::string target);
    ~StagedOutput();
    StagedOutput(const StagedOutput&) = delete;
    StagedOutput& operator=(const StagedOutput&) = delete;

    /// The path to write to.
    const std::string& Path() const { return m_staged; }
    /// Replaces the target with the staged file (or copies it to standard output); throws
    /// ToolError naming the target and the system's reason on failure.
    void Publish();

  private:
    std::string m_target;  // as given
    std::string m_staged;  // the file written
    std::string m_folder;  // the private folder holding m_staged, for standard output
};

}  // namespace kest::tool
