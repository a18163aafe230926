// The host transitions: the catalogue's reading of settings, and the pixels of
// each kind checked against values computed here from the kind's geometry.

#include "TX/TransitionCatalogue.h"
#include "VF/VideoFrame.h"
#include "mvxmediatypes/PixelFormat.h"

#include <array>
#include <cmath>
#include <functional>
#include <map>
#include <string>

#include <gtest/gtest.h>

namespace
{

namespace mt = mvxmediatypes;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;
using Pixel = std::array<int, 4>; // B, G, R, A
using Params = std::map<std::string, std::string>;

TX::TransitionCreation Create(const std::string& inMatch, const Params& inParams = {},
                              bool inReverse = false)
{
    BE::TransitionSettings settings;
    settings.mMatchName = inMatch;
    settings.mStart = mt::TickTime::FromFrame(2, mt::kFrameRate_Video25);
    settings.mEnd = mt::TickTime::FromFrame(12, mt::kFrameRate_Video25);
    settings.mReverse = inReverse;
    settings.mParams = inParams;
    return TX::CreateTransition(settings);
}

// An 8-bit BGRA frame whose pixels inPaint gives.
FrameRef Frame(std::uint32_t inWidth, std::uint32_t inHeight,
               const std::function<Pixel(int, int)>& inPaint)
{
    FrameRef frame = VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, inWidth, inHeight,
                                          mt::kPixelAspectRatio_Square, false, false);
    auto* base = static_cast<std::uint8_t*>(frame->GetWritableBaseAddress());
    for (int y = 0; y < int(inHeight); ++y)
        for (int x = 0; x < int(inWidth); ++x)
            for (int c = 0; c < 4; ++c)
                base[y * frame->GetRowBytes() + x * 4 + c] =
                    static_cast<std::uint8_t>(inPaint(x, y)[c]);
    return frame;
}

Pixel At(const MF::IVideoFrame& inFrame, int inX, int inY)
{
    const auto* base = static_cast<const std::uint8_t*>(inFrame.GetBaseAddress());
    const std::uint8_t* p = base + inY * inFrame.GetRowBytes() + inX * 4;
    return {p[0], p[1], p[2], p[3]};
}

FrameRef Render(const std::string& inMatch, const Params& inParams, const FrameRef& inA,
                const FrameRef& inB, float inProgress, bool inReverse = false,
                TX::TransitionFrameSettings inFrame = {})
{
    const TX::TransitionCreation made = Create(inMatch, inParams, inReverse);
    EXPECT_EQ(made.mError, "");
    const MF::IVideoFrame& shape = inA ? *inA : *inB;
    FrameRef out = VF::CreateVideoFrame(shape.GetPixelFormat(), shape.GetBounds().Width(),
                                        shape.GetBounds().Height(), mt::kPixelAspectRatio_Square,
                                        false, false);
    EXPECT_EQ(made.mTransition->Render(inA.Get(), inB.Get(), *out, inProgress,
                                       made.mTransition->GetParameters(), inFrame, 4),
              QRT::kResult_Success);
    return out;
}

const Pixel kA{10, 200, 60, 255};
const Pixel kB{250, 0, 120, 255};
const Pixel kRed{0, 0, 255, 255};

TEST(TransitionCatalogueTest, MakesEveryKindAndRefusesWhatItCannotRead)
{
    struct Case
    {
        std::string mMatch;
        Params mParams;
        std::string mError; // empty: made
    };
    const Case cases[] = {
        {"TX.CrossDissolve", {}, ""},
        {"TX.DipToBlack", {{"start", "10"}}, ""},
        {"TX.DipToWhite", {{"switch", "1"}}, ""},
        {"TX.Wipe", {{"direction", "top"}, {"border", "3"}, {"softness", "2"}}, ""},
        {"TX.Push", {{"direction", "right"}}, ""},
        {"TX.Slide", {{"direction", "bottom"}}, ""},
        {"TX.Iris", {{"centre", "0.25,0.75"}, {"borderColor", "#102030"}}, ""},
        {"TX.Nope", {}, "unknown transition match name \"TX.Nope\""},
        {"TX.Wipe", {{"softnes", "2"}}, "parameter \"softnes\" is not a parameter"},
        {"TX.CrossDissolve", {{"border", "2"}}, "parameter \"border\" is not a parameter"},
        {"TX.Wipe", {{"direction", "up"}}, "is not left, right, top or bottom: \"up\""},
        {"TX.Wipe", {{"border", "wide"}}, "\"border\" is not a number: \"wide\""},
        {"TX.Iris", {{"centre", "0.5"}}, "\"centre\" is not a point"},
        {"TX.Iris", {{"borderColor", "red"}}, "\"borderColor\" is not a colour"},
        {"TX.Push", {{"switch", "maybe"}}, "\"switch\" is not a boolean"},
    };
    for (const Case& c : cases)
    {
        SCOPED_TRACE(c.mMatch + " " + c.mError);
        const TX::TransitionCreation made = Create(c.mMatch, c.mParams);
        EXPECT_NE(made.mError.find(c.mError), std::string::npos) << made.mError;
        EXPECT_EQ(bool(made.mTransition), c.mError.empty());
        if (made.mTransition)
        {
            EXPECT_EQ(made.mTransition->GetMatchName(), c.mMatch);
        }
    }
}

TEST(TransitionCatalogueTest, ReadsSettingsAndClampsNumbersWithWarnings)
{
    const TX::TransitionCreation made = Create("TX.Wipe",
                                               {{"start", "-10"},
                                                {"end", "150"},
                                                {"direction", "bottom"},
                                                {"border", "6"},
                                                {"borderColor", "#80FF0000"},
                                                {"antialias", "0"},
                                                {"softness", "3"}},
                                               true);
    ASSERT_TRUE(made.mTransition);
    EXPECT_EQ(made.mWarnings.size(), 2u);
    const TX::TransitionParameters& p = made.mTransition->GetParameters();
    EXPECT_EQ(p.mStartPercent, 0.0f);
    EXPECT_EQ(p.mEndPercent, 100.0f);
    EXPECT_EQ(p.mDirection, TX::kTransitionDirection_FromBottom);
    EXPECT_EQ(p.mBorderWidth, 6.0f);
    EXPECT_EQ(p.mBorderColor, 0x80FF0000u);
    EXPECT_EQ(p.mAntiAliasQuality, 0);
    EXPECT_TRUE(p.mReverse);
    EXPECT_EQ(p.mDuration, mt::TickTime::FromFrame(10, mt::kFrameRate_Video25));
    // Softness is carried as the opaque data: another softness, other data.
    const TX::TransitionCreation softer = Create("TX.Wipe", {{"softness", "4"}});
    EXPECT_FALSE(made.mTransition->GetOpaqueData() == softer.mTransition->GetOpaqueData());
    EXPECT_NE(made.mTransition->GetParameters().mInstanceNumber,
              softer.mTransition->GetParameters().mInstanceNumber);
}

// A wipe half way with a 10-pixel border over 100 pixels: the edge stands at
// 0.5 * (100 + 10) - 10 = 45, so 45 pixels of the entering side, then the
// border up to 55, then the other picture.
TEST(TransitionPixelTest, WipeAtHalfWithBorderSplitsTheFrameAtTheEdge)
{
    struct Case
    {
        const char* mDirection;
        bool mReverse;
        bool mAlongX;
        bool mFromLow; // the direction's side is x or y = 0
    };
    const Case cases[] = {
        {"left", false, true, true},     {"right", false, true, false}, {"top", false, false, true},
        {"bottom", false, false, false}, {"left", true, true, true},    {"top", true, false, true},
    };
    const FrameRef a = Frame(100, 100, [](int, int) { return kA; });
    const FrameRef b = Frame(100, 100, [](int, int) { return kB; });
    for (const Case& c : cases)
    {
        SCOPED_TRACE(std::string(c.mDirection) + (c.mReverse ? " reversed" : ""));
        const FrameRef out = Render(
            "TX.Wipe", {{"direction", c.mDirection}, {"border", "10"}, {"borderColor", "#FF0000"}},
            a, b, 0.5f, c.mReverse);
        for (int at = 0; at < 100; ++at)
        {
            const int s = c.mFromLow ? at : 99 - at;
            // Reversed, the outgoing picture stays on the direction's side
            // and the incoming one enters from the far side.
            const Pixel& near = c.mReverse ? kA : kB;
            const Pixel& far = c.mReverse ? kB : kA;
            const Pixel& expected = s < 45 ? near : s < 55 ? kRed : far;
            ASSERT_EQ(At(*out, c.mAlongX ? at : 50, c.mAlongX ? 50 : at), expected) << at;
        }
    }
}

TEST(TransitionPixelTest, DissolvesAndDipsMixWithTheirWeights)
{
    struct Case
    {
        const char* mMatch;
        Params mParams;
        float mProgress;
        double mWeightB;     // of B
        double mWeightColor; // of the dip colour
        int mColor;          // 0 black, 255 white
    };
    const Case cases[] = {
        {"TX.CrossDissolve", {}, 0.0f, 0.0, 0.0, 0},
        {"TX.CrossDissolve", {}, 0.48f, 0.48, 0.0, 0},
        {"TX.CrossDissolve", {}, 1.0f, 1.0, 0.0, 0},
        {"TX.CrossDissolve", {{"start", "20"}, {"end", "60"}}, 0.5f, 0.4, 0.0, 0},
        {"TX.CrossDissolve", {{"switch", "1"}}, 0.25f, 0.75, 0.0, 0},
        {"TX.DipToBlack", {}, 0.25f, 0.0, 0.5, 0},
        {"TX.DipToBlack", {}, 0.75f, 0.5, 0.5, 0},
        {"TX.DipToWhite", {}, 0.4f, 0.0, 0.8, 255},
    };
    const FrameRef a = Frame(16, 2, [](int x, int) { return Pixel{x * 16, 200, 60, 255}; });
    const FrameRef b = Frame(16, 2, [](int x, int) { return Pixel{250 - x * 8, 0, 120, 255}; });
    for (const Case& c : cases)
    {
        SCOPED_TRACE(std::string(c.mMatch) + " at " + std::to_string(c.mProgress));
        const FrameRef out = Render(c.mMatch, c.mParams, a, b, c.mProgress);
        for (int x = 0; x < 16; ++x)
            for (int ch = 0; ch < 4; ++ch)
            {
                const double color = ch == 3 ? 255 : c.mColor;
                const double expected = At(*a, x, 1)[ch] * (1 - c.mWeightB - c.mWeightColor) +
                                        At(*b, x, 1)[ch] * c.mWeightB + color * c.mWeightColor;
                ASSERT_NEAR(At(*out, x, 1)[ch], expected, 1.0) << "x " << x << " channel " << ch;
            }
    }
}

// Pixels of A are 10 + x, of B 100 + x: the output names its sources.
TEST(TransitionPixelTest, PushAndSlideMoveWholePixels)
{
    struct Case
    {
        const char* mMatch;
        const char* mDirection;
        std::array<int, 8> mSources;
    };
    const Case cases[] = {
        {"TX.Push", "left", {106, 107, 10, 11, 12, 13, 14, 15}},
        {"TX.Push", "right", {12, 13, 14, 15, 16, 17, 100, 101}},
        {"TX.Slide", "left", {106, 107, 12, 13, 14, 15, 16, 17}},
        {"TX.Slide", "right", {10, 11, 12, 13, 14, 15, 100, 101}},
    };
    const FrameRef a = Frame(8, 1, [](int x, int) { return Pixel{10 + x, 0, 0, 255}; });
    const FrameRef b = Frame(8, 1, [](int x, int) { return Pixel{100 + x, 0, 0, 255}; });
    for (const Case& c : cases)
    {
        SCOPED_TRACE(std::string(c.mMatch) + " " + c.mDirection);
        const FrameRef out = Render(c.mMatch, {{"direction", c.mDirection}}, a, b, 0.25f);
        for (int x = 0; x < 8; ++x)
            EXPECT_EQ(At(*out, x, 0)[0], c.mSources[x]) << x;
    }
    // Vertically: B's bottom row enters at the top and pushes A down.
    const FrameRef ta = Frame(1, 4, [](int, int y) { return Pixel{10 + y, 0, 0, 255}; });
    const FrameRef tb = Frame(1, 4, [](int, int y) { return Pixel{100 + y, 0, 0, 255}; });
    const FrameRef pushed = Render("TX.Push", {{"direction", "top"}}, ta, tb, 0.25f);
    const int rows[] = {103, 10, 11, 12};
    for (int y = 0; y < 4; ++y)
        EXPECT_EQ(At(*pushed, 0, y)[0], rows[y]) << y;
}

TEST(TransitionPixelTest, IrisGrowsFromItsCentre)
{
    const FrameRef a = Frame(64, 64, [](int, int) { return kA; });
    const FrameRef b = Frame(64, 64, [](int, int) { return kB; });
    struct Case
    {
        Params mParams;
        float mProgress;
        std::array<int, 2> mPoint;
        Pixel mExpected;
    };
    // Centred, the farthest corner is 32 * sqrt(2) = 45.25 away; at 0.5 the
    // radius is 22.6.
    const Case cases[] = {
        {{}, 0.0f, {32, 32}, kA},
        {{}, 0.5f, {32, 32}, kB},
        {{}, 0.5f, {32 + 21, 32}, kB},
        {{}, 0.5f, {32 + 24, 32}, kA},
        {{}, 0.5f, {0, 0}, kA},
        {{}, 1.0f, {0, 0}, kB},
        {{{"centre", "0,0"}}, 0.3f, {1, 1}, kB},
        {{{"centre", "0,0"}}, 0.3f, {63, 63}, kA},
    };
    for (const Case& c : cases)
    {
        SCOPED_TRACE(std::to_string(c.mProgress) + " at " + std::to_string(c.mPoint[0]));
        EXPECT_EQ(At(*Render("TX.Iris", c.mParams, a, b, c.mProgress), c.mPoint[0], c.mPoint[1]),
                  c.mExpected);
    }
}

// An absent input is transparent: in straight alpha the other picture keeps
// its colour and loses coverage; in premultiplied float every channel fades.
TEST(TransitionPixelTest, AbsentInputFadesToTransparent)
{
    const FrameRef a = Frame(4, 1, [](int, int) { return kA; });
    const Pixel faded = At(*Render("TX.CrossDissolve", {}, a, {}, 0.25f), 1, 0);
    EXPECT_EQ(faded, (Pixel{kA[0], kA[1], kA[2], 191}));
    const Pixel fadedIn = At(*Render("TX.CrossDissolve", {}, {}, a, 0.25f), 1, 0);
    EXPECT_EQ(fadedIn, (Pixel{kA[0], kA[1], kA[2], 64}));

    FrameRef linear = VF::CreateVideoFrame(mt::kPixelFormat_BGRP_4444_32f_Linear, 4, 1,
                                           mt::kPixelAspectRatio_Square, false, false);
    auto* values = static_cast<float*>(linear->GetWritableBaseAddress());
    std::fill(values, values + 16, 0.8f);
    const FrameRef out = Render("TX.CrossDissolve", {}, linear, {}, 0.25f);
    const auto* mixed = static_cast<const float*>(out->GetBaseAddress());
    for (int i = 0; i < 16; ++i)
        EXPECT_FLOAT_EQ(mixed[i], 0.6f) << i;
}

TEST(TransitionPixelTest, InterlacedOutputRendersEachFieldAtItsProgress)
{
    const FrameRef a = Frame(2, 4, [](int, int) { return kA; });
    const FrameRef b = Frame(2, 4, [](int, int) { return kB; });
    for (const auto& [field, firstRow] :
         {std::pair{mt::kFieldType_UpperFirst, 0}, std::pair{mt::kFieldType_LowerFirst, 1}})
    {
        TX::TransitionFrameSettings settings;
        settings.mFieldType = field;
        settings.mSecondFieldProgress = 1.0f;
        const FrameRef out = Render("TX.CrossDissolve", {}, a, b, 0.0f, false, settings);
        for (int y = 0; y < 4; ++y)
            EXPECT_EQ(At(*out, 0, y), (y % 2 == firstRow) ? kA : kB) << y;
    }
}

TEST(TransitionPixelTest, RefusesFramesOfAnotherShape)
{
    const FrameRef a = Frame(4, 2, [](int, int) { return kA; });
    const FrameRef small = Frame(2, 2, [](int, int) { return kB; });
    const TX::TransitionCreation made = Create("TX.CrossDissolve");
    FrameRef out = VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, 4, 2,
                                        mt::kPixelAspectRatio_Square, false, false);
    EXPECT_EQ(made.mTransition->Render(a.Get(), small.Get(), *out, 0.5f,
                                       made.mTransition->GetParameters(), {}, 4),
              TX::kResult_FramesDoNotMatch);
}

} // namespace
