#pragma once

// A generated two-hour edit for the timeline and factory benchmarks: four
// tracks of items of patterns, solids and a nested sequence, some with
// keyframes, effects and clip settings, each followed by a short gap.

#include <cstdio>
#include <string>

namespace vrbench
{

inline constexpr double kLengthSeconds = 2 * 60 * 60;
inline constexpr int kTracks = 4;

// inItems items spread evenly over two hours on four tracks, each followed by
// a gap of a fifth of its length.
inline std::string GenerateTimeline(int inItems)
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

} // namespace vrbench
