#pragma once

// MF::IRenderableNode: one node of a renderable cutlist's node tree, as every
// reader of the tree sees it (renderer, prefetchers, accelerated renderers,
// plug-in suites).
//
// A node is an immutable description of one step of the picture (a piece of
// media, a clip, an effect, a transition, a compositor, ...). It is built and
// sealed by the cutlist factory on one thread and afterwards only read, from
// any number of threads, without locks. Its hash covers its hashed
// properties, its inputs (offsets and their hashes), its kind and its
// operators, so equal hashes mean interchangeable pictures.
//
// Statuses: QRT::kResult_Success, or QRT::kResult_NotFound for an index out
// of range or an absent key, in which case the outputs are left untouched.
// Operations that need a sealed node break the input contract "!mMutable"
// when called before sealing.

#include "QRT/Guid.h"
#include "QRT/ImmutableString.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"
#include "QRT/Result.h"
#include "mvxmediatypes/TickTime.h"

#include <cstdint>
#include <map>
#include <string>

namespace MF
{

// Property values are byte strings (text written by the factory). Keys are
// ordered by QRT::ImmutableString::Compare.
using RenderablePropertyValue = std::string;
using RenderablePropertyMap = std::map<QRT::ImmutableString, RenderablePropertyValue>;

class IRenderableNode : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{d8f24158-f4f3-4749-8ab1-3b96d99b5d0d}");

    // The node's identity hash, fixed at sealing. Sealed nodes only.
    virtual QRT::Guid GetNodeHash() const = 0;

    // The node kind's type name (for example "RenderableNodeClipImpl").
    virtual QRT::ImmutableString GetNodeType() const = 0;

    // The render flag bits computed at sealing. Sealed nodes only.
    virtual std::uint32_t GetRenderFlags() const = 0;

    // Replaces outProperties with every property, hashed and unhashed; for a
    // key present in both, the hashed value.
    virtual void GetProperties(RenderablePropertyMap& outProperties) const = 0;

    // The value of inKey (hashed first, then unhashed), or kResult_NotFound.
    virtual QRT::Result GetProperty(const QRT::ImmutableString& inKey,
                                    RenderablePropertyValue& outValue) const = 0;

    virtual std::uint32_t GetInputCount() const = 0;

    // Input inIndex: its start in this node's time and its node (which may be
    // empty). kResult_NotFound when inIndex is not below the count. Sealed
    // nodes only.
    virtual QRT::Result GetInput(std::uint32_t inIndex, mvxmediatypes::TickTime& outOffset,
                                 QRT::InterfaceRef<IRenderableNode>& outNode) const = 0;

    virtual std::uint32_t GetOperatorCount() const = 0;

    // Operator inIndex (never empty), or kResult_NotFound. Sealed nodes only.
    virtual QRT::Result GetOperator(std::uint32_t inIndex,
                                    QRT::InterfaceRef<IRenderableNode>& outNode) const = 0;

protected:
    ~IRenderableNode() = default;
};

} // namespace MF
