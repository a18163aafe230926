#pragma once

// vrender's progress bar and summary line.
//
// ProgressDisplay redraws one line on standard error ("\r" and the bar) when
// standard error is a terminal, at most ten times a second, and clears it at
// the end; otherwise it prints nothing. It is used by the render loop's
// thread only. The formatting functions are pure, for the tests.

#include <chrono>
#include <cstdint>
#include <cstdio>
#include <string>

namespace vrender
{

// "[##########----------]  50/100   41.5 fps  ETA 1.2 s" (inBarWidth
// characters between the brackets; the fps and ETA appear once a frame is
// done and time has passed).
std::string FormatProgressLine(std::int64_t inDone, std::int64_t inTotal, double inSeconds,
                               int inBarWidth);

// "Rendered 50 frames in 1.25 s (40.0 fps) to out/demo/frame_%05d.png".
std::string FormatSummary(std::int64_t inFrames, double inSeconds, const std::string& inWhere);

// "cancelled after 1 frame", "cancelled after 2 frames".
std::string FormatCancelled(std::int64_t inFrames);

class ProgressDisplay
{
public:
    // inEnabled false prints nothing (not a terminal, or --quiet).
    ProgressDisplay(std::FILE* inStream, bool inEnabled, std::int64_t inTotal);

    void Update(std::int64_t inDone);
    // Erases the bar so the summary starts on a clean line.
    void Clear();
    double GetElapsedSeconds() const;

private:
    std::FILE* mStream;
    const bool mEnabled;
    const std::int64_t mTotal;
    const std::chrono::steady_clock::time_point mStart;
    std::chrono::steady_clock::time_point mLastDraw;
    bool mDrawn = false;
};

} // namespace vrender
