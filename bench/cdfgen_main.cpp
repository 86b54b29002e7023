// cdfgen: writes a realistic CDF file for measurements and tests.
//
//   cdfgen [--items N] [--lists L] [--seed S] [--schema | --no-schema] [--no-indent] OUT

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <string>

#include "CdfGen.h"

namespace {

void Usage() {
    std::fprintf(stderr,
                 "usage: cdfgen [--items N] [--lists L] [--seed S] [--schema | --no-schema]\n"
                 "              [--no-indent] OUT\n"
                 "  --items N     calibration items (default 60000)\n"
                 "  --lists L     calibration lists (default: one per 5000 items)\n"
                 "  --seed S      random seed (default 1)\n"
                 "  --schema      the root names cdf.xsd (default)\n"
                 "  --no-schema   the root names no schema\n"
                 "  --no-indent   no line breaks or indentation between elements\n");
}

bool ParseNumber(const char* text, long long& value) {
    char* end = nullptr;
    errno = 0;
    value = std::strtoll(text, &end, 10);
    return errno == 0 && end != text && *end == '\0' && value >= 0;
}

}  // namespace

int main(int argc, char** argv) {
    kest::bench::CdfGenOptions options;
    std::string out;
    for (int i = 1; i < argc; ++i) {
        const std::string arg = argv[i];
        long long n = 0;
        auto next = [&](const char* what) -> const char* {
            if (i + 1 >= argc) {
                std::fprintf(stderr, "cdfgen: %s needs a value\n", what);
                std::exit(2);
            }
            return argv[++i];
        };
        if (arg == "--items" || arg == "--lists" || arg == "--seed") {
            const char* v = next(arg.c_str());
            if (!ParseNumber(v, n)) {
                std::fprintf(stderr, "cdfgen: bad number for %s: %s\n", arg.c_str(), v);
                return 2;
            }
            if (arg == "--items")
                options.items = static_cast<long>(n);
            else if (arg == "--lists")
                options.lists = static_cast<int>(n);
            else
                options.seed = static_cast<std::uint64_t>(n);
        } else if (arg == "--schema") {
            options.schema = true;
        } else if (arg == "--no-schema") {
            options.schema = false;
        } else if (arg == "--no-indent") {
            options.indent = false;
        } else if (arg == "-h" || arg == "--help") {
            Usage();
            return 0;
        } else if (!arg.empty() && arg[0] == '-') {
            std::fprintf(stderr, "cdfgen: unknown option %s\n", arg.c_str());
            Usage();
            return 2;
        } else if (out.empty()) {
            out = arg;
        } else {
            std::fprintf(stderr, "cdfgen: more than one output path\n");
            return 2;
        }
    }
    if (out.empty()) {
        Usage();
        return 2;
    }
    try {
        const kest::bench::CdfGenResult r = kest::bench::GenerateCdf(options, out);
        std::printf("%s: %llu bytes, %ld items (%ld values, %ld curves, %ld maps) in %d lists\n",
                    out.c_str(), static_cast<unsigned long long>(r.bytes), r.items, r.values,
                    r.curves, r.maps, r.lists);
    } catch (const std::exception& e) {
        std::fprintf(stderr, "cdfgen: %s\n", e.what());
        return 1;
    }
    return 0;
}
