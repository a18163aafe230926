#pragma once

// The transition objects behind the catalogue: one class renders every kind,
// picking its pixel work by kind once per render.

#include "MF/BinaryData.h"
#include "QRT/InterfaceRef.h"
#include "TX/Transition.h"

#include <string>

namespace TX
{

enum class TransitionKind
{
    kCrossDissolve,
    kDipToBlack,
    kDipToWhite,
    kWipe,
    kPush,
    kSlide,
    kIris,
};

// Settings of the kinds beyond TransitionParameters.
struct TransitionStyle
{
    // Full-frame pixels over which wipe and iris edges blend.
    float mSoftness = 0.0f;
};

QRT::InterfaceRef<ITransition> CreateTransitionObject(TransitionKind inKind,
                                                      std::string inMatchName,
                                                      const TransitionParameters& inParameters,
                                                      const TransitionStyle& inStyle,
                                                      MF::BinaryData inOpaqueData);

} // namespace TX
