#pragma once

// ML::SubTreeRender: renders a part of a node tree (a layer that an effect
// reads) into a frame at the time its consumer asks for, with the layer's own
// motion. Made by the clip producer for the layer inputs of its effect
// operators and handed to the host effect as an FX::ILayerInput; used by the
// thread that renders the clip, for the request it was made for.

#include "FX/Effect.h"
#include "QRT/QRTUnknown.h"

namespace ML
{

class SubTreeRender : public FX::ILayerInput
{
public:
    QRT_INTERFACE_ID("{e41f7a9c-0b3d-4c58-a6e2-93d5b8c17f04}");
    QRT_INTERFACE_PARENT(FX::ILayerInput);

protected:
    ~SubTreeRender() = default;
};

} // namespace ML
