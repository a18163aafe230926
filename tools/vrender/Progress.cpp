#include "Progress.h"

#include <algorithm>
#include <cinttypes>

namespace vrender
{

std::string FormatProgressLine(std::int64_t inDone, std::int64_t inTotal, double inSeconds,
                               int inBarWidth)
{
    const std::int64_t total = std::max<std::int64_t>(inTotal, 1);
    const std::int64_t done = std::clamp<std::int64_t>(inDone, 0, total);
    const int filled = static_cast<int>(done * inBarWidth / total);
    // Built by appending: GCC 12 at -O3 reports a false -Wrestrict overlap for a
    // literal concatenated with a temporary string.
    std::string line;
    line.reserve(static_cast<std::size_t>(inBarWidth) + 48);
    line.push_back('[');
    line.append(static_cast<std::size_t>(filled), '#');
    line.append(static_cast<std::size_t>(inBarWidth - filled), '-');
    line.push_back(']');
    char numbers[96];
    std::snprintf(numbers, sizeof(numbers), " %*" PRId64 "/%" PRId64,
                  static_cast<int>(std::to_string(inTotal).size()), inDone, inTotal);
    line += numbers;
    if (done > 0 && inSeconds > 0.0)
    {
        const double fps = static_cast<double>(done) / inSeconds;
        const double remaining = static_cast<double>(total - done) / fps;
        std::snprintf(numbers, sizeof(numbers), "  %6.1f fps  ETA %.1f s", fps, remaining);
        line += numbers;
    }
    return line;
}

std::string FormatSummary(std::int64_t inFrames, double inSeconds, const std::string& inWhere)
{
    const double fps = inSeconds > 0.0 ? static_cast<double>(inFrames) / inSeconds : 0.0;
    char text[128];
    std::snprintf(text, sizeof(text), "Rendered %" PRId64 " frame%s in %.2f s (%.1f fps)", inFrames,
                  inFrames == 1 ? "" : "s", inSeconds, fps);
    return std::string(text) + " to " + inWhere;
}

std::string FormatCancelled(std::int64_t inFrames)
{
    return "cancelled after " + std::to_string(inFrames) + (inFrames == 1 ? " frame" : " frames");
}

ProgressDisplay::ProgressDisplay(std::FILE* inStream, bool inEnabled, std::int64_t inTotal)
    : mStream(inStream)
    , mEnabled(inEnabled)
    , mTotal(inTotal)
    , mStart(std::chrono::steady_clock::now())
    , mLastDraw(mStart)
{
}

void ProgressDisplay::Update(std::int64_t inDone)
{
    if (!mEnabled)
        return;
    const auto now = std::chrono::steady_clock::now();
    // Redrawing costs a terminal write; ten times a second reads as smooth.
    if (mDrawn && inDone < mTotal && now - mLastDraw < std::chrono::milliseconds(100))
        return;
    mLastDraw = now;
    mDrawn = true;
    const std::string line = FormatProgressLine(inDone, mTotal, GetElapsedSeconds(), 30);
    std::fprintf(mStream, "\r%s\x1b[K", line.c_str());
    std::fflush(mStream);
}

void ProgressDisplay::Clear()
{
    if (!mEnabled || !mDrawn)
        return;
    std::fprintf(mStream, "\r\x1b[K");
    std::fflush(mStream);
    mDrawn = false;
}

double ProgressDisplay::GetElapsedSeconds() const
{
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - mStart).count();
}

} // namespace vrender
