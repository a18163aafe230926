// Pulldown removal: four distinct film frames telecined into ten fields with
// every cadence phase come back exactly, whole ones as the upstream frame
// itself, split ones from the current and previous upstream frames.

#include "../sources/ScriptedSources.h"
#include "ML/RenderableSourceFilters.h"

#include <array>

namespace ML::Test
{
namespace
{

// The picture of film frame inFilm: distinct in every pixel and every film.
Pixel FilmPixel(std::int64_t inFilm, std::int32_t inX, std::int32_t inY)
{
    return Pixel{static_cast<std::uint8_t>(inFilm * 50 + inY * 3 + inX),
                 static_cast<std::uint8_t>(inFilm * 31 + inY),
                 static_cast<std::uint8_t>(100 + inFilm), 255};
}

// 29.97 video that carries film with 2:3 pulldown in the given cadence.
// Standard-definition heights (up to 576 rows) are lower field first, taller
// ones upper field first. Field g of the material (g = 0 the first field of
// video frame 0) shows the rows of its parity of the film frame it carries.
// With inFieldsApart, frames are handed on in 4:2:2 with the fields stored
// apart (a format copied field by field).
class TelecineSource : public LoggingSource
{
public:
    TelecineSource(mt::PulldownCadence inCadence, std::uint32_t inHeight, bool inFieldsApart)
        : mPhase(inCadence - mt::kPulldownCadence_23_AA)
        , mHeight(inHeight)
        , mOrder(inHeight <= 576 ? mt::kFieldType_LowerFirst : mt::kFieldType_UpperFirst)
        , mFieldsApart(inFieldsApart)
    {
    }

    // The film frame that field inField carries: cycle A A B B B C C D D D,
    // film 0 being the first film frame whose first field is at or after field 0.
    std::int64_t FilmOfField(std::int64_t inField) const
    {
        static constexpr std::array<std::int64_t, 10> kLetters = {0, 0, 1, 1, 1, 2, 2, 3, 3, 3};
        const std::int64_t position = inField + 2 * mPhase;
        const std::int64_t cycle = position >= 0 ? position / 10 : (position - 9) / 10;
        return 4 * cycle + kLetters[static_cast<std::size_t>(position - 10 * cycle)] - mPhase;
    }

    void ConformFrameTime(const MF::FrameTime& inRequested, const CutlistRenderParams&,
                          MF::FrameTime& outConformed) override
    {
        outConformed = MF::FrameTime::Make(
            inRequested.GetTime().AlignToFrame(mt::kFrameRate_Video2997), mOrder, Ticks(kField));
    }

    void RenderFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                     FrameRef& outFrame) override
    {
        MF::FrameTime conformed;
        ConformFrameTime(inTime, inParams, conformed);
        const std::int64_t video = conformed.GetTime().GetTicks() / kFrame;
        // The earlier field (2 x video) lies in slot 1 when upper first.
        const std::int32_t earlierSlot = mOrder == mt::kFieldType_UpperFirst ? 1 : 2;
        const auto pixel = [&](std::int32_t inX, std::int32_t inY)
        {
            const std::int32_t slot = inY % 2 == 0 ? 1 : 2;
            return FilmPixel(FilmOfField(2 * video + (slot == earlierSlot ? 0 : 1)), inX, inY);
        };
        const FrameRef frame = MakeFrame(4, mHeight, pixel);
        Deliver(conformed,
                mFieldsApart ? Converted(frame, mt::kPixelFormat_YUYV_422_8u_Fields) : frame,
                outFrame);
    }

    void GetFrameRate(FrameRate& outRate) override { outRate = mt::kFrameRate_Video2997; }
    void GetFieldRate(FrameRate& outRate) override { outRate = mt::kFrameRate_Video5994; }

private:
    const std::int64_t mPhase;
    const std::uint32_t mHeight;
    const mt::FieldType mOrder;
    const bool mFieldsApart;
};

QRT::InterfaceRef<TelecineSource> MakeTelecine(std::int32_t inCadence, std::uint32_t inHeight,
                                               bool inFieldsApart = false)
{
    return QRT::Allocated<TelecineSource>::CreateInstance(
        static_cast<mt::PulldownCadence>(inCadence), inHeight, inFieldsApart);
}

constexpr std::int64_t kFilmFrame = kFrame * 5 / 4;

// 6 rows: standard definition, lower field first; 578 rows: taller than 576,
// upper field first, where the split frame's fields come the other way round.
class PulldownRemovalTest : public ::testing::TestWithParam<std::uint32_t>
{
};

INSTANTIATE_TEST_SUITE_P(Heights, PulldownRemovalTest, ::testing::Values(6u, 578u));

TEST_P(PulldownRemovalTest, FourTelecinedFilmFramesComeBackExactlyInEveryCadence)
{
    const std::uint32_t height = GetParam();
    const CutlistRenderParams params = MakeParams(4, height);
    for (std::int32_t cadence = mt::kPulldownCadence_23_AA; cadence <= mt::kPulldownCadence_23_DD;
         ++cadence)
    {
        SCOPED_TRACE(testing::Message() << "cadence " << cadence);
        auto telecine = MakeTelecine(cadence, height);
        const SourceRef filter =
            RemovePulldownFromSource(telecine, static_cast<mt::PulldownCadence>(cadence));
        std::size_t splits = 0;
        for (std::int64_t film = 0; film < 4; ++film)
        {
            const MF::FrameTime request(Ticks(film * kFilmFrame));
            EXPECT_EQ(Conform(*filter, MF::FrameTime(Ticks(film * kFilmFrame + 7)), params),
                      request);
            const std::size_t before = telecine->Rendered().size();
            RenderableNodePrefetchList prefetches;
            filter->CollectPrefetches(request, params, prefetches);
            const FrameRef frame = Render(*filter, request, params);
            // Prefetching asks for the frames rendering uses, current then previous.
            const std::vector<MF::FrameTime> rendered = telecine->Rendered();
            EXPECT_EQ(telecine->Prefetched(), rendered);
            if (rendered.size() - before == 2)
            {
                ++splits;
                EXPECT_EQ(rendered[before + 1].GetTime() + Ticks(kFrame),
                          rendered[before].GetTime());
            }
            else
            {
                ASSERT_EQ(rendered.size() - before, 1u);
                EXPECT_TRUE(frame == telecine->LastFrame());
            }
            EXPECT_TRUE(PixelsAre(frame, [film](std::int32_t inX, std::int32_t inY)
                                  { return FilmPixel(film, inX, inY); }))
                << "film " << film;
        }
        // One of every four film frames is split over two video frames.
        EXPECT_EQ(splits, 1u);
        // Film rate over 29.97 material.
        EXPECT_EQ(RateOf(*filter), mt::kFrameRate_Video2398);
        EXPECT_EQ(FieldRateOf(*filter), mt::kFrameRate_Video2398);
    }
}

TEST_P(PulldownRemovalTest, ASplitFilmFrameInAFieldByFieldFormatIsAssembledFromBothFrames)
{
    const std::uint32_t height = GetParam();
    const auto fieldsFormat = mt::kPixelFormat_YUYV_422_8u_Fields;
    auto telecine = MakeTelecine(mt::kPulldownCadence_23_AA, height, true);
    const SourceRef filter = RemovePulldownFromSource(telecine, mt::kPulldownCadence_23_AA);
    // Film frame 2 (C) of cadence AA is split over video frames 2 and 3.
    const FrameRef frame = Render(*filter, MF::FrameTime(Ticks(2 * kFilmFrame)),
                                  MakeParams(4, height, 4, fieldsFormat));
    ASSERT_TRUE(frame);
    EXPECT_EQ(telecine->Rendered().size(), 2u);
    EXPECT_EQ(frame->GetPixelFormat(), fieldsFormat);
    // Compared after the same round trip through the fields format.
    const FrameRef want = Converted(Converted(MakeFrame(4, height,
                                                        [](std::int32_t inX, std::int32_t inY)
                                                        { return FilmPixel(2, inX, inY); }),
                                              fieldsFormat));
    EXPECT_TRUE(PixelsAre(Converted(frame), [&](std::int32_t inX, std::int32_t inY)
                          { return ReadPixel(*want, inX, inY); }));
}

} // namespace
} // namespace ML::Test
