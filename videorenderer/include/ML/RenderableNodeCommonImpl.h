#pragma once

// ML::RenderableNodeCommonImpl: what every renderable node kind has in common:
// the hashed and unhashed property maps, the inputs (each a node, possibly
// empty, and its start in this node's time), the operators (effect nodes
// applied to this node's result, in order), the mutability rule, the node
// hash, the input-side hash and the render flags.
//
// Lifecycle and threads: a node is created mutable by the cutlist factory and
// filled on that one thread with SetProperty, AddInput, AddOperator and the
// kind's own setters (all with the input contract "mMutable"). MakeImmutable
// seals it: the node hash, the input-side hash and the render flags are fixed
// and nothing changes afterwards, so any number of threads may read the node
// without locks. Reading the hash, the flags, inputs, operators or
// prefetching before sealing breaks the input contract "!mMutable".
//
// Ownership: the node holds references to its inputs and operators; trees
// are acyclic. Each concrete kind is instantiated through QRT::Allocated<T>,
// which supplies the atomic reference count.
//
// The node hash: a QRT::HashValue started at zero, mixed with
//   "ML::RenderableNodeCommonImpl"
//   per hashed property in key order: "PropertyName::", key, "PropertyValue::", value
//   per input in order: "Input::", the 8 offset bytes, the 16 bytes of the
//                       input's node hash when the input is not empty
//   "NodeType::", the type name               -> the input-side hash
//   per operator in order: "Operator::", the 16 bytes of its node hash
//                                              -> the node hash
// each converted with QRT::HashValueToGuid. Equal hashes mean
// interchangeable subtrees wherever they occur.

#include "MF/RenderableCutlist.h"
#include "MF/RenderableNode.h"
#include "MF/TimeTransform.h"
#include "ML/CutlistRenderParams.h"
#include "ML/IRenderableNodePrefetch.h"
#include "ML/IRenderableNodePrefetchProvider.h"
#include "ML/RenderablePropertyValue.h"
#include "QRT/Guid.h"
#include "QRT/Hash.h"
#include "QRT/ImmutableString.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"
#include "QRT/Result.h"
#include "mvxmediatypes/TickTime.h"

#include <cstdint>
#include <string_view>
#include <utility>
#include <vector>

namespace ML
{

class RenderableNodeCommonImpl
    : public QRT::Implements<MF::IRenderableNode, IRenderableNodePrefetchProvider>
{
public:
    // One input: the node (may be empty) and its start in this node's time.
    using Input = std::pair<QRT::InterfaceRef<MF::IRenderableNode>, mvxmediatypes::TickTime>;

    // --- MF::IRenderableNode ----------------------------------------------------
    QRT::Guid GetNodeHash() const override;
    QRT::ImmutableString GetNodeType() const override = 0;
    std::uint32_t GetRenderFlags() const override;
    void GetProperties(MF::RenderablePropertyMap& outProperties) const override;
    QRT::Result GetProperty(const QRT::ImmutableString& inKey,
                            MF::RenderablePropertyValue& outValue) const override;
    std::uint32_t GetInputCount() const override;
    QRT::Result GetInput(std::uint32_t inIndex, mvxmediatypes::TickTime& outOffset,
                         QRT::InterfaceRef<MF::IRenderableNode>& outNode) const override;
    std::uint32_t GetOperatorCount() const override;
    QRT::Result GetOperator(std::uint32_t inIndex,
                            QRT::InterfaceRef<MF::IRenderableNode>& outNode) const override;

    // --- Common virtual operations ------------------------------------------------
    // Mixes "NodeType::" and the type name into ioHash.
    virtual void MixKindIntoHash(QRT::HashValue& ioHash) const;
    // The kind's render flags, computed once at sealing (0 by default).
    virtual std::uint32_t ComputeRenderFlags() const;
    // The node's own prefetch for inRange (node time); nothing by default.
    virtual void PrefetchSelf(const MF::TickTimeRange& inRange, const CutlistRenderParams& inParams,
                              RenderableNodePrefetchList& ioPrefetches) const;
    // The mapping from this node's time to its inputs' time; empty by default.
    virtual QRT::InterfaceRef<MF::ITimeTransform> GetTimeTransform() const;
    // Seals the node (see the header comment). Input contract "mMutable".
    // An empty operator throws QRT::NullInterfaceException and leaves the
    // node mutable.
    virtual void MakeImmutable();

    // --- ML::IRenderableNodePrefetchProvider --------------------------------------
    // Prefetches every input over inRange moved into its time (minus its
    // offset, then through GetTimeTransform when there is one), then the node
    // itself. Input contract "!mMutable".
    void Prefetch(const MF::TickTimeRange& inRange, const CutlistRenderParams& inParams,
                  RenderableNodePrefetchList& ioPrefetches) const override;

    // --- Building (input contract "mMutable") ---------------------------------------
    // Writes inKey into the hashed map (inHashed) or the unhashed map; an empty
    // value removes the key from that map.
    void SetProperty(const QRT::ImmutableString& inKey, std::string_view inValue, bool inHashed);
    // Typed forms: the value as its property text (ML/RenderablePropertyValue.h).
    template <class T>
    void SetTypedProperty(const QRT::ImmutableString& inKey, T inValue, bool inHashed)
    {
        SetProperty(inKey, FormatPropertyValue(inValue), inHashed);
    }
    void AddInput(const QRT::InterfaceRef<MF::IRenderableNode>& inNode,
                  mvxmediatypes::TickTime inOffset);
    // Operators must not be empty; MakeImmutable refuses an empty one.
    void AddOperator(const QRT::InterfaceRef<MF::IRenderableNode>& inNode);

    // --- Read access for kinds and their producers ------------------------------------
    bool IsMutable() const { return mMutable; }
    // The node hash before the operators were mixed in. Sealed nodes only.
    QRT::Guid GetInputSideHash() const;
    const std::vector<Input>& GetInputs() const { return mInputs; }
    const std::vector<QRT::InterfaceRef<MF::IRenderableNode>>& GetOperators() const
    {
        return mOperators;
    }
    // The hashed value of inKey, or null when the hashed map lacks it.
    const MF::RenderablePropertyValue* FindHashedProperty(const QRT::ImmutableString& inKey) const;

protected:
    RenderableNodeCommonImpl() = default;
    ~RenderableNodeCommonImpl() = default;

private:
    MF::RenderablePropertyMap mHashedProperties;
    MF::RenderablePropertyMap mUnhashedProperties;
    bool mMutable = true;
    QRT::Guid mNodeHash;
    QRT::Guid mInputSideHash;
    std::uint32_t mRenderFlags = 0;
    std::vector<Input> mInputs;
    std::vector<QRT::InterfaceRef<MF::IRenderableNode>> mOperators;
};

// A node kind Base that also answers the further interfaces Extra..., which
// the kind implements. Interface queries try Base's interfaces first, then
// Extra's in order.
template <class Base, class... Extra>
class RenderableNodeWithInterfaces : public Base, public Extra...
{
public:
    std::uint32_t AddRef() noexcept override = 0;
    std::uint32_t Release() noexcept override = 0;
    void Destroy() noexcept override = 0;

    QRT::Result QueryInterface(const QRT::Guid& inIID, void** outInterface) noexcept override
    {
        return Base::QueryInterface(inIID, outInterface);
    }

protected:
    using Base::Base;
    ~RenderableNodeWithInterfaces() = default;

    void* QueryAdditionalInterface(const QRT::Guid& inIID) noexcept override
    {
        void* found = nullptr;
        ((found = found ? found : QRT::detail::FindInChain<Extra>(this, inIID)), ...);
        return found ? found : Base::QueryAdditionalInterface(inIID);
    }
};

} // namespace ML
