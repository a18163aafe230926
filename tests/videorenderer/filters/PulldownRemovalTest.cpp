// Pulldown removal: four distinct film frames telecined into ten fields with
// every cadence phase come back exactly, whole ones as the upstream frame
// itself, split ones from the current and previous upstream frames.

#include "FilterTestSources.h"
#include "ML/RenderableSourceFilters.h"
#include "VF/VideoFrameManipulators.h"

#include <array>

#include <gtest/gtest.h>

namespace
{

using namespace FilterTest;
using SourceRef = QRT::InterfaceRef<ML::IRenderableSource>;

// The picture of film frame inFilm: distinct in every pixel and every film.
Pixel FilmPixel(std::int64_t inFilm, std::int32_t inX, std::int32_t inY)
{
    return Pixel{static_cast<std::uint8_t>(inFilm * 50 + inY * 3 + inX),
                 static_cast<std::uint8_t>(inFilm * 31 + inY),
                 static_cast<std::uint8_t>(100 + inFilm), 255};
}

std::int64_t FloorDiv(std::int64_t inValue, std::int64_t inDivisor)
{
    const std::int64_t quotient = inValue / inDivisor;
    return (inValue % inDivisor < 0) ? quotient - 1 : quotient;
}

// 29.97 video that carries film with 2:3 pulldown in the given cadence.
// Standard-definition heights (up to 576 rows) are lower field first, taller
// ones upper field first. Field g of the material (g = 0 the first field of
// video frame 0) shows the rows of its parity of the film frame it carries.
class TelecineSource : public LoggingSource
{
public:
    TelecineSource(mvxmediatypes::PulldownCadence inCadence, std::uint32_t inWidth,
                   std::uint32_t inHeight)
        : mPhase(inCadence - mvxmediatypes::kPulldownCadence_23_AA)
        , mWidth(inWidth)
        , mHeight(inHeight)
        , mOrder(inHeight <= 576 ? mvxmediatypes::kFieldType_LowerFirst
                                 : mvxmediatypes::kFieldType_UpperFirst)
    {
    }

    // The film frame that field inField carries: cycle A A B B B C C D D D,
    // film 0 being the first film frame whose first field is at or after field 0.
    std::int64_t FilmOfField(std::int64_t inField) const
    {
        static constexpr std::array<std::int64_t, 10> kLetters = {0, 0, 1, 1, 1, 2, 2, 3, 3, 3};
        const std::int64_t position = inField + 2 * mPhase;
        const std::int64_t cycle = FloorDiv(position, 10);
        return 4 * cycle + kLetters[static_cast<std::size_t>(position - 10 * cycle)] - mPhase;
    }

    void ConformFrameTime(const MF::FrameTime& inRequested, const ML::CutlistRenderParams&,
                          MF::FrameTime& outConformed) override
    {
        outConformed = MF::FrameTime::Make(
            inRequested.GetTime().AlignToFrame(mvxmediatypes::kFrameRate_Video2997), mOrder,
            Ticks(kField));
    }

    void RenderFrame(const MF::FrameTime& inTime, const ML::CutlistRenderParams& inParams,
                     FrameRef& outFrame) override
    {
        MF::FrameTime conformed;
        ConformFrameTime(inTime, inParams, conformed);
        const std::int64_t video = conformed.GetTime().GetTicks() / kFrame;
        // The earlier field (2 x video) lies in slot 1 when upper first.
        const std::int32_t earlierSlot = mOrder == mvxmediatypes::kFieldType_UpperFirst ? 1 : 2;
        FrameRef frame = MakeFrame(mWidth, mHeight,
                                   [&](std::int32_t inX, std::int32_t inY)
                                   {
                                       const std::int32_t slot = inY % 2 == 0 ? 1 : 2;
                                       const std::int64_t field =
                                           2 * video + (slot == earlierSlot ? 0 : 1);
                                       return FilmPixel(FilmOfField(field), inX, inY);
                                   });
        frame->SetFieldType(mOrder);
        frame->MarkShared(1);
        Log(conformed, frame);
        outFrame = frame;
    }

    void GetFrameRate(mvxmediatypes::FrameRate& outRate) override
    {
        outRate = mvxmediatypes::kFrameRate_Video2997;
    }
    void GetFieldRate(mvxmediatypes::FrameRate& outRate) override
    {
        outRate = mvxmediatypes::kFrameRate_Video5994;
    }

private:
    const std::int64_t mPhase;
    const std::uint32_t mWidth;
    const std::uint32_t mHeight;
    const mvxmediatypes::FieldType mOrder;
};

class PulldownRemovalTest : public ::testing::TestWithParam<std::uint32_t>
{
protected:
    static constexpr std::int64_t kFilmFrame = kFrame * 5 / 4;

    // Removes the pulldown of each cadence and compares the four film frames.
    static void ExpectFilmFramesBack(std::uint32_t inWidth, std::uint32_t inHeight)
    {
        for (std::int32_t cadence = mvxmediatypes::kPulldownCadence_23_AA;
             cadence <= mvxmediatypes::kPulldownCadence_23_DD; ++cadence)
        {
            SCOPED_TRACE(testing::Message() << "cadence " << cadence);
            auto telecine = QRT::Allocated<TelecineSource>::CreateInstance(
                static_cast<mvxmediatypes::PulldownCadence>(cadence), inWidth, inHeight);
            const SourceRef filter = ML::RemovePulldownFromSource(
                telecine, static_cast<mvxmediatypes::PulldownCadence>(cadence));
            const ML::CutlistRenderParams params = MakeParams(inWidth, inHeight);
            std::size_t splits = 0;
            for (std::int64_t film = 0; film < 4; ++film)
            {
                const MF::FrameTime request(Ticks(film * kFilmFrame));
                MF::FrameTime conformed;
                filter->ConformFrameTime(MF::FrameTime(Ticks(film * kFilmFrame + 7)), params,
                                         conformed);
                EXPECT_EQ(conformed, request);

                const std::size_t rendersBefore = telecine->Rendered().size();
                const std::size_t prefetchesBefore = telecine->Prefetched().size();
                ML::RenderableNodePrefetchList prefetches;
                filter->CollectPrefetches(request, params, prefetches);
                FrameRef frame;
                filter->RenderFrame(request, params, frame);
                ASSERT_TRUE(frame);
                const std::vector<MF::FrameTime> rendered = telecine->Rendered();
                const std::vector<MF::FrameTime> prefetched = telecine->Prefetched();
                // Prefetching asks for the frames rendering uses, current then previous.
                ASSERT_EQ(prefetched.size() - prefetchesBefore, rendered.size() - rendersBefore);
                for (std::size_t i = rendersBefore; i < rendered.size(); ++i)
                    EXPECT_EQ(prefetched[prefetchesBefore + (i - rendersBefore)], rendered[i]);
                if (rendered.size() - rendersBefore == 2)
                {
                    ++splits;
                    EXPECT_EQ(rendered[rendersBefore + 1].GetTime() + Ticks(kFrame),
                              rendered[rendersBefore].GetTime());
                }
                else
                {
                    ASSERT_EQ(rendered.size() - rendersBefore, 1u);
                    EXPECT_TRUE(frame == telecine->LastFrame());
                }
                for (std::int32_t y = 0; y < static_cast<std::int32_t>(inHeight); ++y)
                    for (std::int32_t x = 0; x < static_cast<std::int32_t>(inWidth); ++x)
                        ASSERT_EQ(ReadPixel(*frame, x, y), FilmPixel(film, x, y))
                            << "film " << film << " row " << y << " column " << x;
            }
            // One of every four film frames is split over two video frames.
            EXPECT_EQ(splits, 1u);
        }
    }
};

TEST_P(PulldownRemovalTest, FourTelecinedFilmFramesComeBackExactlyInEveryCadence)
{
    ExpectFilmFramesBack(4, GetParam());
}

// 6 rows: standard definition, lower field first; 578 rows: taller than 576,
// upper field first, where the split frame's fields come the other way round.
INSTANTIATE_TEST_SUITE_P(Heights, PulldownRemovalTest, ::testing::Values(6u, 578u));

TEST(PulldownRemovalRates, FilmRateOver2997MaterialIs23976)
{
    auto telecine = QRT::Allocated<TelecineSource>::CreateInstance(
        mvxmediatypes::kPulldownCadence_23_AA, 4u, 6u);
    const SourceRef filter =
        ML::RemovePulldownFromSource(telecine, mvxmediatypes::kPulldownCadence_23_AA);
    mvxmediatypes::FrameRate rate;
    filter->GetFrameRate(rate);
    EXPECT_EQ(rate, mvxmediatypes::kFrameRate_Video2398);
    filter->GetFieldRate(rate);
    EXPECT_EQ(rate, mvxmediatypes::kFrameRate_Video2398);
}

// Hands on the frames of another source converted to 4:2:2 with the fields
// stored apart (a format copied field by field).
class FieldsStoredApartSource : public LoggingSource
{
public:
    explicit FieldsStoredApartSource(const QRT::InterfaceRef<ML::IRenderableSource>& inUpstream)
        : mUpstream(inUpstream)
    {
    }
    void ConformFrameTime(const MF::FrameTime& inRequested, const ML::CutlistRenderParams& inParams,
                          MF::FrameTime& outConformed) override
    {
        mUpstream->ConformFrameTime(inRequested, inParams, outConformed);
    }
    void RenderFrame(const MF::FrameTime& inTime, const ML::CutlistRenderParams& inParams,
                     FrameRef& outFrame) override
    {
        FrameRef frame;
        mUpstream->RenderFrame(inTime, inParams, frame);
        outFrame = ToFieldsApart(frame);
        outFrame->SetFieldType(frame->GetFieldType());
        outFrame->MarkShared(1);
    }
    void GetFrameRate(mvxmediatypes::FrameRate& outRate) override
    {
        mUpstream->GetFrameRate(outRate);
    }
    void GetFieldRate(mvxmediatypes::FrameRate& outRate) override
    {
        mUpstream->GetFieldRate(outRate);
    }

    static FrameRef ToFieldsApart(const FrameRef& inFrame)
    {
        const QRT::ParamRect bounds = inFrame->GetBounds();
        FrameRef fields = VF::CreateVideoFrame(
            mvxmediatypes::kPixelFormat_YUYV_422_8u_Fields,
            static_cast<std::uint32_t>(bounds.Width()), static_cast<std::uint32_t>(bounds.Height()),
            mvxmediatypes::kPixelAspectRatio_Square, false, false);
        EXPECT_GE(VF::VideoFrameManipulators::CopyFrame(inFrame, fields,
                                                        mvxmediatypes::kRenderQuality_High),
                  0);
        return fields;
    }

private:
    const QRT::InterfaceRef<ML::IRenderableSource> mUpstream;
};

TEST(PulldownRemovalFieldsApart, ASplitFilmFrameInAFieldByFieldFormatIsAssembledFromBothFrames)
{
    for (const std::uint32_t height : {6u, 578u})
    {
        const auto cadence = mvxmediatypes::kPulldownCadence_23_AA;
        auto telecine = QRT::Allocated<TelecineSource>::CreateInstance(cadence, 4u, height);
        auto apart = QRT::Allocated<FieldsStoredApartSource>::CreateInstance(telecine);
        const SourceRef filter = ML::RemovePulldownFromSource(apart, cadence);
        ML::CutlistRenderParams params = MakeParams(4, height);
        params.mPixelFormat = mvxmediatypes::kPixelFormat_YUYV_422_8u_Fields;
        // Film frame 2 (C) of cadence AA is split over video frames 2 and 3.
        const std::int64_t film = 2;
        FrameRef frame;
        filter->RenderFrame(MF::FrameTime(Ticks(film * kFrame * 5 / 4)), params, frame);
        ASSERT_TRUE(frame);
        ASSERT_EQ(telecine->Rendered().size(), 2u);
        EXPECT_EQ(frame->GetPixelFormat(), mvxmediatypes::kPixelFormat_YUYV_422_8u_Fields);
        const FrameRef expected = FieldsStoredApartSource::ToFieldsApart(MakeFrame(
            4, height,
            [&](std::int32_t inX, std::int32_t inY) { return FilmPixel(film, inX, inY); }));
        const auto toBGRA = [&](const FrameRef& inFrame)
        {
            FrameRef bgra =
                MakeFrame(4, height, [](std::int32_t, std::int32_t) { return Pixel{}; });
            EXPECT_GE(VF::VideoFrameManipulators::CopyFrame(inFrame, bgra,
                                                            mvxmediatypes::kRenderQuality_High),
                      0);
            return bgra;
        };
        const FrameRef got = toBGRA(frame);
        const FrameRef want = toBGRA(expected);
        for (std::int32_t y = 0; y < static_cast<std::int32_t>(height); ++y)
            for (std::int32_t x = 0; x < 4; ++x)
                ASSERT_EQ(ReadPixel(*got, x, y), ReadPixel(*want, x, y))
                    << "height " << height << " row " << y;
    }
}

} // namespace
