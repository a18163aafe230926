#pragma once

// The effect match names the module exports, by which the host recognises
// its built-in effects. Created when the module is loaded, destroyed when it
// is unloaded; read-only, so any thread may use them.
//
// Two are special: a clip reads the keyframes of kMatchnameOpacity and
// kMatchnameMotion as its own opacity and motion, and an effect node of
// either kind makes no operator. The volume, channel volume, mute and
// balance names are audio effects: the video renderer only names them.

#include "QRT/ImmutableString.h"

#include <array>

namespace ML
{

extern const QRT::ImmutableString kMatchnameOpacity;
extern const QRT::ImmutableString kMatchnameMotion;
extern const QRT::ImmutableString kMatchnameTimecode;
extern const QRT::ImmutableString kMatchnameProcamp;
extern const QRT::ImmutableString kMatchnameBalance;
extern const QRT::ImmutableString kMatchnameVolumeMono;
extern const QRT::ImmutableString kMatchnameVolumeStereo;
extern const QRT::ImmutableString kMatchnameVolume51;
extern const QRT::ImmutableString kMatchnameVolumeAdaptive;
extern const QRT::ImmutableString kMatchnameChannelVolumeStereo;
extern const QRT::ImmutableString kMatchnameChannelVolume51;
extern const QRT::ImmutableString kMatchnameChannelVolumeAdaptive;
extern const QRT::ImmutableString kMatchnameMuteMono;
extern const QRT::ImmutableString kMatchnameMuteStereo;
extern const QRT::ImmutableString kMatchnameMute51;
extern const QRT::ImmutableString kMatchnameMute16Channel;
extern const QRT::ImmutableString kTalusMatchName;
extern const QRT::ImmutableString kMatchnameMulticamHilite;
extern const QRT::ImmutableString kMatchnameCornerPin;
extern const QRT::ImmutableString kMatchnameGarbageMatte;
extern const QRT::ImmutableString kMatchnameTransform;
extern const QRT::ImmutableString kMatchnameAlphaAdjust;
extern const QRT::ImmutableString kMatchnameKey_Chroma;
extern const QRT::ImmutableString kMatchnameKey_RGBDifference;
extern const QRT::ImmutableString kMatchnameKey_Luma;
extern const QRT::ImmutableString kMatchnameKey_RemoveMatte;
extern const QRT::ImmutableString kMatchnameKey_ImageMatte;
extern const QRT::ImmutableString kMatchnameKey_DifferenceMatte;
extern const QRT::ImmutableString kMatchnameKey_BlueScreen;
extern const QRT::ImmutableString kMatchnameKey_GreenScreen;
extern const QRT::ImmutableString kMatchnameKey_Multiply;
extern const QRT::ImmutableString kMatchnameKey_Screen;
extern const QRT::ImmutableString kMatchnameKey_TrackMatte;
extern const QRT::ImmutableString kMatchnameKey_NonRed;
extern const QRT::ImmutableString kMatchnameVideoLimiter;

// All 35, in the order above.
const std::array<const QRT::ImmutableString*, 35>& GetExportedMatchNames();

} // namespace ML
