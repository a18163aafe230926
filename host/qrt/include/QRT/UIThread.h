#pragma once

// QRT::UIThread: the host's user-interface thread as a message dispatcher.
//
// Station messages (StationUtils::PostMessageToUIThread) wait in one
// process-wide first-in, first-out queue until the user-interface thread
// delivers them. A program chooses one of two ways to be that thread:
// - Start() runs a dispatcher thread that delivers as messages arrive;
//   Stop() ends it;
// - or a thread of its own pumps the queue: PumpMessages() delivers what is
//   queued, PumpMessagesFor(duration) keeps delivering until the time is up.
//
// Rules:
// - Deliveries are serialised: one thread delivers at a time, in queue order.
//   A receiver may pump again (nested pumping continues with later messages).
// - While the dispatcher thread runs, pumping from any other thread is an
//   input contract violation; so is calling Stop() from a receiver.
// - Stop() returns after the message being delivered; messages still queued
//   stay queued for the next Start() or pump. Nothing is lost.
// - IsUIThread() is true on the dispatcher thread and on a thread that is
//   pumping.

#include <chrono>
#include <cstddef>

namespace QRT
{

class UIThread
{
public:
    // Starts the dispatcher thread; false when it already runs.
    static bool Start();
    // Ends the dispatcher thread and waits for it; false when none runs.
    static bool Stop();
    static bool IsRunning();

    // Delivers the messages queued when the call began (not those posted
    // meanwhile, so a receiver that posts cannot keep it busy forever), on
    // the calling thread. Answers the number delivered or dropped.
    static size_t PumpMessages();
    // Delivers messages as they come until inDuration has passed; answers
    // the number delivered or dropped.
    static size_t PumpMessagesFor(std::chrono::milliseconds inDuration);

    static bool IsUIThread();
    // Messages waiting for delivery.
    static size_t GetPendingMessageCount();
};

} // namespace QRT
