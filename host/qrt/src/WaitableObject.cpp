#include "QRT/WaitableObject.h"

#include "mvxcore/debug/Contract.h"

namespace QRT
{

InterfaceRef<WaitableObject> WaitableObject::Create()
{
    return Allocated<WaitableObject>::CreateInstance();
}

void WaitableObject::Signal()
{
    {
        std::lock_guard lock(mMutex);
        mSignalled = true;
    }
    mCondition.notify_all();
}

void WaitableObject::WaitForSignal()
{
    std::unique_lock lock(mMutex);
    mCondition.wait(lock, [this] { return mSignalled; });
}

bool WaitableObject::WaitForSignal(std::chrono::milliseconds inTimeout)
{
    MVX_INPUT_CONTRACT(inTimeout.count() >= 0);
    std::unique_lock lock(mMutex);
    return mCondition.wait_for(lock, inTimeout, [this] { return mSignalled; });
}

void WaitableObject::Reset()
{
    std::lock_guard lock(mMutex);
    mSignalled = false;
}

bool WaitableObject::IsSignalled() const
{
    std::lock_guard lock(mMutex);
    return mSignalled;
}

} // namespace QRT
