// Benchmarks of the DOM and the converter, each against a bare expat pass over the same bytes.
//
// Every iteration first times the expat pass, then the operation, so that both see the same
// load of the machine; the ratios are sums of operation times over sums of expat times.
//
// Environment:
//   KEST_BENCH_ITEMS  calibration items of the generated files (default 60000)
//   KEST_BENCH_ITERS  iterations of each benchmark (default 3)
//   KEST_BENCH_DIR    directory for the generated files (default: a new temporary directory,
//                     removed at the end)
//   KEST_BENCH_SCHEMA the schema copied beside the validated file (default: the source tree's)

#include <benchmark/benchmark.h>

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <map>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "BenchSupport.h"
#include "CdfGen.h"
#include "core/KestCalmorph.h"
#include "model/KestCdfCalList.h"
#include "platform/KestCalmorphDLLError.h"
#include "platform/XmlDom.h"

#ifndef KEST_BENCH_SCHEMA
#define KEST_BENCH_SCHEMA ""
#endif

using namespace kest;
using namespace kest::bench;

namespace {

struct Setup {
    std::string dir;
    bool ownDir = false;
    std::string plainFile;   // names no schema
    std::string schemaFile;  // names cdf.xsd, which lies beside it
    std::string domOut;
    std::string writeOut;
    std::uint64_t plainBytes = 0;
    std::uint64_t schemaBytes = 0;
    long items = 0;
    int iterations = 3;
};
Setup g;

// The last figures of each benchmark, for the summary after the run.
struct Figure {
    std::string what;
    std::string against;
    double ratio = 0;
    double target = 0;
    double ratioCpu = 0;
    double opMs = 0;
    double baseMs = 0;
    double opCpuMs = 0;
    double baseCpuMs = 0;
};
std::map<std::string, Figure> g_figures;
std::vector<std::string> g_order;

void Record(const std::string& key, Figure f) {
    if (!g_figures.count(key)) g_order.push_back(key);
    g_figures[key] = std::move(f);
}

long EnvLong(const char* name, long fallback) {
    const char* v = std::getenv(name);
    if (!v || !*v) return fallback;
    char* end = nullptr;
    const long n = std::strtol(v, &end, 10);
    return (end && *end == '\0' && n > 0) ? n : fallback;
}

std::string Describe(const std::exception_ptr& e) {
    try {
        std::rethrow_exception(e);
    } catch (const KestCalmorphDLLError& error) {
        return "KestCalmorphDLLError " + std::to_string(error.GetReason()) + " " +
               error.GetReasonString().ToString();
    } catch (const std::exception& error) {
        return error.what();
    } catch (long hr) {
        return "HRESULT " + std::to_string(hr);
    } catch (...) {
        return "unknown exception";
    }
}

Lap TimedExpat(const std::string& path) {
    const Stopwatch watch;
    const ExpatPassResult r = ExpatPass(path);
    const Lap lap = watch.Stop();
    if (!r.ok) throw std::runtime_error("expat: " + path + ": " + r.error);
    benchmark::DoNotOptimize(r.elements);
    return lap;
}

long CountItems(const KestCdfCalData& data) {
    long items = 0;
    KestCdfCalList* lists = data.GetCalLists();
    for (int i = 0; lists && i < data.GetCalListSize(); ++i) items += lists[i].GetCalItemSize();
    return items;
}

// Times of one benchmark per iteration: the expat pass, the operation and, where a benchmark
// has one, a second reference (the DOM load before a save).
struct Samples {
    std::vector<Lap> base;
    std::vector<Lap> op;
    std::vector<Lap> ref;
    static double Wall(const std::vector<Lap>& v) {
        double s = 0;
        for (const Lap& l : v) s += l.wall;
        return s;
    }
    static double Cpu(const std::vector<Lap>& v) {
        double s = 0;
        for (const Lap& l : v) s += l.cpu;
        return s;
    }
    static double MinWall(const std::vector<Lap>& v) {
        double m = v.empty() ? 0 : v[0].wall;
        for (const Lap& l : v) m = std::min(m, l.wall);
        return m;
    }
};

Figure MakeFigure(const std::string& what, const std::string& against, double target,
                  const std::vector<Lap>& op, const std::vector<Lap>& base) {
    Figure f;
    f.what = what;
    f.against = against;
    f.target = target;
    const double n = static_cast<double>(op.size());
    f.opMs = 1e3 * Samples::Wall(op) / n;
    f.baseMs = 1e3 * Samples::Wall(base) / n;
    f.opCpuMs = 1e3 * Samples::Cpu(op) / n;
    f.baseCpuMs = 1e3 * Samples::Cpu(base) / n;
    f.ratio = Samples::Wall(op) / Samples::Wall(base);
    f.ratioCpu = Samples::Cpu(op) / Samples::Cpu(base);
    return f;
}

// Runs `op` once per iteration after a timed expat pass over `baselineFile`, and reports the
// ratios against expat: of the summed wall times and of the summed CPU times.
void Measure(benchmark::State& state, const std::string& key, const std::string& what,
             const std::string& baselineFile, std::uint64_t bytes, double target,
             const std::function<Lap(Samples&)>& op, Samples* out = nullptr) {
    Samples s;
    for (auto _ : state) {
        try {
            s.base.push_back(TimedExpat(baselineFile));
            const Lap lap = op(s);
            s.op.push_back(lap);
            state.SetIterationTime(lap.wall);
        } catch (...) {
            state.SkipWithError(Describe(std::current_exception()).c_str());
            break;
        }
    }
    if (s.op.empty() || s.op.size() != s.base.size()) return;
    const Figure f = MakeFigure(what, "expat", target, s.op, s.base);
    state.counters["expat_ms"] = f.baseMs;
    state.counters["cpu_ms"] = f.opCpuMs;
    state.counters["ratio_vs_expat"] = f.ratio;
    state.counters["ratio_cpu"] = f.ratioCpu;
    state.counters["ratio_min"] = Samples::MinWall(s.op) / Samples::MinWall(s.base);
    state.SetBytesProcessed(static_cast<int64_t>(bytes) * static_cast<int64_t>(s.op.size()));
    Record(key, f);
    if (out) *out = s;
}

void BM_ExpatBaseline(benchmark::State& state) {
    for (auto _ : state) state.SetIterationTime(TimedExpat(g.plainFile).wall);
    state.SetBytesProcessed(static_cast<int64_t>(g.plainBytes) *
                            static_cast<int64_t>(state.iterations()));
}

// Creates a document with validate-on-parse off and loads the file.
Lap LoadDocument(const std::string& path, IXMLDOMDocument2Ptr& doc) {
    doc = nullptr;
    const Stopwatch watch;
    if (FAILED(doc.CreateInstance(kProgIdDOMDocument40)))
        throw std::runtime_error("cannot create a DOM document");
    doc->Putasync(VARIANT_FALSE);
    doc->PutvalidateOnParse(VARIANT_FALSE);
    const VARIANT_BOOL ok = doc->load(_variant_t(path));
    const Lap lap = watch.Stop();
    if (ok != VARIANT_TRUE)
        throw std::runtime_error("load failed: " + doc->GetparseError()->Getreason().ToString());
    return lap;
}

void BM_DomLoad(benchmark::State& state) {
    Measure(state, "dom_load", "DOM load (validate-on-parse off)", g.plainFile, g.plainBytes, 2.0,
            [](Samples&) {
                IXMLDOMDocument2Ptr doc;
                const Lap lap = LoadDocument(g.plainFile, doc);
                doc = nullptr;  // freeing the tree is not part of the load
                return lap;
            });
}

void BM_DomSave(benchmark::State& state) {
    Samples s;
    Measure(
        state, "dom_save", "DOM save of the loaded document", g.plainFile, g.plainBytes, 0,
        [](Samples& samples) {
            IXMLDOMDocument2Ptr doc;
            samples.ref.push_back(LoadDocument(g.plainFile, doc));
            const Stopwatch watch;
            doc->save(_variant_t(g.domOut));
            const Lap lap = watch.Stop();
            doc = nullptr;
            return lap;
        },
        &s);
    if (s.op.empty() || s.ref.size() != s.op.size()) return;
    const Figure f =
        MakeFigure("DOM save vs DOM load (same document)", "DOM load", 1.0, s.op, s.ref);
    state.counters["ratio_vs_load"] = f.ratio;
    state.counters["ratio_vs_load_cpu"] = f.ratioCpu;
    state.counters["out_bytes"] = static_cast<double>(FileSize(g.domOut));
    Record("dom_save_vs_load", f);
}

Lap TimedRead(const std::string& path, KestCdfCalData* keep) {
    KestCalmorph converter;
    CComBSTR message;
    const Stopwatch watch;
    KestCdfCalData data = converter.ConvertXMLtoCPP(CComBSTR(path), true, message);
    const Lap lap = watch.Stop();
    if (message.Length() != 0) throw std::runtime_error("read " + path + ": " + message.ToString());
    if (CountItems(data) != g.items)
        throw std::runtime_error("read " + path + ": " + std::to_string(CountItems(data)) +
                                 " items instead of " + std::to_string(g.items));
    if (keep) *keep = data;
    return lap;  // the converter and the copy are freed outside the timed part
}

void BM_ReadNoSchema(benchmark::State& state) {
    Measure(state, "read_plain", "ConvertXMLtoCPP, file names no schema", g.plainFile, g.plainBytes,
            2.5, [](Samples&) { return TimedRead(g.plainFile, nullptr); });
}

void BM_ReadValidated(benchmark::State& state) {
    Measure(state, "read_validated", "ConvertXMLtoCPP, file names cdf.xsd (validated)",
            g.schemaFile, g.schemaBytes, 3.5,
            [](Samples&) { return TimedRead(g.schemaFile, nullptr); });
}

// The tree a validated read returns, read once; null (and the benchmark skipped) on failure.
const KestCdfCalData* ReadTree(benchmark::State& state) {
    static KestCdfCalData tree;
    static bool haveTree = false;
    if (!haveTree) {
        try {
            TimedRead(g.schemaFile, &tree);
            haveTree = true;
        } catch (...) {
            state.SkipWithError(Describe(std::current_exception()).c_str());
            for (auto _ : state) {
            }
            return nullptr;
        }
    }
    return &tree;
}

void BM_Write(benchmark::State& state) {
    static const KestCdfCalData* tree = nullptr;
    if (!(tree = ReadTree(state))) return;
    Measure(state, "write", "ConvertCPPToXML of the read tree", g.schemaFile, g.schemaBytes, 2.0,
            [](Samples&) {
                KestCalmorph converter;
                const Stopwatch watch;
                const bool ok =
                    converter.ConvertCPPToXML(*tree, CComBSTR(g.writeOut), CComBSTR(u""));
                const Lap lap = watch.Stop();
                if (!ok) throw std::runtime_error("ConvertCPPToXML returned false");
                return lap;
            });
    state.counters["out_bytes"] = static_cast<double>(FileSize(g.writeOut));
}

// The write as a document built from the tree and saved, which hosts holding a DOM still use.
void BM_WriteDom(benchmark::State& state) {
    static const KestCdfCalData* tree = nullptr;
    if (!(tree = ReadTree(state))) return;
    Measure(state, "write_dom", "document built from the tree, saved", g.schemaFile, g.schemaBytes,
            0, [](Samples&) {
                KestCdfCalData copy = *tree;
                const Stopwatch watch;
                IXMLDOMDocument2Ptr doc;
                if (FAILED(doc.CreateInstance(kProgIdDOMDocument40)))
                    throw std::runtime_error("no document");
                doc->appendChild(
                    doc->createNode(_variant_t(static_cast<int>(NODE_PROCESSING_INSTRUCTION)),
                                    _bstr_t(u"xml"), _bstr_t(u"")));
                copy.ConvertCalDataNodeToXML(doc.GetInterfacePtr(), CComBSTR(u""));
                doc->save(_variant_t(CComBSTR(g.writeOut).m_str));
                doc = nullptr;
                return watch.Stop();
            });
}

// Freeing a tree a read returned (the read itself is not timed).
void BM_FreeTree(benchmark::State& state) {
    Measure(state, "free", "freeing the tree of a read", g.plainFile, g.plainBytes, 0,
            [](Samples&) {
                auto tree = std::make_unique<KestCdfCalData>();
                TimedRead(g.plainFile, tree.get());
                const Stopwatch watch;
                tree.reset();
                return watch.Stop();
            });
}

void PrepareFiles() {
    g.items = EnvLong("KEST_BENCH_ITEMS", 60000);
    g.iterations = static_cast<int>(EnvLong("KEST_BENCH_ITERS", 3));
    const char* dir = std::getenv("KEST_BENCH_DIR");
    if (dir && *dir) {
        g.dir = dir;
        mkdir(g.dir.c_str(), 0755);
    } else {
        const char* tmp = std::getenv("TMPDIR");
        std::string pattern = std::string(tmp && *tmp ? tmp : "/tmp") + "/kest-bench-XXXXXX";
        std::vector<char> buffer(pattern.begin(), pattern.end());
        buffer.push_back('\0');
        if (!mkdtemp(buffer.data())) throw std::runtime_error("cannot create " + pattern);
        g.dir = buffer.data();
        g.ownDir = true;
    }
    g.plainFile = g.dir + "/plain.cdf";
    g.schemaFile = g.dir + "/validated.cdf";
    g.domOut = g.dir + "/dom-saved.cdf";
    g.writeOut = g.dir + "/written.cdf";

    CdfGenOptions options;
    options.items = g.items;
    options.seed = 1;
    options.schema = false;
    const CdfGenResult plain = GenerateCdf(options, g.plainFile);
    options.schema = true;
    const CdfGenResult validated = GenerateCdf(options, g.schemaFile);
    g.plainBytes = plain.bytes;
    g.schemaBytes = validated.bytes;

    const char* schemaEnv = std::getenv("KEST_BENCH_SCHEMA");
    const std::string schema = schemaEnv && *schemaEnv ? schemaEnv : KEST_BENCH_SCHEMA;
    CopyFile(schema, g.dir + "/cdf.xsd");

    std::printf(
        "Generated %ld items (%ld values, %ld curves, %ld maps) in %d lists:\n"
        "  %s  %llu bytes (names no schema)\n  %s  %llu bytes (names cdf.xsd)\n",
        plain.items, plain.values, plain.curves, plain.maps, plain.lists, g.plainFile.c_str(),
        static_cast<unsigned long long>(g.plainBytes), g.schemaFile.c_str(),
        static_cast<unsigned long long>(g.schemaBytes));
    std::fflush(stdout);
}

void RemoveFiles() {
    if (!g.ownDir) return;
    for (const std::string& f :
         {g.plainFile, g.schemaFile, g.domOut, g.writeOut, g.dir + "/cdf.xsd"})
        std::remove(f.c_str());
    rmdir(g.dir.c_str());
}

void PrintSummary() {
    std::printf(
        "\nSummary: %ld items, %.1f MB file, %d iterations; mean wall times, ratios of "
        "summed times\n",
        g.items, static_cast<double>(g.plainBytes) / 1e6, g.iterations);
    std::printf("%-48s %9s %9s %7s %7s %8s  %s\n", "measurement", "wall ms", "ref ms", "ratio",
                "cpu", "target", "reference");
    for (const std::string& key : g_order) {
        const Figure& f = g_figures[key];
        char target[32] = "-";
        const char* verdict = "";
        if (f.target > 0) {
            std::snprintf(target, sizeof target, "<= %.1f", f.target);
            verdict = f.ratioCpu <= f.target ? "met " : "MISSED ";
        }
        std::printf("%-48s %9.1f %9.1f %7.2f %7.2f %8s  %s%s\n", f.what.c_str(), f.opMs, f.baseMs,
                    f.ratio, f.ratioCpu, target, verdict, f.against.c_str());
    }
    std::printf("(ratio: wall time; cpu: process CPU time, the one judged against the target)\n");
    std::fflush(stdout);
}

}  // namespace

int main(int argc, char** argv) {
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
    try {
        PrepareFiles();
    } catch (const std::exception& e) {
        std::fprintf(stderr, "calmorph_bench: %s\n", e.what());
        return 1;
    }
    auto add = [](const char* name, void (*fn)(benchmark::State&)) {
        benchmark::RegisterBenchmark(name, fn)
            ->Iterations(g.iterations)
            ->UseManualTime()
            ->Unit(benchmark::kMillisecond);
    };
    add("ExpatBaseline", BM_ExpatBaseline);
    add("DomLoad", BM_DomLoad);
    add("DomSave", BM_DomSave);
    add("ReadNoSchema", BM_ReadNoSchema);
    add("ReadValidated", BM_ReadValidated);
    add("Write", BM_Write);
    add("WriteDom", BM_WriteDom);
    add("FreeTree", BM_FreeTree);
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
    PrintSummary();
    RemoveFiles();
    return 0;
}
