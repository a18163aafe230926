#pragma once

// MF::ITimeTransform: a mapping from one time base to another, such as a
// clip's time to the time of the media it plays.
//
// CreateTimeTransform makes the linear mapping of a playback speed:
//
//     media = start + (t - origin) * speed
//
// The speed is held as an exact fraction numerator / denominator, so that the
// mapping is exact in ticks wherever the product is a whole number of ticks
// (speed 0.5 of an even tick count, speed 2.5 of any tick count). A product
// that falls between two ticks is rounded to the nearest tick, halves toward
// the later tick. A negative speed plays backwards from the start time.
//
// A double speed is turned into the simplest fraction whose value rounds to
// exactly that double (0.1 becomes 1/10, 2.5 becomes 5/2, 1.0/3 becomes 1/3);
// see SpeedToRatio.
//
// Special times: kTime_Invalid maps to kTime_Invalid; kTime_Max and kTime_Min
// (no end, no beginning) map to kTime_Max and kTime_Min, exchanged when the
// speed is negative. Ordinary results beyond the time range saturate to
// kTime_Min / kTime_Max.
//
// Transforms are immutable after creation and may be used from any thread.

#include "QRT/Hash.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"
#include "mvxmediatypes/TickTime.h"

#include <cstdint>

namespace MF
{

class ITimeTransform : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{b16358b3-3e6b-4c19-a753-e271b975f512}");

    // Maps a time of the outer base (a clip's time) to the inner one (media).
    virtual mvxmediatypes::TickTime Transform(mvxmediatypes::TickTime inTime) const = 0;

    // Maps a time of the inner base back to the outer one.
    virtual mvxmediatypes::TickTime InverseTransform(mvxmediatypes::TickTime inTime) const = 0;

    // Inner ticks per outer tick (negative when playing backwards).
    virtual double GetSpeed() const = 0;

    // Mixes everything that determines the mapping into ioHash, so that equal
    // mappings mix equal bytes.
    virtual void MixIntoHash(QRT::HashValue& ioHash) const = 0;

protected:
    ~ITimeTransform() = default;
};

// A speed as an exact fraction; the denominator is always positive and the
// fraction is in lowest terms.
struct SpeedRatio
{
    std::int64_t mNumerator = 1;
    std::int64_t mDenominator = 1;

    friend bool operator==(const SpeedRatio&, const SpeedRatio&) = default;
};

// Numerators and denominators never exceed this magnitude (2^53), which keeps
// every product with a tick count inside 128-bit arithmetic.
inline constexpr std::int64_t kMaxSpeedRatioTerm = std::int64_t{1} << 53;

// The simplest fraction p/q (smallest q) whose quotient, computed in double,
// equals inSpeed exactly; when no such fraction has terms within
// kMaxSpeedRatioTerm, the exact binary value of inSpeed. Input contracts:
// inSpeed is finite and at most 2^53 in magnitude; a speed so close to zero
// (below about 2^-50) that no fraction within the term limit rounds to it is
// refused too.
// Examples: 0.5 -> 1/2, -2.5 -> -5/2, 0.1 -> 1/10, 0 -> 0/1.
SpeedRatio SpeedToRatio(double inSpeed);

// The linear transform media = inStart + (t - inOrigin) * inSpeed. Input
// contracts: inSpeed finite and not zero (a frozen clip is a frame hold, not a
// speed), inOrigin and inStart valid times.
QRT::InterfaceRef<ITimeTransform>
CreateTimeTransform(double inSpeed, mvxmediatypes::TickTime inOrigin = mvxmediatypes::kTime_Zero,
                    mvxmediatypes::TickTime inStart = mvxmediatypes::kTime_Zero);

// The same with the speed given as a fraction (reduced on creation). Input
// contracts: inDenominator not zero, inNumerator not zero, both within
// kMaxSpeedRatioTerm after reduction.
QRT::InterfaceRef<ITimeTransform>
CreateRationalTimeTransform(std::int64_t inNumerator, std::int64_t inDenominator,
                            mvxmediatypes::TickTime inOrigin = mvxmediatypes::kTime_Zero,
                            mvxmediatypes::TickTime inStart = mvxmediatypes::kTime_Zero);

} // namespace MF
