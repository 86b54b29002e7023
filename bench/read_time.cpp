// read_time FILE [ITERATIONS]: the fastest of ITERATIONS reads of FILE by KestCalmorph, with the
// read options kestcalmorph.read uses by default, in milliseconds on standard output.

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <string>

#include "core/KestCalmorph.h"

int main(int argc, char** argv) {
    if (argc < 2) {
        std::fprintf(stderr, "usage: read_time FILE [ITERATIONS]\n");
        return 2;
    }
    const int iterations = argc > 2 ? std::atoi(argv[2]) : 3;
    double best = 1e300;
    for (int i = 0; i < iterations; ++i) {
        kest::KestCalmorph converter;
        kest::KestReadOptions options;
        options.allowNetwork = false;
        options.builtinSchemaFallback = true;
        converter.SetReadOptions(options);
        kest::CComBSTR message;
        const auto start = std::chrono::steady_clock::now();
        kest::KestCdfCalData data =
            converter.ConvertXMLtoCPP(kest::CComBSTR(argv[1]), true, message);
        const std::chrono::duration<double, std::milli> took =
            std::chrono::steady_clock::now() - start;
        if (converter.GetLastLoadError().code != 0 || message.Length() != 0) {
            std::fprintf(stderr, "read_time: %s does not load\n", argv[1]);
            return 1;
        }
        if (took.count() < best) best = took.count();
    }
    std::printf("%.1f\n", best);
    return 0;
}
