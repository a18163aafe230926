#pragma once

// RenderableNodeDisabledImpl: a disabled subtree. It takes part in its
// parent's hash and flags like any node (its render flags are its first
// input's, 0 without inputs) but answers no producer provider, so the
// compositor makes no layer for it. Built and sealed by one thread, read by
// any afterwards.

#include "ML/RenderableNodeCommonImpl.h"

namespace ML
{

class RenderableNodeDisabledImpl : public RenderableNodeCommonImpl
{
public:
    RenderableNodeDisabledImpl() = default;

    QRT::ImmutableString GetNodeType() const override;

    // The first input's flags; 0 without inputs. An empty first input throws
    // QRT::NullInterfaceException.
    std::uint32_t ComputeRenderFlags() const override;

    // A new reference to this node.
    QRT::InterfaceRef<MF::IRenderableNode> GetSelfReference();

protected:
    ~RenderableNodeDisabledImpl() = default;
};

} // namespace ML
