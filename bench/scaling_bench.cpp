// Scaling benchmarks of the platform layer: a SAFEARRAY grown one element at a time (linear,
// not quadratic) and a document nested a million levels deep (refused at the default depth
// limit, and loaded whole with the limit raised). Compare the reported complexity and times.

#include <benchmark/benchmark.h>

#include <string>

#include "platform/XmlDom.h"

using namespace kest;

namespace {

void BM_SafeArrayGrowOneAtATime(benchmark::State& state) {
    const ULONG count = static_cast<ULONG>(state.range(0));
    for (auto _ : state) {
        SAFEARRAY* array = SafeArrayCreateVector(VT_VARIANT, 0, 0);
        for (ULONG i = 0; i < count; ++i) {
            SAFEARRAYBOUND bound{i + 1, 0};
            SafeArrayRedim(array, &bound);
            LONG index = static_cast<LONG>(i);
            _variant_t value(1L);
            SafeArrayPutElement(array, &index, &value);
        }
        SafeArrayDestroy(array);
    }
    state.SetComplexityN(state.range(0));
}
BENCHMARK(BM_SafeArrayGrowOneAtATime)
    ->RangeMultiplier(2)
    ->Range(100000, 800000)
    ->Complexity()
    ->Unit(benchmark::kMillisecond);

std::string Nested(long depth) {
    std::string xml;
    for (long i = 0; i < depth; ++i) xml += "<a>";
    for (long i = 0; i < depth; ++i) xml += "</a>";
    return xml;
}

// arg 0: refused at the default limit of 10000 levels; arg 1: limit raised, loaded whole.
void BM_DeepNestingLoad(benchmark::State& state) {
    const std::string xml = Nested(1000000);
    for (auto _ : state) {
        IXMLDOMDocument2Ptr doc;
        doc.CreateInstance(kProgIdDOMDocument40);
        doc->PutvalidateOnParse(VARIANT_FALSE);
        if (state.range(0)) doc->setProperty(u"MaxElementDepth", _variant_t(2000000L));
        const bool loaded = doc->loadBuffer(xml.data(), xml.size()) == VARIANT_TRUE;
        if (loaded != (state.range(0) != 0)) state.SkipWithError("unexpected load outcome");
    }
}
BENCHMARK(BM_DeepNestingLoad)->Arg(0)->Arg(1)->Iterations(3)->Unit(benchmark::kMillisecond);

}  // namespace

BENCHMARK_MAIN();
