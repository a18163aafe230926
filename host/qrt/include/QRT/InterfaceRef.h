#pragma once

// QRT::InterfaceRef<T>: a counted reference to an object through one of its
// interfaces.
//
// - Copying adds a reference; destruction releases it; moving transfers it.
// - Converting from a reference to another interface asks the object for T;
//   when the object does not implement it, InterfaceNotFoundException is
//   thrown. An empty reference converts to an empty reference.
//   QRT::QueryRef<T>(ref) is the non-throwing form (empty on failure).
// - ->, * on an empty reference throw NullInterfaceException.
// - Two references are equal when they reach the same object: they are
//   compared through their root interfaces. When either object cannot answer
//   its root, IllegalComparisonException is thrown. Empty references are
//   equal to each other and to nullptr.
//
// Not thread-safe as an object (like a shared_ptr instance); distinct
// references to one object may be used from any threads.

#include "QRT/Exception.h"
#include "QRT/QRTUnknown.h"

#include <compare>
#include <cstddef>
#include <functional>
#include <type_traits>
#include <utility>

namespace QRT
{

template <class T>
class InterfaceRef
{
public:
    using element_type = T;

    InterfaceRef() noexcept = default;
    InterfaceRef(std::nullptr_t) noexcept {}

    // Adds a reference to inObject (which may be null).
    explicit InterfaceRef(T* inObject) noexcept
        : mObject(inObject)
    {
        if (mObject)
            mObject->AddRef();
    }

    InterfaceRef(const InterfaceRef& inOther) noexcept
        : InterfaceRef(inOther.mObject)
    {
    }

    InterfaceRef(InterfaceRef&& inOther) noexcept
        : mObject(std::exchange(inOther.mObject, nullptr))
    {
    }

    // Conversion: a static up-cast when U derives from T, otherwise a query.
    template <class U>
    requires(!std::is_same_v<U, T>) InterfaceRef(const InterfaceRef<U>& inOther)
    {
        if constexpr (std::is_convertible_v<U*, T*>)
        {
            mObject = inOther.Get();
            if (mObject)
                mObject->AddRef();
        }
        else
        {
            if (!inOther)
                return;
            void* found = nullptr;
            if (inOther.Get()->QueryInterface(T::kIID, &found) != kResult_Success || !found)
                throw InterfaceNotFoundException();
            mObject = static_cast<T*>(found);
        }
    }

    ~InterfaceRef()
    {
        if (mObject)
            mObject->Release();
    }

    InterfaceRef& operator=(const InterfaceRef& inOther) noexcept
    {
        InterfaceRef(inOther).Swap(*this);
        return *this;
    }

    InterfaceRef& operator=(InterfaceRef&& inOther) noexcept
    {
        InterfaceRef(std::move(inOther)).Swap(*this);
        return *this;
    }

    InterfaceRef& operator=(std::nullptr_t) noexcept
    {
        Reset();
        return *this;
    }

    // Takes over a pointer that already carries a reference.
    static InterfaceRef Adopt(T* inObject) noexcept
    {
        InterfaceRef ref;
        ref.mObject = inObject;
        return ref;
    }

    // Gives up the pointer without releasing it.
    T* Detach() noexcept { return std::exchange(mObject, nullptr); }

    void Reset() noexcept
    {
        if (T* old = std::exchange(mObject, nullptr))
            old->Release();
    }

    void Swap(InterfaceRef& ioOther) noexcept { std::swap(mObject, ioOther.mObject); }

    T* Get() const noexcept { return mObject; }

    T* operator->() const
    {
        if (!mObject)
            throw NullInterfaceException();
        return mObject;
    }

    T& operator*() const
    {
        if (!mObject)
            throw NullInterfaceException();
        return *mObject;
    }

    explicit operator bool() const noexcept { return mObject != nullptr; }

    // The object's root interface (no reference added), null for an empty
    // reference. Throws IllegalComparisonException when the object does not
    // answer the root.
    QRTUnknown* GetRootForComparison() const
    {
        if (!mObject)
            return nullptr;
        void* root = nullptr;
        if (mObject->QueryInterface(QRTUnknown::kIID, &root) != kResult_Success || !root)
            throw IllegalComparisonException();
        QRTUnknown* unknown = static_cast<QRTUnknown*>(root);
        unknown->Release();
        return unknown;
    }

private:
    T* mObject = nullptr;
};

// Non-throwing conversion: an empty reference when the object does not
// implement T (or inRef is empty).
template <class T, class U>
InterfaceRef<T> QueryRef(const InterfaceRef<U>& inRef) noexcept
{
    if (!inRef)
        return {};
    void* found = nullptr;
    if (inRef.Get()->QueryInterface(T::kIID, &found) != kResult_Success || !found)
        return {};
    return InterfaceRef<T>::Adopt(static_cast<T*>(found));
}

template <class A, class B>
bool operator==(const InterfaceRef<A>& inLeft, const InterfaceRef<B>& inRight)
{
    if (static_cast<const void*>(inLeft.Get()) == static_cast<const void*>(inRight.Get()))
        return true;
    return inLeft.GetRootForComparison() == inRight.GetRootForComparison();
}

template <class A, class B>
std::strong_ordering operator<=>(const InterfaceRef<A>& inLeft, const InterfaceRef<B>& inRight)
{
    return std::compare_three_way{}(inLeft.GetRootForComparison(), inRight.GetRootForComparison());
}

template <class T>
bool operator==(const InterfaceRef<T>& inRef, std::nullptr_t) noexcept
{
    return !inRef;
}

} // namespace QRT

// Hashes by the object's root interface, consistent with operator==.
template <class T>
struct std::hash<QRT::InterfaceRef<T>>
{
    size_t operator()(const QRT::InterfaceRef<T>& inRef) const
    {
        return std::hash<const void*>{}(inRef.GetRootForComparison());
    }
};
