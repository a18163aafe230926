// Multicam pictures: the selected angle alone, the grid of every angle with
// the selected one outlined (amber, red while recording), empty angles and
// cells, and the cached picture of non-multicam material.

#include "VF/MulticamRender.h"

#include "FrameTestSupport.h"
#include "VF/SharedVideoFrameCache.h"
#include "VF/VideoFrameManipulators.h"

#include <gtest/gtest.h>

namespace
{

using namespace vftest;

constexpr uint32_t kBlack = 0xFF000000u;
constexpr uint32_t kColors[] = {0xFF102030u, 0xFF405060u, 0xFF708090u, 0xFFA0B0C0u};

Frame Solid(uint32_t inColor)
{
    Frame frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 12, 12);
    EXPECT_EQ(VF::VideoFrameManipulators::FillWithColor(frame, inColor), QRT::kResult_Success);
    return frame;
}

uint32_t PixelAt(const Frame& inFrame, int32_t inX, int32_t inY)
{
    const uint8_t* p = Row(inFrame, inY, inX);
    return uint32_t(p[3]) << 24 | uint32_t(p[2]) << 16 | uint32_t(p[1]) << 8 | p[0];
}

VF::MultiCamRenderParams Params36()
{
    return VF::SelectedRenderParams(mt::kPixelFormat_BGRA_4444_8u, 36, 36,
                                    mt::kPixelAspectRatio_Square, mt::kRenderQuality_Draft);
}

struct Probe
{
    int32_t mX;
    int32_t mY;
    uint32_t mColor;
};

struct MulticamCase
{
    const char* mName;
    std::size_t mAngles;
    int mMissing; // the angle without a frame, or -1
    uint64_t mSelected;
    bool mShowProgram;
    bool mRecording;
    std::vector<Probe> mProbes;
};

TEST(MulticamRenderTest, DrawsTheSelectedAngleOrTheOutlinedGrid)
{
    const uint32_t amber = VF::kMulticamOutlineColor;
    const MulticamCase cases[] = {
        {"selected alone", 3, -1, 1, false, false, {{0, 0, kColors[1]}, {35, 35, kColors[1]}}},
        {"selected angle missing", 3, 1, 1, false, false, {{17, 17, kBlack}}},
        // 2x2 cells of 18x18; the selected bottom-left one has a 2-pixel rim.
        {"grid",
         4,
         -1,
         2,
         true,
         false,
         {{9, 9, kColors[0]},
          {27, 9, kColors[1]},
          {9, 27, kColors[2]},
          {27, 27, kColors[3]},
          {0, 0, kColors[0]},
          {0, 18, amber},
          {17, 35, amber},
          {3, 20, kColors[2]},
          {18, 18, kColors[3]}}},
        {"recording",
         4,
         -1,
         0,
         true,
         true,
         {{1, 1, VF::kMulticamRecordingColor}, {9, 9, kColors[0]}}},
        {"three angles leave a cell empty",
         3,
         -1,
         0,
         true,
         false,
         {{27, 9, kColors[1]}, {9, 27, kColors[2]}, {27, 27, kBlack}}},
        {"missing angle in the grid",
         4,
         3,
         0,
         true,
         false,
         {{27, 27, kBlack}, {27, 9, kColors[1]}}},
    };
    for (const MulticamCase& c : cases)
    {
        SCOPED_TRACE(c.mName);
        VF::MulticamFrames frames;
        for (std::size_t i = 0; i < c.mAngles; ++i)
            frames.push_back(int(i) == c.mMissing ? Frame() : Solid(kColors[i]));
        const Frame out =
            VF::RenderMulticam(frames, c.mSelected, c.mShowProgram, c.mRecording, Params36());
        ASSERT_TRUE(out);
        EXPECT_EQ(out->GetBounds().Width(), 36);
        for (const Probe& probe : c.mProbes)
            EXPECT_EQ(PixelAt(out, probe.mX, probe.mY), probe.mColor)
                << probe.mX << "," << probe.mY;
    }
}

TEST(MulticamRenderTest, AFittingSelectedFrameIsAnsweredItself)
{
    const Frame fitting = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 36, 36);
    EXPECT_EQ(VF::RenderMulticam({Solid(kColors[0]), fitting}, 1, false, false, Params36()),
              fitting);
}

TEST(MulticamRenderTest, NonMulticamGridHasNoOutlineAndIsKeptUnderItsKey)
{
    const mvxcore::utility::Guid key("{5a0c1f22-7e3b-4d19-b8a6-0c2f9e4d7b31}");
    const Frame grid =
        VF::RenderNonMulticam({Solid(kColors[0]), Solid(kColors[1])}, true, Params36(), key);
    ASSERT_TRUE(grid);
    EXPECT_EQ(PixelAt(grid, 0, 0), kColors[0]);
    EXPECT_EQ(PixelAt(grid, 35, 0), kColors[1]);
    EXPECT_EQ(VF::RenderNonMulticam({Solid(kColors[2])}, false, Params36(), key), grid);
    const Frame alone = VF::RenderNonMulticam({Solid(kColors[2])}, false, Params36(), {});
    EXPECT_EQ(PixelAt(alone, 20, 20), kColors[2]);
}

} // namespace
