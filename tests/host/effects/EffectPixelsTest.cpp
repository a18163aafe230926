// Pixel truth of the catalogue's effects, against values computed here from
// each effect's definition: ProcAmp levels on ramps, luma key thresholds,
// crops and blurs, defaults that leave a picture alone, shared frames left
// unwritten and formats staged through float.

#include "FX/EffectCatalogue.h"
#include "QRT/Allocated.h"
#include "VF/PngFile.h"
#include "VF/VideoFrame.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <random>
#include <tuple>

#include <gtest/gtest.h>

namespace FX
{
namespace
{

namespace mt = mvxmediatypes;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

FrameRef MakeFrame(std::uint32_t inWidth, std::uint32_t inHeight,
                   mt::PixelFormat inFormat = mt::kPixelFormat_BGRA_4444_8u)
{
    return VF::CreateVideoFrame(inFormat, inWidth, inHeight, mt::kPixelAspectRatio_Square, true,
                                false);
}

// Component inC (B, G, R, A) of pixel (inX, inY), 0..255 for either format.
double At(const MF::IVideoFrame& inFrame, int inX, int inY, int inC)
{
    const auto* row = static_cast<const std::uint8_t*>(inFrame.GetBaseAddress()) +
                      static_cast<std::ptrdiff_t>(inY) * inFrame.GetRowBytes();
    if (inFrame.GetPixelFormat() == mt::kPixelFormat_BGRA_4444_32f)
        return reinterpret_cast<const float*>(row)[inX * 4 + inC] * 255.0;
    return row[inX * 4 + inC];
}

void Set(MF::IVideoFrame& ioFrame, int inX, int inY, std::array<double, 4> inBgra)
{
    auto* row = static_cast<std::uint8_t*>(ioFrame.GetWritableBaseAddress()) +
                static_cast<std::ptrdiff_t>(inY) * ioFrame.GetRowBytes();
    for (int c = 0; c < 4; ++c)
        if (ioFrame.GetPixelFormat() == mt::kPixelFormat_BGRA_4444_32f)
            reinterpret_cast<float*>(row)[inX * 4 + c] = static_cast<float>(inBgra[c] / 255.0);
        else
            row[inX * 4 + c] = static_cast<std::uint8_t>(inBgra[c]);
}

// A 256x1 frame whose pixel i has blue i, green 255 - i, red 7i mod 256, opaque.
FrameRef Ramp(mt::PixelFormat inFormat)
{
    FrameRef frame = MakeFrame(256, 1, inFormat);
    for (int i = 0; i < 256; ++i)
        Set(*frame, i, 0, {double(i), double(255 - i), double((7 * i) % 256), 255});
    return frame;
}

FrameRef Render(std::string_view inMatch, std::map<std::string, std::string> inParams,
                FrameRef inFrame, float inScale = 1.0f, const LayerInputs& inLayers = {},
                QRT::Result inStatus = QRT::kResult_Success)
{
    BE::EffectSettings settings;
    settings.mMatchName = std::string(inMatch);
    settings.mParams = std::move(inParams);
    const EffectMade made = CreateEffect(settings);
    EXPECT_TRUE(made.mEffect) << made.mError;
    RenderContext context;
    context.mQuality = 4;
    context.mScale = inScale;
    context.mTime = mt::TickTime::FromFrame(7, mt::kFrameRate_Video25);
    EXPECT_EQ(made.mEffect->Render(context, inFrame, inLayers), inStatus);
    return inFrame;
}

const mt::PixelFormat kFormats[] = {mt::kPixelFormat_BGRA_4444_8u, mt::kPixelFormat_BGRA_4444_32f};

struct Levels
{
    double mBrightness;
    double mContrast;
};

class ProcAmpLevelsTest : public ::testing::TestWithParam<Levels>
{
};

TEST_P(ProcAmpLevelsTest, BrightnessAndContrastMapEveryComponentOfARamp)
{
    const auto [brightness, contrast] = GetParam();
    for (const mt::PixelFormat format : kFormats)
    {
        SCOPED_TRACE(format.GetValue());
        const FrameRef source = Ramp(format);
        const FrameRef result = Render(
            kMatch_ProcAmp,
            {{"brightness", std::to_string(brightness)}, {"contrast", std::to_string(contrast)}},
            Ramp(format));
        const bool isFloat = format == mt::kPixelFormat_BGRA_4444_32f;
        for (int i = 0; i < 256; ++i)
            for (int c = 0; c < 3; ++c)
            {
                double expected =
                    ((At(*source, i, 0, c) / 255 - 0.5) * contrast / 100 + 0.5 + brightness / 100);
                if (!isFloat)
                    expected = std::clamp(expected, 0.0, 1.0);
                // 8-bit results are the exact value rounded; float ones the exact value.
                ASSERT_NEAR(At(*result, i, 0, c), expected * 255, isFloat ? 1e-3 : 0.5001)
                    << "pixel " << i << " component " << c;
            }
    }
}

INSTANTIATE_TEST_SUITE_P(Ramps, ProcAmpLevelsTest,
                         ::testing::Values(Levels{0, 100}, Levels{20, 100}, Levels{-35, 100},
                                           Levels{0, 60}, Levels{10, 150}, Levels{-100, 0}));

struct LumaCase
{
    double mThreshold;
    double mSoftness;
};

class LumaKeyTest : public ::testing::TestWithParam<LumaCase>
{
};

TEST_P(LumaKeyTest, KeysGreysBelowTheThresholdAndRampsAboveIt)
{
    const auto [threshold, softness] = GetParam();
    FrameRef grey = MakeFrame(256, 1);
    for (int i = 0; i < 256; ++i)
        Set(*grey, i, 0, {double(i), double(i), double(i), 255});
    const FrameRef result = Render(
        kMatch_LumaKey,
        {{"threshold", std::to_string(threshold)}, {"softness", std::to_string(softness)}}, grey);
    for (int i = 0; i < 256; ++i)
    {
        const double luma = i / 255.0, t = threshold / 100, s = softness / 100;
        const double alpha = luma <= t ? 0.0 : (s == 0 ? 1.0 : std::min(1.0, (luma - t) / s));
        ASSERT_NEAR(At(*result, i, 0, 3), alpha * 255, 0.5001) << "grey " << i;
        ASSERT_EQ(At(*result, i, 0, 0), i) << "colour is kept";
    }
}

INSTANTIATE_TEST_SUITE_P(Thresholds, LumaKeyTest,
                         ::testing::Values(LumaCase{30, 0}, LumaCase{50, 20}, LumaCase{5, 90},
                                           LumaCase{100, 0}));

// A 16x8 frame of opaque random pixels.
FrameRef Noise(mt::PixelFormat inFormat)
{
    std::mt19937 random(7);
    FrameRef frame = MakeFrame(16, 8, inFormat);
    for (int y = 0; y < 8; ++y)
        for (int x = 0; x < 16; ++x)
            Set(*frame, x, y,
                {double(random() % 256), double(random() % 256), double(random() % 256), 255});
    return frame;
}

TEST(EffectPixels, DefaultsLeaveThePictureAlone)
{
    const std::pair<std::string_view, std::map<std::string, std::string>> cases[] = {
        {kMatch_ProcAmp, {}},
        {kMatch_AlphaAdjust, {}},
        {kMatch_VideoLimiter, {}},
        {kMatch_Transform, {}},
        {kMatch_Crop, {}},
        {kMatch_GaussianBlur, {{"blurriness", "0"}}},
        {kMatch_MultiplyKey, {{"softness", "0"}}},
        {kMatch_CornerPin, {}},
        {kMatch_GarbageMatte, {}},
        {kMatch_MulticamHilite, {{"width", "0"}}}};
    for (const mt::PixelFormat format : kFormats)
        for (const auto& [match, params] : cases)
        {
            SCOPED_TRACE(std::string(match));
            const FrameRef source = Noise(format);
            const FrameRef result = Render(match, params, Noise(format));
            for (int y = 0; y < 8; ++y)
                for (int x = 0; x < 16; ++x)
                    for (int c = 0; c < 4; ++c)
                        ASSERT_NEAR(At(*result, x, y, c), At(*source, x, y, c), 1e-3)
                            << x << "," << y << " component " << c;
        }
}

TEST(EffectPixels, CropClearsTheEdgesOnly)
{
    const FrameRef result =
        Render(kMatch_Crop, {{"left", "20"}, {"top", "10"}, {"right", "30"}, {"bottom", "0"}},
               Noise(mt::kPixelFormat_BGRA_4444_8u));
    for (int y = 0; y < 8; ++y)
        for (int x = 0; x < 16; ++x)
        {
            // 20 % of 16 is 3 columns, 30 % is 5, 10 % of 8 rows is 1.
            const bool kept = x >= 3 && x < 11 && y >= 1;
            EXPECT_EQ(At(*result, x, y, 3), kept ? 255 : 0) << x << "," << y;
        }
}

TEST(EffectPixels, CornerPinAndGarbageMatteFollowTheirCorners)
{
    const FrameRef source = Noise(mt::kPixelFormat_BGRA_4444_8u);
    // Every corner moved by (4, 2) is a shift of the picture.
    BE::EffectSettings pin;
    pin.mMatchName = std::string(kMatch_CornerPin);
    for (const char* corner : {"upperLeft", "upperRight", "lowerRight", "lowerLeft"})
        pin.mKeyframedParams[corner] = BE::KeyframeCurve::Point({4, 2});
    FrameRef shifted = Noise(mt::kPixelFormat_BGRA_4444_8u);
    RenderContext context;
    ASSERT_EQ(CreateEffect(pin).mEffect->Render(context, shifted, {}), QRT::kResult_Success);
    for (int y = 0; y < 8; ++y)
        for (int x = 0; x < 16; ++x)
            for (int c = 0; c < 4; ++c)
                ASSERT_EQ(At(*shifted, x, y, c),
                          x >= 4 && y >= 2 ? At(*source, x - 4, y - 2, c) : 0.0)
                    << x << "," << y << " component " << c;

    // The left edge moved in by 4.5 pixels: a half-covered column, then the picture.
    BE::EffectSettings matte;
    matte.mMatchName = std::string(kMatch_GarbageMatte);
    matte.mKeyframedParams["upperLeft"] = matte.mKeyframedParams["lowerLeft"] =
        BE::KeyframeCurve::Point({4.5, 0});
    FrameRef matted = Noise(mt::kPixelFormat_BGRA_4444_8u);
    ASSERT_EQ(CreateEffect(matte).mEffect->Render(context, matted, {}), QRT::kResult_Success);
    for (int x = 0; x < 16; ++x)
        EXPECT_EQ(At(*matted, x, 3, 3), x < 4 ? 0 : (x == 4 ? 128 : 255)) << x;
}

TEST(EffectPixels, TimecodeDrawsTheFramesOwnTime)
{
    BE::EffectSettings settings;
    settings.mMatchName = std::string(kMatch_Timecode);
    settings.mParams = {{"size", "40"}, {"background", "0"}};
    const QRT::InterfaceRef<IEffect> effect = CreateEffect(settings).mEffect;
    EXPECT_TRUE(effect->IsTimeVariant());
    auto draw = [&](std::int64_t inFrame)
    {
        FrameRef frame = MakeFrame(160, 40);
        RenderContext context;
        context.mFrame = inFrame;
        EXPECT_EQ(effect->Render(context, frame, {}), QRT::kResult_Success);
        return std::vector<std::uint8_t>(static_cast<const std::uint8_t*>(frame->GetBaseAddress()),
                                         static_cast<const std::uint8_t*>(frame->GetBaseAddress()) +
                                             frame->GetDataSize());
    };
    const std::vector<std::uint8_t> first = draw(25 * 3600 + 1);
    EXPECT_EQ(draw(25 * 3600 + 1), first);
    EXPECT_NE(draw(25 * 3600 + 2), first);
    EXPECT_NE(std::count(first.begin(), first.end(), 255), 0) << "nothing was drawn";
}

TEST(EffectPixels, BlurKeepsAFlatFieldAndSpreadsALineEvenly)
{
    FrameRef line = MakeFrame(33, 3, mt::kPixelFormat_BGRA_4444_32f);
    for (int y = 0; y < 3; ++y)
        for (int x = 0; x < 33; ++x)
            Set(*line, x, y, {x == 16 ? 255.0 : 0.0, 40, 80, 255});
    const FrameRef result = Render(kMatch_GaussianBlur,
                                   {{"blurriness", "6"}, {"dimensions", "horizontal"}}, line, 0.5f);
    double total = 0;
    for (int x = 0; x < 33; ++x)
    {
        total += At(*result, x, 1, 0);
        EXPECT_NEAR(At(*result, x, 1, 1), 40, 1e-3) << "a flat component stays flat";
        EXPECT_NEAR(At(*result, x, 1, 0), At(*result, 32 - x, 1, 0), 1e-3) << x;
        if (x > 0 && x <= 16)
        {
            EXPECT_GE(At(*result, x, 1, 0), At(*result, x - 1, 1, 0)) << x;
        }
    }
    EXPECT_NEAR(total, 255, 0.05);
    // Blurriness 6 at half size is a standard deviation of 3 pixels.
    double variance = 0;
    for (int x = 0; x < 33; ++x)
        variance += At(*result, x, 1, 0) / 255 * (x - 16) * (x - 16);
    EXPECT_NEAR(std::sqrt(variance), 3.0, 0.25);

    // Down the columns: a row lit across 17 columns (a strip of sixteen and
    // one more) spreads alike in every column, at full size.
    FrameRef row = MakeFrame(17, 33, mt::kPixelFormat_BGRA_4444_32f);
    for (int y = 0; y < 33; ++y)
        for (int x = 0; x < 17; ++x)
            Set(*row, x, y, {y == 16 ? 255.0 : 0.0, 40, 80, 255});
    const FrameRef down = Render(kMatch_GaussianBlur, {{"blurriness", "3"}}, row);
    for (int y = 0; y < 33; ++y)
    {
        EXPECT_NEAR(At(*down, 0, y, 0), At(*down, 0, 32 - y, 0), 1e-3) << y;
        EXPECT_NEAR(At(*down, 16, y, 0), At(*down, 0, y, 0), 1e-3) << y;
        EXPECT_NEAR(At(*down, 7, y, 0), At(*down, 0, y, 0), 1e-3) << y;
    }
    EXPECT_GT(At(*down, 16, 13, 0), 1.0);
}

// The blur against a Gaussian convolution computed here in double precision
// (premultiplied, edge pixels repeated, out to six deviations), on a picture of
// odd size (strips and blocks with some left over) with hard edges and mixed
// alpha: within 1 code value on 8 bits (its rounding), and on floats within
// 0.01 for the sampled Gaussian below 1.5 pixels and 0.06 for the recursive
// filter from there on, in code values of premultiplied components.
TEST(EffectPixels, BlurIsAGaussianWithinItsTolerance)
{
    const int width = 37, height = 23;
    std::mt19937 random(7);
    std::vector<std::array<double, 4>> source(width * height);
    for (int i = 0; i < width * height; ++i)
    {
        const int block = (i % width) / 5 + (i / width / 4) * 8;
        random.seed(static_cast<unsigned>(block));
        source[i] = {double(random() % 256), double(random() % 256), double(random() % 256),
                     double(std::array{0, 128, 255, 255}[random() % 4])};
    }
    struct Case
    {
        double mSigma;
        const char* mDimensions;
        double mToleranceFloat;
    };
    const Case cases[] = {{0.7, "both", 0.01},  {1.2, "horizontal", 0.01}, {1.5, "vertical", 0.06},
                          {2.9, "both", 0.06},  {4.5, "horizontal", 0.06}, {9.0, "vertical", 0.06},
                          {24.0, "both", 0.06}, {400.0, "both", 0.06}};
    for (const Case& c : cases)
        for (const mt::PixelFormat format : kFormats)
        {
            SCOPED_TRACE(::testing::Message()
                         << c.mSigma << " " << c.mDimensions << " " << format.GetValue());
            FrameRef frame = MakeFrame(width, height, format);
            std::vector<std::array<double, 4>> expected(source);
            for (auto& p : expected)
                p = {p[0] * p[3] / 255, p[1] * p[3] / 255, p[2] * p[3] / 255, p[3]};
            for (int i = 0; i < width * height; ++i)
                Set(*frame, i % width, i / width, source[i]);
            const int radius = static_cast<int>(std::ceil(6 * c.mSigma));
            for (int pass = 0; pass < 2; ++pass)
            {
                const bool rows = pass == 0;
                if (std::string(c.mDimensions) == (rows ? "vertical" : "horizontal"))
                    continue;
                std::vector<std::array<double, 4>> blurred(expected.size());
                for (int y = 0; y < height; ++y)
                    for (int x = 0; x < width; ++x)
                    {
                        std::array<double, 4> sum{};
                        double total = 0;
                        for (int t = -radius; t <= radius; ++t)
                        {
                            const double w = std::exp(-0.5 * t * t / (c.mSigma * c.mSigma));
                            const int sx = rows ? std::clamp(x + t, 0, width - 1) : x;
                            const int sy = rows ? y : std::clamp(y + t, 0, height - 1);
                            for (int k = 0; k < 4; ++k)
                                sum[k] += w * expected[sy * width + sx][k];
                            total += w;
                        }
                        for (int k = 0; k < 4; ++k)
                            blurred[y * width + x][k] = sum[k] / total;
                    }
                expected = blurred;
            }
            const FrameRef result = Render(
                kMatch_GaussianBlur,
                {{"blurriness", std::to_string(c.mSigma)}, {"dimensions", c.mDimensions}}, frame);
            const double tolerance =
                format == mt::kPixelFormat_BGRA_4444_8u ? 1.0 : c.mToleranceFloat;
            double worst = 0;
            for (int i = 0; i < width * height; ++i)
            {
                const double alpha = At(*result, i % width, i / width, 3);
                for (int k = 0; k < 4; ++k)
                {
                    const double got =
                        At(*result, i % width, i / width, k) * (k < 3 ? alpha / 255 : 1);
                    worst = std::max(worst, std::abs(got - expected[i][k]));
                }
            }
            EXPECT_LE(worst, tolerance);
        }
}

TEST(EffectPixels, ASharedFrameIsNeverWrittenAndOtherFormatsAreStaged)
{
    for (const mt::PixelFormat format :
         {mt::kPixelFormat_BGRA_4444_8u, mt::kPixelFormat_BGRA_4444_32f,
          mt::kPixelFormat_VUYA_4444_8u})
    {
        SCOPED_TRACE(format.GetValue());
        FrameRef frame = MakeFrame(4, 2, format);
        std::memset(frame->GetWritableBaseAddress(), 100, frame->GetDataSize());
        if (format == mt::kPixelFormat_BGRA_4444_32f)
            for (int x = 0; x < 4; ++x)
                Set(*frame, x, 0, {100, 100, 100, 100});
        frame->MarkShared(1);
        const std::vector<std::uint8_t> before(
            static_cast<const std::uint8_t*>(frame->GetBaseAddress()),
            static_cast<const std::uint8_t*>(frame->GetBaseAddress()) + frame->GetDataSize());
        const FrameRef result = Render(kMatch_ProcAmp, {{"brightness", "30"}}, frame);
        EXPECT_NE(result.Get(), frame.Get());
        EXPECT_EQ(result->GetPixelFormat(), format);
        EXPECT_EQ(std::memcmp(frame->GetBaseAddress(), before.data(), before.size()), 0);
        EXPECT_NE(std::memcmp(result->GetBaseAddress(), before.data(), 4), 0);
    }
}

// A layer that answers one frame (or a status) and records the time asked.
class FakeLayer : public QRT::Implements<ILayerInput>
{
public:
    FakeLayer(FrameRef inFrame, QRT::Result inStatus)
        : mFrame(std::move(inFrame))
        , mStatus(inStatus)
    {
    }
    QRT::Result RenderLayer(mt::TickTime inTime, FrameRef& outFrame) override
    {
        mAsked = inTime;
        outFrame = mFrame;
        return mStatus;
    }
    mt::TickTime mAsked = mt::kTime_Invalid;

protected:
    ~FakeLayer() = default;

private:
    FrameRef mFrame;
    QRT::Result mStatus;
};

TEST(EffectPixels, MattesKeyByTheirLayerOrImage)
{
    // Red components against a layer of grey 100: differences 0, 20, 60, 100.
    const double reds[] = {100, 120, 160, 200};
    FrameRef grey = MakeFrame(4, 1);
    for (int x = 0; x < 4; ++x)
        Set(*grey, x, 0, {100, 100, 100, 255});
    for (const bool invert : {false, true})
    {
        SCOPED_TRACE(invert);
        FrameRef frame = MakeFrame(4, 1);
        for (int x = 0; x < 4; ++x)
            Set(*frame, x, 0, {100, 100, reds[x], 255});
        auto layer = QRT::Allocated<FakeLayer>::CreateInstance(grey, QRT::kResult_Success);
        const FrameRef result = Render(kMatch_DifferenceMatte,
                                       {{"layer", "1"},
                                        {"threshold", "10"},
                                        {"softness", "20"},
                                        {"invert", invert ? "true" : "false"}},
                                       frame, 1.0f, {QRT::InterfaceRef<ILayerInput>(layer.Get())});
        EXPECT_EQ(layer->mAsked, mt::TickTime::FromFrame(7, mt::kFrameRate_Video25));
        for (int x = 0; x < 4; ++x)
        {
            const double keep = std::clamp(((reds[x] - 100) / 255 - 0.1) / 0.2, 0.0, 1.0);
            EXPECT_NEAR(At(*result, x, 0, 3), 255 * (invert ? 1 - keep : keep), 1.0) << x;
        }
    }
    // An image matte reads its PNG (the opaque data; a relative name from the
    // settings' folder): luma of white and black.
    FrameRef image = MakeFrame(2, 1);
    Set(*image, 0, 0, {255, 255, 255, 255});
    Set(*image, 1, 0, {0, 0, 0, 255});
    const std::string folder = ::testing::TempDir();
    ASSERT_TRUE(VF::WritePngFile(folder + "/image-matte.png", image).Succeeded());
    for (const auto& [file, base, status, alphas] :
         {std::tuple{std::string("image-matte.png"), folder, QRT::kResult_Success,
                     std::array{255.0, 0.0}},
          std::tuple{folder + "/image-matte.png.missing", std::string(), VF::kResult_PngCannotOpen,
                     std::array{255.0, 255.0}}})
    {
        BE::EffectSettings settings;
        settings.mMatchName = kMatch_ImageMatte;
        settings.mParams = {{"using", "luma"}};
        settings.mBaseFolder = base;
        settings.mOpaqueData = MF::BinaryData(file.data(), file.size());
        FrameRef frame = MakeFrame(2, 1);
        Set(*frame, 0, 0, {10, 20, 30, 255});
        Set(*frame, 1, 0, {10, 20, 30, 255});
        EXPECT_EQ(CreateEffect(settings).mEffect->Render({}, frame, {}), status);
        EXPECT_EQ(At(*frame, 0, 0, 3), alphas[0]);
        EXPECT_EQ(At(*frame, 1, 0, 3), alphas[1]);
    }

    // A layer's failure is the effect's.
    auto failing = QRT::Allocated<FakeLayer>::CreateInstance(FrameRef(), QRT::kResult_NotFound);
    Render(kMatch_TrackMatte, {{"matte", "1"}}, MakeFrame(2, 1), 1.0f,
           {QRT::InterfaceRef<ILayerInput>(failing.Get())}, QRT::kResult_NotFound);
}

} // namespace
} // namespace FX
