#pragma once

// The timeline reader's view of the parsed JSON: an object with its place in
// the file (a JSON pointer) and typed readers of its keys, and the readers of
// the value groups (rates, keyframe curves, streams, clip and motion
// settings). Every reader throws Failure, naming the place and the problem,
// for a value that is missing, of the wrong type or out of range.

#include "BE/SequenceTypes.h"
#include "TimelineFormat.h"
#include "TimelineLines.h"

#include <cmath>
#include <initializer_list>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include <nlohmann/json.hpp>

namespace BE::timeline
{

using Json = nlohmann::json;

// A problem found in the file: where (a JSON pointer) and what.
struct Failure
{
    std::string mPath;
    std::string mProblem;
};

[[noreturn]] void Fail(const std::string& inPath, std::string inProblem);
std::string Quoted(std::string_view inText);
const char* TypeName(const Json& inValue);
[[noreturn]] void WrongType(const Json& inValue, const std::string& inPath, const char* inWanted);
// inValue must be an object whose keys are all in inKnown.
void CheckKeys(const Json& inValue, const std::string& inPath,
               std::initializer_list<std::string_view> inKnown);

// One object of the file with its place, and typed readers of its keys.
class Node
{
public:
    Node(const Json& inValue, std::string inPath)
        : mValue(inValue)
        , mPath(std::move(inPath))
    {
    }

    const Json& Value() const { return mValue; }
    const std::string& Path() const { return mPath; }
    std::string PathOf(std::string_view inKey) const { return ChildPath(mPath, inKey); }
    bool Has(std::string_view inKey) const { return mValue.contains(inKey); }

    Node Child(std::string_view inKey) const
    {
        const auto found = mValue.find(inKey);
        if (found == mValue.end())
            Fail(mPath, "missing key " + Quoted(inKey));
        return Node(*found, PathOf(inKey));
    }

    bool Bool(std::string_view inKey, bool inDefault) const
    {
        if (!Has(inKey))
            return inDefault;
        const Node child = Child(inKey);
        if (!child.mValue.is_boolean())
            WrongType(child.mValue, child.mPath, "a boolean");
        return child.mValue.get<bool>();
    }

    std::string String(std::string_view inKey) const
    {
        const Node child = Child(inKey);
        if (!child.mValue.is_string())
            WrongType(child.mValue, child.mPath, "a string");
        return child.mValue.get<std::string>();
    }

    double Number(std::string_view inKey, double inDefault) const
    {
        if (!Has(inKey))
            return inDefault;
        return Child(inKey).AsNumber();
    }

    double AsNumber() const
    {
        if (!mValue.is_number())
            WrongType(mValue, mPath, "a number");
        return mValue.get<double>();
    }

    std::int64_t AsInteger(std::int64_t inLow, std::int64_t inHigh) const
    {
        if (!mValue.is_number_integer())
            WrongType(mValue, mPath, "an integer");
        const bool negative = mValue.is_number_unsigned() ? false : mValue.get<std::int64_t>() < 0;
        if (!negative && mValue.get<std::uint64_t>() > static_cast<std::uint64_t>(inHigh))
            Fail(mPath, "the value is above " + std::to_string(inHigh));
        const std::int64_t value = mValue.get<std::int64_t>();
        if (value < inLow)
            Fail(mPath, "the value is below " + std::to_string(inLow));
        return value;
    }

    template <class T, std::size_t N>
    T Name(std::string_view inKey, const NamedValue<T> (&inTable)[N], T inDefault) const
    {
        if (!Has(inKey))
            return inDefault;
        const std::string text = String(inKey);
        const std::optional<T> value = ValueOf(inTable, text);
        if (!value)
            Fail(PathOf(inKey),
                 "unknown value " + Quoted(text) + " (one of: " + NamesOf(inTable) + ")");
        return *value;
    }

    // Times stay within a billion seconds (about 31 years) either way, so
    // that sums of two times never leave the tick range.
    mvxmediatypes::TickTime AsTime(mvxmediatypes::FrameRate inRate) const
    {
        constexpr double kLimitSeconds = 1.0e9;
        constexpr std::int64_t kLimitTicks =
            static_cast<std::int64_t>(kLimitSeconds) * mvxmediatypes::kTicksPerSecond;
        std::optional<mvxmediatypes::TickTime> time;
        if (mValue.is_number())
        {
            const double seconds = mValue.get<double>();
            if (std::isfinite(seconds) && std::fabs(seconds) <= kLimitSeconds)
                return mvxmediatypes::TickTime::FromSeconds(seconds);
            Fail(mPath, "the time is more than a billion seconds from 0");
        }
        if (mValue.is_string())
            time = ParseTimeText(mValue.get<std::string>(), inRate);
        if (!time)
            Fail(mPath,
                 std::string("expected a time (seconds, \"<n>f\" or \"<n>t\"), got ") +
                     (mValue.is_string() ? Quoted(mValue.get<std::string>()) : TypeName(mValue)));
        if (time->GetTicks() > kLimitTicks || time->GetTicks() < -kLimitTicks)
            Fail(mPath, "the time is more than a billion seconds from 0");
        return *time;
    }

    mvxmediatypes::TickTime Time(std::string_view inKey, mvxmediatypes::FrameRate inRate,
                                 mvxmediatypes::TickTime inDefault) const
    {
        return Has(inKey) ? Child(inKey).AsTime(inRate) : inDefault;
    }

    std::uint32_t Color(std::string_view inKey, std::uint32_t inDefault) const
    {
        if (!Has(inKey))
            return inDefault;
        const std::string text = String(inKey);
        const std::optional<std::uint32_t> color = ParseColorText(text);
        if (!color)
            Fail(PathOf(inKey),
                 "expected a colour \"#RRGGBB\" or \"#AARRGGBB\", got " + Quoted(text));
        return *color;
    }

    // A pair of integers in [inLow, inHigh], such as a size or a ratio.
    std::pair<std::int64_t, std::int64_t> Pair(std::string_view inKey, std::int64_t inLow,
                                               std::int64_t inHigh, const char* inWhat) const
    {
        const Node child = Child(inKey);
        if (!child.mValue.is_array() || child.mValue.size() != 2)
            WrongType(child.mValue, child.mPath, "an array of two integers");
        const std::int64_t first =
            Node(child.mValue[0], ChildPath(child.mPath, 0)).AsInteger(INT64_MIN, INT64_MAX);
        const std::int64_t second =
            Node(child.mValue[1], ChildPath(child.mPath, 1)).AsInteger(INT64_MIN, INT64_MAX);
        if (first < inLow || first > inHigh || second < inLow || second > inHigh)
            Fail(child.mPath, std::string(inWhat) + " " + std::to_string(first) + "x" +
                                  std::to_string(second) + " is outside " + std::to_string(inLow) +
                                  ".." + std::to_string(inHigh));
        return {first, second};
    }

    std::map<std::string, std::string> StringMap(std::string_view inKey) const
    {
        std::map<std::string, std::string> map;
        if (!Has(inKey))
            return map;
        const Node child = Child(inKey);
        if (!child.mValue.is_object())
            WrongType(child.mValue, child.mPath, "an object");
        for (const auto& [key, value] : child.mValue.items())
        {
            if (!value.is_string())
                WrongType(value, child.PathOf(key), "a string");
            map[key] = value.get<std::string>();
        }
        return map;
    }

    // The elements of the array at inKey (none when absent).
    std::vector<Node> Elements(std::string_view inKey) const
    {
        std::vector<Node> elements;
        if (!Has(inKey))
            return elements;
        const Node child = Child(inKey);
        if (!child.mValue.is_array())
            WrongType(child.mValue, child.mPath, "an array");
        elements.reserve(child.mValue.size());
        for (std::size_t i = 0; i < child.mValue.size(); ++i)
            elements.emplace_back(child.mValue[i], ChildPath(child.mPath, i));
        return elements;
    }

private:
    const Json& mValue;
    std::string mPath;
};

mvxmediatypes::FrameRate ReadRate(const Node& inNode);

// The picture keys a sequence and a stream share ("rate", "size", "par",
// "field"), each read into ioSettings when present.
template <typename Settings>
void ReadPictureKeys(const Node& inNode, Settings& ioSettings)
{
    if (inNode.Has("rate"))
        ioSettings.mFrameRate = ReadRate(inNode.Child("rate"));
    if (inNode.Has("size"))
    {
        const auto [width, height] = inNode.Pair("size", 1, kMaxFrameDimension, "frame size");
        ioSettings.mWidth = static_cast<std::int32_t>(width);
        ioSettings.mHeight = static_cast<std::int32_t>(height);
    }
    if (inNode.Has("par"))
    {
        const auto [num, den] = inNode.Pair("par", 1, UINT32_MAX, "pixel aspect ratio");
        ioSettings.mPixelAspectRatio = mvxmediatypes::PixelAspectRatio(
            static_cast<std::uint32_t>(num), static_cast<std::uint32_t>(den));
    }
    ioSettings.mFieldType = inNode.Name("field", kFieldTypes, ioSettings.mFieldType);
}
// A constant (a number, or [x, y] for points) or a list of keys, every value
// within [inLow, inHigh]; the curve's default and dimension come from inDefault.
KeyframeCurve ReadCurve(const Node& inNode, const KeyframeCurve& inDefault,
                        mvxmediatypes::FrameRate inRate, double inLow, double inHigh);
StreamSettings ReadStream(const Node& inNode);
ClipSettings ReadClip(const Node& inNode, mvxmediatypes::FrameRate inRate);
void ReadMotion(const Node& inNode, mvxmediatypes::FrameRate inRate, MotionKeyframes& ioMotion);

} // namespace BE::timeline
