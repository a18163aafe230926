#pragma once

// QRT::WaitableObject: a manual-reset signal that threads wait for.
//
// - Created with WaitableObject::Create() as a counted object, so that a
//   request and the thread waiting for it can both hold it.
// - Manual reset: once Signal() has been called, every current waiter is
//   released and every later wait returns at once, until Reset().
// - Signal before wait is not lost; signalling twice is the same as once.
// - All operations may be called from any thread.

#include "QRT/Allocated.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"

#include <chrono>
#include <condition_variable>
#include <mutex>

namespace QRT
{

class IWaitableObject : public QRTUnknown
{
public:
    QRT_INTERFACE_ID("{6f0be0b3-1c7a-4c55-9a0e-2f6c81d94b27}");

    virtual void Signal() = 0;
    // Blocks until the object is signalled.
    virtual void WaitForSignal() = 0;
    // Blocks until the object is signalled or inTimeout has passed; true when
    // signalled. A zero timeout only tests the state.
    virtual bool WaitForSignal(std::chrono::milliseconds inTimeout) = 0;
    virtual void Reset() = 0;
    virtual bool IsSignalled() const = 0;

protected:
    ~IWaitableObject() = default;
};

class WaitableObject : public Implements<IWaitableObject>
{
public:
    // A new, unsignalled object.
    static InterfaceRef<WaitableObject> Create();

    void Signal() override;
    void WaitForSignal() override;
    bool WaitForSignal(std::chrono::milliseconds inTimeout) override;
    void Reset() override;
    bool IsSignalled() const override;

protected:
    WaitableObject() = default;
    ~WaitableObject() = default;

private:
    friend class Allocated<WaitableObject>;

    // Guards mSignalled.
    mutable std::mutex mMutex;
    std::condition_variable mCondition;
    bool mSignalled = false;
};

} // namespace QRT
