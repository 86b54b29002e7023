// One value list of many megabytes (50 MB by default; KEST_BENCH_BIG_MB sets another size): time
// to read it validated, to validate it alone and to write it, peak memory, and bytes per value.
// libxml2's time on one huge text node grows faster than linearly, so sizes are worth comparing.

#include <sys/resource.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <string>

#include "core/KestCalmorph.h"

using namespace kest;

namespace {

double Seconds(const std::chrono::steady_clock::time_point& start) {
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

long PeakKb() {
    rusage usage{};
    getrusage(RUSAGE_SELF, &usage);
    return usage.ru_maxrss;
}

}  // namespace

int main() {
    const char* env = std::getenv("KEST_BENCH_BIG_MB");
    const std::size_t bytes = static_cast<std::size_t>(env ? std::atol(env) : 50) * 1000000;
    const std::string dir = std::getenv("TMPDIR") ? std::getenv("TMPDIR") : "/tmp";
    const std::string in = dir + "/kest-bigtext.cdf", out = dir + "/kest-bigtext-out.cdf";
    const std::string schema = KEST_BENCH_SCHEMA;
    std::string values;
    long count = 0;
    for (; values.size() < bytes; ++count)
        values += (count ? " " : "") + std::to_string(count % 100000) + ".5";
    std::ofstream(in, std::ios::binary)
        << "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<CAL-DATA "
           "xmlns=\"http://kest.dev/schemas/cdf/1.0\" "
           "xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\" "
           "xsi:schemaLocation=\"http://kest.dev/schemas/cdf/1.0 "
        << schema
        << "\"><CHANGE-HISTORY/><FILENAME/><COMPANY-INFO/><NOTE/><CAL-LIST><NAME>L</"
           "NAME><SYMBOLIC-FILE "
           "crc32=\"0x00000000\">s</SYMBOLIC-FILE><CAL-ITEM><NAME>BIG</NAME><VALUE "
           "sw-units-ref=\"\" "
           "format-type=\"NUMERIC\">"
        << values << "</VALUE></CAL-ITEM></CAL-LIST></CAL-DATA>\n";
    values = std::string();
    std::printf("value list: %zu bytes, %ld values, %.2f bytes per value\n", bytes, count,
                static_cast<double>(bytes) / static_cast<double>(count));

    KestCalmorph converter;
    CComBSTR message;
    auto start = std::chrono::steady_clock::now();
    KestCdfCalData data = converter.ConvertXMLtoCPP(CComBSTR(in), true, message);
    std::printf("read, validated:   %7.2f s  %s\n", Seconds(start), message.ToString().c_str());
    start = std::chrono::steady_clock::now();
    CComBSTR verdict = converter.ValidateXMLFileWithLocaleXSD(CComBSTR(in), CComBSTR(schema));
    std::printf("validate alone:    %7.2f s  %s\n", Seconds(start), verdict.ToString().c_str());
    start = std::chrono::steady_clock::now();
    converter.ConvertCPPToXML(data, CComBSTR(out), CComBSTR(u""));
    std::printf("write:             %7.2f s\n", Seconds(start));
    std::printf("peak memory:       %7.1f MB\n", static_cast<double>(PeakKb()) / 1024.0);
    std::remove(in.c_str());
    std::remove(out.c_str());
    return message.Length() == 0 && verdict.Length() == 0 ? 0 : 1;
}
