#include "VF/SDKPixelFormat.h"

#include <array>
#include <utility>

namespace VF
{
namespace
{

namespace mt = mvxmediatypes;

constexpr std::array<std::pair<OvPixelFormat, mt::PixelFormat>, 11> kSDKFormats{{
    {kOvPixelFormat_BGRA_4444_8u, mt::kPixelFormat_BGRA_4444_8u},
    {kOvPixelFormat_BGRA_4444_16u, mt::kPixelFormat_BGRA_4444_16u},
    {kOvPixelFormat_BGRA_4444_16f, mt::kPixelFormat_BGRA_4444_16f},
    {kOvPixelFormat_BGRA_4444_32f, mt::kPixelFormat_BGRA_4444_32f},
    {kOvPixelFormat_BGRP_4444_32f_Linear, mt::kPixelFormat_BGRP_4444_32f_Linear},
    {kOvPixelFormat_VUYA_4444_8u, mt::kPixelFormat_VUYA_4444_8u},
    {kOvPixelFormat_VUYA_4444_32f, mt::kPixelFormat_VUYA_4444_32f},
    {kOvPixelFormat_YUYV_422_8u, mt::kPixelFormat_YUYV_422_8u},
    {kOvPixelFormat_YUYV_422_8u_Fields, mt::kPixelFormat_YUYV_422_8u_Fields},
    {kOvPixelFormat_YUYV_422_8u_HalfWidthFields, mt::kPixelFormat_YUYV_422_8u_HalfWidthFields},
    {kOvPixelFormat_MJPG_422_Compressed, mt::kPixelFormat_MJPG_422_Compressed},
}};

} // namespace

bool IsValidSDKPixelFormat(OvPixelFormat inFormat)
{
    return SDKToBEPixelFormat(inFormat) != mt::kPixelFormat_Invalid;
}

mt::PixelFormat SDKToBEPixelFormat(OvPixelFormat inFormat)
{
    for (const auto& [sdk, catalogue] : kSDKFormats)
        if (sdk == inFormat)
            return catalogue;
    return mt::kPixelFormat_Invalid;
}

OvPixelFormat BEToSDKPixelFormat(mt::PixelFormat inFormat)
{
    for (const auto& [sdk, catalogue] : kSDKFormats)
        if (catalogue == inFormat)
            return sdk;
    return kOvPixelFormat_Invalid;
}

} // namespace VF
