// Effects in timelines: which of an item's effects become its clip's
// operators, the loader's refusals and warnings naming the effect's place,
// and frame-parallel rendering of the blur (which renders several frames at
// once), which must give the frames a serial render gives.

#include "BE/TimelineFile.h"
#include "FX/EffectCatalogue.h"
#include "ML/CutlistRenderer.h"
#include "QRT/Exception.h"
#include "TestFrames.h"
#include "factory/CutlistFactory.h"

#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace ML
{
namespace
{

namespace mt = mvxmediatypes;
using CutlistRef = QRT::InterfaceRef<MF::IRenderableCutlist>;
using NodeRef = QRT::InterfaceRef<MF::IRenderableNode>;

// One 64x36 item of 12 frames with the given effects (JSON list) and more keys.
std::string Timeline(const std::string& inEffects, const std::string& inMore = {})
{
    return R"({"sequences": [{"name": "S", "size": [64, 36], "tracks": [{"items": [)"
           R"({"end": "12f", "media": {"pattern": "pattern:moving?size=64x36"}, "effects": )" +
           inEffects + inMore + "}]}]}]}";
}

CutlistRef Cutlist(const std::string& inEffects, const std::string& inMore = {})
{
    const BE::TimelineLoadResult loaded =
        BE::ParseTimeline(Timeline(inEffects, inMore), "t.json", ".");
    EXPECT_EQ(loaded.mError, "");
    CutlistRef cutlist;
    EXPECT_EQ(CreateCutlistFactory()->CreateSequenceCutlist(loaded.mMain, {}, cutlist),
              QRT::kResult_Success);
    return cutlist;
}

NodeRef Clip(const CutlistRef& inCutlist)
{
    mt::TickTime start, end, offset;
    QRT::Guid hash;
    NodeRef compositor, clip;
    EXPECT_EQ(inCutlist->GetSegment(0, start, end, offset, hash), QRT::kResult_Success);
    EXPECT_EQ(inCutlist->GetNodeByHash(hash, compositor), QRT::kResult_Success);
    EXPECT_EQ(compositor->GetInput(0, offset, clip), QRT::kResult_Success);
    return clip;
}

TEST(EffectTimelineTest, OpacityAndMotionAreNotOperatorsTheOthersAreInOrder)
{
    EXPECT_EQ(Clip(Cutlist(R"([{"match": "KX.VNTR Opacity"}, {"match": "KX.VNTR Motion"}])"))
                  ->GetOperatorCount(),
              0u);
    const NodeRef clip = Clip(Cutlist(R"([{"match": "KX.VNTR Opacity"}, {"match": "VR.Crop"},
        {"match": "KX.VNTR Motion"}, {"match": "KX.VNTR ProcAmp"}])"));
    ASSERT_EQ(clip->GetOperatorCount(), 2u);
    for (const auto& [index, match] : {std::pair{0u, "VR.Crop"}, {1u, "KX.VNTR ProcAmp"}})
    {
        NodeRef effect;
        ASSERT_EQ(clip->GetOperator(index, effect), QRT::kResult_Success);
        MF::RenderablePropertyValue name;
        effect->GetProperty(QRT::ImmutableString::CreateStatic("EffectNode::FilterMatchName"),
                            name);
        EXPECT_EQ(std::string(name.begin(), name.end()), match);
    }
}

TEST(EffectTimelineTest, TheLoaderRefusesUnknownEffectsAndWarnsOfClampedValues)
{
    const std::string place = "t.json:1: /sequences/0/tracks/0/items/0/effects/";
    const BE::TimelineLoadResult unknown =
        BE::ParseTimeline(Timeline(R"([{"match": "VR.Crop"}, {"match": "VR.Sparkle"}])"), "t.json",
                          ".", FX::CheckEffect);
    EXPECT_EQ(unknown.mError, place + "1/match: unknown effect \"VR.Sparkle\"");
    const BE::TimelineLoadResult clamped = BE::ParseTimeline(
        Timeline(R"([{"match": "KX.VNTR ProcAmp", "params": {"brightness": 300}}])"), "t.json", ".",
        FX::CheckEffect);
    EXPECT_EQ(clamped.mError, "");
    EXPECT_EQ(clamped.mWarnings,
              std::vector<std::string>{place + "0: \"KX.VNTR ProcAmp\" parameter \"brightness\": "
                                               "300 is outside -100..100; clamped to 100"});
    // Loaded without the check, the factory refuses the effect it cannot make.
    const BE::TimelineLoadResult unchecked =
        BE::ParseTimeline(Timeline(R"([{"match": "VR.Sparkle"}])"), "t.json", ".");
    CutlistRef cutlist;
    try
    {
        CreateCutlistFactory()->CreateSequenceCutlist(unchecked.mMain, {}, cutlist);
        ADD_FAILURE() << "an unknown effect was made";
    }
    catch (const QRT::Exception& error)
    {
        EXPECT_NE(std::string(error.what()).find("unknown effect \"VR.Sparkle\""),
                  std::string::npos)
            << error.what();
    }
}

std::string RenderPixels(const CutlistRef& inCutlist, std::int64_t inFrame)
{
    CutlistRenderParams params = vrtest::MakeParams(
        64, 36, MF::FrameTime(mt::TickTime::FromFrame(inFrame, mt::kFrameRate_Video25)));
    params.mQuality = params.mSecondaryQuality = 4;
    QRT::InterfaceRef<IRenderableNodeProducer> producer;
    MF::FrameTime local;
    EXPECT_EQ(CutlistRenderer::GetProducerForCutlist(inCutlist, params, producer, local),
              QRT::kResult_Success);
    const auto frame = CutlistRenderer::RenderFrameFromCutlist(producer, params, local,
                                                               {params.mPixelFormat}, false);
    if (!frame)
        return "none";
    const auto* base = static_cast<const char*>(frame->GetBaseAddress());
    return std::string(base, base + frame->GetDataSize());
}

TEST(EffectTimelineTest, AFrameHoldWithFiltersHoldsTheEffectsToo)
{
    const std::string brightening = R"([{"match": "KX.VNTR ProcAmp", "params": {"brightness":
        [{"time": 0, "value": 0}, {"time": "11f", "value": 100}]}}])";
    for (const bool filters : {true, false})
    {
        SCOPED_TRACE(filters);
        const CutlistRef held = Cutlist(
            brightening, std::string(R"(, "clip": {"frameHold": {"at": "3f", "filters": )") +
                             (filters ? "true" : "false") + "}}");
        EXPECT_EQ(RenderPixels(held, 2) == RenderPixels(held, 9), filters);
    }
}

TEST(EffectTimelineTest, FrameParallelRenderingOfTheBlurMatchesSerialRendering)
{
    const CutlistRef cutlist = Cutlist(R"([
        {"match": "VR.GaussianBlur", "params": {"blurriness": [{"time": 0, "value": 1},
                                                               {"time": "11f", "value": 5}]}},
        {"match": "KX.VNTR ProcAmp", "params": {"brightness": 10}}])");
    // The blur renders several frames at once, each with its own buffers.
    ASSERT_TRUE(FX::CreateEffect({"VR.GaussianBlur", {}, {}, {}, {}}).mEffect->IsReentrant());
    constexpr int kFrames = 12, kThreads = 4;
    std::vector<std::string> parallel(kFrames);
    {
        std::vector<std::jthread> threads;
        for (int t = 0; t < kThreads; ++t)
            threads.emplace_back(
                [&, t]
                {
                    for (int frame = t; frame < kFrames; frame += kThreads)
                        parallel[static_cast<std::size_t>(frame)] = RenderPixels(cutlist, frame);
                });
    }
    for (int frame = 0; frame < kFrames; ++frame)
        EXPECT_EQ(parallel[static_cast<std::size_t>(frame)], RenderPixels(cutlist, frame))
            << "frame " << frame;
    EXPECT_NE(parallel[0], parallel[kFrames - 1]);
}

} // namespace
} // namespace ML
