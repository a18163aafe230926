#pragma once

// The object model's root interface and the helper that implements interface
// queries for concrete classes.
//
// Every interface derives (directly, or through one parent interface) from
// QRTUnknown, whose four operations come first: add a reference, release,
// destroy, query interface. Interfaces name their identifier with
// QRT_INTERFACE_ID and, when they extend another interface, that parent with
// QRT_INTERFACE_PARENT:
//
//     class IRenderableSource : public QRT::QRTUnknown
//     {
//     public:
//         QRT_INTERFACE_ID("{...}");
//         virtual ... = 0;
//     };
//
// A concrete class derives from QRT::Implements<IFoo, IBar> and is created
// through QRT::Allocated<T> (Allocated.h), which supplies the reference count.
// A query answers the identifiers of the listed interfaces (and of their
// parents) and the root; anything else answers kResult_NoInterface and an
// empty result.

#include "QRT/Guid.h"
#include "QRT/Result.h"

#include <cstdint>
#include <type_traits>

#define QRT_INTERFACE_ID(text)                                                                     \
    static constexpr ::QRT::Guid kIID                                                              \
    {                                                                                              \
        text                                                                                       \
    }
#define QRT_INTERFACE_PARENT(parent) using ParentInterface = parent

namespace QRT
{

class QRTUnknown
{
public:
    QRT_INTERFACE_ID("{3c5e7f0a-91d2-4b7e-8a3f-0d6c2b1e9a40}");

    // Adds a reference; answers the new count.
    virtual uint32_t AddRef() noexcept = 0;
    // Releases a reference; the last release destroys the object. Answers the new count.
    virtual uint32_t Release() noexcept = 0;
    // Destroys the object and frees its memory. Called by the last Release only.
    virtual void Destroy() noexcept = 0;
    // On success stores the interface pointer (with a reference added) in
    // *outInterface and answers kResult_Success; otherwise stores null and
    // answers kResult_NoInterface.
    virtual Result QueryInterface(const Guid& inIID, void** outInterface) noexcept = 0;

protected:
    ~QRTUnknown() = default;
};

namespace detail
{

template <class I>
concept HasParentInterface = requires
{
    typename I::ParentInterface;
};

// The interface pointer for inIID along I's parent chain, or null.
template <class I>
void* FindInChain(I* inObject, const Guid& inIID) noexcept
{
    if (inIID == I::kIID)
        return inObject;
    if constexpr (HasParentInterface<I>)
        return FindInChain<typename I::ParentInterface>(inObject, inIID);
    else
        return nullptr;
}

template <class First, class... Rest>
struct FirstOf
{
    using Type = First;
};

} // namespace detail

// Base of concrete classes: implements QueryInterface over the listed
// interfaces. The four root operations are redeclared here so that they are
// unambiguous on the concrete class; QRT::Allocated<T> supplies the count.
template <class... Interfaces>
class Implements : public Interfaces...
{
    static_assert(sizeof...(Interfaces) > 0, "a class implements at least one interface");
    static_assert((std::is_base_of_v<QRTUnknown, Interfaces> && ...),
                  "interfaces derive from QRT::QRTUnknown");

    using Primary = typename detail::FirstOf<Interfaces...>::Type;

public:
    uint32_t AddRef() noexcept override = 0;
    uint32_t Release() noexcept override = 0;
    void Destroy() noexcept override = 0;

    Result QueryInterface(const Guid& inIID, void** outInterface) noexcept override
    {
        void* found = nullptr;
        if (inIID == QRTUnknown::kIID)
            found = static_cast<QRTUnknown*>(static_cast<Primary*>(this));
        else
            ((found = found ? found : detail::FindInChain<Interfaces>(this, inIID)), ...);
        if (found == nullptr)
            found = QueryAdditionalInterface(inIID);
        *outInterface = found;
        if (found == nullptr)
            return kResult_NoInterface;
        AddRef();
        return kResult_Success;
    }

    // The root interface of this object, without a reference added.
    QRTUnknown* GetRootUnknown() noexcept
    {
        return static_cast<QRTUnknown*>(static_cast<Primary*>(this));
    }

protected:
    Implements() = default;
    ~Implements() = default;

    // Answers interfaces that are not in the list (a pointer into this
    // object without a reference added), or null.
    virtual void* QueryAdditionalInterface(const Guid& /*inIID*/) noexcept { return nullptr; }
};

} // namespace QRT
