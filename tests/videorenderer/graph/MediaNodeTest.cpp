// The media node: render flags, frame hashes, the source chain it builds,
// the pictures of media without a source, and nested sequences.

#include "ML/CutlistRenderer.h"
#include "ML/RenderableSourceFilters.h"
#include "ML/RenderableVideoSources.h"
#include "ML/StaticImageFactory.h"
#include "MediaNodeTestSupport.h"
#include "TestCutlists.h"
#include "graph/RenderableNodeMediaImpl.h"

#include <functional>
#include <tuple>

namespace graphtest
{
namespace
{

using SourceRef = QRT::InterfaceRef<ML::IRenderableSource>;

NodeRef MediaNode(const BE::MediaRef& inMedia, const BE::ClipSettings& inClip = {},
                  mt::FieldType inSequenceField = mt::kFieldType_Progressive, bool inMuted = false)
{
    ML::MediaNodeSetup setup =
        MediaSetup(inMedia, Item(inMedia, inClip), Sequence(inSequenceField));
    setup.mMuted = inMuted;
    return ML::CreateMediaNode(setup);
}

// The chain a media node should build over inMedia's source: the base
// source, inSteps in order, the scaler and the time mix.
SourceRef Chain(const BE::MediaRef& inMedia,
                const std::vector<std::function<SourceRef(const SourceRef&)>>& inSteps)
{
    const auto stream = inMedia->GetVideoStream(0);
    const BE::StreamSettings& settings = stream->GetStreamSettings();
    SourceRef source = ML::CreateRenderableSource(
        stream->GetVideoSource(), inMedia->GetOpaqueData(), settings.mAlpha,
        QRT::ParamColor(0xFF000000u), false, false, settings.mFrameRate, settings.mFieldType,
        settings.mPixelAspectRatio, inMedia->GetColorProfile());
    for (const auto& step : inSteps)
        source = step(source);
    return ML::TimeMixSource(ML::ScaleAndPARCorrectSource(source));
}

FrameRef RenderChain(const SourceRef& inSource, ML::CutlistRenderParams inParams)
{
    MF::FrameTime conformed;
    inSource->ConformFrameTime(inParams.GetFrameTime(), inParams, conformed);
    inParams.SetFrameTime(conformed);
    FrameRef frame;
    inSource->RenderFrame(conformed, inParams, frame);
    return frame;
}

TEST(MediaNodeTest, RenderFlagsSayStillAndOpaqueAndFrameHashesFollowMediaTime)
{
    const std::tuple<const char*, const char*, std::uint32_t> cases[] = {
        {"bars", "size=64x36", 93},
        {"bars", "size=64x36&alpha=straight", 92},
        {"moving", "size=64x36", 85}};
    for (const auto& [pattern, query, flags] : cases)
        EXPECT_EQ(MediaNode(Pattern(pattern, query))->GetRenderFlags(), flags) << query;
    const NodeRef still = MediaNode(Pattern("bars"));
    const NodeRef moving = MediaNode(Pattern("moving"));
    EXPECT_EQ(FrameHash(still, AtFrame(1)), FrameHash(still, AtFrame(7)));
    EXPECT_NE(FrameHash(moving, AtFrame(1)), FrameHash(moving, AtFrame(7)));
    // Other material never shares a node (and so a frame) hash; the same
    // material in another node does.
    EXPECT_NE(still->GetNodeHash(), MediaNode(Pattern("gradient"))->GetNodeHash());
    EXPECT_EQ(still->GetNodeHash(), MediaNode(Pattern("bars"))->GetNodeHash());
}

TEST(MediaNodeTest, FieldSettingsBuildTheirFilters)
{
    const BE::MediaRef upper = Pattern("moving", "size=64x36&field=upper");
    BE::ClipSettings reversed;
    reversed.mReverseFieldDominance = true;
    BE::ClipSettings deinterlaced;
    deinterlaced.mFieldProcessing = BE::FieldProcessing::kDeinterlaceAlways;
    BE::ClipSettings held;
    held.mFrameHold = {Frames(3), false, true};
    // Each case is told apart from the chain without its last filter at a
    // time where the two differ in pixels.
    const MF::FrameTime fields(Frames(2), Frames(2.5));
    const struct
    {
        const char* mName;
        BE::ClipSettings mClip;
        SourceRef mExpected;
        SourceRef mOther;
        MF::FrameTime mTime;
    } cases[] = {
        {"dominance then field reverse", reversed,
         Chain(upper, {ML::ReverseFieldDominanceOfSource, ML::FieldReverseSource}),
         Chain(upper, {ML::ReverseFieldDominanceOfSource}), MF::FrameTime(Frames(2))},
        {"deinterlace always", deinterlaced, Chain(upper, {ML::DeinterlaceSource}),
         Chain(upper, {}), fields},
        {"frame hold deinterlace", held, Chain(upper, {ML::DeinterlaceSource}), Chain(upper, {}),
         fields},
    };
    for (const auto& c : cases)
    {
        SCOPED_TRACE(c.mName);
        const NodeRef node = MediaNode(upper, c.mClip, mt::kFieldType_UpperFirst);
        const SourceRef chain =
            dynamic_cast<ML::RenderableNodeMediaImpl&>(*node).GetRenderState().mSource;
        const ML::CutlistRenderParams params = At(c.mTime, mt::kFieldType_UpperFirst);
        const FrameRef frame = RenderChain(chain, params);
        EXPECT_TRUE(SamePixels(frame, RenderChain(c.mExpected, params)));
        EXPECT_FALSE(SamePixels(frame, RenderChain(c.mOther, params)));
    }
    // The producer renders through that chain, at the hold time when held.
    EXPECT_TRUE(SamePixels(Render(MediaNode(upper, held, mt::kFieldType_UpperFirst), At(fields)),
                           RenderChain(Chain(upper, {ML::DeinterlaceSource}),
                                       At(MF::FrameTime(Frames(3)), mt::kFieldType_UpperFirst))));
}

TEST(MediaNodeTest, MediaWithoutSourceShowItsState)
{
    BE::MediaSettings offline;
    offline.mLocation = "/nonexistent/clip.y4m";
    BE::MediaSettings pending = offline;
    pending.mKind = BE::MediaKind::kPattern;
    pending.mLocation = "pattern:moving";
    pending.mPending = true;
    const ML::CutlistRenderParams params = AtFrame(2);
    // Offline and pending media keep their stream's picture size: 1920x1080.
    const auto picture = [](std::int32_t inNumber)
    {
        return ML::StaticImageFactory::LoadImageW(
            inNumber, 1920, 1080, mt::kPixelFormat_BGRA_4444_8u, mt::kPixelAspectRatio_Square,
            mt::RenderQuality{});
    };
    ML::CutlistRenderParams full = params;
    full.mFullFrameWidth = full.mWidth = 1920;
    full.mFullFrameHeight = full.mHeight = 1080;
    const struct
    {
        const char* mName;
        NodeRef mNode;
        std::uint32_t mFlags;
        ML::CutlistRenderParams mParams;
        FrameRef mExpected;
    } cases[] = {
        {"muted", MediaNode(Pattern("moving"), {}, {}, true), 84, params,
         ML::CutlistRenderer::GetBlackFrame(params)},
        {"offline", MediaNode(MakeMedia(offline)), 85, full,
         picture(ML::kStaticImage_MediaOffline)},
        {"pending", MediaNode(MakeMedia(pending)), 85, full,
         picture(ML::kStaticImage_MediaPending)},
    };
    EXPECT_FALSE(SamePixels(cases[1].mExpected, cases[2].mExpected));
    for (const auto& c : cases)
    {
        SCOPED_TRACE(c.mName);
        EXPECT_EQ(c.mNode->GetRenderFlags(), c.mFlags);
        EXPECT_TRUE(SamePixels(Render(c.mNode, c.mParams), c.mExpected));
    }
}

TEST(MediaNodeTest, NestedSequenceRendersItsCutlist)
{
    const BE::TrackItemRef innerItem = Item(Pattern("moving"));
    const vrtest::CutlistRef cutlist = vrtest::OneSegment(ClipOver(innerItem));
    BE::SequenceBuilder builder("Inner", Sequence());
    builder.AddTrack();
    builder.AddItem(0, innerItem);
    BE::MediaSettings nested;
    nested.mKind = BE::MediaKind::kSequence;
    nested.mLocation = "Inner";
    const BE::MediaRef media = MakeMedia(nested, builder.Build());
    ML::MediaNodeSetup setup = MediaSetup(media, Item(media));
    setup.mNestedCutlist = cutlist;
    const NodeRef node = ML::CreateMediaNode(setup);

    const ML::CutlistRenderParams params = AtFrame(6);
    MF::FrameTime local;
    QRT::InterfaceRef<ML::IRenderableNodeProducer> inner;
    ASSERT_EQ(ML::CutlistRenderer::GetProducerForCutlist(cutlist, params, inner, local),
              QRT::kResult_Success);
    EXPECT_TRUE(SamePixels(Render(node, params),
                           ML::CutlistRenderer::RenderFrameFromCutlist(
                               inner, params, local, {mt::kPixelFormat_BGRA_4444_8u}, false)));
    setup.mNestedCutlist = vrtest::OneSegment(ClipOver(Item(Pattern("bars"))));
    EXPECT_NE(FrameHash(node, params), FrameHash(ML::CreateMediaNode(setup), params));
}

} // namespace
} // namespace graphtest
