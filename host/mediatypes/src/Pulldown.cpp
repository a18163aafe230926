#include "mvxmediatypes/Pulldown.h"

#include "TimeArithmetic.h"
#include "mvxcore/debug/Contract.h"

#include <array>
#include <limits>

namespace mvxmediatypes
{

namespace
{

// One 2:3 cycle is ten fields: A A B B B C C D D D. The first field of each
// film frame, counted from the first field of the cycle, and its field count.
constexpr std::array<std::int64_t, 4> kFirstField = {0, 2, 5, 7};
constexpr std::array<std::int64_t, 4> kFieldCount = {2, 3, 2, 3};
constexpr std::int64_t kFieldsPerCycle = 10;
constexpr std::int64_t kFilmFramesPerCycle = 4;
constexpr std::int64_t kVideoFramesPerCycle = 5;

__int128 FloorDivideWide(__int128 inValue, __int128 inDivisor)
{
    const __int128 quotient = inValue / inDivisor;
    return (inValue % inDivisor < 0) ? quotient - 1 : quotient;
}

} // namespace

TickTime MapPulldownFrameTo2997Frame(TickTime inFilmTime, const FrameRate& inVideoRate,
                                     PulldownCadence inCadence, bool& outSplit)
{
    MVX_INPUT_CONTRACT(inVideoRate.GetTicksPerFrame() > 0);
    MVX_INPUT_CONTRACT(inCadence >= kPulldownCadence_23_AA && inCadence <= kPulldownCadence_23_DD);
    MVX_INPUT_CONTRACT(inFilmTime.IsValid());

    // Video frame 0 sits at cycle frame `phase`, i.e. at cycle field 2 x phase.
    // Counting film frames from the first whole one after that point, film frame
    // 0 is cycle letter `phase` (A, B, C, D, or the next cycle's A for phase 4).
    const std::int64_t phase = inCadence - kPulldownCadence_23_AA;

    // Four film frames last exactly as long as five video frames; the film frame
    // number is found inside that span without rounding.
    const __int128 cycleTicks =
        static_cast<__int128>(inVideoRate.GetTicksPerFrame()) * kVideoFramesPerCycle;
    const __int128 ticks = inFilmTime.GetTicks();
    const __int128 cycle = FloorDivideWide(ticks, cycleTicks);
    const __int128 rest = ticks - cycle * cycleTicks;
    const __int128 filmFrame =
        cycle * kFilmFramesPerCycle + (rest * kFilmFramesPerCycle) / cycleTicks;

    const __int128 letterIndex = filmFrame + phase;
    const __int128 letterCycle = FloorDivideWide(letterIndex, kFilmFramesPerCycle);
    const auto letter = static_cast<std::size_t>(letterIndex - letterCycle * kFilmFramesPerCycle);

    // Field index within the material: field 0 is the first field of video frame 0.
    const __int128 firstField = letterCycle * kFieldsPerCycle + kFirstField[letter] - 2 * phase;

    // A three-field film frame always has two fields in one video frame (the
    // first two when it starts on a frame boundary, else the last two); a
    // two-field one is whole only when it starts on a frame boundary.
    const __int128 videoFrame = FloorDivideWide(firstField + 1, 2);
    outSplit = kFieldCount[letter] == 2 && (firstField % 2 != 0);

    constexpr __int128 kLimit = std::numeric_limits<std::int64_t>::max();
    const std::int64_t frame = videoFrame > kLimit    ? std::numeric_limits<std::int64_t>::max()
                               : videoFrame < -kLimit ? -std::numeric_limits<std::int64_t>::max()
                                                      : static_cast<std::int64_t>(videoFrame);
    return TickTime::FromFrame(frame, inVideoRate);
}

} // namespace mvxmediatypes
