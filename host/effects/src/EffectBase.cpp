// Effect parameters, the common effect object and frame staging.

#include "EffectBase.h"

#include "VF/PixelFormatConversions.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"
#include "mvxcore/debug/Contract.h"

#include <sstream>

namespace FX
{
namespace
{

} // namespace

bool EffectParam::IsTimeVariant() const
{
    return mType == ParamType::kNumber || mType == ParamType::kPoint ||
           mType == ParamType::kChoice || mType == ParamType::kLayer;
}

std::string EffectParam::GetText() const
{
    std::ostringstream text;
    text.precision(17);
    const bool point = mCurve.GetDimension() == 2;
    auto put = [&](MF::KeyframePoint inValue)
    {
        text << inValue.mX;
        if (point)
            text << ',' << inValue.mY;
    };
    text << mName << '=';
    if (mCurve.GetKeys().empty())
        put(mCurve.GetDefault());
    for (std::size_t i = 0; i < mCurve.GetKeys().size(); ++i)
    {
        const BE::CurveKey& key = mCurve.GetKeys()[i];
        text << (i > 0 ? ";" : "") << key.mTime.GetTicks() << ':';
        put(key.mValue);
        text << ':' << static_cast<int>(key.mInterpolation) << ':';
        put(key.mInSlope);
        text << ':';
        put(key.mOutSlope);
    }
    return text.str();
}

namespace detail
{

EffectBase::EffectBase(EffectSetup inSetup)
    : mSetup(std::move(inSetup))
{
}

bool EffectBase::GetOpaqueData(MF::BinaryData& outData) const
{
    if (mSetup.mOpaqueData.IsEmpty())
        return false;
    outData = mSetup.mOpaqueData;
    return true;
}

std::uint32_t EffectBase::GetParamCount() const
{
    return static_cast<std::uint32_t>(mSetup.mParams.size());
}

const EffectParam& EffectBase::GetParam(std::uint32_t inIndex) const
{
    MVX_INPUT_CONTRACT(inIndex < mSetup.mParams.size());
    return mSetup.mParams[inIndex];
}

mvxmediatypes::TickTime EffectBase::GetDuration() const
{
    return mSetup.mDuration.value_or(mvxmediatypes::kTime_Zero);
}

QRT::Result EffectBase::Render(const RenderContext& inContext,
                               QRT::InterfaceRef<MF::IVideoFrame>& ioFrame,
                               const LayerInputs& /*inLayers*/)
{
    return Stage(inContext, ioFrame,
                 [&](QRT::InterfaceRef<MF::IVideoFrame>& ioStaged)
                 { return RenderStaged(inContext, ioStaged); });
}

QRT::Result EffectBase::Stage(const RenderContext& inContext,
                              QRT::InterfaceRef<MF::IVideoFrame>& ioFrame,
                              const StagedRender& inRender)
{
    if (!ioFrame)
        return QRT::kResult_NotFound;
    const mvxmediatypes::PixelFormat format = ioFrame->GetPixelFormat();
    if (format == mvxmediatypes::kPixelFormat_BGRA_4444_8u ||
        format == mvxmediatypes::kPixelFormat_BGRA_4444_32f)
        return inRender(ioFrame);

    const QRT::ParamRect bounds = ioFrame->GetBounds();
    QRT::InterfaceRef<MF::IVideoFrame> staged = VF::CreateVideoFrame(
        mvxmediatypes::kPixelFormat_BGRA_4444_32f, static_cast<std::uint32_t>(bounds.Width()),
        static_cast<std::uint32_t>(bounds.Height()), ioFrame->GetPixelAspectRatio(), false, false);
    if (!staged)
        return kIR_UnsupportedFormat;
    const auto quality = static_cast<mvxmediatypes::RenderQuality>(inContext.mQuality);
    QRT::Result status = VF::VideoFrameManipulators::CopyFrame(ioFrame, staged, quality);
    if (QRT::Failed(status))
        return status;
    status = inRender(staged);
    if (QRT::Failed(status))
        return status;
    QRT::InterfaceRef<MF::IVideoFrame> result = ioFrame->CreateEmptyFrame(false);
    status = VF::VideoFrameManipulators::CopyFrame(staged, result, quality);
    if (QRT::Failed(status))
        return status;
    ioFrame = std::move(result);
    return QRT::kResult_Success;
}

QRT::Result EffectBase::RenderStaged(const RenderContext& inContext,
                                     QRT::InterfaceRef<MF::IVideoFrame>& ioFrame)
{
    ioFrame = VF::MakeWriteableVideoFrame(
        ioFrame, static_cast<mvxmediatypes::RenderQuality>(inContext.mQuality));
    const QRT::Result status = RenderInPlace(inContext, PixelsOf(*ioFrame));
    ioFrame->AlphaChanged();
    return status;
}

QRT::Result EffectBase::RenderInPlace(const RenderContext& /*inContext*/,
                                      const Pixels& /*inPixels*/)
{
    return QRT::kResult_Success;
}

Pixels PixelsOf(MF::IVideoFrame& inFrame)
{
    Pixels pixels;
    const mvxmediatypes::PixelFormat format = inFrame.GetPixelFormat();
    const bool isFloat = format == mvxmediatypes::kPixelFormat_BGRA_4444_32f;
    if (!isFloat && format != mvxmediatypes::kPixelFormat_BGRA_4444_8u)
        return pixels;
    pixels.mBase = inFrame.GetWritableBaseAddress();
    pixels.mRowBytes = inFrame.GetRowBytes();
    pixels.mWidth = inFrame.GetBounds().Width();
    pixels.mHeight = inFrame.GetBounds().Height();
    pixels.mFloat = isFloat;
    return pixels;
}

} // namespace detail
} // namespace FX
