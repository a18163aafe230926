#pragma once

// Weak references to objects that implement IWeakReferenceCapable (render
// clients, for example).
//
// Such an object keeps its strong count in a separately allocated weak block
// that outlives it while weak references remain. A weak reference yields a
// strong one only while the count is above zero: it raises the count by a
// compare-and-swap from a non-zero value, so it can never revive an object
// whose last release has begun. Under contention the loop backs off by
// spinning 1, 2, 4, 8 and 16 times, then sleeping 1 ms per further attempt.

#include "QRT/InterfaceRef.h"

#include <atomic>
#include <cstdint>

namespace QRT
{

class WeakBlock
{
public:
    // A block whose object holds the only block reference and no strong one.
    static WeakBlock* Create();

    // Strong count operations used by the object's AddRef and Release.
    uint32_t AddStrong() noexcept { return mStrong.fetch_add(1, std::memory_order_relaxed) + 1; }
    uint32_t ReleaseStrong() noexcept
    {
        return mStrong.fetch_sub(1, std::memory_order_acq_rel) - 1;
    }
    uint32_t GetStrongCount() const noexcept { return mStrong.load(std::memory_order_acquire); }

    // Raises the strong count when it is above zero; false once it is zero.
    bool TryAddStrong() noexcept;

    void AddBlockRef() noexcept { mBlockRefs.fetch_add(1, std::memory_order_relaxed); }
    // The last block release frees the block.
    void ReleaseBlockRef() noexcept;

private:
    WeakBlock() = default;

    std::atomic<uint32_t> mStrong{0};
    std::atomic<uint32_t> mBlockRefs{1};
};

class IWeakReferenceCapable : public QRTUnknown
{
public:
    QRT_INTERFACE_ID("{b5f0c3a2-6d1e-4f8a-9c27-3e4d5a6b7c81}");

    // The object's weak block; valid while the caller holds a strong reference.
    virtual WeakBlock* GetWeakBlock() noexcept = 0;

protected:
    ~IWeakReferenceCapable() = default;
};

// A weak reference through interface T. Copyable; not thread-safe as an
// object, but distinct weak references may be locked from any threads.
template <class T>
class WeakReference
{
public:
    WeakReference() noexcept = default;

    // Throws InterfaceNotFoundException when the object is not weak-capable.
    explicit WeakReference(const InterfaceRef<T>& inStrong)
    {
        if (!inStrong)
            return;
        InterfaceRef<IWeakReferenceCapable> capable(inStrong);
        mBlock = capable->GetWeakBlock();
        mBlock->AddBlockRef();
        mObject = inStrong.Get();
    }

    WeakReference(const WeakReference& inOther) noexcept
        : mBlock(inOther.mBlock)
        , mObject(inOther.mObject)
    {
        if (mBlock)
            mBlock->AddBlockRef();
    }

    WeakReference(WeakReference&& inOther) noexcept
        : mBlock(std::exchange(inOther.mBlock, nullptr))
        , mObject(std::exchange(inOther.mObject, nullptr))
    {
    }

    WeakReference& operator=(WeakReference inOther) noexcept
    {
        std::swap(mBlock, inOther.mBlock);
        std::swap(mObject, inOther.mObject);
        return *this;
    }

    ~WeakReference()
    {
        if (mBlock)
            mBlock->ReleaseBlockRef();
    }

    // A strong reference while the object lives, else empty.
    InterfaceRef<T> Lock() const noexcept
    {
        if (!mBlock || !mBlock->TryAddStrong())
            return {};
        return InterfaceRef<T>::Adopt(mObject);
    }

    bool IsExpired() const noexcept { return !mBlock || mBlock->GetStrongCount() == 0; }
    bool IsEmpty() const noexcept { return mBlock == nullptr; }

private:
    WeakBlock* mBlock = nullptr;
    T* mObject = nullptr;
};

} // namespace QRT
