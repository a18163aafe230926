#pragma once

// The media adaptors: renderable sources over a back-end video source.
// - CreateRenderableSource: the source creates the frame;
// - CreateRenderableGetVideoSource: the adaptor creates the frame in the
//   nearest format the source supports and has the source draw into it.
// Both answer the reference obtained by querying IRenderableSource.

#include "BE/ColorProfile.h"
#include "BE/IVideoSource.h"
#include "MF/BinaryData.h"
#include "ML/IRenderableSource.h"
#include "QRT/InterfaceRef.h"
#include "QRT/Param.h"
#include "mvxmediatypes/FieldType.h"
#include "mvxmediatypes/FrameRate.h"
#include "mvxmediatypes/PixelAspectRatio.h"
#include "mvxmediatypes/TickTime.h"

namespace ML
{

QRT::InterfaceRef<IRenderableSource>
CreateRenderableSource(const QRT::InterfaceRef<BE::Deprecated::IVideoSource>& inSource,
                       const MF::BinaryData& inBinaryData, mvxmediatypes::AlphaChannel inAlphaKind,
                       QRT::ParamColor inMatteColor, bool inIgnoreAlpha, bool inInvertAlpha,
                       mvxmediatypes::FrameRate inFrameRate, mvxmediatypes::FieldType inFieldType,
                       mvxmediatypes::PixelAspectRatio inPixelAspectRatio,
                       const BE::ColorProfile& inColorProfile);

QRT::InterfaceRef<IRenderableSource> CreateRenderableGetVideoSource(
    const QRT::InterfaceRef<BE::Deprecated::IVideoSource>& inSource,
    const MF::BinaryData& inBinaryData, mvxmediatypes::TickTime inFrameGridOrigin,
    mvxmediatypes::TickTime inSecondTime, QRT::ParamColor inMatteColor,
    mvxmediatypes::AlphaChannel inAlphaKind, bool inIgnoreAlpha, bool inInvertAlpha,
    bool inThirdFlag, double inValue, mvxmediatypes::FrameRate inFrameRate);

} // namespace ML
