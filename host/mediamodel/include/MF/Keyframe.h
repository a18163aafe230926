#pragma once

// MF::Keyframe: one keyframe of an effect or clip parameter: its time, its
// interpolation kind and its value.
//
// A value type; safe to copy between threads. The value is one of the kinds
// the plug-in interfaces distinguish, numbered as they number them
// (KeyframeValueKind); kind 0 is "no value".

#include "MF/BinaryData.h"
#include "QRT/Guid.h"
#include "mvxmediatypes/TickTime.h"

#include <cstdint>
#include <string>
#include <utility>
#include <variant>

namespace MF
{

struct KeyframePoint
{
    double mX = 0.0;
    double mY = 0.0;

    friend bool operator==(const KeyframePoint&, const KeyframePoint&) = default;
};

// The value kinds, with the numbers that cross the plug-in boundary.
enum KeyframeValueKind : std::int32_t
{
    kKeyframeValueKind_None = 0,
    kKeyframeValueKind_Int8 = 2,
    kKeyframeValueKind_UInt8 = 3,
    kKeyframeValueKind_Int16 = 4,
    kKeyframeValueKind_UInt16 = 5,
    kKeyframeValueKind_Int32 = 6,
    kKeyframeValueKind_UInt32 = 7,
    kKeyframeValueKind_Int64 = 8,
    kKeyframeValueKind_UInt64 = 9,
    kKeyframeValueKind_Float32 = 10,
    kKeyframeValueKind_Float64 = 11,
    kKeyframeValueKind_Text = 12,
    kKeyframeValueKind_Bool = 13,
    kKeyframeValueKind_Guid = 14,
    kKeyframeValueKind_BinaryData = 15,
    kKeyframeValueKind_Point = 16,
};

// The alternatives in KeyframeValueKind order (kind 1 has no alternative).
using KeyframeValue =
    std::variant<std::monostate, std::int8_t, std::uint8_t, std::int16_t, std::uint16_t,
                 std::int32_t, std::uint32_t, std::int64_t, std::uint64_t, float, double,
                 std::u16string, bool, QRT::Guid, BinaryData, KeyframePoint>;

// The kind of a value: alternative 0 is kind 0, alternative i > 0 is kind i + 1.
KeyframeValueKind GetKeyframeValueKind(const KeyframeValue& inValue) noexcept;

class Keyframe
{
public:
    Keyframe() = default;
    Keyframe(mvxmediatypes::TickTime inTime, KeyframeValue inValue,
             std::int32_t inInterpolation = 0)
        : mTime(inTime)
        , mInterpolation(inInterpolation)
        , mValue(std::move(inValue))
    {
    }

    mvxmediatypes::TickTime GetTime() const { return mTime; }
    // The interpolation kind toward the next keyframe, as the host numbers it.
    std::int32_t GetInterpolation() const { return mInterpolation; }
    const KeyframeValue& GetValue() const { return mValue; }
    KeyframeValueKind GetValueKind() const { return GetKeyframeValueKind(mValue); }

    friend bool operator==(const Keyframe&, const Keyframe&) = default;

private:
    mvxmediatypes::TickTime mTime;
    std::int32_t mInterpolation = 0;
    KeyframeValue mValue;
};

} // namespace MF
