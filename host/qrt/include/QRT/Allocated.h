#pragma once

// QRT::Allocated<T>: the wrapper through which concrete classes are
// instantiated. It adds the atomic 32-bit reference count (starting at zero)
// and takes the object's memory from QRT::Allocator. For classes that
// implement IWeakReferenceCapable the count lives in a weak block instead, so
// that weak references can outlive the object.
//
//     QRT::InterfaceRef<IRenderableSource> source =
//         QRT::Allocated<RenderableVideoSource>::Create<IRenderableSource>(args...);
//
// Create queries the requested interface; a failed query destroys the new
// object and answers an empty reference, not an exception. Exceptions from
// T's constructor propagate after the memory is returned.

#include "QRT/Allocator.h"
#include "QRT/InterfaceRef.h"
#include "QRT/WeakReference.h"

#include <atomic>
#include <cstddef>
#include <new>
#include <type_traits>
#include <utility>

namespace QRT
{
namespace detail
{

// The plain count.
template <class T, bool kWeak = std::is_base_of_v<IWeakReferenceCapable, T>>
class Counted : public T
{
public:
    using T::T;

    uint32_t AddRef() noexcept final { return mCount.fetch_add(1, std::memory_order_relaxed) + 1; }

    uint32_t Release() noexcept final
    {
        const uint32_t count = mCount.fetch_sub(1, std::memory_order_acq_rel) - 1;
        if (count == 0)
            this->Destroy();
        return count;
    }

    uint32_t GetRefCountForTesting() const noexcept { return mCount.load(); }

protected:
    ~Counted() = default;

private:
    std::atomic<uint32_t> mCount{0};
};

// The count in a weak block.
template <class T>
class Counted<T, true> : public T
{
public:
    template <class... Args>
    explicit Counted(Args&&... inArgs)
        : T(std::forward<Args>(inArgs)...)
        , mBlock(WeakBlock::Create())
    {
    }

    uint32_t AddRef() noexcept final { return mBlock->AddStrong(); }

    uint32_t Release() noexcept final
    {
        const uint32_t count = mBlock->ReleaseStrong();
        if (count == 0)
            this->Destroy();
        return count;
    }

    WeakBlock* GetWeakBlock() noexcept final { return mBlock; }

    uint32_t GetRefCountForTesting() const noexcept { return mBlock->GetStrongCount(); }

protected:
    ~Counted() { mBlock->ReleaseBlockRef(); }

private:
    WeakBlock* mBlock;
};

} // namespace detail

template <class T>
class Allocated final : public detail::Counted<T>
{
    static_assert(alignof(T) <= alignof(std::max_align_t),
                  "over-aligned objects are not supported by QRT::Allocator");

public:
    template <class... Args>
    explicit Allocated(Args&&... inArgs)
        : detail::Counted<T>(std::forward<Args>(inArgs)...)
    {
    }

    void Destroy() noexcept override
    {
        this->~Allocated();
        Allocator::Dispose(this);
    }

    // Creates an object and answers it through interface I (empty when the
    // object does not implement I).
    template <class I, class... Args>
    static InterfaceRef<I> Create(Args&&... inArgs)
    {
        Allocated* object = New(std::forward<Args>(inArgs)...);
        object->AddRef(); // keeps the object alive across the query
        void* found = nullptr;
        InterfaceRef<I> result;
        if (object->QueryInterface(I::kIID, &found) == kResult_Success && found)
            result = InterfaceRef<I>::Adopt(static_cast<I*>(found));
        object->Release();
        return result;
    }

    // Creates an object and answers it through its concrete type.
    template <class... Args>
    static InterfaceRef<T> CreateInstance(Args&&... inArgs)
    {
        return InterfaceRef<T>(New(std::forward<Args>(inArgs)...));
    }

private:
    template <class... Args>
    static Allocated* New(Args&&... inArgs)
    {
        void* memory = Allocator::Allocate(sizeof(Allocated));
        try
        {
            return new (memory) Allocated(std::forward<Args>(inArgs)...);
        }
        catch (...)
        {
            Allocator::Dispose(memory);
            throw;
        }
    }
};

} // namespace QRT
