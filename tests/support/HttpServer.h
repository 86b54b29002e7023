#pragma once
// Local servers for tests that fetch over http. They listen on 127.0.0.1 only, on a free port.

#include <sys/types.h>

#include <optional>
#include <string>
#include <thread>

namespace kest {
namespace test {

/// Serves the files of a directory with `python3 -m http.server` bound to 127.0.0.1. The
/// constructor waits (at most a few seconds) until the server accepts connections; the
/// destructor stops it. When python3 is missing or the server does not come up, Started() is
/// false and Error() says why, so a test can skip.
class LocalHttpServer {
  public:
    explicit LocalHttpServer(const std::string& directory);
    ~LocalHttpServer();
    LocalHttpServer(const LocalHttpServer&) = delete;
    LocalHttpServer& operator=(const LocalHttpServer&) = delete;

    bool Started() const noexcept { return m_pid > 0; }
    const std::string& Error() const noexcept { return m_error; }
    int Port() const noexcept { return m_port; }
    /// "http://127.0.0.1:<port>/<file>" (file relative to the served directory).
    std::string Url(const std::string& file) const;

  private:
    bool Start(const std::string& directory);
    void Stop() noexcept;

    pid_t m_pid = -1;
    int m_port = 0;
    std::string m_error;
};

/// Answers every request on 127.0.0.1 with the same raw response (status line, headers and
/// body as given), from a thread, until destroyed. Without a response it accepts connections
/// into its backlog and never answers, for testing timeouts.
class CannedHttpServer {
  public:
    explicit CannedHttpServer(std::optional<std::string> response = std::nullopt);
    ~CannedHttpServer();
    CannedHttpServer(const CannedHttpServer&) = delete;
    CannedHttpServer& operator=(const CannedHttpServer&) = delete;

    bool Started() const noexcept { return m_socket >= 0; }
    std::string Url(const std::string& file) const;

  private:
    std::string m_response;
    int m_socket = -1;
    int m_port = 0;
    std::thread m_thread;
};
using SilentServer = CannedHttpServer;

/// A port on 127.0.0.1 that was free a moment ago (0 when none could be found).
int FindFreeLocalPort();

}  // namespace test
}  // namespace kest
