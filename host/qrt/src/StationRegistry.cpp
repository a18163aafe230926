#include "QRT/StationRegistry.h"

#include "QRT/Guid.h"
#include "Station.h"
#include "mvxcore/debug/Contract.h"

#include <exception>
#include <map>

namespace QRT
{
namespace detail
{

namespace
{

class StationTable
{
public:
    static StationTable& Get()
    {
        // Never destroyed: stations may be disposed by static destructors and
        // the dispatcher thread may still run at exit.
        static StationTable* sTable = new StationTable();
        return *sTable;
    }

    // Guards mStations.
    std::mutex mMutex;
    std::map<ImmutableString, std::shared_ptr<Station>> mStations;
};

// Counts a delivery for Dispose and RemoveReceiver, also when a receiver
// throws.
class RunningDelivery
{
public:
    RunningDelivery(int& ioRunning, std::mutex& inMutex, std::condition_variable& inIdle)
        : mRunning(ioRunning)
        , mMutex(inMutex)
        , mIdle(inIdle)
    {
    }
    ~RunningDelivery()
    {
        std::lock_guard lock(mMutex);
        if (--mRunning == 0)
            mIdle.notify_all();
    }

private:
    int& mRunning;
    std::mutex& mMutex;
    std::condition_variable& mIdle;
};

} // namespace

void Station::Deliver(const Message& inMessage)
{
    std::vector<std::pair<ReceiverID, HandlerRef>> receivers;
    {
        std::lock_guard lock(mMutex);
        if (mDisposed || mReceivers.empty())
            return;
        receivers = mReceivers;
        ++mRunning;
        mDeliveringThread = std::this_thread::get_id();
    }
    RunningDelivery running(mRunning, mMutex, mIdle);
    for (const auto& [id, handler] : receivers)
    {
        {
            // A receiver may dispose the station or remove a later receiver.
            std::lock_guard lock(mMutex);
            if (mDisposed)
                break;
            if (!HasReceiverLocked(id))
                continue;
        }
        try
        {
            (*handler)(inMessage);
        }
        catch (const std::exception& inError)
        {
            mvxcore::debug::BreakAfterAssertDialog("receiver did not throw", inError.what(),
                                                   __FILE__, __LINE__);
        }
        catch (...)
        {
            mvxcore::debug::BreakAfterAssertDialog("receiver did not throw",
                                                   "unknown exception from a station receiver",
                                                   __FILE__, __LINE__);
        }
    }
}

void Station::WaitForOtherDeliveriesLocked(std::unique_lock<std::mutex>& ioLock)
{
    // Deliveries happen on one thread at a time (the dispatcher serialises
    // them), so a running delivery on this thread means we are called from a
    // receiver and must not wait for ourselves.
    mIdle.wait(ioLock,
               [this] { return mRunning == 0 || mDeliveringThread == std::this_thread::get_id(); });
}

bool Station::HasReceiverLocked(ReceiverID inReceiverID) const noexcept
{
    for (const auto& receiver : mReceivers)
    {
        if (receiver.first == inReceiverID)
            return true;
    }
    return false;
}

void Station::Dispose()
{
    std::vector<std::pair<ReceiverID, HandlerRef>> receivers;
    {
        std::unique_lock lock(mMutex);
        mDisposed = true;
        WaitForOtherDeliveriesLocked(lock);
        receivers.swap(mReceivers);
    }
    // receivers are destroyed here, outside the lock.
}

ReceiverID Station::AddReceiver(StationHandler inHandler)
{
    auto handler = std::make_shared<const StationHandler>(std::move(inHandler));
    std::lock_guard lock(mMutex);
    if (mDisposed)
        return 0;
    const ReceiverID id = mNextReceiverID++;
    mReceivers.emplace_back(id, std::move(handler));
    return id;
}

bool Station::RemoveReceiver(ReceiverID inReceiverID)
{
    HandlerRef removed;
    std::unique_lock lock(mMutex);
    for (auto it = mReceivers.begin(); it != mReceivers.end(); ++it)
    {
        if (it->first == inReceiverID)
        {
            removed = std::move(it->second);
            mReceivers.erase(it);
            WaitForOtherDeliveriesLocked(lock);
            lock.unlock();
            return true;
        }
    }
    return false;
}

std::shared_ptr<Station> FindStation(const ImmutableString& inName)
{
    StationTable& table = StationTable::Get();
    std::lock_guard lock(table.mMutex);
    const auto found = table.mStations.find(inName);
    return found == table.mStations.end() ? nullptr : found->second;
}

} // namespace detail

StationRegistry::UniqueStationID::UniqueStationID()
    : ImmutableString(ImmutableString::CreateDynamic(Guid::CreateUnique().ToString()))
{
}

Result StationRegistry::RegisterStation(const ImmutableString& inName, StationHandler inHandler)
{
    MVX_INPUT_CONTRACT(!inName.empty());
    auto station = std::make_shared<detail::Station>(inName);
    if (inHandler)
        station->AddReceiver(std::move(inHandler));

    detail::StationTable& table = detail::StationTable::Get();
    std::lock_guard lock(table.mMutex);
    if (!table.mStations.emplace(inName, std::move(station)).second)
        return kResult_AlreadyExists;
    return kResult_Success;
}

StationRegistry::UniqueStationID StationRegistry::RegisterUniqueStation(StationHandler inHandler)
{
    UniqueStationID name;
    const Result result = RegisterStation(name, std::move(inHandler));
    // A random Guid is never taken twice.
    MVX_OUTPUT_CONTRACT(result == kResult_Success);
    return name;
}

Result StationRegistry::DisposeStation(const ImmutableString& inName)
{
    std::shared_ptr<detail::Station> station;
    {
        detail::StationTable& table = detail::StationTable::Get();
        std::lock_guard lock(table.mMutex);
        const auto found = table.mStations.find(inName);
        if (found == table.mStations.end())
            return kResult_NotFound;
        station = std::move(found->second);
        table.mStations.erase(found);
    }
    // Waiting for a running receiver happens outside the registry lock, so
    // that the receiver may use the registry meanwhile.
    station->Dispose();
    return kResult_Success;
}

bool StationRegistry::IsStationRegistered(const ImmutableString& inName)
{
    return detail::FindStation(inName) != nullptr;
}

Result StationRegistry::AddReceiver(const ImmutableString& inName, StationHandler inHandler,
                                    ReceiverID& outReceiverID)
{
    MVX_INPUT_CONTRACT(inHandler != nullptr);
    outReceiverID = 0;
    const std::shared_ptr<detail::Station> station = detail::FindStation(inName);
    if (!station)
        return kResult_NotFound;
    outReceiverID = station->AddReceiver(std::move(inHandler));
    // Disposed between the lookup and the addition.
    return outReceiverID == 0 ? kResult_NotFound : kResult_Success;
}

Result StationRegistry::RemoveReceiver(const ImmutableString& inName, ReceiverID inReceiverID)
{
    const std::shared_ptr<detail::Station> station = detail::FindStation(inName);
    if (!station)
        return kResult_NotFound;
    return station->RemoveReceiver(inReceiverID) ? kResult_Success : kResult_NotFound;
}

} // namespace QRT
