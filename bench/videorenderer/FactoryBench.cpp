// The cutlist factory on a generated two-hour edit (bench/support): the time
// to sweep its four tracks into segments and build and seal every node tree,
// per item count. The target is a 2,000-item edit in under 50 ms.

#include "BE/TimelineFile.h"
#include "GeneratedTimeline.h"
#include "factory/CutlistFactory.h"

#include <benchmark/benchmark.h>

namespace
{

void BuildSequenceCutlist(benchmark::State& ioState)
{
    const int items = static_cast<int>(ioState.range(0));
    const BE::TimelineLoadResult loaded =
        BE::ParseTimeline(vrbench::GenerateTimeline(items), "generated.json", "/");
    if (!loaded.Succeeded())
    {
        ioState.SkipWithError(loaded.mError.c_str());
        return;
    }
    const auto factory = ML::CreateCutlistFactory();
    std::size_t segments = 0;
    for (auto _ : ioState)
    {
        QRT::InterfaceRef<MF::IRenderableCutlist> cutlist;
        factory->CreateSequenceCutlist(loaded.mMain, {}, cutlist);
        segments = cutlist->GetSegmentCount();
        benchmark::DoNotOptimize(cutlist);
    }
    ioState.counters["items"] = items;
    ioState.counters["segments"] = static_cast<double>(segments);
}

BENCHMARK(BuildSequenceCutlist)->Arg(500)->Arg(2000)->Unit(benchmark::kMillisecond);

} // namespace
