#include "BenchSupport.h"

#include <expat.h>

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <fstream>
#include <stdexcept>
#include <sys/stat.h>
#include <time.h>

namespace kest {
namespace bench {
namespace {

void XMLCALL OnStart(void* data, const XML_Char*, const XML_Char** attributes) {
    auto* r = static_cast<ExpatPassResult*>(data);
    ++r->elements;
    for (const XML_Char** a = attributes; *a; a += 2) ++r->attributes;
}

void XMLCALL OnEnd(void*, const XML_Char*) {}

void XMLCALL OnCharacters(void* data, const XML_Char*, int length) {
    static_cast<ExpatPassResult*>(data)->characters += static_cast<std::uint64_t>(length);
}

}  // namespace

ExpatPassResult ExpatPass(const std::string& path) {
    ExpatPassResult result;
    // The file is read as the DOM reads it: read() in 64 KiB pieces appended to a buffer
    // reserved at the file's size; expat is then fed in 256 KiB slices.
    const int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0) {
        result.error = "cannot open " + path;
        return result;
    }
    std::string bytes;
    struct stat st {};
    if (::fstat(fd, &st) == 0 && st.st_size > 0) bytes.reserve(static_cast<std::size_t>(st.st_size));
    char buffer[64 * 1024];
    for (;;) {
        const ssize_t n = ::read(fd, buffer, sizeof buffer);
        if (n == 0) break;
        if (n < 0) {
            if (errno == EINTR) continue;
            ::close(fd);
            result.error = "cannot read " + path;
            return result;
        }
        bytes.append(buffer, static_cast<std::size_t>(n));
    }
    ::close(fd);

    XML_Parser parser = XML_ParserCreate(nullptr);
    if (!parser) {
        result.error = "XML_ParserCreate failed";
        return result;
    }
    XML_SetUserData(parser, &result);
    XML_SetElementHandler(parser, OnStart, OnEnd);
    XML_SetCharacterDataHandler(parser, OnCharacters);
    const std::size_t kSlice = 256 * 1024;
    std::size_t offset = 0;
    bool ok = true;
    do {
        const std::size_t n = std::min(kSlice, bytes.size() - offset);
        const bool last = offset + n == bytes.size();
        if (XML_Parse(parser, bytes.data() + offset, static_cast<int>(n), last) !=
            XML_STATUS_OK) {
            ok = false;
            result.error = XML_ErrorString(XML_GetErrorCode(parser));
            break;
        }
        offset += n;
        if (last) break;
    } while (true);
    XML_ParserFree(parser);
    result.ok = ok;
    return result;
}

double ProcessCpuSeconds() {
    timespec ts {};
    clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &ts);
    return static_cast<double>(ts.tv_sec) + 1e-9 * static_cast<double>(ts.tv_nsec);
}

std::uint64_t FileSize(const std::string& path) {
    struct stat st {};
    if (stat(path.c_str(), &st) != 0) return 0;
    return static_cast<std::uint64_t>(st.st_size);
}

void CopyFile(const std::string& from, const std::string& to) {
    std::ifstream in(from, std::ios::binary);
    std::ofstream out(to, std::ios::binary | std::ios::trunc);
    if (!in || !out) throw std::runtime_error("cannot copy " + from + " to " + to);
    out << in.rdbuf();
    if (!out) throw std::runtime_error("cannot write " + to);
}

}  // namespace bench
}  // namespace kest
