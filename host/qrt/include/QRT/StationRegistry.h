#pragma once

// QRT::StationRegistry: the process-wide table of messaging stations.
//
// A station is a named mailbox on the host's user-interface thread (see
// UIThread.h). Messages posted to it (StationUtils::PostMessageToUIThread)
// are delivered later, on that thread, to each of its receivers in the order
// the receivers were added; messages posted to one station arrive in post
// order. A station may be registered without a receiver and receive its
// receivers later (AddReceiver); until then its messages are dropped.
//
// Guarantees:
// - Registering a name that is registered answers kResult_AlreadyExists and
//   changes nothing. An empty name is an input contract violation.
// - A message posted to an unknown station is dropped at once; one whose
//   station is disposed before delivery is dropped at delivery.
// - DisposeStation and RemoveReceiver do not return while a receiver of that
//   station is running on another thread; called from within a receiver
//   (on the delivering thread) they return at once, and no receiver of a
//   disposed station is called afterwards. The receivers' callables are
//   destroyed outside every lock.
// - No receiver is called while a registry or queue lock is held.
// - An exception escaping a receiver is reported as an assertion and the
//   delivery continues with the next receiver.
//
// All functions may be called from any thread, including from receivers.

#include "QRT/ImmutableString.h"
#include "QRT/Message.h"
#include "QRT/Result.h"

#include <cstdint>
#include <functional>

namespace QRT
{

// Receives the messages of one station on the user-interface thread.
using StationHandler = std::function<void(const Message& inMessage)>;
using ReceiverID = uint64_t;

class StationRegistry
{
public:
    // A station name that no other station of this process has: the text of
    // a new random Guid. Constructing one registers nothing.
    class UniqueStationID : public ImmutableString
    {
    public:
        UniqueStationID();
    };

    // Registers a station; an empty inHandler registers it without receiver.
    static Result RegisterStation(const ImmutableString& inName, StationHandler inHandler = {});
    // Registers a station under a new unique name and answers the name.
    static UniqueStationID RegisterUniqueStation(StationHandler inHandler = {});
    // Removes the station; kResult_NotFound when it is not registered.
    static Result DisposeStation(const ImmutableString& inName);
    static bool IsStationRegistered(const ImmutableString& inName);

    // Adds a receiver (not empty: input contract) and answers its identifier
    // in outReceiverID (0 on failure). kResult_NotFound for an unknown station.
    static Result AddReceiver(const ImmutableString& inName, StationHandler inHandler,
                              ReceiverID& outReceiverID);
    static Result RemoveReceiver(const ImmutableString& inName, ReceiverID inReceiverID);
};

} // namespace QRT
