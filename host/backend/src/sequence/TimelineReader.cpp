// Loading timeline files into sequences (BE/TimelineFile.h).

#include "BE/TimelineFile.h"
#include "TimelineValues.h"

#include <cmath>
#include <filesystem>
#include <fstream>
#include <map>
#include <set>
#include <sstream>
#include <unordered_map>

#include <nlohmann/json.hpp>

namespace BE
{
namespace
{

namespace mt = mvxmediatypes;
using namespace timeline;
using Json = nlohmann::json;

constexpr std::size_t kMaxNestingDepth = 64;

class TimelineReader
{
public:
    TimelineReader(const Json& inRoot, std::string inBaseFolder, const EffectCheck& inCheck,
                   const TransitionCheck& inTransitionCheck)
        : mRoot(inRoot)
        , mBaseFolder(std::move(inBaseFolder))
        , mCheck(inCheck)
        , mTransitionCheck(inTransitionCheck)
    {
    }

    // The check's warnings, each with its place.
    std::vector<std::pair<std::string, std::string>> mWarnings;

    TimelineLoadResult Read();

private:
    enum class State
    {
        kNew,
        kBuilding,
        kDone,
    };

    struct Entry
    {
        std::vector<Node>::size_type mIndex;
        std::string mName;
        State mState = State::kNew;
        SequenceRef mBuilt;
    };

    SequenceRef Build(std::size_t inIndex);
    void ReadTrack(const Node& inNode, const SequenceSettings& inSequence,
                   SequenceBuilder& ioBuilder);
    TrackItemSettings ReadItem(const Node& inNode, mt::FrameRate inRate, mt::TickTime inStart);
    EffectSettings ReadEffect(const Node& inNode, mt::FrameRate inRate);
    MediaRef ReadMedia(const Node& inNode, const SequenceSettings& inSequence);
    SequenceRef NestedSequence(const Node& inNode, const std::string& inName);
    std::vector<MediaRef> ReadMulticam(const Node& inNode, const SequenceSettings& inSequence,
                                       MulticamSettings& outSettings);

    const Json& mRoot;
    const std::string mBaseFolder;
    const EffectCheck& mCheck;
    const TransitionCheck& mTransitionCheck;
    std::vector<Node> mNodes;
    std::vector<Entry> mEntries;
    std::unordered_map<std::string, std::size_t> mByName;
    // Names of the sequences being built, outermost first.
    std::vector<std::string> mChain;
    std::unordered_map<std::string, MediaRef> mMedia;
    std::set<std::string> mMissingSeen;
    std::vector<std::string> mMissing;
};

TimelineLoadResult TimelineReader::Read()
{
    const Node root(mRoot, "");
    CheckKeys(mRoot, "", {"version", "main", "sequences"});
    if (root.Has("version") && root.Child("version").AsInteger(INT64_MIN, INT64_MAX) != 1)
        Fail("/version", "version " + root.Child("version").Value().dump() +
                             " is not supported (this reader knows version 1)");
    mNodes = root.Elements("sequences");
    if (mNodes.empty())
        Fail(root.Has("sequences") ? "/sequences" : "",
             root.Has("sequences") ? "a timeline needs at least one sequence"
                                   : "missing key \"sequences\"");
    for (std::size_t i = 0; i < mNodes.size(); ++i)
    {
        const Node& node = mNodes[i];
        CheckKeys(node.Value(), node.Path(), {"name", "rate", "size", "par", "field", "tracks"});
        std::string name = node.String("name");
        if (name.empty())
            Fail(node.PathOf("name"), "a sequence needs a name");
        if (!mByName.emplace(name, i).second)
            Fail(node.PathOf("name"), "a sequence named " + Quoted(name) + " already exists");
        mEntries.push_back({i, std::move(name), State::kNew, {}});
    }
    TimelineLoadResult result;
    for (std::size_t i = 0; i < mEntries.size(); ++i)
        result.mSequences.push_back(Build(i));
    result.mMain = result.mSequences.front();
    if (root.Has("main"))
    {
        const std::string main = root.String("main");
        const auto found = mByName.find(main);
        if (found == mByName.end())
            Fail("/main", "no sequence named " + Quoted(main));
        result.mMain = result.mSequences[found->second];
    }
    result.mMissingFiles = std::move(mMissing);
    return result;
}

SequenceRef TimelineReader::Build(std::size_t inIndex)
{
    Entry& entry = mEntries[inIndex];
    if (entry.mState == State::kDone)
        return entry.mBuilt;
    const Node& node = mNodes[entry.mIndex];
    entry.mState = State::kBuilding;
    mChain.push_back(entry.mName);

    SequenceSettings settings;
    ReadPictureKeys(node, settings);

    SequenceBuilder builder(entry.mName, settings);
    for (const Node& track : node.Elements("tracks"))
        ReadTrack(track, settings, builder);

    mChain.pop_back();
    Entry& done = mEntries[inIndex];
    done.mBuilt = builder.Build();
    done.mState = State::kDone;
    return done.mBuilt;
}

void TimelineReader::ReadTrack(const Node& inNode, const SequenceSettings& inSequence,
                               SequenceBuilder& ioBuilder)
{
    const mt::FrameRate rate = inSequence.mFrameRate;
    CheckKeys(inNode.Value(), inNode.Path(), {"muted", "locked", "items"});
    const std::size_t track =
        ioBuilder.AddTrack({inNode.Bool("muted", false), inNode.Bool("locked", false)});
    mt::TickTime cursor = mt::kTime_Zero;
    std::optional<mt::TickTime> previousStart;
    for (const Node& entry : inNode.Elements("items"))
    {
        if (entry.Value().is_object() && entry.Has("gap"))
        {
            CheckKeys(entry.Value(), entry.Path(), {"gap"});
            const mt::TickTime gap = entry.Child("gap").AsTime(rate);
            if (gap <= mt::kTime_Zero)
                Fail(entry.PathOf("gap"), "zero or negative gap (" + SecondsText(gap) + ")");
            cursor = cursor + gap;
            continue;
        }
        const TrackItemSettings settings = ReadItem(entry, rate, cursor);
        const std::string place = entry.Has("start") ? entry.PathOf("start") : entry.Path();
        if (previousStart && settings.mStart < *previousStart)
            Fail(place, "the items of a track must be in time order (this one starts at " +
                            SecondsText(settings.mStart) + ", the one before at " +
                            SecondsText(*previousStart) + ")");
        if (previousStart && settings.mStart < cursor)
            Fail(place, "the item overlaps the one before it on this track (this one starts at " +
                            SecondsText(settings.mStart) + ", the one before ends at " +
                            SecondsText(cursor) + ")");
        ioBuilder.AddItem(track, settings, ReadMedia(entry.Child("media"), inSequence));
        previousStart = settings.mStart;
        cursor = settings.mEnd;
    }
}

TrackItemSettings TimelineReader::ReadItem(const Node& inNode, mt::FrameRate inRate,
                                           mt::TickTime inStart)
{
    CheckKeys(inNode.Value(), inNode.Path(),
              {"start", "end", "duration", "flags", "adjustment", "media", "blend", "opacity",
               "motion", "clip", "effects", "transitions"});
    TrackItemSettings item;
    item.mStart = inNode.Time("start", inRate, inStart);
    if (item.mStart < mt::kTime_Zero)
        Fail(inNode.PathOf("start"), "the item starts before 0 (" + SecondsText(item.mStart) + ")");
    if (inNode.Has("end") == inNode.Has("duration"))
        Fail(inNode.Path(), inNode.Has("end") ? "give \"end\" or \"duration\", not both"
                                              : "missing key \"end\" (or \"duration\")");
    const std::string endPath = inNode.PathOf(inNode.Has("end") ? "end" : "duration");
    item.mEnd = inNode.Has("end") ? inNode.Child("end").AsTime(inRate)
                                  : item.mStart + inNode.Child("duration").AsTime(inRate);
    if (item.mEnd <= item.mStart)
        Fail(endPath, "zero or negative duration (start " + SecondsText(item.mStart) + ", end " +
                          SecondsText(item.mEnd) + ")");
    if (inNode.Has("flags"))
        item.mFlags = static_cast<std::uint32_t>(inNode.Child("flags").AsInteger(0, UINT32_MAX));
    if (inNode.Bool("adjustment", false))
        item.mFlags |= kTrackItemFlag_AdjustmentLayer;
    item.mBlendMode = inNode.Name("blend", kBlendModes, item.mBlendMode);
    if (inNode.Has("opacity"))
        item.mOpacity = ReadCurve(inNode.Child("opacity"), item.mOpacity, inRate, 0.0, 100.0);
    if (inNode.Has("motion"))
        ReadMotion(inNode.Child("motion"), inRate, item.mMotion);
    if (inNode.Has("clip"))
        item.mClip = ReadClip(inNode.Child("clip"), inRate);
    for (const Node& effect : inNode.Elements("effects"))
        item.mEffects.push_back(ReadEffect(effect, inRate));
    for (const Node& transition : inNode.Elements("transitions"))
    {
        CheckKeys(transition.Value(), transition.Path(),
                  {"match", "start", "end", "reverse", "params"});
        TransitionSettings settings;
        settings.mMatchName = transition.String("match");
        settings.mStart = transition.Child("start").AsTime(inRate);
        settings.mEnd = transition.Child("end").AsTime(inRate);
        if (settings.mEnd <= settings.mStart)
            Fail(transition.PathOf("end"), "zero or negative duration (start " +
                                               SecondsText(settings.mStart) + ", end " +
                                               SecondsText(settings.mEnd) + ")");
        settings.mReverse = transition.Bool("reverse", false);
        settings.mParams = transition.StringMap("params");
        if (mTransitionCheck)
        {
            const EffectCheckResult checked = mTransitionCheck(settings);
            if (!checked.mError.empty())
                Fail(transition.PathOf("match"), checked.mError);
            for (const std::string& warning : checked.mWarnings)
                mWarnings.emplace_back(transition.Path(), warning);
        }
        item.mTransitions.push_back(std::move(settings));
    }
    return item;
}

// Parameters: text stays text; a number, a point or a key list is a curve
// (a point when its value, or its first key's value, is a pair).
EffectSettings TimelineReader::ReadEffect(const Node& inNode, mt::FrameRate inRate)
{
    constexpr double kFar = 1.0e9;
    CheckKeys(inNode.Value(), inNode.Path(), {"match", "params", "opaque"});
    EffectSettings settings;
    settings.mMatchName = inNode.String("match");
    if (inNode.Has("params"))
    {
        const Node params = inNode.Child("params");
        if (!params.Value().is_object())
            WrongType(params.Value(), params.Path(), "an object");
        for (const auto& [key, value] : params.Value().items())
        {
            if (value.is_string())
            {
                settings.mParams[key] = value.get<std::string>();
                continue;
            }
            const Json& sample = value.is_array() && !value.empty() && value[0].is_object()
                                     ? value[0].value("value", Json())
                                     : value;
            const KeyframeCurve shape =
                sample.is_array() ? KeyframeCurve::Point({0.0, 0.0}) : KeyframeCurve::Scalar(0.0);
            settings.mKeyframedParams[key] =
                ReadCurve(params.Child(key), shape, inRate, -kFar, kFar);
        }
    }
    if (inNode.Has("opaque"))
        settings.mOpaqueData = MF::BinaryData::FromText(inNode.String("opaque"));
    settings.mBaseFolder = mBaseFolder;
    if (mCheck)
    {
        const EffectCheckResult checked = mCheck(settings);
        if (!checked.mError.empty())
            Fail(inNode.PathOf("match"), checked.mError);
        for (const std::string& warning : checked.mWarnings)
            mWarnings.emplace_back(inNode.Path(), warning);
    }
    return settings;
}

SequenceRef TimelineReader::NestedSequence(const Node& inNode, const std::string& inName)
{
    const auto found = mByName.find(inName);
    if (found == mByName.end())
        Fail(inNode.PathOf("sequence"), "no sequence named " + Quoted(inName));
    // Each level of nesting is a level of recursion here and in the renderer.
    if (mChain.size() >= kMaxNestingDepth)
        Fail(inNode.PathOf("sequence"),
             "sequences nest more than " + std::to_string(kMaxNestingDepth) + " deep");
    if (mEntries[found->second].mState == State::kBuilding)
    {
        std::string chain;
        const auto start = std::find(mChain.begin(), mChain.end(), inName);
        for (auto name = start; name != mChain.end(); ++name)
            chain += Quoted(*name) + " -> ";
        Fail(inNode.PathOf("sequence"),
             "sequence " + Quoted(inName) + " contains itself (" + chain + Quoted(inName) + ")");
    }
    return Build(found->second);
}

std::vector<MediaRef> TimelineReader::ReadMulticam(const Node& inNode,
                                                   const SequenceSettings& inSequence,
                                                   MulticamSettings& outSettings)
{
    CheckKeys(inNode.Value(), inNode.Path(), {"angles", "selected", "showProgram", "recording"});
    std::vector<MediaRef> angles;
    for (const Node& angle : inNode.Elements("angles"))
        angles.push_back(ReadMedia(angle, inSequence));
    if (angles.empty())
        Fail(inNode.PathOf("angles"), "a multicam needs at least one angle");
    if (inNode.Has("selected"))
        outSettings.mSelected =
            static_cast<std::uint64_t>(inNode.Child("selected").AsInteger(0, INT64_MAX));
    if (outSettings.mSelected >= angles.size())
        Fail(inNode.PathOf("selected"), "angle " + std::to_string(outSettings.mSelected) +
                                            " is selected but the multicam has " +
                                            std::to_string(angles.size()) +
                                            " angles (counted from 0)");
    outSettings.mShowProgram = inNode.Bool("showProgram", false);
    outSettings.mRecording = inNode.Bool("recording", false);
    return angles;
}

MediaRef TimelineReader::ReadMedia(const Node& inNode, const SequenceSettings& inSequence)
{
    const mt::FrameRate rate = inSequence.mFrameRate;
    static constexpr std::string_view kKinds[] = {"file",  "still",    "pattern",
                                                  "color", "sequence", "multicam"};
    CheckKeys(inNode.Value(), inNode.Path(),
              {"file", "still", "pattern", "color", "sequence", "multicam", "offline", "pending",
               "draft", "opaque", "colorProfile", "stream", "duration"});
    // Items naming the same material share one media object. A solid
    // without a stream takes the sequence's picture, so its key does too,
    // and so does a multicam's, whose angles may be such solids.
    std::string key = inNode.Value().dump();
    const bool sequencePicture = inNode.Has("color") && !inNode.Has("stream");
    if (sequencePicture || inNode.Has("multicam"))
        key += std::to_string(inSequence.mWidth) + "x" + std::to_string(inSequence.mHeight) + "@" +
               std::to_string(rate.GetTicksPerFrame()) + ":" +
               std::to_string(inSequence.mPixelAspectRatio.GetNumerator()) + "/" +
               std::to_string(inSequence.mPixelAspectRatio.GetDenominator());
    if (const auto cached = mMedia.find(key); cached != mMedia.end())
        return cached->second;

    MediaSettings settings;
    int kinds = 0;
    for (std::size_t i = 0; i < std::size(kKinds); ++i)
        if (inNode.Has(kKinds[i]))
        {
            ++kinds;
            settings.mKind = static_cast<MediaKind>(i);
        }
    if (kinds != 1)
        Fail(inNode.Path(), "a media needs exactly one of \"file\", \"still\", \"pattern\", "
                            "\"color\", \"sequence\" and \"multicam\"");
    SequenceRef nested;
    std::vector<MediaRef> angles;
    const std::string kindKey(kKinds[static_cast<std::size_t>(settings.mKind)]);
    if (settings.mKind == MediaKind::kMulticam)
        angles = ReadMulticam(inNode.Child(kindKey), inSequence, settings.mMulticam);
    else if (settings.mKind == MediaKind::kSolid)
        settings.mColor = inNode.Color("color", settings.mColor);
    else
        settings.mLocation = inNode.String(kindKey);
    if (settings.mKind == MediaKind::kFile || settings.mKind == MediaKind::kStill)
    {
        if (settings.mLocation.empty())
            Fail(inNode.PathOf(kindKey), "the path is empty");
        const std::filesystem::path path(settings.mLocation);
        settings.mResolvedPath =
            path.is_absolute()
                ? settings.mLocation
                : (std::filesystem::path(mBaseFolder) / path).lexically_normal().string();
    }
    if (settings.mKind == MediaKind::kSequence)
        nested = NestedSequence(inNode, settings.mLocation);
    settings.mOffline = inNode.Bool("offline", false);
    settings.mPending = inNode.Bool("pending", false);
    settings.mDraft = inNode.Bool("draft", false);
    if (inNode.Has("opaque"))
        settings.mOpaqueData = MF::BinaryData::FromText(inNode.String("opaque"));
    if (inNode.Has("colorProfile"))
        settings.mColorProfile.mName = inNode.String("colorProfile");
    if (inNode.Has("stream"))
        settings.mStream = ReadStream(inNode.Child("stream"));
    else if (sequencePicture)
        settings.mStream = StreamOfSequence(inSequence, mt::kAlphaChannel_None);
    if (inNode.Has("duration"))
    {
        const mt::TickTime duration = inNode.Child("duration").AsTime(rate);
        if (duration <= mt::kTime_Zero)
            Fail(inNode.PathOf("duration"),
                 "zero or negative duration (" + SecondsText(duration) + ")");
        settings.mDuration = duration;
    }

    if (settings.mKind == MediaKind::kMulticam)
    {
        MediaRef multicam = CreateMulticamMedia(settings, std::move(angles));
        mMedia.emplace(key, multicam);
        return multicam;
    }
    const MediaResult made = CreateMedia(settings, nested);
    if (!made.mMedia)
        Fail(inNode.PathOf(kindKey), made.mStatus.mMessage);
    if (made.mMissing && mMissingSeen.insert(settings.mResolvedPath).second)
        mMissing.push_back(settings.mResolvedPath);
    mMedia.emplace(key, made.mMedia);
    return made.mMedia;
}

std::string Located(const std::string& inFileName, std::optional<int> inLine)
{
    return inLine ? inFileName + ":" + std::to_string(*inLine) : inFileName;
}

} // namespace

TimelineLoadResult ParseTimeline(std::string_view inText, const std::string& inFileName,
                                 const std::string& inBaseFolder, const EffectCheck& inCheck,
                                 const TransitionCheck& inTransitionCheck)
{
    TimelineLoadResult result;
    Json root;
    try
    {
        root = Json::parse(inText);
    }
    catch (const Json::parse_error& error)
    {
        int line = 0;
        int column = 0;
        // The parser counts the byte it stopped at from one.
        LineAndColumn(inText, error.byte > 0 ? error.byte - 1 : 0, line, column);
        std::string reason = error.what();
        if (const std::size_t at = reason.find(": ", reason.find("column"));
            at != std::string::npos)
            reason = reason.substr(at + 2);
        result.mError = inFileName + ":" + std::to_string(line) + ":" + std::to_string(column) +
                        ": malformed JSON: " + reason;
        return result;
    }
    try
    {
        TimelineReader reader(root, inBaseFolder, inCheck, inTransitionCheck);
        result = reader.Read();
        for (const auto& [place, warning] : reader.mWarnings)
            result.mWarnings.push_back(Located(inFileName, FindLineOfValue(inText, place)) + ": " +
                                       place + ": " + warning);
        return result;
    }
    catch (const Failure& failure)
    {
        const std::string place = failure.mPath.empty() ? "/" : failure.mPath;
        result.mError = Located(inFileName, FindLineOfValue(inText, failure.mPath)) + ": " + place +
                        ": " + failure.mProblem;
    }
    return result;
}

TimelineLoadResult LoadTimelineFile(const std::string& inPath, const EffectCheck& inCheck,
                                    const TransitionCheck& inTransitionCheck)
{
    std::ifstream file(inPath, std::ios::binary);
    std::ostringstream text;
    if (file)
        text << file.rdbuf();
    if (!file || file.bad())
    {
        TimelineLoadResult result;
        result.mError = inPath + ": cannot read the file";
        return result;
    }
    const std::filesystem::path folder = std::filesystem::path(inPath).parent_path();
    return ParseTimeline(text.str(), inPath, folder.empty() ? "." : folder.string(), inCheck,
                         inTransitionCheck);
}

} // namespace BE
