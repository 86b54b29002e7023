#include "HttpServer.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstring>
#include <thread>
#include <vector>

extern char** environ;

namespace kest {
namespace test {
namespace {

sockaddr_in Loopback(int port) {
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<uint16_t>(port));
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    return address;
}

/// Binds a new socket to 127.0.0.1 on a port the system picks; returns the socket (or -1)
/// and the port.
int BindAnyLocalPort(int& port) {
    int fd = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (fd < 0) return -1;
    sockaddr_in address = Loopback(0);
    socklen_t length = sizeof address;
    if (::bind(fd, reinterpret_cast<sockaddr*>(&address), sizeof address) != 0 ||
        ::getsockname(fd, reinterpret_cast<sockaddr*>(&address), &length) != 0) {
        ::close(fd);
        return -1;
    }
    port = ntohs(address.sin_port);
    return fd;
}

bool Accepts(int port) {
    int fd = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (fd < 0) return false;
    sockaddr_in address = Loopback(port);
    bool ok = ::connect(fd, reinterpret_cast<sockaddr*>(&address), sizeof address) == 0;
    ::close(fd);
    return ok;
}

}  // namespace

int FindFreeLocalPort() {
    int port = 0;
    int fd = BindAnyLocalPort(port);
    if (fd < 0) return 0;
    ::close(fd);
    return port;
}

LocalHttpServer::LocalHttpServer(const std::string& directory) {
    // The port can be taken between our probe and the server's bind; try a few times.
    for (int attempt = 0; attempt < 3 && !Start(directory); ++attempt) {
    }
}

LocalHttpServer::~LocalHttpServer() { Stop(); }

std::string LocalHttpServer::Url(const std::string& file) const {
    return "http://127.0.0.1:" + std::to_string(m_port) + "/" + file;
}

bool LocalHttpServer::Start(const std::string& directory) {
    m_port = FindFreeLocalPort();
    if (m_port == 0) {
        m_error = "no free local port";
        return false;
    }
    std::string port = std::to_string(m_port);
    std::vector<std::string> args = {"python3",   "-m", "http.server", "--bind",
                                     "127.0.0.1", port, "--directory", directory};
    std::vector<char*> argv;
    for (auto& arg : args) argv.push_back(arg.data());
    argv.push_back(nullptr);

    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
    posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
    posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, "/dev/null", O_WRONLY, 0);
    pid_t pid = -1;
    int spawned = posix_spawnp(&pid, "python3", &actions, nullptr, argv.data(), environ);
    posix_spawn_file_actions_destroy(&actions);
    if (spawned != 0) {
        m_error = std::string("cannot start python3: ") + std::strerror(spawned);
        return false;
    }
    m_pid = pid;
    auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(15);
    while (std::chrono::steady_clock::now() < deadline) {
        if (Accepts(m_port)) {
            m_error.clear();
            return true;
        }
        int status = 0;
        if (::waitpid(m_pid, &status, WNOHANG) == m_pid) {
            m_pid = -1;
            m_error = "python3 -m http.server exited before accepting connections";
            return false;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
    }
    m_error = "python3 -m http.server did not accept connections in time";
    Stop();
    return false;
}

void LocalHttpServer::Stop() noexcept {
    if (m_pid <= 0) return;
    ::kill(m_pid, SIGTERM);
    int status = 0;
    for (int i = 0; i < 100; ++i) {  // up to 2 s, then force it
        if (::waitpid(m_pid, &status, WNOHANG) == m_pid) {
            m_pid = -1;
            return;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
    ::kill(m_pid, SIGKILL);
    ::waitpid(m_pid, &status, 0);
    m_pid = -1;
}

CannedHttpServer::CannedHttpServer(std::optional<std::string> response) {
    m_socket = BindAnyLocalPort(m_port);
    if (m_socket >= 0 && ::listen(m_socket, 16) != 0) {
        ::close(m_socket);
        m_socket = -1;
    }
    if (m_socket < 0 || !response) return;
    m_response = std::move(*response);
    m_thread = std::thread([this] {
        pollfd waiting{m_socket, POLLIN, 0};
        // Shutting the socket down (in the destructor) ends the poll.
        while (::poll(&waiting, 1, -1) == 1 && !(waiting.revents & (POLLHUP | POLLERR))) {
            int client = ::accept(m_socket, nullptr, nullptr);
            if (client < 0) break;
            char request[4096];
            (void)::recv(client, request, sizeof request, 0);
            (void)::send(client, m_response.data(), m_response.size(), MSG_NOSIGNAL);
            ::close(client);
        }
    });
}

CannedHttpServer::~CannedHttpServer() {
    if (m_socket >= 0) ::shutdown(m_socket, SHUT_RDWR);
    if (m_thread.joinable()) m_thread.join();
    if (m_socket >= 0) ::close(m_socket);
}

std::string CannedHttpServer::Url(const std::string& file) const {
    return "http://127.0.0.1:" + std::to_string(m_port) + "/" + file;
}

}  // namespace test
}  // namespace kest
