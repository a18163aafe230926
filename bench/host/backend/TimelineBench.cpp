// Loading timeline files: a generated two-hour edit with four tracks of
// items (2,000 items at full size) of patterns, solids and nested
// sequences, some with keyframes, effects and clip settings. Reported per
// load: the time, and the heap bytes the loaded sequences hold per item,
// which stays flat as the item count grows when memory is proportional to
// the items. The target is
// a 2,000-item load in under 50 ms.

#include "BE/TimelineFile.h"

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

constexpr double kLengthSeconds = 2 * 60 * 60;
constexpr int kTracks = 4;

// inItems items spread evenly over two hours on four tracks, each followed by
// a gap of a fifth of its length.
std::string GenerateTimeline(int inItems)
{
    const int perTrack = inItems / kTracks;
    const double slot = kLengthSeconds / perTrack;
    std::string text = R"({"version": 1, "main": "Edit", "sequences": [
  {"name": "Insert", "rate": 25, "size": [1920, 1080], "tracks": [{"items": [
    {"end": 20, "media": {"pattern": "pattern:moving"}}]}]},
  {"name": "Edit", "rate": 25, "size": [1920, 1080], "tracks": [)";
    char item[1024];
    for (int t = 0; t < kTracks; ++t)
    {
        text += t == 0 ? "\n    {\"items\": [" : ",\n    {\"items\": [";
        for (int i = 0; i < perTrack; ++i)
        {
            const int kind = (i + t) % 4;
            const char* media[] = {
                R"({"pattern": "pattern:moving?rate=25"})",
                R"({"pattern": "pattern:bars"})",
                R"({"color": "#FF204060"})",
                R"({"sequence": "Insert"})",
            };
            const char* extra[] = {
                R"(, "clip": {"speed": 1.5, "in": 3})",
                R"(, "opacity": [{"time": 0, "value": 0}, {"time": 1, "value": 100, "interp": "bezier", "inSlope": 10}])",
                R"(, "motion": {"scale": 50, "position": [{"time": 0, "value": [0, 0]}, {"time": 4, "value": [200, 100]}]})",
                R"(, "effects": [{"match": "vr.Tint", "params": {"amount": "40"}}])",
            };
            std::snprintf(item, sizeof(item), "%s\n      {\"duration\": %.3f, \"media\": %s%s}%s",
                          i == 0 ? "" : ",", slot * 0.8, media[kind], extra[(i / 4) % 4],
                          ",\n      {\"gap\": \"5f\"}");
            text += item;
        }
        text.resize(text.size() - std::string(",\n      {\"gap\": \"5f\"}").size());
        text += "]}";
    }
    return text + "]}]}\n";
}

void LoadTimeline(benchmark::State& ioState)
{
    const int items = static_cast<int>(ioState.range(0));
    const std::string text = GenerateTimeline(items);
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
