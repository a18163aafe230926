#pragma once

// BE::PatternSettings: the description of a generated test picture, and its text
// form.
//
// Syntax:   pattern:KIND[?KEY=VALUE[&KEY=VALUE]...]
//
//   KIND      bars      seven 75 % colour bars (white, yellow, cyan, green,
//                       magenta, red, blue), bar i covering columns
//                       [i * width / 7, (i + 1) * width / 7)
//             solid     one colour everywhere
//             gradient  a horizontal ramp from `from` (column 0) to `to`
//                       (the last column), rounded to nearest
//             moving    a test pattern in which every frame differs: a
//                       grey background, a light box that moves right along
//                       the bottom edge and the frame number in large digits
//                       at the top left (see PatternSource for the geometry)
//   size=WxH            picture size, 1..32768 each (default 1920x1080)
//   rate=R              frame rate: an integer ("25"), a ratio ("30000/1001")
//                       or one of 23.976, 29.97, 59.94 (default 25)
//   field=F             progressive, upper or lower (default progressive);
//                       interlaced moving patterns draw each field at its own
//                       time
//   par=N:D             pixel aspect ratio, both terms positive (default 1:1)
//   alpha=A             none, straight or premultiplied (default none)
//   opacity=N           the alpha value 0..255 of alpha variants (default 128)
//   matte=RRGGBB        the colour premultiplied variants are premultiplied
//                       over (default 000000)
//   color=RRGGBB        solid only (default 808080)
//   from=RRGGBB, to=RRGGBB   gradient only (default 000000 and FFFFFF)
//
// Keys may come in any order, each at most once; hexadecimal digits in either
// case. Bars, solid and gradient are time-invariant (media kind 1); moving
// varies with time. The canonical text (ToText) spells every key, so two
// texts that mean the same picture have the same canonical text.

#include "QRT/Param.h"
#include "QRT/Result.h"
#include "mvxmediatypes/FieldType.h"
#include "mvxmediatypes/FrameRate.h"
#include "mvxmediatypes/PixelAspectRatio.h"

#include <cstdint>
#include <string>
#include <string_view>

namespace BE
{

enum class PatternKind
{
    kBars,
    kSolid,
    kGradient,
    kMoving,
};

struct PatternSettings
{
    PatternKind mKind = PatternKind::kBars;
    std::uint32_t mWidth = 1920;
    std::uint32_t mHeight = 1080;
    mvxmediatypes::FrameRate mFrameRate = mvxmediatypes::kFrameRate_Video25;
    mvxmediatypes::FieldType mFieldType = mvxmediatypes::kFieldType_Progressive;
    mvxmediatypes::PixelAspectRatio mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    mvxmediatypes::AlphaChannel mAlpha = mvxmediatypes::kAlphaChannel_None;
    std::uint8_t mOpacity = 128;
    // Colours as 0xRRGGBB.
    std::uint32_t mMatte = 0x000000;
    std::uint32_t mColor = 0x808080;
    std::uint32_t mFrom = 0x000000;
    std::uint32_t mTo = 0xFFFFFF;

    // True for the kinds whose picture does not change with time.
    bool IsTimeInvariant() const { return mKind != PatternKind::kMoving; }
    // The canonical "pattern:..." text.
    std::string ToText() const;

    friend bool operator==(const PatternSettings&, const PatternSettings&) = default;
};

struct PatternParseResult
{
    QRT::Result mResult = QRT::kResult_Success;
    // Empty on success; otherwise "pattern '<text>': <problem>".
    std::string mMessage;
    PatternSettings mSettings;

    bool Succeeded() const { return QRT::Succeeded(mResult); }
};

// Parses a "pattern:" text. Failures answer kResult_BadPattern with a
// message naming the text and what is wrong in it.
PatternParseResult ParsePatternSettings(std::string_view inText);

} // namespace BE
