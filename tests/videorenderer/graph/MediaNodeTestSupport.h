#pragma once

// The media, clip and compositor suites' helpers: back-end media and items made in
// one line, nodes over them in a small 64x36 sequence at 25 frames per
// second, and rendering or hashing a node's producer at a frame time.

#include "BE/Sequence.h"
#include "ML/IRenderableNodeProducerProvider.h"
#include "TestFrames.h"
#include "TestNodeKinds.h"
#include "graph/SequenceNodes.h"

#include <cstring>
#include <string>

#include <gtest/gtest.h>

namespace graphtest
{

namespace mt = mvxmediatypes;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

inline constexpr std::int64_t kFrame = mt::kTicksPerSecond / 25;

inline TickTime Frames(double inFrames)
{
    return Ticks(static_cast<std::int64_t>(inFrames * kFrame));
}

inline BE::SequenceSettings Sequence(mt::FieldType inField = mt::kFieldType_Progressive)
{
    return {mt::kFrameRate_Video25, 64, 36, mt::kPixelAspectRatio_Square, inField};
}

inline BE::MediaRef MakeMedia(BE::MediaSettings inSettings, const BE::SequenceRef& inNested = {})
{
    const BE::MediaResult made = BE::CreateMedia(inSettings, inNested);
    EXPECT_TRUE(made.mMedia) << made.mStatus.mMessage;
    return made.mMedia;
}

// The generated pattern inName with the settings inQuery.
inline BE::MediaRef Pattern(const std::string& inName, const std::string& inQuery = "size=64x36")
{
    BE::MediaSettings settings;
    settings.mKind = BE::MediaKind::kPattern;
    settings.mLocation = "pattern:" + inName + "?" + inQuery;
    return MakeMedia(settings);
}

// An item over [0, 10 frames) of inMedia with inClip.
inline BE::TrackItemRef Item(const BE::MediaRef& inMedia, const BE::ClipSettings& inClip = {},
                             BE::TrackItemSettings inItem = {})
{
    inItem.mEnd = Frames(10);
    inItem.mClip = inClip;
    return BE::CreateTrackItem(inItem, inMedia);
}

inline ML::MediaNodeSetup MediaSetup(const BE::MediaRef& inMedia, const BE::TrackItemRef& inItem,
                                     const BE::SequenceSettings& inSequence = Sequence())
{
    ML::MediaNodeSetup setup;
    setup.mMedia = inMedia;
    setup.mTrackItem = inItem;
    setup.mSequence = inSequence;
    setup.mHasSequence = true;
    return setup;
}

inline NodeRef ClipOver(const BE::TrackItemRef& inItem,
                        const BE::SequenceSettings& inSequence = Sequence())
{
    ML::ClipNodeSetup setup;
    setup.mTrackItem = inItem;
    setup.mInput = ML::CreateMediaNode(MediaSetup(inItem->GetMedia(), inItem, inSequence));
    return ML::CreateClipNode(setup);
}

// The parameters of a 64x36 render at inTime in a sequence of inField.
inline ML::CutlistRenderParams At(const MF::FrameTime& inTime,
                                  mt::FieldType inField = mt::kFieldType_Progressive)
{
    ML::CutlistRenderParams params = vrtest::MakeParams(64, 36, inTime);
    params.mFieldType = static_cast<std::uint32_t>(inField);
    return params;
}

// The parameters of a progressive 64x36 render at frame inFrame.
inline ML::CutlistRenderParams AtFrame(double inFrame)
{
    return At(MF::FrameTime(Frames(inFrame)));
}

inline QRT::InterfaceRef<ML::IRenderableNodeProducer>
ProducerOf(const NodeRef& inNode, const ML::CutlistRenderParams& inParams)
{
    QRT::InterfaceRef<ML::IRenderableNodeProducer> producer;
    QRT::InterfaceRef<ML::IRenderableNodeProducerProvider>(inNode)->GetProducer(
        producer, inParams.GetFrameTime(), inParams);
    return producer;
}

inline FrameRef Render(const NodeRef& inNode, const ML::CutlistRenderParams& inParams)
{
    FrameRef frame;
    EXPECT_EQ(ProducerOf(inNode, inParams)->ProduceFrame(inParams.GetFrameTime(), inParams, frame),
              QRT::kResult_Success);
    return frame;
}

inline QRT::Guid FrameHash(const NodeRef& inNode, const ML::CutlistRenderParams& inParams)
{
    QRT::Guid hash;
    ProducerOf(inNode, inParams)->GetFrameHash(hash, inParams.GetFrameTime(), inParams);
    return hash;
}

// True when both frames have the same format, bounds and pixel bytes.
inline bool SamePixels(const FrameRef& inA, const FrameRef& inB)
{
    if (!inA || !inB || inA->GetPixelFormat() != inB->GetPixelFormat() ||
        !(inA->GetBounds() == inB->GetBounds()))
        return false;
    const auto rowBytes = static_cast<std::size_t>(inA->GetBounds().Width()) * 4;
    for (std::int32_t row = 0; row < inA->GetBounds().Height(); ++row)
        if (std::memcmp(static_cast<const char*>(inA->GetBaseAddress()) + row * inA->GetRowBytes(),
                        static_cast<const char*>(inB->GetBaseAddress()) + row * inB->GetRowBytes(),
                        rowBytes) != 0)
            return false;
    return true;
}

} // namespace graphtest
