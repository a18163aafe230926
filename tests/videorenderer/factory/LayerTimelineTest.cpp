// Adjustment layers and layer effects in timelines: an adjustment layer
// changes the tracks below it and nothing above, with its own opacity; a
// track matte reads its matte track (which is then not drawn), by alpha or
// luma, normal or inverted; an effect with a layer names the layer's hash in
// "EffectNode::LayerInputHashes" and loses render flag 64.

#include "BE/TimelineFile.h"
#include "ML/CutlistRenderer.h"
#include "ML/RenderFlags.h"
#include "TestFrames.h"
#include "factory/CutlistFactory.h"

#include <array>
#include <cstdlib>
#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace ML
{
namespace
{

namespace mt = mvxmediatypes;
using CutlistRef = QRT::InterfaceRef<MF::IRenderableCutlist>;
using NodeRef = QRT::InterfaceRef<MF::IRenderableNode>;
using Rgb = std::array<int, 3>;

constexpr int kWidth = 16, kHeight = 8;

// A 16x8 sequence of the given tracks (JSON item lists, bottom first), each
// track one item over frames 0 to 4 unless the item says otherwise.
CutlistRef Cutlist(const std::vector<std::string>& inTracks)
{
    std::string json = R"({"sequences": [{"name": "S", "size": [16, 8], "tracks": [)";
    for (std::size_t i = 0; i < inTracks.size(); ++i)
        json += std::string(i ? "," : "") + R"({"items": [{"end": "4f", )" + inTracks[i] + "}]}";
    const BE::TimelineLoadResult loaded = BE::ParseTimeline(json + "]}]}", "t.json", ".");
    EXPECT_EQ(loaded.mError, "");
    CutlistRef cutlist;
    EXPECT_EQ(CreateCutlistFactory()->CreateSequenceCutlist(loaded.mMain, {}, cutlist),
              QRT::kResult_Success);
    return cutlist;
}

// The centre and corner pixels (red, green, blue) of frame 1.
std::array<Rgb, 2> CentreAndCorner(const CutlistRef& inCutlist)
{
    CutlistRenderParams params = vrtest::MakeParams(
        kWidth, kHeight, MF::FrameTime(mt::TickTime::FromFrame(1, mt::kFrameRate_Video25)));
    params.mQuality = params.mSecondaryQuality = 4;
    QRT::InterfaceRef<IRenderableNodeProducer> producer;
    MF::FrameTime local;
    EXPECT_EQ(CutlistRenderer::GetProducerForCutlist(inCutlist, params, producer, local),
              QRT::kResult_Success);
    const auto frame = CutlistRenderer::RenderFrameFromCutlist(producer, params, local,
                                                               {params.mPixelFormat}, false);
    EXPECT_TRUE(frame);
    if (!frame)
        return {};
    EXPECT_EQ(frame->GetPixelFormat(), mt::kPixelFormat_BGRA_4444_8u);
    auto pixel = [&](int inX, int inY)
    {
        const auto* p = static_cast<const std::uint8_t*>(frame->GetBaseAddress()) +
                        inY * frame->GetRowBytes() + inX * 4;
        return Rgb{p[2], p[1], p[0]};
    };
    return {pixel(kWidth / 2, kHeight / 2), pixel(0, 0)};
}

void ExpectNear(const Rgb& inActual, const Rgb& inExpected, const char* inWhere)
{
    for (int c = 0; c < 3; ++c)
        EXPECT_LE(std::abs(inActual[c] - inExpected[c]), 1)
            << inWhere << " component " << c << ": " << inActual[c] << " vs " << inExpected[c];
}

NodeRef InputOf(const NodeRef& inNode, std::uint32_t inIndex)
{
    mt::TickTime offset;
    NodeRef input;
    EXPECT_EQ(inNode->GetInput(inIndex, offset, input), QRT::kResult_Success);
    return input;
}

NodeRef Root(const CutlistRef& inCutlist)
{
    mt::TickTime start, end, offset;
    QRT::Guid hash;
    NodeRef root;
    EXPECT_EQ(inCutlist->GetSegment(0, start, end, offset, hash), QRT::kResult_Success);
    EXPECT_EQ(inCutlist->GetNodeByHash(hash, root), QRT::kResult_Success);
    return root;
}

std::string Property(const NodeRef& inNode, const char* inKey)
{
    MF::RenderablePropertyValue value;
    inNode->GetProperty(QRT::ImmutableString::CreateStatic(inKey), value);
    return std::string(value.begin(), value.end());
}

// The bottom track is #F04020; the Video Limiter's maximum of 50 % holds
// every component at 128 (0.5 of 255, rounded), so 240 becomes 128. The
// track above is a half-size #D0E0F0 solid in the centre.
struct AdjustmentCase
{
    const char* mName;
    std::string mAdjustmentKeys;
    Rgb mCorner;
};

class AdjustmentLayerTest : public ::testing::TestWithParam<AdjustmentCase>
{
};

TEST_P(AdjustmentLayerTest, ChangesTheTracksBelowAndNothingAbove)
{
    const CutlistRef cutlist =
        Cutlist({R"("media": {"color": "#FFF04020"})",
                 R"("media": {"color": "#00000000"}, "adjustment": true, "effects":
            [{"match": "KX.VNTR Video Limiter", "params": {"maximum": 50}}])" +
                     GetParam().mAdjustmentKeys,
                 R"("media": {"color": "#FFD0E0F0"}, "motion": {"scale": 50})"});
    const auto [centre, corner] = CentreAndCorner(cutlist);
    ExpectNear(corner, GetParam().mCorner, "below");
    ExpectNear(centre, {0xD0, 0xE0, 0xF0}, "above");
    const NodeRef adjustment = InputOf(Root(cutlist), 0);
    EXPECT_EQ(adjustment->GetNodeType().ToStringView(), "RenderableNode_AdjustmentImpl");
    EXPECT_EQ(Property(adjustment, "AdjustmentNode::AdjustmentMediaIsOpaque"), "0");
}

INSTANTIATE_TEST_SUITE_P(Opacity, AdjustmentLayerTest,
                         ::testing::Values(AdjustmentCase{"Opaque", "", {128, 0x40, 0x20}},
                                           // Half the limited picture over the unlimited one.
                                           AdjustmentCase{
                                               "Half", R"(, "opacity": 50)", {184, 0x40, 0x20}}),
                         [](const auto& inInfo) { return std::string(inInfo.param.mName); });

// A red fill over a blue background, matted by a half-size centred solid on
// the track above; luma of #808080 is 128/255.
struct MatteCase
{
    const char* mName;
    std::string mParams;
    std::string mMatteColor;
    Rgb mCentre;
    Rgb mCorner;
};

class TrackMatteTest : public ::testing::TestWithParam<MatteCase>
{
};

TEST_P(TrackMatteTest, ReadsItsLayerWhichIsNotDrawn)
{
    const MatteCase& test = GetParam();
    const CutlistRef cutlist = Cutlist(
        {R"("media": {"color": "#FF0000FF"})",
         R"("media": {"color": "#FFFF0000"}, "effects": [{"match": "KX.VNTR Legacy Key Track Matte",
            "params": {"matte": 2)" +
             test.mParams + "}}]",
         R"("media": {"color": ")" + test.mMatteColor + R"("}, "motion": {"scale": 50})"});
    const auto [centre, corner] = CentreAndCorner(cutlist);
    ExpectNear(centre, test.mCentre, "centre");
    ExpectNear(corner, test.mCorner, "corner");
}

INSTANTIATE_TEST_SUITE_P(
    Modes, TrackMatteTest,
    ::testing::Values(
        MatteCase{"Alpha", "", "#FFFFFFFF", {255, 0, 0}, {0, 0, 255}},
        MatteCase{"AlphaInverted", R"(, "invert": "true")", "#FFFFFFFF", {0, 0, 255}, {255, 0, 0}},
        MatteCase{"Luma", R"(, "using": "luma")", "#FF808080", {128, 0, 127}, {0, 0, 255}},
        MatteCase{"LumaInverted",
                  R"(, "using": "luma", "invert": "true")",
                  "#FF808080",
                  {127, 0, 128},
                  {255, 0, 0}}),
    [](const auto& inInfo) { return std::string(inInfo.param.mName); });

TEST(LayerInputTest, AnEffectWithALayerNamesItsHashAndLosesFlag64)
{
    auto effectOf = [](const std::string& inMatte, const std::string& inMatteColor)
    {
        const CutlistRef cutlist =
            Cutlist({R"("media": {"color": "#FFFF0000"}, "effects": [{"match":
                "KX.VNTR Legacy Key Track Matte", "params": {"matte": )" +
                         inMatte + "}}]",
                     R"("media": {"color": ")" + inMatteColor + R"("})"});
        NodeRef effect;
        EXPECT_EQ(InputOf(Root(cutlist), 0)->GetOperator(0, effect), QRT::kResult_Success);
        return effect;
    };
    const NodeRef reading = effectOf("1", "#FFFFFFFF");
    ASSERT_EQ(reading->GetInputCount(), 1u);
    EXPECT_EQ(Property(reading, "EffectNode::LayerInputHashes"),
              InputOf(reading, 0)->GetNodeHash().ToString() + "@0\n");
    EXPECT_EQ(reading->GetRenderFlags() & kRenderFlag_NoLayerInputs, 0u);
    // Another matte picture is another effect node.
    EXPECT_NE(effectOf("1", "#FF808080")->GetNodeHash(), reading->GetNodeHash());

    // A track with nothing on it gives no layer.
    const NodeRef none = effectOf("7", "#FFFFFFFF");
    EXPECT_EQ(none->GetInputCount(), 0u);
    EXPECT_EQ(Property(none, "EffectNode::LayerInputHashes"), "");
    EXPECT_NE(none->GetRenderFlags() & kRenderFlag_NoLayerInputs, 0u);
}

} // namespace
} // namespace ML
