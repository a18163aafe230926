// Timeline files: a model written and loaded again is the same model, every
// key of the format is written, the loader's shorthands, and every kind of
// error with its exact message naming file, line and place.

#include "BE/TimelineFile.h"

#include "BackendTestSupport.h"
#include "SequenceTestSupport.h"

#include <fstream>
#include <set>

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

namespace
{

using namespace seqtest;
namespace mt = mvxmediatypes;

BE::CurveKey Key(double inSeconds, double inX, double inY, BE::KeyframeInterpolation inKind,
                 double inSlope = 0.0)
{
    return {Seconds(inSeconds), {inX, inY}, inKind, {inSlope, -inSlope}, {-inSlope, inSlope}};
}

// Every setting away from its default at least once.
BE::SequenceRef FullModel(const std::string& inFolder)
{
    using K = BE::KeyframeInterpolation;
    BE::SequenceBuilder innerBuilder("Inner",
                                     {mt::kFrameRate_Video2997, 720, 480,
                                      mt::PixelAspectRatio(10, 11), mt::kFieldType_LowerFirst});
    innerBuilder.AddTrack();
    innerBuilder.AddItem(0, Item(0, 4), Pattern("pattern:moving?size=64x36"));
    const BE::SequenceRef inner = innerBuilder.Build();

    BE::MediaSettings file;
    file.mLocation = file.mResolvedPath = inFolder + "/missing.y4m";
    file.mDraft = true;
    file.mOpaqueData = MF::BinaryData::FromText("opaque bytes");
    file.mColorProfile.mName = "BT.709";
    file.mStream = BE::StreamSettings{
        mt::kFrameRate_Video2398,  640, 360, mt::PixelAspectRatio(4, 3), mt::kFieldType_UpperFirst,
        mt::kAlphaChannel_Straight};
    file.mDuration = Seconds(20);
    BE::MediaSettings still;
    still.mKind = BE::MediaKind::kStill;
    still.mLocation = still.mResolvedPath = inFolder + "/missing.png";
    still.mOffline = still.mPending = true;
    BE::MediaSettings solid;
    solid.mKind = BE::MediaKind::kSolid;
    solid.mColor = 0x80FF0000u;
    BE::MediaSettings nested;
    nested.mKind = BE::MediaKind::kSequence;
    nested.mLocation = "Inner";

    BE::MediaSettings multicam;
    multicam.mKind = BE::MediaKind::kMulticam;
    multicam.mMulticam = {1, true, true};

    BE::TrackItemSettings full = Item(0, 2);
    full.mFlags = 5;
    full.mBlendMode = kIR_BlendMode_Multiply;
    full.mOpacity = BE::KeyframeCurve::Scalar(
        100, {Key(0, 0, 0, K::kBezier, 30), Key(1, 80, 0, K::kHold), Key(1.5, 40, 0, K::kLinear)});
    full.mMotion.mPosition =
        BE::KeyframeCurve::Point({}, {Key(0, -5, 7, K::kLinear), Key(2, 9, -3, K::kBezier, 4)});
    full.mMotion.mScale = BE::KeyframeCurve::Scalar(50);
    full.mMotion.mRotation =
        BE::KeyframeCurve::Scalar(0, {Key(0, 0, 0, K::kLinear), Key(1, 90, 0, K::kLinear)});
    full.mMotion.mAnchor = BE::KeyframeCurve::Point({3, 4});
    BE::ClipSettings& clip = full.mClip;
    clip.mInPoint = Seconds(1);
    clip.mOutPoint = TickTime::TicksToTime(9'876'543'210);
    clip.mSpeed = -2.5;
    clip.mReverse = true;
    clip.mTimeRemapping =
        BE::KeyframeCurve::Scalar(0, {Key(0, 1, 0, K::kLinear), Key(2, 3, 0, K::kHold)});
    clip.mFrameHold = {Seconds(0.5), true, true};
    clip.mFieldProcessing = BE::FieldProcessing::kDeinterlaceAlways;
    clip.mReverseFieldDominance = clip.mFrameBlend = clip.mScaleToFrame = true;
    clip.mAlpha = {mt::kAlphaChannel_Premultiplied, true, true, 0xFF102030u};
    clip.mPulldown = {true, mt::kPulldownCadence_23_BC};
    full.mEffects = {
        {"vr.Blur", {{"radius", "4"}, {"axis", "x"}}, MF::BinaryData::FromText("fx"), {}, {}},
        {"vr.Tint",
         {},
         {},
         {{"amount",
           BE::KeyframeCurve::Scalar(0, {Key(0, 5, 0, K::kLinear), Key(1, 9, 0, K::kHold)})},
          {"centre", BE::KeyframeCurve::Point({1, -2})}},
         {}}};
    full.mTransitions = {
        {"vr.CrossDissolve", TickTime::TicksToTime(12345), Seconds(1), true, {{"border", "2"}}}};
    BE::TrackItemSettings adjustment = Item(6, 7);
    adjustment.mFlags = BE::kTrackItemFlag_AdjustmentLayer;

    BE::SequenceBuilder builder("Main", {mt::kFrameRate_Video50, 1280, 720,
                                         mt::PixelAspectRatio(1, 1), mt::kFieldType_UpperFirst});
    builder.AddTrack({true, true});
    builder.AddTrack();
    builder.AddItem(0, full, Media(file));
    builder.AddItem(0, Item(3, 4), Media(still));
    builder.AddItem(0, Item(4, 6),
                    BE::CreateMulticamMedia(multicam, {Media(nested, inner), Media(solid)}));
    builder.AddItem(0, adjustment, Media(solid));
    builder.AddItem(1, Item(1, 5), Media(nested, inner));
    builder.AddItem(1, Item(5, 6), Pattern("pattern:gradient?size=32x32"));
    return builder.Build();
}

void CollectKeys(const nlohmann::json& inValue, bool inSchema, std::set<std::string>& ioKeys)
{
    if (inValue.is_object())
        for (const auto& [key, value] : inValue.items())
        {
            if (inSchema && key == "properties")
                for (const auto& [name, unused] : value.items())
                    ioKeys.insert(name);
            if (!inSchema)
                ioKeys.insert(key);
            // Parameter names belong to the effect, not to the format.
            if (inSchema || key != "params")
                CollectKeys(value, inSchema, ioKeys);
        }
    if (inValue.is_array())
        for (const auto& element : inValue)
            CollectKeys(element, inSchema, ioKeys);
}

class TimelineFileTest : public ::testing::Test
{
protected:
    betest::TempDirectory mFolder;
    std::string mDir = std::filesystem::path(mFolder.File("x")).parent_path().string();
};

TEST_F(TimelineFileTest, AWrittenModelLoadsAsTheSameModelAndWritesTheSameText)
{
    const BE::SequenceRef model = FullModel(mDir);
    const std::string text = BE::WriteTimeline(model);
    const BE::TimelineLoadResult loaded = BE::ParseTimeline(text, "full.json", mDir);
    ASSERT_TRUE(loaded.Succeeded()) << loaded.mError;
    EXPECT_TRUE(BE::SameSequence(*loaded.mMain, *model));
    EXPECT_EQ(BE::WriteTimeline(loaded.mMain), text);
    ASSERT_EQ(loaded.mSequences.size(), 2u);
    EXPECT_EQ(loaded.mSequences[0]->GetName(), "Inner");
    EXPECT_EQ(loaded.mMain, loaded.mSequences[1]);
    EXPECT_EQ(loaded.mMissingFiles,
              (std::vector<std::string>{mDir + "/missing.y4m", mDir + "/missing.png"}));

    // A changed setting is noticed by the comparison the round trip relies on.
    BE::TrackItemSettings moved =
        loaded.mMain->GetTrackGroup(0)->GetTrack(1)->GetItem(1)->GetSettings();
    moved.mMotion.mScale = BE::KeyframeCurve::Scalar(51);
    const auto media = loaded.mMain->GetTrackGroup(0)->GetTrack(1)->GetItem(1)->GetMedia();
    EXPECT_FALSE(BE::SameSequence(
        *BE::ReplaceTrackItem(loaded.mMain, 1, 1, BE::CreateTrackItem(moved, media)), *model));
}

TEST_F(TimelineFileTest, TheWriterUsesEveryKeyOfTheSchemaAndNoOther)
{
    std::ifstream schemaFile(VR_TIMELINE_SCHEMA);
    ASSERT_TRUE(schemaFile) << VR_TIMELINE_SCHEMA;
    std::set<std::string> schemaKeys;
    CollectKeys(nlohmann::json::parse(schemaFile), true, schemaKeys);
    std::set<std::string> writtenKeys;
    CollectKeys(nlohmann::json::parse(BE::WriteTimeline(FullModel(mDir))), false, writtenKeys);
    // Shorthands the loader accepts but the writer never needs.
    writtenKeys.insert("gap");
    EXPECT_EQ(writtenKeys, schemaKeys);
}

TEST_F(TimelineFileTest, ShorthandsPlaceItemsAfterGapsAndShareMedia)
{
    const std::string text = R"({"sequences": [{"name": "S", "rate": 25, "tracks": [{"items": [
        {"duration": "25f", "media": {"file": "clips/a.y4m"}, "opacity": 40},
        {"gap": 1},
        {"duration": 0.5, "media": {"file": "clips/a.y4m"}, "motion": {"position": [3, 4]}},
        {"start": "2116800150t", "end": "100f", "media": {"color": "#336699"}, "clip": {"speed": 2}}
    ]}, {"items": [{"start": 1, "end": 2, "media": {"file": "clips/a.y4m", "draft": true}}]}]}]})";
    const BE::TimelineLoadResult loaded = BE::ParseTimeline(text, "short.json", "/base");
    ASSERT_TRUE(loaded.Succeeded()) << loaded.mError;
    EXPECT_EQ(loaded.mMissingFiles, std::vector<std::string>{"/base/clips/a.y4m"});
    const auto track = loaded.mMain->GetTrackGroup(0)->GetTrack(0);
    ASSERT_EQ(track->GetItemCount(), 3u);
    const auto& first = track->GetItem(0)->GetSettings();
    const auto& second = track->GetItem(1)->GetSettings();
    EXPECT_EQ(first.mStart, Seconds(0));
    EXPECT_EQ(first.mEnd, Seconds(1));
    EXPECT_EQ(second.mStart, Seconds(2));
    EXPECT_EQ(second.mEnd, Seconds(2.5));
    EXPECT_EQ(track->GetItem(2)->GetSettings().mStart, Seconds(3) + TickTime::TicksToTime(150));
    EXPECT_EQ(track->GetItem(2)->GetSettings().mEnd, Seconds(4));
    EXPECT_EQ(first.mOpacity.ValueAt(Seconds(0.3)).mX, 40.0);
    EXPECT_EQ(second.mMotion.mPosition.ValueAt(Seconds(9)), (MF::KeyframePoint{3, 4}));
    EXPECT_EQ(track->GetItem(2)->GetMedia()->GetMediaSettings().mColor, 0xFF336699u);
    EXPECT_EQ(track->GetItem(0)->GetMedia(), track->GetItem(1)->GetMedia());
    const auto other = loaded.mMain->GetTrackGroup(0)->GetTrack(1)->GetItem(0)->GetMedia();
    EXPECT_NE(other, track->GetItem(0)->GetMedia());
    EXPECT_TRUE(other->IsOffline() && other->IsDraft());
}

TEST_F(TimelineFileTest, TheExamplesLoadAndSurviveARoundTrip)
{
    int examples = 0;
    for (const auto& entry : std::filesystem::directory_iterator(VR_TIMELINE_EXAMPLES))
    {
        SCOPED_TRACE(entry.path().string());
        const BE::TimelineLoadResult loaded = BE::LoadTimelineFile(entry.path().string());
        ASSERT_TRUE(loaded.Succeeded()) << loaded.mError;
        const BE::TimelineLoadResult again = BE::ParseTimeline(
            BE::WriteTimeline(loaded.mMain), "again.json", entry.path().parent_path().string());
        ASSERT_TRUE(again.Succeeded()) << again.mError;
        EXPECT_TRUE(BE::SameSequence(*again.mMain, *loaded.mMain));
        ++examples;
    }
    EXPECT_EQ(examples, 3);
}

TEST_F(TimelineFileTest, LoadsAFileWithPathsRelativeToItsFolder)
{
    const std::string path = mFolder.File("show.json");
    betest::WriteBytes(path, R"({"sequences": [{"name": "S", "tracks": [{"items": [
        {"end": 1, "media": {"still": "pics/p.png"}}]}]}]})");
    const BE::TimelineLoadResult loaded = BE::LoadTimelineFile(path);
    ASSERT_TRUE(loaded.Succeeded()) << loaded.mError;
    EXPECT_EQ(loaded.mMissingFiles, std::vector<std::string>{mDir + "/pics/p.png"});
    const std::string absent = mFolder.File("absent.json");
    EXPECT_EQ(BE::LoadTimelineFile(absent).mError, absent + ": cannot read the file");
}

// A document of one sequence "A" whose first track holds inItems, one per line
// from line 2.
std::string Doc(std::initializer_list<std::string> inItems)
{
    std::string text = R"({"sequences": [{"name": "A", "tracks": [{"items": [)";
    for (const std::string& item : inItems)
        text += (text.back() == '[' ? "\n" : ",\n") + item;
    return text + "\n]}]}]}";
}

// inDepth sequences, each but the last playing the next, one per line.
std::string DeepNesting(int inDepth)
{
    std::string text = "{\"sequences\": [";
    for (int i = 0; i < inDepth; ++i)
    {
        const std::string media = i + 1 < inDepth
                                      ? "{\"sequence\": \"S" + std::to_string(i + 1) + "\"}"
                                      : "{\"pattern\": \"pattern:bars\"}";
        text += (i == 0 ? "{\"name\": \"S" : ",\n{\"name\": \"S") + std::to_string(i) +
                "\", \"tracks\": [{\"items\": [{\"end\": 1, \"media\": " + media + "}]}]}";
    }
    return text + "]}";
}

TEST(TimelineNesting, SixtyFourLevelsLoad)
{
    const BE::TimelineLoadResult loaded = BE::ParseTimeline(DeepNesting(64), "t.json", "/");
    ASSERT_TRUE(loaded.Succeeded()) << loaded.mError;
    EXPECT_EQ(loaded.mMain->GetName(), "S0");
}

const std::string kBars = R"("media": {"pattern": "pattern:bars"})";

struct ErrorCase
{
    const char* mName;
    std::string mText;
    std::string mError;
};

class TimelineErrorTest : public ::testing::TestWithParam<ErrorCase>
{
};

TEST_P(TimelineErrorTest, NamesFileLinePlaceAndProblem)
{
    const BE::TimelineLoadResult loaded = BE::ParseTimeline(GetParam().mText, "t.json", "/base");
    EXPECT_EQ(loaded.mError, GetParam().mError);
    EXPECT_FALSE(loaded.mMain);
}

const std::string kItem0 = "t.json:2: /sequences/0/tracks/0/items/0";
const std::string kItem1 = "t.json:3: /sequences/0/tracks/0/items/1";

INSTANTIATE_TEST_SUITE_P(
    Classes, TimelineErrorTest,
    ::testing::Values(
        ErrorCase{"Malformed", "{\"sequences\": [\n  {\"name\": \"A\",]}",
                  "t.json:2:16: malformed JSON: syntax error while parsing object key - "
                  "unexpected ']'; expected string literal"},
        ErrorCase{"UnknownKeyNearOne",
                  Doc({"{\"end\": 1, " + kBars + ", \"clip\": {\"speeed\": 2}}"}),
                  kItem0 + "/clip/speeed: unknown key \"speeed\" (did you mean \"speed\"?)"},
        ErrorCase{"UnknownKeyFarFromAll", "{\"sequences\": [],\n \"colour\": 1}",
                  "t.json:2: /colour: unknown key \"colour\" (known keys: version, main, "
                  "sequences)"},
        ErrorCase{"WrongType",
                  Doc({"{\"end\": 1, " + kBars + ", \"clip\": {\"reverse\": \"yes\"}}"}),
                  kItem0 + "/clip/reverse: expected a boolean, got a string"},
        ErrorCase{"ZeroDuration", Doc({"{\"start\": 2, \"end\": 2, " + kBars + "}"}),
                  kItem0 + "/end: zero or negative duration (start 2.000 s, end 2.000 s)"},
        ErrorCase{"NegativeDuration", Doc({"{\"start\": 2, \"duration\": -1, " + kBars + "}"}),
                  kItem0 + "/duration: zero or negative duration (start 2.000 s, end 1.000 s)"},
        ErrorCase{"NegativeGap", Doc({"{\"gap\": 0}"}),
                  kItem0 + "/gap: zero or negative gap (0.000 s)"},
        ErrorCase{
            "Overlap",
            Doc({"{\"end\": 2, " + kBars + "}", "{\"start\": 1.5, \"end\": 3, " + kBars + "}"}),
            kItem1 + "/start: the item overlaps the one before it on this track (this one "
                     "starts at 1.500 s, the one before ends at 2.000 s)"},
        ErrorCase{"OutOfOrder",
                  Doc({"{\"start\": 4, \"end\": 5, " + kBars + "}",
                       "{\"start\": 0, \"end\": 1, " + kBars + "}"}),
                  kItem1 + "/start: the items of a track must be in time order (this one starts "
                           "at 0.000 s, the one before at 4.000 s)"},
        ErrorCase{"NestsItself", Doc({"{\"end\": 1, \"media\": {\"sequence\": \"A\"}}"}),
                  kItem0 + "/media/sequence: sequence \"A\" contains itself (\"A\" -> \"A\")"},
        ErrorCase{"NestsItselfThroughAnother",
                  "{\"sequences\": [{\"name\": \"A\", \"tracks\": [{\"items\": [{\"end\": 1, "
                  "\"media\": {\"sequence\": \"B\"}}]}]},\n{\"name\": \"B\", \"tracks\": "
                  "[{\"items\": [\n{\"end\": 1, \"media\": {\"sequence\": \"A\"}}]}]}]}",
                  "t.json:3: /sequences/1/tracks/0/items/0/media/sequence: sequence \"A\" "
                  "contains itself (\"A\" -> \"B\" -> \"A\")"},
        ErrorCase{"UnknownSequence", Doc({"{\"end\": 1, \"media\": {\"sequence\": \"Z\"}}"}),
                  kItem0 + "/media/sequence: no sequence named \"Z\""},
        ErrorCase{"DuplicateName", "{\"sequences\": [{\"name\": \"A\"},\n {\"name\": \"A\"}]}",
                  "t.json:2: /sequences/1/name: a sequence named \"A\" already exists"},
        ErrorCase{"AbsurdSize", "{\"sequences\": [{\"name\": \"A\",\n \"size\": [0, 1080]}]}",
                  "t.json:2: /sequences/0/size: frame size 0x1080 is outside 1..32768"},
        ErrorCase{"AbsurdRate", "{\"sequences\": [{\"name\": \"A\",\n \"rate\": 5000}]}",
                  "t.json:2: /sequences/0/rate: frame rate 5000 is outside 0.01..1000 frames "
                  "per second"},
        ErrorCase{"MalformedRate", "{\"sequences\": [{\"name\": \"A\",\n \"rate\": \"25/0\"}]}",
                  "t.json:2: /sequences/0/rate: expected a frame rate (\"25\" or "
                  "\"30000/1001\"), got \"25/0\""},
        ErrorCase{"AbsurdSpeed", Doc({"{\"end\": 1, " + kBars + ", \"clip\": {\"speed\": 0}}"}),
                  kItem0 + "/clip/speed: speed 0 is zero or beyond 1000 either way"},
        ErrorCase{"TwoMediaKinds",
                  Doc({"{\"end\": 1, \"media\": {\"file\": \"a\", \"color\": \"#000000\"}}"}),
                  kItem0 + "/media: a media needs exactly one of \"file\", \"still\", "
                           "\"pattern\", \"color\", \"sequence\" and \"multicam\""},
        ErrorCase{"MulticamWithoutAngles",
                  Doc({"{\"end\": 1, \"media\": {\"multicam\": {\"angles\": []}}}"}),
                  kItem0 + "/media/multicam/angles: a multicam needs at least one angle"},
        ErrorCase{"MulticamSelectsNoAngle",
                  Doc({"{\"end\": 1, \"media\": {\"multicam\": {\"angles\": [{\"pattern\": "
                       "\"pattern:bars\"}], \"selected\": 1}}}"}),
                  kItem0 + "/media/multicam/selected: angle 1 is selected but the multicam has "
                           "1 angles (counted from 0)"},
        ErrorCase{"MissingMedia", Doc({"{\"end\": 1}"}), kItem0 + ": missing key \"media\""},
        ErrorCase{"MissingEnd", Doc({"{" + kBars + "}"}),
                  kItem0 + ": missing key \"end\" (or \"duration\")"},
        ErrorCase{"UnknownName", "{\"sequences\": [{\"name\": \"A\",\n \"field\": \"both\"}]}",
                  "t.json:2: /sequences/0/field: unknown value \"both\" (one of: progressive, "
                  "upper, lower)"},
        ErrorCase{"BadPattern", Doc({"{\"end\": 1, \"media\": {\"pattern\": \"pattern:dots\"}}"}),
                  kItem0 + "/media/pattern: pattern 'pattern:dots': unknown pattern 'dots' "
                           "(expected bars, solid, gradient or moving)"},
        ErrorCase{
            "KeysOutOfOrder",
            Doc({"{\"end\": 1, " + kBars +
                 ", \"opacity\": [{\"time\": 1, \"value\": 5}, {\"time\": 1, \"value\": 6}]}"}),
            kItem0 + "/opacity/1/time: keyframe times must increase (1.000 s is not after "
                     "1.000 s)"},
        ErrorCase{"ConstantRemap",
                  Doc({"{\"end\": 1, " + kBars + ", \"clip\": {\"timeRemap\": 3}}"}),
                  kItem0 + "/clip/timeRemap: expected a list of keys, got a number"},
        ErrorCase{"OpacityOutOfRange", Doc({"{\"end\": 1, " + kBars + ", \"opacity\": 140}"}),
                  kItem0 + "/opacity: the value is outside 0..100"},
        ErrorCase{"BadColor", Doc({"{\"end\": 1, \"media\": {\"color\": \"red\"}}"}),
                  kItem0 + "/media/color: expected a colour \"#RRGGBB\" or \"#AARRGGBB\", got "
                           "\"red\""},
        ErrorCase{"BadTime", Doc({"{\"end\": \"3s\", " + kBars + "}"}),
                  kItem0 + "/end: expected a time (seconds, \"<n>f\" or \"<n>t\"), got \"3s\""},
        ErrorCase{"TinyRate", "{\"sequences\": [{\"name\": \"A\",\n \"rate\": \"1/1000\"}]}",
                  "t.json:2: /sequences/0/rate: frame rate 0.001 is outside 0.01..1000 frames "
                  "per second"},
        ErrorCase{"FarTime", Doc({"{\"end\": \"9223372036854775807t\", " + kBars + "}"}),
                  kItem0 + "/end: the time is more than a billion seconds from 0"},
        ErrorCase{"NegativeStart", Doc({"{\"start\": -1, \"end\": 1, " + kBars + "}"}),
                  kItem0 + "/start: the item starts before 0 (-1.000 s)"},
        ErrorCase{"NestedTooDeep", DeepNesting(70),
                  "t.json:64: /sequences/63/tracks/0/items/0/media/sequence: sequences nest "
                  "more than 64 deep"},
        ErrorCase{"Version", "{\"version\": 2,\n \"sequences\": []}",
                  "t.json:1: /version: version 2 is not supported (this reader knows version 1)"},
        ErrorCase{"NoSequences", "{\"sequences\": []}",
                  "t.json:1: /sequences: a timeline needs at least one sequence"}),
    [](const ::testing::TestParamInfo<ErrorCase>& inInfo) { return inInfo.param.mName; });

} // namespace
