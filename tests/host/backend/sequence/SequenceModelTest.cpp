// The sequence model: host interfaces by their identifiers, media kinds,
// item lookup, edits that share what they do not touch, and the builder's
// contracts.

#include "BE/MediaStatus.h"
#include "BE/Sequence.h"
#include "ContractExpect.h"
#include "SequenceTestSupport.h"

#include <gtest/gtest.h>

namespace
{

using namespace seqtest;
namespace mt = mvxmediatypes;

bool Answers(const QRT::InterfaceRef<QRT::QRTUnknown>& inObject, const std::string& inIID)
{
    void* found = nullptr;
    const bool ok = inObject->QueryInterface(QRT::Guid(inIID), &found) == QRT::kResult_Success;
    if (found)
        static_cast<QRT::QRTUnknown*>(found)->Release();
    return ok && found;
}

class SequenceModelTest : public ::testing::Test
{
protected:
    // Two tracks: bars 0-2 s and moving 3-5 s below, bars 1-4 s above.
    BE::SequenceRef Sample()
    {
        BE::SequenceBuilder builder("Main", {});
        builder.AddTrack();
        builder.AddTrack({true, true});
        builder.AddItem(0, Item(3, 5), mMoving);
        builder.AddItem(0, Item(0, 2), mBars);
        builder.AddItem(1, Item(1, 4), mBars);
        return builder.Build();
    }

    static BE::TrackItemRef ItemAt(const BE::SequenceRef& inSequence, std::size_t inTrack,
                                   std::size_t inItem)
    {
        return inSequence->GetTrackGroup(0)->GetTrack(inTrack)->GetItem(inItem);
    }

    BE::MediaRef mBars = Pattern("pattern:bars?size=64x36");
    BE::MediaRef mMoving = Pattern("pattern:moving?size=64x36&rate=50");
};

TEST_F(SequenceModelTest, ObjectsAnswerTheHostInterfaceIdentifiers)
{
    const BE::SequenceRef sequence = Sample();
    const BE::TrackItemRef item = ItemAt(sequence, 0, 0);
    const struct
    {
        QRT::InterfaceRef<QRT::QRTUnknown> mObject;
        std::string mIID;
    } cases[] = {
        {sequence, "{E602A75B-E7E2-47D8-BCA9-A9BF7E72D2FC}"},
        {sequence, "{CA40C1B8-DB43-4842-94DF-E6B80FAFAF87}"},
        {sequence->GetTrackGroup(0), "{F68DCD82-8805-11D5-AF2D-9BFA89D4DDD4}"},
        {item, "{064EC681-9BA6-11D5-AF2D-9CA32C7D6164}"},
        {item, BE::IClipSettings::kIID.ToString()},
        {item->GetMedia(), "{FC43A200-2BA6-4E99-A642-3A9B538CD72D}"},
        {item->GetMedia(), BE::IStillRanges::kIID.ToString()},
        {item->GetMedia()->GetVideoStream(0), BE::IMediaStream::kIID.ToString()},
    };
    for (const auto& c : cases)
        EXPECT_TRUE(Answers(c.mObject, c.mIID)) << c.mIID;
    EXPECT_FALSE(Answers(item, "{E602A75B-E7E2-47D8-BCA9-A9BF7E72D2FC}"));
}

TEST_F(SequenceModelTest, TracksKeepTimeOrderAndFindTheItemUnderATime)
{
    const BE::SequenceRef sequence = Sample();
    const auto bottom = sequence->GetTrackGroup(0)->GetTrack(0);
    EXPECT_EQ(bottom->GetItem(0)->GetMedia(), mBars);
    EXPECT_EQ(sequence->GetEnd(), Seconds(5));
    const struct
    {
        double mTime;
        int mItem; // -1: none
    } cases[] = {{-1, -1}, {0, 0}, {1.99, 0}, {2, -1}, {2.5, -1}, {3, 1}, {4.99, 1}, {5, -1}};
    for (const auto& c : cases)
    {
        SCOPED_TRACE(c.mTime);
        const BE::TrackItemRef found = bottom->FindItemAt(Seconds(c.mTime));
        EXPECT_EQ(found, c.mItem < 0 ? BE::TrackItemRef() : bottom->GetItem(std::size_t(c.mItem)));
    }
    const auto top = sequence->GetTrackGroup(0)->GetTrack(1);
    EXPECT_EQ(top->GetTrackIndex(), 1u);
    EXPECT_TRUE(top->GetTrackSettings().mMuted && top->GetTrackSettings().mLocked);
}

TEST_F(SequenceModelTest, EditingAnItemMakesNewVersionsOnlyOfWhatContainsIt)
{
    const BE::SequenceRef before = Sample();
    BE::TrackItemSettings changed = ItemAt(before, 0, 1)->GetSettings();
    changed.mClip.mSpeed = 2.0;
    const BE::SequenceRef after =
        BE::ReplaceTrackItem(before, 0, 1, BE::CreateTrackItem(changed, mMoving));

    EXPECT_NE(after, before);
    EXPECT_NE(after->GetTrackGroup(0), before->GetTrackGroup(0));
    EXPECT_NE(after->GetTrackGroup(0)->GetTrack(0), before->GetTrackGroup(0)->GetTrack(0));
    EXPECT_EQ(after->GetTrackGroup(0)->GetTrack(1), before->GetTrackGroup(0)->GetTrack(1));
    EXPECT_EQ(ItemAt(after, 0, 0), ItemAt(before, 0, 0));
    EXPECT_NE(ItemAt(after, 0, 1), ItemAt(before, 0, 1));
    EXPECT_EQ(ItemAt(after, 0, 1)->GetMedia(), ItemAt(before, 0, 1)->GetMedia());
    EXPECT_EQ(ItemAt(after, 0, 1)->GetClip()->GetClipSettings().mSpeed, 2.0);
    // The old version is untouched.
    EXPECT_EQ(ItemAt(before, 0, 1)->GetClip()->GetClipSettings().mSpeed, 1.0);
    EXPECT_FALSE(BE::SameSequence(*before, *after));
    EXPECT_TRUE(BE::SameSequence(*before, *Sample()));

    const BE::SequenceRef unlocked = BE::ReplaceTrackSettings(before, 1, {});
    EXPECT_FALSE(unlocked->GetTrackGroup(0)->GetTrack(1)->GetTrackSettings().mLocked);
    EXPECT_EQ(unlocked->GetTrackGroup(0)->GetTrack(1)->GetItem(0), ItemAt(before, 1, 0));
    EXPECT_EQ(unlocked->GetTrackGroup(0)->GetTrack(0), before->GetTrackGroup(0)->GetTrack(0));
}

TEST_F(SequenceModelTest, EditsAndBuildsRefuseOverlapsAndEmptyItems)
{
    const BE::SequenceRef sequence = Sample();
    vrtest::ExpectInputContract(
        [&] { BE::ReplaceTrackItem(sequence, 0, 0, BE::CreateTrackItem(Item(0, 3.5), mBars)); },
        "inItems[i - 1]->GetSettings().mEnd <= inItems[i]->GetSettings().mStart");
    vrtest::ExpectInputContract([&] { BE::CreateTrackItem(Item(2, 2), mBars); },
                                "inSettings.mEnd > inSettings.mStart");
    BE::TrackItemSettings stopped = Item(0, 1);
    stopped.mClip.mSpeed = 0.0;
    vrtest::ExpectInputContract(
        [&] { BE::CreateTrackItem(stopped, mBars); },
        "std::isfinite(speed) && speed != 0.0 && std::fabs(speed) <= kMaxClipSpeed");
}

TEST_F(SequenceModelTest, MediaKindsReportStreamsStillnessDurationAndStates)
{
    BE::MediaSettings solid;
    solid.mKind = BE::MediaKind::kSolid;
    solid.mColor = 0xFF336699u;
    solid.mStream = BE::StreamSettings{mt::kFrameRate_Video50, 32, 16};
    BE::MediaSettings missing;
    missing.mLocation = "/nonexistent/clip.y4m";
    missing.mDuration = Seconds(7);
    BE::MediaSettings pending = missing;
    pending.mLocation = "pattern:moving";
    pending.mKind = BE::MediaKind::kPattern;
    pending.mPending = true;
    pending.mDuration.reset();
    BE::SequenceSettings nestedSettings{mt::kFrameRate_Video2997, 720, 480,
                                        mt::PixelAspectRatio(10, 11), mt::kFieldType_LowerFirst};
    BE::SequenceBuilder nestedBuilder("Inner", nestedSettings);
    nestedBuilder.AddTrack();
    nestedBuilder.AddItem(0, Item(1, 6), mBars);
    const BE::SequenceRef inner = nestedBuilder.Build();
    BE::MediaSettings nested;
    nested.mKind = BE::MediaKind::kSequence;
    nested.mLocation = "Inner";

    const BE::MediaResult missingMade = BE::CreateMedia(missing);
    EXPECT_TRUE(missingMade.mMissing);
    EXPECT_TRUE(missingMade.mStatus.Succeeded());
    EXPECT_EQ(missingMade.mStatus.mMessage,
              "/nonexistent/clip.y4m: file not found; the media is offline");
    const struct
    {
        const char* mName;
        BE::MediaRef mMedia;
        bool mStill, mOffline, mPending, mHasSource;
        TickTime mDuration;
        std::int32_t mWidth;
        mt::FrameRate mRate;
    } cases[] = {
        {"bars", mBars, true, false, false, true, mt::kTime_Max, 64, mt::kFrameRate_Video25},
        {"moving", mMoving, false, false, false, true, mt::kTime_Max, 64, mt::kFrameRate_Video50},
        {"solid", Media(solid), true, false, false, true, mt::kTime_Max, 32,
         mt::kFrameRate_Video50},
        {"missing", missingMade.mMedia, false, true, false, false, Seconds(7), 1920,
         mt::kFrameRate_Video25},
        {"pending", Media(pending), false, false, true, false, mt::kTime_Max, 1920,
         mt::kFrameRate_Video25},
        {"nested", Media(nested, inner), false, false, false, false, Seconds(6), 720,
         mt::kFrameRate_Video2997},
    };
    for (const auto& c : cases)
    {
        SCOPED_TRACE(c.mName);
        const BE::MediaRef& media = c.mMedia;
        EXPECT_EQ(media->IsStill(), c.mStill);
        EXPECT_EQ(media->IsOffline(), c.mOffline);
        EXPECT_EQ(media->IsPending(), c.mPending);
        const auto stream = media->GetVideoStream(0);
        EXPECT_EQ(static_cast<bool>(stream->GetVideoSource()), c.mHasSource);
        EXPECT_EQ(stream->GetStreamSettings().mWidth, c.mWidth);
        EXPECT_EQ(stream->GetStreamSettings().mFrameRate, c.mRate);
        EXPECT_EQ(QRT::InterfaceRef<BE::IMediaDuration>(media)->GetDuration(), c.mDuration);
        MF::TickTimeRangeList ranges;
        QRT::InterfaceRef<BE::IStillRanges>(media)->GetStillRanges(Seconds(-1), Seconds(3), ranges);
        const MF::TickTimeRangeList still{{Seconds(0), Seconds(3)}};
        EXPECT_EQ(ranges, c.mStill ? still : MF::TickTimeRangeList());
    }
    const BE::MediaRef nestedMedia = cases[5].mMedia;
    EXPECT_EQ(nestedMedia->GetNestedSequence(), inner);
    EXPECT_EQ(nestedMedia->GetVideoStream(0)->GetStreamSettings().mFieldType,
              mt::kFieldType_LowerFirst);
    vrtest::ExpectInputContract(
        [&] { BE::CreateMedia(nested); },
        "(inSettings.mKind == MediaKind::kSequence) == static_cast<bool>(inNested)");
}

TEST_F(SequenceModelTest, UnreadableMaterialIsRefusedWithItsReason)
{
    BE::MediaSettings bad;
    bad.mKind = BE::MediaKind::kPattern;
    bad.mLocation = "pattern:stripes";
    const BE::MediaResult made = BE::CreateMedia(bad);
    EXPECT_FALSE(made.mMedia);
    EXPECT_EQ(made.mStatus.mResult, BE::kResult_BadPattern);
    EXPECT_NE(made.mStatus.mMessage.find("stripes"), std::string::npos);
}

} // namespace

namespace
{

TEST(ClipSettingsTest, TimeRemappingTextNamesEveryKeyAndIsEmptyWhenNotInUse)
{
    BE::ClipSettings clip;
    EXPECT_FALSE(clip.IsTimeRemapped());
    EXPECT_EQ(clip.GetTimeRemappingText(), "");
    clip.mTimeRemapping = BE::KeyframeCurve::Scalar(
        0, {{Seconds(0), {1.5, 0}, BE::KeyframeInterpolation::kHold, {}, {}},
            {Seconds(2), {0.25, 0}, BE::KeyframeInterpolation::kBezier, {2, 0}, {-1, 0}}});
    EXPECT_TRUE(clip.IsTimeRemapped());
    EXPECT_EQ(clip.GetTimeRemappingText(),
              "0=1.5:hold;" + std::to_string(2 * mt::kTicksPerSecond) + "=0.25:bezier(2,-1)");
}

} // namespace
