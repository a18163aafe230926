// The render queue's entries and registries, and the helpers that move
// entries between its lists.

#include "ML/RenderRequestException.h"
#include "ML/RenderStatus.h"
#include "QRT/Exception.h"
#include "pipeline/RenderFrameQueueImpl.h"

#include <algorithm>
#include <new>

namespace ML::RenderQueueInternals
{

OrderKey KeyOf(const QueueEntry& inEntry)
{
    return OrderKey(inEntry.mRequest.mRequestID, inEntry.mSerial);
}

void SortByIdentifier(std::vector<QueueEntry>& ioEntries)
{
    std::sort(ioEntries.begin(), ioEntries.end(),
              [](const QueueEntry& inLeft, const QueueEntry& inRight)
              { return KeyOf(inLeft) < KeyOf(inRight); });
}

bool EraseRegistrationByID(Registry& ioRegistry, RenderRequestID inRequestID)
{
    for (auto it = ioRegistry.begin(); it != ioRegistry.end(); ++it)
    {
        if (it->second.mRequestID == inRequestID)
        {
            ioRegistry.erase(it);
            return true;
        }
    }
    return false;
}

void EraseRegistrationsOfCaller(Registry& ioRegistry, const void* inCaller)
{
    std::erase_if(ioRegistry,
                  [inCaller](const auto& inItem) { return inItem.second.mCaller == inCaller; });
}

QRT::Result StatusOfCurrentException()
{
    try
    {
        throw;
    }
    catch (const RenderRequestException& inError)
    {
        return inError.GetStatus();
    }
    catch (const QRT::Exception&)
    {
        return kResult_RenderFailed;
    }
    catch (const std::bad_alloc&)
    {
        return kResult_OutOfMemory;
    }
    catch (...)
    {
        return kResult_RenderFailed;
    }
}

ExecutorPtr LoadExecutor(const ExecutorPtr& inShared)
{
    return boost::atomic_load(&inShared);
}

std::optional<QueueEntry> RenderFrameQueueImpl::TakeByID(OrderedEntries& ioSet,
                                                         RenderRequestID inRequestID)
{
    const auto it = ioSet.lower_bound(OrderKey(inRequestID, 0));
    if (it == ioSet.end() || it->first.first != inRequestID)
        return std::nullopt;
    std::optional<QueueEntry> taken(std::move(it->second));
    ioSet.erase(it);
    return taken;
}

} // namespace ML::RenderQueueInternals
