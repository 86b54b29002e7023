#pragma once
// A progress line on standard error for a step that takes more than a second: shown only when
// standard error is a terminal, and erased when the step ends.

#include <condition_variable>
#include <mutex>
#include <string>
#include <thread>

namespace kest::tool {

class ProgressLine {
  public:
    /// Starts timing `step` ("reading big.cdf"); after a second it is shown as
    /// "calmorph: reading big.cdf ...".
    explicit ProgressLine(std::string step);
    /// Ends the step: erases the line when it was shown.
    ~ProgressLine();
    ProgressLine(const ProgressLine&) = delete;
    ProgressLine& operator=(const ProgressLine&) = delete;

  private:
    std::string m_step;
    std::mutex m_mutex;
    std::condition_variable m_done;
    bool m_finished = false;
    bool m_shown = false;
    std::thread m_thread;
};

}  // namespace kest::tool
