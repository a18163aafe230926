#pragma once

// The shared video-frame cache: finished frames keyed by content hash
// (mvxcore::utility::Guid), so that a frame any request rendered or read is
// not made again while it stays cached.
//
// VF::VideoFrameCache is the cache itself; VF::SharedVideoFrameCache is the
// process-wide instance behind static functions, which is what the renderer
// calls. Tests make private VideoFrameCache instances.
//
// Guarantees:
// - Inserting marks the frame shared (MF::IVideoFrame::MarkShared): from then
//   on nobody writes it; writers take VF::MakeWriteableVideoFrame.
// - The cache holds at most its byte budget of frames (a frame counts its
//   GetDataSize). After each insertion it evicts until the budget holds:
//   frames of the lowest priority first, least recently used first within a
//   priority (a retrieve or a re-insertion makes a frame recently used).
//   Frames whose key has a registered dependency are never evicted; only they
//   may keep the cache above its budget, and when the last dependency goes the
//   budget is restored. A single frame larger than the whole budget is not
//   stored.
// - Priorities (VF/FrameCachePriority.h): frames that will be asked for again
//   go in at kCachePriority_High; frames of one pass over the material at
//   kCachePriority_Low. The low class (every priority below High) is also held
//   to a small allowance of its own, so that an export keeps only the few
//   recent frames that its neighbours may ask for again (a frame blend, a
//   field filter) instead of filling the budget with frames nobody comes back
//   to: when the low class exceeds its allowance, its least recently used
//   unpinned frames go even while the whole budget has room. A pinned frame
//   of the low class stays until its dependency goes, so that a read-ahead
//   frame still reaches the render that waits for it.
// - The renderer's policy: read-ahead frames, rendered frames and black
//   frames of playback, scrubbing, plug-in and prefetch renders (requests of
//   priority above 810) go in at High; the results of requests of priority
//   810 and below, and every frame of a render whose parameters carry
//   kCachePriority_Low (the command-line renderer's one-pass exports), at Low.
// - Eviction and Clear only drop the cache's reference: a frame held elsewhere
//   stays valid.
// - Threads: every function may be called from any thread at once. Keys are
//   spread over 16 shards, each with its own mutex guarding its entries and
//   its recency lists, so lookups of different keys rarely meet. Recency is a
//   global atomic use counter stamped on each entry; the byte count is one
//   atomic. Eviction is serialised by one eviction mutex: the evictor visits
//   each shard under its lock to find that shard's best victim (lowest
//   priority, then oldest stamp, not pinned), picks the best over all shards,
//   and removes it under its shard's lock only if its stamp is unchanged
//   (otherwise it was used meanwhile and the search repeats). Shard locks are
//   never nested.
// - The notification function is called once per insertion, with the key,
//   on the inserting thread after the frame is retrievable, outside every
//   cache lock: it may call back into the cache.
// - The environment variable VF_DISABLE_FRAME_CACHE=1, read when the cache is
//   constructed (for the shared cache: at first use), switches it off: it
//   stores nothing and every retrieve misses. Insertion still marks the frame
//   shared and still calls the notification, so that whoever waits for the
//   key hears of the frame at once instead of at its next poll.
// - Default budget: a quarter of physical memory, at most 4 GiB; default
//   low-priority allowance 32 MiB, at most an eighth of the budget.

#include "MF/IVideoFrame.h"
#include "QRT/InterfaceRef.h"
#include "VF/FrameCachePriority.h"
#include "mvxcore/utility/Guid.h"

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <list>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <unordered_map>

namespace VF
{

using FrameCacheNotification = std::function<void(const mvxcore::utility::Guid&)>;

struct FrameCacheStatistics
{
    uint64_t mHits = 0;
    uint64_t mMisses = 0;
    uint64_t mInsertions = 0; // insertions that stored a frame
    uint64_t mRefused = 0;    // insertions not stored (disabled, larger than the budget)
    uint64_t mEvictions = 0;
    uint64_t mBytes = 0;            // bytes of the frames held now
    uint64_t mFrames = 0;           // frames held now
    uint64_t mLowPriorityBytes = 0; // bytes of the low class held now
};

class VideoFrameCache
{
public:
    // Allowance of the low class that means "the whole budget".
    static constexpr size_t kWholeBudget = SIZE_MAX;

    // Budget and allowance from the machine's memory; enabled unless
    // VF_DISABLE_FRAME_CACHE=1.
    VideoFrameCache();
    VideoFrameCache(size_t inByteBudget, bool inEnabled,
                    size_t inLowPriorityByteBudget = kWholeBudget);
    ~VideoFrameCache();
    VideoFrameCache(const VideoFrameCache&) = delete;
    VideoFrameCache& operator=(const VideoFrameCache&) = delete;

    // The frame under inKey, or empty. Input contract "!inKey.IsNil()".
    QRT::InterfaceRef<MF::IVideoFrame> RetrieveFromCache(const mvxcore::utility::Guid& inKey);
    // Marks inFrame shared and stores it under inKey (replacing a frame stored
    // there before), then evicts to the budget and calls the notification.
    // Input contracts "inFrame != NULL", "!inKey.IsNil()", "inPriority >= 0".
    void InsertIntoCache(const QRT::InterfaceRef<MF::IVideoFrame>& inFrame,
                         const mvxcore::utility::Guid& inKey, int32_t inPriority);
    // Pins the frame under inKey (now or when it arrives) against eviction
    // until as many unregistrations have been made as registrations.
    void RegisterDependencyOnFrame(const mvxcore::utility::Guid& inKey);
    // Input contract: a dependency on inKey is registered.
    void UnregisterDependencyOnFrame(const mvxcore::utility::Guid& inKey);
    // Registered dependencies on inKey.
    uint32_t GetDependencyCount(const mvxcore::utility::Guid& inKey) const;
    // The priority of the frame held under inKey, or none. Diagnostics and tests.
    std::optional<int32_t> GetCachedPriority(const mvxcore::utility::Guid& inKey) const;

    // Replaces the notification function (an empty function: none).
    void SetNotificationFunction(FrameCacheNotification inFunction);

    // Drops every frame; registered dependencies stay.
    void Clear();
    void SetByteBudget(size_t inBytes);
    size_t GetByteBudget() const noexcept;
    // The low class's allowance (kWholeBudget: only the budget limits it).
    void SetLowPriorityByteBudget(size_t inBytes);
    size_t GetLowPriorityByteBudget() const noexcept;
    bool IsEnabled() const noexcept { return mEnabled; }
    FrameCacheStatistics GetStatistics() const noexcept;

    // A quarter of physical memory, at most 4 GiB.
    static size_t GetDefaultByteBudget();
    // 32 MiB, at most an eighth of inByteBudget.
    static size_t GetDefaultLowPriorityByteBudget(size_t inByteBudget) noexcept;

private:
    static constexpr size_t kShardCount = 16;

    struct Entry
    {
        QRT::InterfaceRef<MF::IVideoFrame> mFrame; // empty: only dependencies
        size_t mBytes = 0;
        int32_t mPriority = 0;
        uint64_t mLastUse = 0;
        uint32_t mDependencies = 0;
        std::list<mvxcore::utility::Guid>::iterator mRecency; // valid when mFrame
    };

    struct Shard
    {
        // Guards mEntries and mRecency.
        mutable std::mutex mMutex;
        std::unordered_map<mvxcore::utility::Guid, Entry> mEntries;
        // Per priority: keys with a frame, most recently used at the front.
        std::map<int32_t, std::list<mvxcore::utility::Guid>> mRecency;
    };

    struct Victim
    {
        size_t mShard = 0;
        mvxcore::utility::Guid mKey;
        int32_t mPriority = 0;
        uint64_t mLastUse = 0;
    };

    Shard& ShardFor(const mvxcore::utility::Guid& inKey) const noexcept;
    // Unlinks the frame of an entry; the caller releases outFrame after unlocking.
    void RemoveFrameLocked(Shard& inShard, Entry& ioEntry, const mvxcore::utility::Guid& inKey,
                           QRT::InterfaceRef<MF::IVideoFrame>& outFrame) noexcept;
    // The shard's best victim, or false when it has none. Requires its mutex.
    static bool FindVictimLocked(const Shard& inShard, Victim& ioVictim);
    // True while the budget or the low class's allowance is exceeded.
    bool IsOverBudget() const noexcept;
    // Evicts until the budget and the allowance hold or only pinned frames are
    // left (of the low class, for the allowance).
    void EvictToBudget();

    const bool mEnabled;
    std::atomic<size_t> mByteBudget;
    std::atomic<size_t> mLowPriorityByteBudget;
    std::atomic<size_t> mBytes{0};
    std::atomic<size_t> mLowPriorityBytes{0};
    std::atomic<uint64_t> mFrames{0};
    std::atomic<uint64_t> mUseClock{0};
    std::atomic<uint64_t> mHits{0};
    std::atomic<uint64_t> mMisses{0};
    std::atomic<uint64_t> mInsertions{0};
    std::atomic<uint64_t> mRefused{0};
    std::atomic<uint64_t> mEvictions{0};

    mutable std::array<Shard, kShardCount> mShards;
    // Serialises eviction passes; never held while a notification runs.
    std::mutex mEvictionMutex;
    // Guards mNotification (the pointer, not the call).
    std::mutex mNotificationMutex;
    std::shared_ptr<const FrameCacheNotification> mNotification;
};

// The process-wide cache, constructed at first use and never destroyed.
class SharedVideoFrameCache
{
public:
    static VideoFrameCache& GetInstance();

    static QRT::InterfaceRef<MF::IVideoFrame> RetrieveFromCache(const mvxcore::utility::Guid& inKey)
    {
        return GetInstance().RetrieveFromCache(inKey);
    }
    static void InsertIntoCache(const QRT::InterfaceRef<MF::IVideoFrame>& inFrame,
                                const mvxcore::utility::Guid& inKey, int32_t inPriority)
    {
        GetInstance().InsertIntoCache(inFrame, inKey, inPriority);
    }
    static void RegisterDependencyOnFrame(const mvxcore::utility::Guid& inKey)
    {
        GetInstance().RegisterDependencyOnFrame(inKey);
    }
    static void UnregisterDependencyOnFrame(const mvxcore::utility::Guid& inKey)
    {
        GetInstance().UnregisterDependencyOnFrame(inKey);
    }
    static void SetNotificationFunction(FrameCacheNotification inFunction)
    {
        GetInstance().SetNotificationFunction(std::move(inFunction));
    }
    static void Clear() { GetInstance().Clear(); }
    static FrameCacheStatistics GetStatistics() { return GetInstance().GetStatistics(); }
};

} // namespace VF
