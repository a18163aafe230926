// The exported match-name constants.

#include "ML/MatchNames.h"

namespace ML
{

const QRT::ImmutableString kMatchnameOpacity =
    QRT::ImmutableString::CreateStatic("KX.VNTR Opacity");
const QRT::ImmutableString kMatchnameMotion = QRT::ImmutableString::CreateStatic("KX.VNTR Motion");
const QRT::ImmutableString kMatchnameTimecode =
    QRT::ImmutableString::CreateStatic("KX.VNTR Orvl Timecode");
const QRT::ImmutableString kMatchnameProcamp =
    QRT::ImmutableString::CreateStatic("KX.VNTR ProcAmp");
const QRT::ImmutableString kMatchnameBalance =
    QRT::ImmutableString::CreateStatic("Internal Balance");
const QRT::ImmutableString kMatchnameVolumeMono =
    QRT::ImmutableString::CreateStatic("Internal Volume Mono");
const QRT::ImmutableString kMatchnameVolumeStereo =
    QRT::ImmutableString::CreateStatic("Internal Volume Stereo");
const QRT::ImmutableString kMatchnameVolume51 =
    QRT::ImmutableString::CreateStatic("Internal Volume 5.1");
const QRT::ImmutableString kMatchnameVolumeAdaptive =
    QRT::ImmutableString::CreateStatic("Internal Volume 16 Channel");
const QRT::ImmutableString kMatchnameChannelVolumeStereo =
    QRT::ImmutableString::CreateStatic("Internal Channel Volume Stereo");
const QRT::ImmutableString kMatchnameChannelVolume51 =
    QRT::ImmutableString::CreateStatic("Internal Channel Volume 5.1");
const QRT::ImmutableString kMatchnameChannelVolumeAdaptive =
    QRT::ImmutableString::CreateStatic("Internal Channel Volume 16 Channel");
const QRT::ImmutableString kMatchnameMuteMono =
    QRT::ImmutableString::CreateStatic("Internal Mute Mono");
const QRT::ImmutableString kMatchnameMuteStereo =
    QRT::ImmutableString::CreateStatic("Internal Mute Stereo");
const QRT::ImmutableString kMatchnameMute51 =
    QRT::ImmutableString::CreateStatic("Internal Mute 5.1");
const QRT::ImmutableString kMatchnameMute16Channel =
    QRT::ImmutableString::CreateStatic("Internal Mute 16 Channel");
const QRT::ImmutableString kTalusMatchName = QRT::ImmutableString::CreateStatic("Orvl.TimeWarp");
const QRT::ImmutableString kMatchnameMulticamHilite =
    QRT::ImmutableString::CreateStatic("KX.VNTR Multicam Hilite");
const QRT::ImmutableString kMatchnameCornerPin =
    QRT::ImmutableString::CreateStatic("KX.VNTR Corner Pin");
const QRT::ImmutableString kMatchnameGarbageMatte =
    QRT::ImmutableString::CreateStatic("KX.VNTR Garbage Matte");
const QRT::ImmutableString kMatchnameTransform =
    QRT::ImmutableString::CreateStatic("KX.VNTR Geometry");
const QRT::ImmutableString kMatchnameAlphaAdjust =
    QRT::ImmutableString::CreateStatic("KX.VNTR Alpha Adjust");
const QRT::ImmutableString kMatchnameKey_Chroma =
    QRT::ImmutableString::CreateStatic("KX.VNTR Legacy Key Chroma");
const QRT::ImmutableString kMatchnameKey_RGBDifference =
    QRT::ImmutableString::CreateStatic("KX.VNTR Legacy Key RGBDifference");
const QRT::ImmutableString kMatchnameKey_Luma =
    QRT::ImmutableString::CreateStatic("KX.VNTR Legacy Key Luma");
const QRT::ImmutableString kMatchnameKey_RemoveMatte =
    QRT::ImmutableString::CreateStatic("KX.VNTR Legacy Key Remove Matte");
const QRT::ImmutableString kMatchnameKey_ImageMatte =
    QRT::ImmutableString::CreateStatic("KX.VNTR Legacy Key Image Matte");
const QRT::ImmutableString kMatchnameKey_DifferenceMatte =
    QRT::ImmutableString::CreateStatic("KX.VNTR Legacy Key Difference Matte");
const QRT::ImmutableString kMatchnameKey_BlueScreen =
    QRT::ImmutableString::CreateStatic("KX.VNTR Legacy Key BlueScreen");
const QRT::ImmutableString kMatchnameKey_GreenScreen =
    QRT::ImmutableString::CreateStatic("KX.VNTR Legacy Key GreenScreen");
const QRT::ImmutableString kMatchnameKey_Multiply =
    QRT::ImmutableString::CreateStatic("KX.VNTR Legacy Key Multiply");
const QRT::ImmutableString kMatchnameKey_Screen =
    QRT::ImmutableString::CreateStatic("KX.VNTR Legacy Key Screen");
const QRT::ImmutableString kMatchnameKey_TrackMatte =
    QRT::ImmutableString::CreateStatic("KX.VNTR Legacy Key Track Matte");
const QRT::ImmutableString kMatchnameKey_NonRed =
    QRT::ImmutableString::CreateStatic("KX.VNTR Legacy Key NonRed");
const QRT::ImmutableString kMatchnameVideoLimiter =
    QRT::ImmutableString::CreateStatic("KX.VNTR Video Limiter");

const std::array<const QRT::ImmutableString*, 35>& GetExportedMatchNames()
{
    static const std::array<const QRT::ImmutableString*, 35> sNames = {
        &kMatchnameOpacity,         &kMatchnameMotion,
        &kMatchnameTimecode,        &kMatchnameProcamp,
        &kMatchnameBalance,         &kMatchnameVolumeMono,
        &kMatchnameVolumeStereo,    &kMatchnameVolume51,
        &kMatchnameVolumeAdaptive,  &kMatchnameChannelVolumeStereo,
        &kMatchnameChannelVolume51, &kMatchnameChannelVolumeAdaptive,
        &kMatchnameMuteMono,        &kMatchnameMuteStereo,
        &kMatchnameMute51,          &kMatchnameMute16Channel,
        &kTalusMatchName,           &kMatchnameMulticamHilite,
        &kMatchnameCornerPin,       &kMatchnameGarbageMatte,
        &kMatchnameTransform,       &kMatchnameAlphaAdjust,
        &kMatchnameKey_Chroma,      &kMatchnameKey_RGBDifference,
        &kMatchnameKey_Luma,        &kMatchnameKey_RemoveMatte,
        &kMatchnameKey_ImageMatte,  &kMatchnameKey_DifferenceMatte,
        &kMatchnameKey_BlueScreen,  &kMatchnameKey_GreenScreen,
        &kMatchnameKey_Multiply,    &kMatchnameKey_Screen,
        &kMatchnameKey_TrackMatte,  &kMatchnameKey_NonRed,
        &kMatchnameVideoLimiter,
    };
    return sNames;
}

} // namespace ML
