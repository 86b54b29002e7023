#pragma once
// Files for the converter and tool tests: a temporary folder removed with its content, and whole
// files written and read as bytes.

#include <stdlib.h>

#include <filesystem>
#include <fstream>
#include <sstream>
#include <stdexcept>
#include <string>

namespace kest {
namespace test {

class T2TempDir {
  public:
    T2TempDir() {
        std::string pattern = (std::filesystem::temp_directory_path() / "kest-t2-XXXXXX").string();
        if (!mkdtemp(pattern.data())) throw std::runtime_error("mkdtemp failed");
        m_path = pattern;
    }
    ~T2TempDir() {
        std::error_code ignored;
        std::filesystem::remove_all(m_path, ignored);
    }
    T2TempDir(const T2TempDir&) = delete;
    T2TempDir& operator=(const T2TempDir&) = delete;
    std::string operator/(const std::string& name) const { return (m_path / name).string(); }
    const std::filesystem::path& path() const { return m_path; }
    std::string str() const { return m_path.string(); }

  private:
    std::filesystem::path m_path;
};

/// Writes `text` to `path`, creating the folders on the way.
inline void T2WriteFile(const std::string& path, const std::string& text) {
    std::filesystem::create_directories(std::filesystem::path(path).parent_path());
    std::ofstream out(path, std::ios::binary);
    out << text;
}

/// The bytes of `path`; empty when it cannot be read.
inline std::string T2ReadFile(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

}  // namespace test
}  // namespace kest
