#pragma once

// The messaging internals shared by the station registry, the posting
// functions and the user-interface dispatcher.

#include "QRT/ImmutableString.h"
#include "QRT/Message.h"
#include "QRT/StationRegistry.h"

#include <condition_variable>
#include <memory>
#include <mutex>
#include <thread>
#include <utility>
#include <vector>

namespace QRT::detail
{

// One registered station. Shared by the registry and by the messages queued
// for it, so a message outlives neither its station object nor, after
// disposal, delivers to it.
class Station
{
public:
    explicit Station(ImmutableString inName)
        : mName(std::move(inName))
    {
    }

    const ImmutableString& GetName() const noexcept { return mName; }

    // Calls every receiver with inMessage on the calling thread; does nothing
    // once the station is disposed.
    void Deliver(const Message& inMessage);

    // Marks the station disposed, waits for a delivery running on another
    // thread, and destroys the receivers outside the lock.
    void Dispose();

    // 0 when the station is disposed.
    ReceiverID AddReceiver(StationHandler inHandler);
    // False when there is no such receiver. Waits like Dispose.
    bool RemoveReceiver(ReceiverID inReceiverID);

private:
    using HandlerRef = std::shared_ptr<const StationHandler>;

    // Waits until no delivery runs on another thread. Caller holds mMutex.
    void WaitForOtherDeliveriesLocked(std::unique_lock<std::mutex>& ioLock);
    bool HasReceiverLocked(ReceiverID inReceiverID) const noexcept;

    const ImmutableString mName;

    // Guards every member below.
    std::mutex mMutex;
    // Signalled when mRunning drops to zero.
    std::condition_variable mIdle;
    bool mDisposed = false;
    std::vector<std::pair<ReceiverID, HandlerRef>> mReceivers;
    ReceiverID mNextReceiverID = 1;
    // Deliveries in progress (nested ones count each) and their thread.
    int mRunning = 0;
    std::thread::id mDeliveringThread;
};

// The registered station of that name, or null.
std::shared_ptr<Station> FindStation(const ImmutableString& inName);

// Queues a clone for delivery on the user-interface thread. With inCoalesce,
// a message of the same type still queued for the same station with
// inCoalesce set is replaced in place by this one.
void EnqueueForUIThread(std::shared_ptr<Station> inStation, MessagePtr inMessage, bool inCoalesce);

} // namespace QRT::detail
