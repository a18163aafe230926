#pragma once

// vrender::OrderingWindow: puts results that arrive in any order back into
// frame order.
//
// Renders complete on the module's and the encoders' threads in whatever
// order they finish; the writer must see frames in order. Producers hand in
// each index once (Deliver, any thread); the one consumer takes them in
// strictly increasing order (TakeNext), waiting for the next one when it has
// not arrived yet. Items that arrive early wait in the window; the render
// loop bounds how far ahead it issues work, which bounds the window. All
// operations are guarded by one mutex; a delivery wakes the consumer.

#include "mvxcore/debug/Contract.h"

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <map>
#include <mutex>
#include <optional>
#include <vector>

namespace vrender
{

template <typename T>
class OrderingWindow
{
public:
    // The first index the consumer will take.
    explicit OrderingWindow(std::int64_t inFirst)
        : mNext(inFirst)
    {
    }

    // Hands in the item of inIndex. Input contracts: the index has not been
    // taken yet and is not delivered twice.
    void Deliver(std::int64_t inIndex, T inItem)
    {
        {
            std::lock_guard lock(mMutex);
            MVX_INPUT_CONTRACT(inIndex >= mNext);
            MVX_INPUT_CONTRACT(!mWaiting.contains(inIndex));
            mWaiting.emplace(inIndex, std::move(inItem));
        }
        mArrived.notify_all();
    }

    // The item of the next index once it has arrived, advancing the window;
    // nothing when it has not arrived within inTimeout.
    std::optional<T> TakeNext(std::chrono::milliseconds inTimeout)
    {
        std::unique_lock lock(mMutex);
        if (!mArrived.wait_for(lock, inTimeout, [this] { return mWaiting.contains(mNext); }))
            return std::nullopt;
        auto found = mWaiting.find(mNext);
        T item = std::move(found->second);
        mWaiting.erase(found);
        ++mNext;
        return item;
    }

    // The index TakeNext answers next.
    std::int64_t GetNextIndex() const
    {
        std::lock_guard lock(mMutex);
        return mNext;
    }

    // Items delivered ahead of the next index.
    std::size_t GetWaitingCount() const
    {
        std::lock_guard lock(mMutex);
        return mWaiting.size();
    }

    // Removes and answers every waiting item, in index order (used when a
    // render stops early, to clean up what was produced but not written).
    std::vector<T> TakeAllWaiting()
    {
        std::lock_guard lock(mMutex);
        std::vector<T> items;
        for (auto& [index, item] : mWaiting)
            items.push_back(std::move(item));
        mWaiting.clear();
        return items;
    }

private:
    // Guards mNext and mWaiting.
    mutable std::mutex mMutex;
    std::condition_variable mArrived;
    std::int64_t mNext;
    std::map<std::int64_t, T> mWaiting;
};

} // namespace vrender
