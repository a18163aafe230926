#pragma once

// Helpers shared by the sequence suites: times, media and items made in one
// line each.

#include "BE/Sequence.h"

#include <gtest/gtest.h>

namespace seqtest
{

using mvxmediatypes::TickTime;

inline TickTime Seconds(double inSeconds)
{
    return TickTime::FromSeconds(inSeconds);
}

inline BE::MediaRef Media(const BE::MediaSettings& inSettings, const BE::SequenceRef& inNested = {})
{
    const BE::MediaResult made = BE::CreateMedia(inSettings, inNested);
    EXPECT_TRUE(made.mMedia) << made.mStatus.mMessage;
    return made.mMedia;
}

inline BE::MediaRef Pattern(const std::string& inText)
{
    BE::MediaSettings settings;
    settings.mKind = BE::MediaKind::kPattern;
    settings.mLocation = inText;
    return Media(settings);
}

inline BE::TrackItemSettings Item(double inStart, double inEnd)
{
    BE::TrackItemSettings item;
    item.mStart = Seconds(inStart);
    item.mEnd = Seconds(inEnd);
    return item;
}

} // namespace seqtest
