#include "QRT/CriticalSection.h"

#include "mvxcore/debug/Contract.h"

namespace QRT
{

void CriticalSection::Lock(const char* inLabel)
{
    // Only this thread can have stored its own id, so the relaxed read is
    // exact for the question "do I hold it already?".
    MVX_INPUT_CONTRACT(!IsLockedByCurrentThread());
    mMutex.lock();
    TakeOwnership(inLabel);
}

bool CriticalSection::TryLock(const char* inLabel)
{
    MVX_INPUT_CONTRACT(!IsLockedByCurrentThread());
    if (!mMutex.try_lock())
        return false;
    TakeOwnership(inLabel);
    return true;
}

void CriticalSection::Unlock()
{
    MVX_INPUT_CONTRACT(IsLockedByCurrentThread());
    mOwnerLabel.store(nullptr, std::memory_order_relaxed);
    mOwner.store(std::thread::id(), std::memory_order_relaxed);
    mMutex.unlock();
}

void CriticalSection::TakeOwnership(const char* inLabel) noexcept
{
    mOwner.store(std::this_thread::get_id(), std::memory_order_relaxed);
    mOwnerLabel.store(inLabel, std::memory_order_relaxed);
}

void CriticalSectionLock::Unlock()
{
    MVX_INPUT_CONTRACT(mLocked);
    mSection.Unlock();
    mLocked = false;
}

void CriticalSectionLock::Relock()
{
    MVX_INPUT_CONTRACT(!mLocked);
    mSection.Lock(mLabel);
    mLocked = true;
}

} // namespace QRT
