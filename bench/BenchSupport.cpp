#include "BenchSupport.h"

#include <expat.h>

#include <fcntl.h>
#include <unistd.h>

#include <sys/stat.h>
#include <time.h>
#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <fstream>
#include <stdexcept>

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
    // The file is read as the DOM reads it: read() in 256 KiB pieces into one reused buffer,
    // each piece handed to expat at once, and an empty last piece to end the document.
    const int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0) {
        result.error = "cannot open " + path;
        return result;
    }
    XML_Parser parser = XML_ParserCreate(nullptr);
    if (!parser) {
        ::close(fd);
        result.error = "XML_ParserCreate failed";
        return result;
    }
    XML_SetUserData(parser, &result);
    XML_SetElementHandler(parser, OnStart, OnEnd);
    XML_SetCharacterDataHandler(parser, OnCharacters);
    std::string buffer(256 * 1024, '\0');
    bool ok = true;
    for (;;) {
        const ssize_t n = ::read(fd, &buffer[0], buffer.size());
        if (n < 0 && errno == EINTR) continue;
        if (n < 0) {
            ok = false;
            result.error = "cannot read " + path;
            break;
        }
        const bool last = n == 0;
        if (XML_Parse(parser, buffer.data(), static_cast<int>(n), last) != XML_STATUS_OK) {
            ok = false;
            result.error = XML_ErrorString(XML_GetErrorCode(parser));
            break;
        }
        if (last) break;
    }
    XML_ParserFree(parser);
    ::close(fd);
    result.ok = ok;
    return result;
}

double ProcessCpuSeconds() {
    timespec ts{};
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
