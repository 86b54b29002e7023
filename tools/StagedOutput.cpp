#include "StagedOutput.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "Diagnostics.h"
#include "ToolError.h"

namespace kest::tool {

namespace {

// The staged file and folder an interruption must remove; set while a StagedOutput lives.
char g_stagedFile[4096];
char g_stagedFolder[4096];

extern "C" void RemoveStagedAndReraise(int signal) {
    if (g_stagedFile[0]) ::unlink(g_stagedFile);
    if (g_stagedFolder[0]) ::rmdir(g_stagedFolder);
    std::signal(signal, SIG_DFL);
    std::raise(signal);
}

void Remember(char (&slot)[4096], const std::string& path) {
    std::snprintf(slot, sizeof slot, "%s", path.size() < sizeof slot ? path.c_str() : "");
}

[[noreturn]] void Fail(const std::string& target, const std::string& what, int err) {
    throw ToolError(kExitCannotWrite, "calmorph",
                    what + " " + DisplayName(target, true) + ": " + std::strerror(err));
}

// The file a target path stands for: saving through a symbolic link replaces the file it
// points to, as the library's own save does.
std::string Resolved(const std::string& path) {
    struct stat link {};
    if (::lstat(path.c_str(), &link) != 0 || !S_ISLNK(link.st_mode)) return path;
    char* resolved = ::realpath(path.c_str(), nullptr);
    if (!resolved) return path;
    std::string result = resolved;
    std::free(resolved);
    return result;
}

void SyncDirectoryOf(const std::string& path) {
    std::string::size_type slash = path.rfind('/');
    std::string dir = slash == std::string::npos ? "." : path.substr(0, slash ? slash : 1);
    int fd = ::open(dir.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (fd < 0) return;
    ::fsync(fd);
    ::close(fd);
}

std::string StagingPrefix(const std::string& base) { return "." + base.substr(0, 200) + "."; }
constexpr const char* kStagingSuffix = ".tmp-staged";

// Removes files staged for `base` in `dir` by calmorph processes that have ended.
void RemoveStaleStaging(const std::string& dir, const std::string& base) {
    DIR* listing = ::opendir(dir.empty() ? "." : dir.c_str());
    if (!listing) return;
    const std::string prefix = StagingPrefix(base);
    while (dirent* entry = ::readdir(listing)) {
        const std::string name = entry->d_name;
        if (name.compare(0, prefix.size(), prefix) != 0) continue;
        char* end = nullptr;
        const long pid = std::strtol(name.c_str() + prefix.size(), &end, 10);
        if (pid <= 0 || std::strcmp(end, kStagingSuffix) != 0 || pid == ::getpid()) continue;
        if (::kill(static_cast<pid_t>(pid), 0) == 0 || errno != ESRCH) continue;
        ::unlink((dir + name).c_str());
    }
    ::closedir(listing);
}

}  // namespace

StagedOutput::StagedOutput(std::string target) : m_target(std::move(target)) {
    std::string dir;
    std::string base = "calmorph-stdout";
    if (m_target != "-") {
        std::string file = Resolved(m_target);
        std::string::size_type slash = file.rfind('/');
        dir = slash == std::string::npos ? "" : file.substr(0, slash + 1);
        base = slash == std::string::npos ? file : file.substr(slash + 1);
    }
    if (m_target == "-" && ::access(".", W_OK) != 0) {
        const char* tmp = std::getenv("TMPDIR");
        std::string folder = std::string(tmp && *tmp ? tmp : "/tmp") + "/calmorph.XXXXXX";
        if (!::mkdtemp(&folder[0])) Fail(m_target, "cannot stage", errno);
        m_folder = folder;
        m_staged = folder + "/out.cdf";
    } else {
        // Standard output is staged in the current folder: a later read of what was piped out
        // resolves a relative schema location against it, as the check of the staged copy does.
        // The name follows the library's temporaries, so that saves of the target remove it
        // once this process has ended, as the next convert does.
        RemoveStaleStaging(dir, base);
        m_staged = dir + StagingPrefix(base) + std::to_string(::getpid()) + kStagingSuffix;
    }
    Remember(g_stagedFile, m_staged);
    Remember(g_stagedFolder, m_folder);
    for (int signal : {SIGINT, SIGTERM, SIGHUP, SIGPIPE})
        std::signal(signal, RemoveStagedAndReraise);
}

StagedOutput::~StagedOutput() {
    ::unlink(m_staged.c_str());
    if (!m_folder.empty()) ::rmdir(m_folder.c_str());
    g_stagedFile[0] = '\0';
    g_stagedFolder[0] = '\0';
}

void StagedOutput::Publish() {
    if (m_target == "-") {
        std::FILE* in = std::fopen(m_staged.c_str(), "rb");
        if (!in) Fail(m_target, "cannot read the staged copy of", errno);
        char buffer[65536];
        std::size_t n;
        bool ok = true;
        while (ok && (n = std::fread(buffer, 1, sizeof buffer, in)) > 0) {
            ok = std::fwrite(buffer, 1, n, stdout) == n;
        }
        std::fclose(in);
        if (!ok || std::fflush(stdout) != 0) Fail(m_target, "cannot write", errno);
        return;
    }
    std::string file = Resolved(m_target);
    struct stat existing {};
    // A replaced file keeps its permissions.
    if (::stat(file.c_str(), &existing) == 0 && !S_ISDIR(existing.st_mode)) {
        ::chmod(m_staged.c_str(), existing.st_mode & 07777);
    }
    if (::rename(m_staged.c_str(), file.c_str()) != 0) Fail(m_target, "cannot save to", errno);
    SyncDirectoryOf(file);
}

}  // namespace kest::tool
