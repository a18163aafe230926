// The disabled node: a subtree that counts in hashes and flags but renders nothing.

#include "graph/RenderableNodeDisabledImpl.h"

#include "ML/RenderableNodes.h"
#include "QRT/Allocated.h"
#include "QRT/Exception.h"

namespace ML
{

QRT::ImmutableString RenderableNodeDisabledImpl::GetNodeType() const
{
    return QRT::ImmutableString::CreateStatic("RenderableNodeDisabledImpl");
}

std::uint32_t RenderableNodeDisabledImpl::ComputeRenderFlags() const
{
    const std::vector<Input>& inputs = GetInputs();
    if (inputs.empty())
        return 0;
    // Dereferencing throws QRT::NullInterfaceException for an empty first input.
    return inputs.front().first->GetRenderFlags();
}

QRT::InterfaceRef<MF::IRenderableNode> RenderableNodeDisabledImpl::GetSelfReference()
{
    return QRT::InterfaceRef<MF::IRenderableNode>(this);
}

QRT::InterfaceRef<MF::IRenderableNode>
CreateDisabledNode(const QRT::InterfaceRef<MF::IRenderableNode>& inInput,
                   mvxmediatypes::TickTime inOffset)
{
    if (!inInput)
        throw QRT::NullInterfaceException();
    QRT::InterfaceRef<RenderableNodeDisabledImpl> node =
        QRT::Allocated<RenderableNodeDisabledImpl>::CreateInstance();
    node->AddInput(inInput, inOffset);
    node->MakeImmutable();
    return node->GetSelfReference();
}

} // namespace ML
