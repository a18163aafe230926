#include "VF/SharedVideoFrameCache.h"

#include "mvxcore/debug/Contract.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <unistd.h>
#include <vector>

namespace VF
{
namespace
{

using mvxcore::utility::Guid;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

bool DisabledByEnvironment()
{
    const char* value = std::getenv("VF_DISABLE_FRAME_CACHE");
    return value != nullptr && std::strcmp(value, "1") == 0;
}

bool IsLowClass(int32_t inPriority)
{
    return inPriority < kCachePriority_High;
}

// Orders eviction candidates: lower priority first, then older use.
bool IsBetterVictim(int32_t inPriority, uint64_t inLastUse, int32_t inBestPriority,
                    uint64_t inBestLastUse)
{
    return inPriority < inBestPriority ||
           (inPriority == inBestPriority && inLastUse < inBestLastUse);
}

} // namespace

size_t VideoFrameCache::GetDefaultByteBudget()
{
    const long pages = sysconf(_SC_PHYS_PAGES);
    const long pageSize = sysconf(_SC_PAGESIZE);
    const size_t physical = (pages > 0 && pageSize > 0) ? size_t(pages) * size_t(pageSize) : 0;
    const size_t quarter = physical / 4;
    // Without an answer from the system, a modest budget rather than none.
    if (quarter == 0)
        return size_t{512} << 20;
    return std::min(quarter, size_t{4} << 30);
}

size_t VideoFrameCache::GetDefaultLowPriorityByteBudget(size_t inByteBudget) noexcept
{
    // A handful of HD frames: what a frame blend or a field filter of an
    // export asks for again, not the export itself.
    return std::min(size_t{32} << 20, inByteBudget / 8);
}

VideoFrameCache::VideoFrameCache()
    : VideoFrameCache(GetDefaultByteBudget(), !DisabledByEnvironment(),
                      GetDefaultLowPriorityByteBudget(GetDefaultByteBudget()))
{
}

VideoFrameCache::VideoFrameCache(size_t inByteBudget, bool inEnabled,
                                 size_t inLowPriorityByteBudget)
    : mEnabled(inEnabled)
    , mByteBudget(inByteBudget)
    , mLowPriorityByteBudget(inLowPriorityByteBudget)
{
}

bool VideoFrameCache::IsOverBudget() const noexcept
{
    return mBytes.load(std::memory_order_relaxed) > mByteBudget.load(std::memory_order_relaxed) ||
           mLowPriorityBytes.load(std::memory_order_relaxed) >
               mLowPriorityByteBudget.load(std::memory_order_relaxed);
}

VideoFrameCache::~VideoFrameCache() = default;

VideoFrameCache::Shard& VideoFrameCache::ShardFor(const Guid& inKey) const noexcept
{
    // Keys are content hashes; the multiply spreads their bits before the top
    // bits pick the shard.
    const uint64_t mixed = uint64_t(std::hash<Guid>{}(inKey)) * 0x9E3779B97F4A7C15ull;
    return mShards[mixed >> 60];
}

FrameRef VideoFrameCache::RetrieveFromCache(const Guid& inKey)
{
    MVX_INPUT_CONTRACT(!inKey.IsNil());
    if (!mEnabled)
    {
        mMisses.fetch_add(1, std::memory_order_relaxed);
        return FrameRef();
    }
    Shard& shard = ShardFor(inKey);
    std::lock_guard lock(shard.mMutex);
    auto found = shard.mEntries.find(inKey);
    if (found == shard.mEntries.end() || !found->second.mFrame)
    {
        mMisses.fetch_add(1, std::memory_order_relaxed);
        return FrameRef();
    }
    Entry& entry = found->second;
    std::list<Guid>& recency = shard.mRecency[entry.mPriority];
    recency.splice(recency.begin(), recency, entry.mRecency);
    entry.mLastUse = mUseClock.fetch_add(1, std::memory_order_relaxed) + 1;
    mHits.fetch_add(1, std::memory_order_relaxed);
    return entry.mFrame;
}

void VideoFrameCache::InsertIntoCache(const FrameRef& inFrame, const Guid& inKey,
                                      int32_t inPriority)
{
    MVX_INPUT_CONTRACT(inFrame != nullptr);
    MVX_INPUT_CONTRACT(!inKey.IsNil());
    MVX_INPUT_CONTRACT(inPriority >= 0);
    inFrame->MarkShared(1);
    const size_t bytes = inFrame->GetDataSize();
    FrameRef replaced;
    if (!mEnabled || bytes > mByteBudget.load(std::memory_order_relaxed))
    {
        mRefused.fetch_add(1, std::memory_order_relaxed);
    }
    else
    {
        Shard& shard = ShardFor(inKey);
        {
            std::lock_guard lock(shard.mMutex);
            Entry& entry = shard.mEntries[inKey];
            if (entry.mFrame)
                RemoveFrameLocked(shard, entry, inKey, replaced);
            std::list<Guid>& recency = shard.mRecency[inPriority];
            recency.push_front(inKey);
            entry.mRecency = recency.begin();
            entry.mFrame = inFrame;
            entry.mBytes = bytes;
            entry.mPriority = inPriority;
            entry.mLastUse = mUseClock.fetch_add(1, std::memory_order_relaxed) + 1;
            mBytes.fetch_add(bytes, std::memory_order_relaxed);
            if (IsLowClass(inPriority))
                mLowPriorityBytes.fetch_add(bytes, std::memory_order_relaxed);
            mFrames.fetch_add(1, std::memory_order_relaxed);
        }
        mInsertions.fetch_add(1, std::memory_order_relaxed);
        replaced.Reset();
        if (IsOverBudget())
            EvictToBudget();
    }
    std::shared_ptr<const FrameCacheNotification> notification;
    {
        std::lock_guard lock(mNotificationMutex);
        notification = mNotification;
    }
    if (notification && *notification)
        (*notification)(inKey);
}

void VideoFrameCache::RemoveFrameLocked(Shard& inShard, Entry& ioEntry, const Guid& /*inKey*/,
                                        FrameRef& outFrame) noexcept
{
    auto lists = inShard.mRecency.find(ioEntry.mPriority);
    lists->second.erase(ioEntry.mRecency);
    if (lists->second.empty())
        inShard.mRecency.erase(lists);
    mBytes.fetch_sub(ioEntry.mBytes, std::memory_order_relaxed);
    if (IsLowClass(ioEntry.mPriority))
        mLowPriorityBytes.fetch_sub(ioEntry.mBytes, std::memory_order_relaxed);
    mFrames.fetch_sub(1, std::memory_order_relaxed);
    outFrame = std::move(ioEntry.mFrame);
    ioEntry.mFrame.Reset();
    ioEntry.mBytes = 0;
}

bool VideoFrameCache::FindVictimLocked(const Shard& inShard, Victim& ioVictim)
{
    // Priorities ascend through the map; within one, the back of the list is
    // the least recently used. Pinned entries are stepped over.
    for (const auto& [priority, keys] : inShard.mRecency)
    {
        for (auto key = keys.rbegin(); key != keys.rend(); ++key)
        {
            const Entry& entry = inShard.mEntries.at(*key);
            if (entry.mDependencies != 0)
                continue;
            ioVictim.mKey = *key;
            ioVictim.mPriority = priority;
            ioVictim.mLastUse = entry.mLastUse;
            return true;
        }
    }
    return false;
}

void VideoFrameCache::EvictToBudget()
{
    std::lock_guard evictionLock(mEvictionMutex);
    std::vector<FrameRef> evicted;
    while (IsOverBudget())
    {
        const bool overBudget =
            mBytes.load(std::memory_order_relaxed) > mByteBudget.load(std::memory_order_relaxed);
        bool found = false;
        Victim best;
        for (size_t index = 0; index < kShardCount; ++index)
        {
            Victim candidate;
            std::lock_guard lock(mShards[index].mMutex);
            if (!FindVictimLocked(mShards[index], candidate))
                continue;
            candidate.mShard = index;
            if (!found || IsBetterVictim(candidate.mPriority, candidate.mLastUse, best.mPriority,
                                         best.mLastUse))
            {
                best = candidate;
                found = true;
            }
        }
        if (!found)
            break; // only pinned frames are left
        // Only the low class is over its allowance, and every frame of it
        // left is pinned: the best victim is of the high class.
        if (!overBudget && !IsLowClass(best.mPriority))
            break;
        Shard& shard = mShards[best.mShard];
        std::lock_guard lock(shard.mMutex);
        auto entry = shard.mEntries.find(best.mKey);
        // Used, replaced or pinned since the search: search again.
        if (entry == shard.mEntries.end() || !entry->second.mFrame ||
            entry->second.mLastUse != best.mLastUse || entry->second.mDependencies != 0)
            continue;
        FrameRef frame;
        RemoveFrameLocked(shard, entry->second, best.mKey, frame);
        shard.mEntries.erase(entry);
        evicted.push_back(std::move(frame));
        mEvictions.fetch_add(1, std::memory_order_relaxed);
    }
    // The evicted frames are released here, outside the shard locks; frames
    // held elsewhere live on.
}

void VideoFrameCache::RegisterDependencyOnFrame(const Guid& inKey)
{
    MVX_INPUT_CONTRACT(!inKey.IsNil());
    Shard& shard = ShardFor(inKey);
    std::lock_guard lock(shard.mMutex);
    shard.mEntries[inKey].mDependencies++;
}

void VideoFrameCache::UnregisterDependencyOnFrame(const Guid& inKey)
{
    MVX_INPUT_CONTRACT(!inKey.IsNil());
    bool unpinned = false;
    {
        Shard& shard = ShardFor(inKey);
        std::lock_guard lock(shard.mMutex);
        auto found = shard.mEntries.find(inKey);
        const bool registered = found != shard.mEntries.end() && found->second.mDependencies > 0;
        MVX_INPUT_CONTRACT(registered);
        Entry& entry = found->second;
        if (--entry.mDependencies == 0)
        {
            unpinned = true;
            if (!entry.mFrame)
                shard.mEntries.erase(found);
        }
    }
    // A pinned frame may have held the cache above its budget or the low
    // class above its allowance.
    if (unpinned && IsOverBudget())
        EvictToBudget();
}

uint32_t VideoFrameCache::GetDependencyCount(const Guid& inKey) const
{
    Shard& shard = ShardFor(inKey);
    std::lock_guard lock(shard.mMutex);
    auto found = shard.mEntries.find(inKey);
    return found == shard.mEntries.end() ? 0 : found->second.mDependencies;
}

std::optional<int32_t> VideoFrameCache::GetCachedPriority(const Guid& inKey) const
{
    Shard& shard = ShardFor(inKey);
    std::lock_guard lock(shard.mMutex);
    auto found = shard.mEntries.find(inKey);
    if (found == shard.mEntries.end() || !found->second.mFrame)
        return std::nullopt;
    return found->second.mPriority;
}

void VideoFrameCache::SetNotificationFunction(FrameCacheNotification inFunction)
{
    auto function = inFunction
                        ? std::make_shared<const FrameCacheNotification>(std::move(inFunction))
                        : nullptr;
    std::shared_ptr<const FrameCacheNotification> previous;
    {
        std::lock_guard lock(mNotificationMutex);
        previous = std::exchange(mNotification, std::move(function));
    }
    // The previous function is destroyed here, outside the lock.
}

void VideoFrameCache::Clear()
{
    std::vector<FrameRef> dropped;
    for (Shard& shard : mShards)
    {
        std::lock_guard lock(shard.mMutex);
        for (auto entry = shard.mEntries.begin(); entry != shard.mEntries.end();)
        {
            if (entry->second.mFrame)
            {
                FrameRef frame;
                RemoveFrameLocked(shard, entry->second, entry->first, frame);
                dropped.push_back(std::move(frame));
            }
            // Registered dependencies stay for the frames still to come.
            if (entry->second.mDependencies == 0)
                entry = shard.mEntries.erase(entry);
            else
                ++entry;
        }
    }
}

void VideoFrameCache::SetByteBudget(size_t inBytes)
{
    mByteBudget.store(inBytes, std::memory_order_relaxed);
    EvictToBudget();
}

size_t VideoFrameCache::GetByteBudget() const noexcept
{
    return mByteBudget.load(std::memory_order_relaxed);
}

void VideoFrameCache::SetLowPriorityByteBudget(size_t inBytes)
{
    mLowPriorityByteBudget.store(inBytes, std::memory_order_relaxed);
    EvictToBudget();
}

size_t VideoFrameCache::GetLowPriorityByteBudget() const noexcept
{
    return mLowPriorityByteBudget.load(std::memory_order_relaxed);
}

FrameCacheStatistics VideoFrameCache::GetStatistics() const noexcept
{
    FrameCacheStatistics statistics;
    statistics.mHits = mHits.load(std::memory_order_relaxed);
    statistics.mMisses = mMisses.load(std::memory_order_relaxed);
    statistics.mInsertions = mInsertions.load(std::memory_order_relaxed);
    statistics.mRefused = mRefused.load(std::memory_order_relaxed);
    statistics.mEvictions = mEvictions.load(std::memory_order_relaxed);
    statistics.mBytes = mBytes.load(std::memory_order_relaxed);
    statistics.mFrames = mFrames.load(std::memory_order_relaxed);
    statistics.mLowPriorityBytes = mLowPriorityBytes.load(std::memory_order_relaxed);
    return statistics;
}

VideoFrameCache& SharedVideoFrameCache::GetInstance()
{
    // Never destroyed: render threads may still use the cache while the
    // process exits.
    static VideoFrameCache* sInstance = new VideoFrameCache();
    return *sInstance;
}

} // namespace VF
