#include "OutputFile.h"

#include <cerrno>
#include <cstring>

#include "Diagnostics.h"
#include "ToolError.h"

namespace kest::tool {

namespace {

[[noreturn]] void Fail(const std::string& target, int error) {
    throw ToolError(kExitCannotWrite, DisplayName(target.empty() ? "-" : target, true),
                    std::string("cannot write: ") + std::strerror(error));
}

}  // namespace

OutputFile::OutputFile(const std::string& target) : m_target(target) {
    if (target.empty() || target == "-") {
        m_file = stdout;
        return;
    }
    m_staged = std::make_unique<StagedOutput>(target);
    m_file = std::fopen(m_staged->Path().c_str(), "wb");
    if (!m_file) Fail(target, errno);
}

OutputFile::~OutputFile() {
    if (m_file && m_file != stdout) std::fclose(m_file);
}

void OutputFile::Write(std::string_view text) {
    if (std::fwrite(text.data(), 1, text.size(), m_file) != text.size()) Fail(m_target, errno);
}

void OutputFile::Finish() {
    if (std::fflush(m_file) != 0) Fail(m_target, errno);
    if (m_file == stdout) return;
    const int failed = std::fclose(m_file);
    m_file = nullptr;
    if (failed != 0) Fail(m_target, errno);
    m_staged->Publish();
}

}  // namespace kest::tool
