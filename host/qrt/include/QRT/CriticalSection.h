#pragma once

// QRT::CriticalSection: a non-recursive mutex; QRT::CriticalSectionLock: its
// scoped lock.
//
// - A critical section is owned by the object or table whose state it guards;
//   it may be locked from any thread.
// - It is not recursive. Locking it again on the thread that holds it is an
//   input contract violation (a clear error instead of a silent deadlock);
//   unlocking it on a thread that does not hold it is one too.
// - A lock may carry a label, a string literal naming the place of locking
//   ("RenderFrameQueue::OnAcceleratedRenderCompletion"). The section remembers
//   the label of its current holder for debugging (GetOwnerLabel).
// - lock(), unlock() and try_lock() make it a standard Lockable, so
//   std::scoped_lock, std::unique_lock and std::condition_variable_any work
//   with it.

#include <atomic>
#include <mutex>
#include <thread>

namespace QRT
{

class CriticalSection
{
public:
    CriticalSection() = default;
    CriticalSection(const CriticalSection&) = delete;
    CriticalSection& operator=(const CriticalSection&) = delete;

    // Blocks until the section is held by the calling thread.
    void Lock(const char* inLabel = nullptr);
    // True when the section was free and is now held.
    bool TryLock(const char* inLabel = nullptr);
    void Unlock();

    // True when the calling thread holds the section.
    bool IsLockedByCurrentThread() const noexcept
    {
        return mOwner.load(std::memory_order_relaxed) == std::this_thread::get_id();
    }
    // The label given by the current holder (null when none or not held).
    // Only for debugging: the holder may change while the caller reads it.
    const char* GetOwnerLabel() const noexcept
    {
        return mOwnerLabel.load(std::memory_order_relaxed);
    }

    void lock() { Lock(); }
    bool try_lock() { return TryLock(); }
    void unlock() { Unlock(); }

private:
    void TakeOwnership(const char* inLabel) noexcept;

    std::mutex mMutex;
    // The holder and its label, written only by the holder.
    std::atomic<std::thread::id> mOwner{};
    std::atomic<const char*> mOwnerLabel{nullptr};
};

// Holds a critical section for its scope. Unlock and Relock let a caller step
// out of the section in the middle of the scope (for example to deliver a
// notification); the destructor unlocks only when still locked.
class CriticalSectionLock
{
public:
    explicit CriticalSectionLock(CriticalSection& inSection, const char* inLabel = nullptr)
        : mSection(inSection)
        , mLabel(inLabel)
    {
        mSection.Lock(mLabel);
        mLocked = true;
    }

    ~CriticalSectionLock()
    {
        if (mLocked)
            mSection.Unlock();
    }

    CriticalSectionLock(const CriticalSectionLock&) = delete;
    CriticalSectionLock& operator=(const CriticalSectionLock&) = delete;

    // Leaves the section early; input contract: still locked.
    void Unlock();
    // Takes the section again; input contract: unlocked by Unlock.
    void Relock();

    bool IsLocked() const noexcept { return mLocked; }
    const char* GetLabel() const noexcept { return mLabel; }
    CriticalSection& GetSection() const noexcept { return mSection; }

private:
    CriticalSection& mSection;
    const char* mLabel;
    bool mLocked = false;
};

} // namespace QRT
