#include "BenchSupport.h"

#include <expat.h>

#include <algorithm>
#include <cstdio>
#include <fstream>
#include <stdexcept>
#include <sys/stat.h>

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
    std::FILE* file = std::fopen(path.c_str(), "rb");
    if (!file) {
        result.error = "cannot open " + path;
        return result;
    }
    std::string bytes;
    struct stat st {};
    if (fstat(fileno(file), &st) == 0 && st.st_size > 0) bytes.resize(static_cast<std::size_t>(st.st_size));
    const std::size_t got = bytes.empty() ? 0 : std::fread(&bytes[0], 1, bytes.size(), file);
    std::fclose(file);
    bytes.resize(got);

    XML_Parser parser = XML_ParserCreate(nullptr);
    if (!parser) {
        result.error = "XML_ParserCreate failed";
        return result;
    }
    XML_SetUserData(parser, &result);
    XML_SetElementHandler(parser, OnStart, OnEnd);
    XML_SetCharacterDataHandler(parser, OnCharacters);
    // Large inputs go through in slices, since XML_Parse takes an int length.
    const std::size_t kSlice = std::size_t(1) << 30;
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
    } while (offset < bytes.size());
    XML_ParserFree(parser);
    result.ok = ok;
    return result;
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
