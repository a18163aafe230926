// Loading timeline files: a generated two-hour edit with four tracks of
// items (2,000 items at full size) of patterns, solids and nested
// sequences, some with keyframes, effects and clip settings. Reported per
// load: the time, and the heap bytes the loaded sequences hold per item,
// which stays flat as the item count grows when memory is proportional to
// the items. The target is
// a 2,000-item load in under 50 ms.

#include "BE/TimelineFile.h"
#include "GeneratedTimeline.h"

#include <cstdio>
#include <malloc.h>
#include <string>

#include <benchmark/benchmark.h>

namespace
{

// Heap bytes in use now.
std::size_t HeapInUse()
{
    return mallinfo2().uordblks;
}

void LoadTimeline(benchmark::State& ioState)
{
    const int items = static_cast<int>(ioState.range(0));
    const std::string text = vrbench::GenerateTimeline(items);
    std::size_t bytes = 0;
    for (auto _ : ioState)
    {
        const std::size_t before = HeapInUse();
        BE::TimelineLoadResult loaded = BE::ParseTimeline(text, "generated.json", "/");
        bytes = HeapInUse() - before;
        if (!loaded.Succeeded())
        {
            ioState.SkipWithError(loaded.mError.c_str());
            break;
        }
        benchmark::DoNotOptimize(loaded.mMain);
    }
    ioState.counters["items"] = items;
    ioState.counters["bytes_per_item"] = static_cast<double>(bytes) / items;
    ioState.counters["text_bytes"] = static_cast<double>(text.size());
}

BENCHMARK(LoadTimeline)->Arg(500)->Arg(1000)->Arg(2000)->Unit(benchmark::kMillisecond);

} // namespace
