// Golden frames: every frame of the synthetic timelines in timelines/,
// rendered through the cutlist factory and the cutlist renderer at quality 4
// (8-bit compositing, compared bit for bit, at the sequence's size and at
// half of it) and quality 5 (32-bit float in linear light, compared within
// kFloatTolerance code values per block), is
// checked against <name>.txt in this folder: one line per frame with a hash
// of its pixels and the mean of each channel over a 3x3 grid of blocks.
//
// After a deliberate change of rendering, regenerate the files with
//     VR_UPDATE_GOLDEN=1 build/bin/golden_tests
// and review the difference before committing it.

#include "BE/SequenceInterfaces.h"
#include "BE/TimelineFile.h"
#include "MF/IVideoFrame.h"
#include "MF/RenderableCutlistFactory.h"
#include "ML/CutlistRenderer.h"
#include "factory/CutlistFactory.h"
#include "mvxmediatypes/PixelFormat.h"

#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <fstream>
#include <iomanip>
#include <sstream>
#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace ML
{
namespace
{

namespace mt = mvxmediatypes;

// Largest difference of a block mean (in 8-bit code values) accepted for the
// float path, where the order of floating-point operations may differ
// between compilers and instruction sets.
constexpr double kFloatTolerance = 0.75;
constexpr int kGrid = 3;

struct FrameLine
{
    std::string mKey; // "frame quality"
    std::string mHash;
    std::vector<double> mMeans;
};

std::string HashPixels(const MF::IVideoFrame& inFrame)
{
    // FNV-1a over the visible pixels, row by row.
    std::uint64_t hash = 1469598103934665603ull;
    const auto* base = static_cast<const std::uint8_t*>(inFrame.GetBaseAddress());
    const QRT::ParamRect bounds = inFrame.GetBounds();
    for (int y = 0; y < bounds.Height(); ++y)
        for (int x = 0; x < bounds.Width() * 4; ++x)
            hash = (hash ^ base[std::ptrdiff_t{y} * inFrame.GetRowBytes() + x]) * 1099511628211ull;
    std::ostringstream text;
    text << std::hex << std::setw(16) << std::setfill('0') << hash;
    return text.str();
}

std::vector<double> BlockMeans(const MF::IVideoFrame& inFrame)
{
    const auto* base = static_cast<const std::uint8_t*>(inFrame.GetBaseAddress());
    const int width = inFrame.GetBounds().Width();
    const int height = inFrame.GetBounds().Height();
    std::vector<double> means;
    for (int by = 0; by < kGrid; ++by)
        for (int bx = 0; bx < kGrid; ++bx)
            for (int channel = 0; channel < 4; ++channel)
            {
                double sum = 0;
                int count = 0;
                for (int y = by * height / kGrid; y < (by + 1) * height / kGrid; ++y)
                    for (int x = bx * width / kGrid; x < (bx + 1) * width / kGrid; ++x, ++count)
                        sum += base[std::ptrdiff_t{y} * inFrame.GetRowBytes() + x * 4 + channel];
                means.push_back(count ? sum / count : 0);
            }
    return means;
}

std::string Format(const FrameLine& inLine)
{
    std::ostringstream text;
    text << inLine.mKey << ' ' << inLine.mHash << std::fixed << std::setprecision(2);
    for (const double mean : inLine.mMeans)
        text << ' ' << mean;
    return text.str();
}

FrameLine Parse(const std::string& inText)
{
    std::istringstream text(inText);
    FrameLine line;
    std::string frame, quality;
    text >> frame >> quality >> line.mHash;
    line.mKey = frame + " " + quality;
    for (double mean; text >> mean;)
        line.mMeans.push_back(mean);
    return line;
}

std::vector<FrameLine> RenderTimeline(const std::string& inPath)
{
    const BE::TimelineLoadResult loaded = BE::LoadTimelineFile(inPath);
    EXPECT_EQ(loaded.mError, "");
    if (!loaded.Succeeded())
        return {};
    const BE::SequenceSettings& settings =
        QRT::QueryRef<BE::ISequenceSettings>(loaded.mMain)->GetSequenceSettings();
    QRT::InterfaceRef<MF::IRenderableCutlist> cutlist;
    EXPECT_EQ(CreateCutlistFactory()->CreateSequenceCutlist(loaded.mMain, {}, cutlist),
              QRT::kResult_Success);
    const std::int64_t frames = loaded.mMain->GetEnd().ToFrame64(settings.mFrameRate);

    // Quality 4 and 5 at the sequence's size, and quality 4 at half of it
    // (a view of the sequence, which renders its media at half their size).
    struct Pass
    {
        std::uint32_t mQuality;
        std::uint32_t mDivisor;
        const char* mName;
    };
    std::vector<FrameLine> lines;
    for (const Pass pass : {Pass{4, 1, "q4"}, Pass{5, 1, "q5"}, Pass{4, 2, "q4/2"}})
        for (std::int64_t frame = 0; frame < frames; ++frame)
        {
            const std::uint32_t quality = pass.mQuality;
            CutlistRenderParams params;
            params.SetFrameTime(
                MF::FrameTime::Make(mt::TickTime::FromFrame(frame, settings.mFrameRate),
                                    mt::kFieldType_Progressive, mt::kTime_Zero));
            params.mFullFrameWidth = static_cast<std::uint32_t>(settings.mWidth);
            params.mFullFrameHeight = static_cast<std::uint32_t>(settings.mHeight);
            params.mWidth = params.mFullFrameWidth / pass.mDivisor;
            params.mHeight = params.mFullFrameHeight / pass.mDivisor;
            params.mHorizontalScale = params.mVerticalScale = 1.0 / pass.mDivisor;
            params.mPixelAspectRatio = params.mFullFramePixelAspectRatio =
                settings.mPixelAspectRatio;
            params.mPixelFormat = mt::kPixelFormat_BGRA_4444_8u;
            params.mQuality = params.mSecondaryQuality = quality;
            params.mFrameRate = settings.mFrameRate;
            QRT::InterfaceRef<IRenderableNodeProducer> producer;
            MF::FrameTime local;
            EXPECT_EQ(CutlistRenderer::GetProducerForCutlist(cutlist, params, producer, local),
                      QRT::kResult_Success);
            const auto rendered = CutlistRenderer::RenderFrameFromCutlist(
                producer, params, local, {params.mPixelFormat}, false);
            FrameLine line;
            line.mKey = std::to_string(frame) + " " + pass.mName;
            if (!rendered || rendered->GetPixelFormat() != mt::kPixelFormat_BGRA_4444_8u)
                line.mHash = "none";
            else
            {
                line.mHash = HashPixels(*rendered);
                line.mMeans = BlockMeans(*rendered);
            }
            lines.push_back(std::move(line));
        }
    return lines;
}

class GoldenFramesTest : public ::testing::TestWithParam<const char*>
{
};

TEST_P(GoldenFramesTest, FramesMatchTheirGoldenLines)
{
    const std::string folder = VR_GOLDEN_DIR;
    const std::string name = GetParam();
    const std::vector<FrameLine> rendered = RenderTimeline(folder + "/timelines/" + name + ".json");
    ASSERT_FALSE(rendered.empty());
    const std::string goldenPath = folder + "/" + name + ".txt";
    if (const char* update = std::getenv("VR_UPDATE_GOLDEN"); update && *update == '1')
    {
        std::ofstream out(goldenPath);
        out << "# frame quality hash means (B G R A over a 3x3 grid, row by row)\n";
        for (const FrameLine& line : rendered)
            out << Format(line) << '\n';
        GTEST_SKIP() << "rewrote " << goldenPath;
    }
    std::ifstream in(goldenPath);
    ASSERT_TRUE(in) << goldenPath << " is missing; run with VR_UPDATE_GOLDEN=1 to make it";
    std::vector<FrameLine> golden;
    for (std::string text; std::getline(in, text);)
        if (!text.empty() && text[0] != '#')
            golden.push_back(Parse(text));
    ASSERT_EQ(golden.size(), rendered.size());
    for (std::size_t i = 0; i < golden.size(); ++i)
    {
        SCOPED_TRACE(name + " frame " + golden[i].mKey);
        ASSERT_EQ(rendered[i].mKey, golden[i].mKey);
        const bool exact = !golden[i].mKey.ends_with("q5");
        if (exact || golden[i].mHash == "none" || rendered[i].mHash == "none")
        {
            EXPECT_EQ(rendered[i].mHash, golden[i].mHash);
            continue;
        }
        ASSERT_EQ(rendered[i].mMeans.size(), golden[i].mMeans.size());
        for (std::size_t m = 0; m < golden[i].mMeans.size(); ++m)
            EXPECT_NEAR(rendered[i].mMeans[m], golden[i].mMeans[m], kFloatTolerance)
                << "block " << m;
    }
}

INSTANTIATE_TEST_SUITE_P(Timelines, GoldenFramesTest,
                         ::testing::Values("adjustment", "effects", "layers", "motion", "multicam",
                                           "retime", "transitions"));

} // namespace
} // namespace ML
