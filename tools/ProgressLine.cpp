#include "ProgressLine.h"

#include <unistd.h>

#include <chrono>
#include <cstdio>

namespace kest::tool {

ProgressLine::ProgressLine(std::string step) : m_step(std::move(step)) {
    if (!::isatty(STDERR_FILENO)) return;
    m_thread = std::thread([this] {
        std::unique_lock<std::mutex> lock(m_mutex);
        if (m_done.wait_for(lock, std::chrono::seconds(1), [this] { return m_finished; })) return;
        std::fprintf(stderr, "calmorph: %s ...", m_step.c_str());
        std::fflush(stderr);
        m_shown = true;
    });
}

ProgressLine::~ProgressLine() {
    if (!m_thread.joinable()) return;
    {
        std::lock_guard<std::mutex> lock(m_mutex);
        m_finished = true;
    }
    m_done.notify_one();
    m_thread.join();
    if (m_shown) std::fputs("\r\033[K", stderr);  // erase the line
}

}  // namespace kest::tool
