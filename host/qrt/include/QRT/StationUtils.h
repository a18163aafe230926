#pragma once

// QRT::StationUtils: posting messages to stations.
//
// PostMessageToUIThread clones the message (the caller keeps its own) and
// queues the clone for delivery to the station's receivers on the
// user-interface thread (UIThread.h). It returns at once on any thread and
// never calls a receiver itself.
//
// inCoalesce asks that, when a message of the same type posted with
// inCoalesce is still waiting for the same station, the new message take its
// place in the queue instead of being queued again (change notifications
// that only need to arrive once). Without it every message is delivered.
//
// Answers kResult_Success when queued (or coalesced) and kResult_NotFound
// when the station is not registered; the message is then dropped.

#include "QRT/ImmutableString.h"
#include "QRT/Message.h"
#include "QRT/Result.h"

namespace QRT
{

class StationUtils
{
public:
    static Result PostMessageToUIThread(const ImmutableString& inStationName,
                                        const Message& inMessage, bool inCoalesce = false);
};

} // namespace QRT
