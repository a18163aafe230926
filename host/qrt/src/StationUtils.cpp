#include "QRT/StationUtils.h"

#include "Station.h"

namespace QRT
{

Result StationUtils::PostMessageToUIThread(const ImmutableString& inStationName,
                                           const Message& inMessage, bool inCoalesce)
{
    std::shared_ptr<detail::Station> station = detail::FindStation(inStationName);
    if (!station)
        return kResult_NotFound;
    detail::EnqueueForUIThread(std::move(station), inMessage.Clone(), inCoalesce);
    return kResult_Success;
}

} // namespace QRT
