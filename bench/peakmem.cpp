// peakmem: peak memory of one operation on one file, as a multiple of the file's size.
//
//   peakmem dom-load FILE        DOM load with validate-on-parse off
//   peakmem read FILE            ConvertXMLtoCPP (validated when the file names a schema)
//   peakmem write FILE OUT       ConvertCPPToXML of the tree read from FILE (the read is done
//                                first and is not counted: its peak is reset before the write)
//
// The peak is getrusage(RUSAGE_SELF).ru_maxrss after the operation minus the resident size
// just before it, taken after freed heap memory has been handed back (malloc_trim). Run one
// mode per process: the peak of a process only grows, except where the kernel lets it be
// reset (/proc/self/clear_refs), which the write mode needs.
//
// Output, one line: mode=... file_bytes=... baseline_kb=... peak_kb=... extra_kb=...
//                   ratio=...  (ratio = extra / file size)

#include <malloc.h>
#include <sys/resource.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <string>

#include "BenchSupport.h"
#include "core/KestCalmorph.h"
#include "platform/KestCalmorphDLLError.h"
#include "platform/XmlDom.h"

using namespace kest;

namespace {

long ResidentKb() {
    std::FILE* f = std::fopen("/proc/self/statm", "r");
    if (!f) return 0;
    long size = 0, resident = 0;
    const int n = std::fscanf(f, "%ld %ld", &size, &resident);
    std::fclose(f);
    if (n != 2) return 0;
    return resident * (sysconf(_SC_PAGESIZE) / 1024);
}

long MaxRssKb() {
    rusage usage{};
    getrusage(RUSAGE_SELF, &usage);
    return usage.ru_maxrss;  // kilobytes on Linux
}

// Hands freed heap memory back to the system, so that the resident size before an operation
// holds only what is in use; otherwise an operation could reuse pages that an earlier step
// freed and its growth would not show.
void ReleaseFreeMemory() { malloc_trim(0); }

// Resets the peak to the present resident size; false where the kernel does not allow it.
bool ResetPeak() {
    std::ofstream f("/proc/self/clear_refs");
    if (!f) return false;
    f << "5";
    f.flush();
    return static_cast<bool>(f);
}

int Usage() {
    std::fprintf(stderr, "usage: peakmem dom-load FILE | read FILE | write FILE OUT\n");
    return 2;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc < 3) return Usage();
    const std::string mode = argv[1];
    const std::string file = argv[2];
    if (mode == "write" && argc < 4) return Usage();
    const std::uint64_t bytes = bench::FileSize(file);
    if (bytes == 0) {
        std::fprintf(stderr, "peakmem: cannot read %s\n", file.c_str());
        return 1;
    }

    try {
        // Touch the DOM once on a tiny document so that lazily initialised parts of the
        // libraries are resident before the baseline.
        {
            IXMLDOMDocument2Ptr warm;
            if (SUCCEEDED(warm.CreateInstance(kProgIdDOMDocument40)))
                warm->loadXML(_bstr_t("<a/>"));
        }
        long baseline = 0;
        long peak = 0;
        bool resetOk = true;
        if (mode == "dom-load") {
            IXMLDOMDocument2Ptr doc;
            ReleaseFreeMemory();
            baseline = ResidentKb();
            if (FAILED(doc.CreateInstance(kProgIdDOMDocument40)))
                throw std::runtime_error("no DOM");
            doc->Putasync(VARIANT_FALSE);
            doc->PutvalidateOnParse(VARIANT_FALSE);
            if (doc->load(_variant_t(file)) != VARIANT_TRUE)
                throw std::runtime_error("load: " + doc->GetparseError()->Getreason().ToString());
            peak = MaxRssKb();
        } else if (mode == "read") {
            KestCalmorph converter;
            CComBSTR message;
            ReleaseFreeMemory();
            baseline = ResidentKb();
            KestCdfCalData data = converter.ConvertXMLtoCPP(CComBSTR(file), true, message);
            peak = MaxRssKb();
            if (message.Length()) throw std::runtime_error("read: " + message.ToString());
            if (data.GetCalListSize() <= 0) throw std::runtime_error("read: no calibration list");
        } else if (mode == "write") {
            KestCalmorph reader;
            CComBSTR message;
            KestCdfCalData data = reader.ConvertXMLtoCPP(CComBSTR(file), true, message);
            if (message.Length()) throw std::runtime_error("read: " + message.ToString());
            KestCalmorph writer;
            ReleaseFreeMemory();
            resetOk = ResetPeak();
            baseline = ResidentKb();
            if (!writer.ConvertCPPToXML(data, CComBSTR(std::string(argv[3])), CComBSTR(u"")))
                throw std::runtime_error("write returned false");
            peak = MaxRssKb();
        } else {
            return Usage();
        }
        const long extra = peak - baseline;
        std::printf(
            "mode=%s file_bytes=%llu baseline_kb=%ld peak_kb=%ld extra_kb=%ld ratio=%.2f%s\n",
            mode.c_str(), static_cast<unsigned long long>(bytes), baseline, peak, extra,
            static_cast<double>(extra) * 1024.0 / static_cast<double>(bytes),
            resetOk ? "" : " (peak could not be reset: includes the read)");
    } catch (const KestCalmorphDLLError& e) {
        std::fprintf(stderr, "peakmem: KestCalmorphDLLError %d %s\n", e.GetReason(),
                     e.GetReasonString().ToString().c_str());
        return 1;
    } catch (const std::exception& e) {
        std::fprintf(stderr, "peakmem: %s\n", e.what());
        return 1;
    } catch (...) {
        std::fprintf(stderr, "peakmem: unknown exception\n");
        return 1;
    }
    return 0;
}
