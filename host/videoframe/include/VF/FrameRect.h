#pragma once

// Rectangle helpers for frames. Frame rectangles are QRT::ParamRect (left,
// top, right, bottom; right and bottom exclusive). All zeros is the rectangle
// that frames use for "no visible content" and "no full frame". Plain
// functions, safe from any thread.

#include "QRT/Param.h"

#include <algorithm>

namespace VF
{

using FrameRect = QRT::ParamRect;

constexpr bool IsAllZero(const FrameRect& inRect)
{
    return inRect.mLeft == 0 && inRect.mTop == 0 && inRect.mRight == 0 && inRect.mBottom == 0;
}

// True when inInner lies completely inside inOuter.
constexpr bool Contains(const FrameRect& inOuter, const FrameRect& inInner)
{
    return inInner.mLeft >= inOuter.mLeft && inInner.mTop >= inOuter.mTop &&
           inInner.mRight <= inOuter.mRight && inInner.mBottom <= inOuter.mBottom;
}

// The smallest rectangle holding both; an empty operand does not count.
constexpr FrameRect Union(const FrameRect& inA, const FrameRect& inB)
{
    if (inB.IsEmpty())
        return inA;
    if (inA.IsEmpty())
        return inB;
    return FrameRect{std::min(inA.mLeft, inB.mLeft), std::min(inA.mTop, inB.mTop),
                     std::max(inA.mRight, inB.mRight), std::max(inA.mBottom, inB.mBottom)};
}

// The common part; all zeros when there is none.
constexpr FrameRect Intersect(const FrameRect& inA, const FrameRect& inB)
{
    const FrameRect common{std::max(inA.mLeft, inB.mLeft), std::max(inA.mTop, inB.mTop),
                           std::min(inA.mRight, inB.mRight), std::min(inA.mBottom, inB.mBottom)};
    return common.IsEmpty() ? FrameRect{} : common;
}

} // namespace VF
