#include "AtomicSave.h"

#include <dirent.h>
#include <fcntl.h>
#include <signal.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <utility>

#include "ExpatLoader.h"
#include "XmlWriter.h"

namespace kest {
namespace detail {

namespace {

[[noreturn]] void Fail(int err, const char* what, const std::string& path) {
    throw _com_error(HResultForErrno(err),
                     std::string(what) + " " + path + ": " + std::strerror(err));
}

// The temporary name stays within the file name length limit however long the target is.
std::string TempPrefix(const std::string& base) { return "." + base.substr(0, 200) + "."; }

// Removes temporary files of earlier saves of `base` in `dir` whose writing process has ended.
// A process that still runs (or that we may not signal) keeps its file.
void RemoveStaleTemporaries(const std::string& dir, const std::string& base) {
    DIR* listing = ::opendir(dir.c_str());
    if (!listing) return;
    const std::string prefix = TempPrefix(base);
    while (dirent* entry = ::readdir(listing)) {
        std::string name = entry->d_name;
        if (name.compare(0, prefix.size(), prefix) != 0) continue;
        const char* rest = name.c_str() + prefix.size();
        char* end = nullptr;
        long pid = std::strtol(rest, &end, 10);
        if (end == rest || pid <= 0 || std::strncmp(end, ".tmp-", 5) != 0 || std::strlen(end) != 11)
            continue;
        if (pid == static_cast<long>(::getpid())) continue;  // another save of ours may run
        if (::kill(static_cast<pid_t>(pid), 0) == 0 || errno != ESRCH) continue;
        ::unlink((dir + "/" + name).c_str());
    }
    ::closedir(listing);
}

mode_t DefaultMode() {
    // New files get the usual permissions, as open() would give them.
    std::ifstream status("/proc/self/status");
    std::string line;
    mode_t mask = 022;
    while (std::getline(status, line))
        if (line.compare(0, 6, "Umask:") == 0)
            mask = static_cast<mode_t>(std::strtol(line.c_str() + 6, nullptr, 8));
    return 0666 & ~mask;
}

}  // namespace

AtomicFile::AtomicFile(std::string path) : m_path(std::move(path)) {}

AtomicFile::~AtomicFile() {
    if (m_fd >= 0) ::close(m_fd);
    if (!m_temp.empty() && !m_committed) ::unlink(m_temp.c_str());
}

void AtomicFile::Keep(int err, const char* what) noexcept {
    if (m_error != 0) return;
    m_error = err;
    try {
        m_what = what;
    } catch (...) {
    }
}

void AtomicFile::Open() {
    m_opened = true;
    const std::string& path = m_path;
    if (path.empty()) return Keep(ENOENT, "cannot save to");
    // Saving through a symbolic link replaces the file it points to, not the link.
    m_target = path;
    struct stat link {};
    if (::lstat(path.c_str(), &link) == 0 && S_ISLNK(link.st_mode)) {
        char* resolved = ::realpath(path.c_str(), nullptr);
        if (resolved) {
            m_target = resolved;
            std::free(resolved);
        }
    }
    const std::string& target = m_target;
    std::string::size_type slash = target.rfind('/');
    m_dir = slash == std::string::npos ? "." : (slash == 0 ? "/" : target.substr(0, slash));
    std::string base = slash == std::string::npos ? target : target.substr(slash + 1);
    if (base.empty()) return Keep(EISDIR, "cannot save to");
    struct stat st {};
    if (::stat(target.c_str(), &st) == 0) {
        if (S_ISDIR(st.st_mode)) return Keep(EISDIR, "cannot save to");
        m_mode = st.st_mode & 07777;  // a replaced file keeps its permissions
    } else {
        m_mode = DefaultMode();
    }
    RemoveStaleTemporaries(m_dir, base);
    std::string temp = m_dir + "/" + TempPrefix(base) +
                       std::to_string(static_cast<long>(::getpid())) + ".tmp-XXXXXX";
    m_fd = ::mkstemp(&temp[0]);
    if (m_fd < 0) return Keep(errno, "cannot save to");
    m_temp = std::move(temp);
}

void AtomicFile::Write(std::string_view piece) noexcept {
    if (!m_opened) {
        try {
            Open();
        } catch (...) {
            Keep(ENOMEM, "cannot save to");
        }
    }
    if (m_error != 0) return;
    while (!piece.empty()) {
        ssize_t n = ::write(m_fd, piece.data(), piece.size());
        if (n < 0) {
            if (errno == EINTR) continue;
            return Keep(errno, "cannot write");
        }
        piece.remove_prefix(static_cast<std::size_t>(n));
    }
}

void AtomicFile::Commit(long unrepresentable) {
    if (!m_opened) Write({});
    if (m_error != 0) Fail(m_error, m_what.c_str(), m_path);
    const std::string& path = m_path;
    if (unrepresentable >= 0) {
        // The file would not load again: refuse it rather than report a save that loses data.
        char code[32];
        std::snprintf(code, sizeof code, "U+%04lX", unrepresentable);
        throw _com_error(E_FAIL, "cannot save " + path + ": the document holds character " + code +
                                     ", which XML 1.0 cannot represent");
    }
    if (::fchmod(m_fd, static_cast<mode_t>(m_mode)) != 0) Fail(errno, "cannot save to", path);
    if (::fsync(m_fd) != 0) Fail(errno, "cannot write", path);
    const int fd = m_fd;
    m_fd = -1;
    if (::close(fd) != 0) Fail(errno, "cannot write", path);
    if (::rename(m_temp.c_str(), m_target.c_str()) != 0) Fail(errno, "cannot save to", path);
    m_committed = true;
    // The rename is durable once the directory is: sync it (a failure here leaves a complete
    // file in place, so it is not reported).
    int dirFd = ::open(m_dir.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (dirFd >= 0) {
        (void)::fsync(dirFd);
        ::close(dirFd);
    }
}

void SaveAtomically(const DomNode* document, const std::string& path, bool indent) {
    AtomicFile file(path);
    std::string buffer;
    buffer.reserve(1024 * 1024 + 64 * 1024);
    long unrepresentable = WriteXml(
        document, buffer, [&](std::string_view piece) { file.Write(piece); }, indent);
    file.Commit(unrepresentable);
}

}  // namespace detail
}  // namespace kest
