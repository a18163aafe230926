#include "prefetch/MediaNodePrefetcher.h"

#include "ML/RenderStatus.h"
#include "QRT/Allocated.h"
#include "QRT/CriticalSection.h"
#include "VF/SharedVideoFrameCache.h"
#include "mvxcore/debug/Contract.h"
#include "prefetch/VideoSourcePrefetcher.h"

#include <atomic>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <utility>

namespace ML
{
namespace
{

using mvxcore::utility::Guid;
using mvxmediatypes::TickTime;
using SourceRef = QRT::InterfaceRef<BE::Deprecated::IVideoSource>;
using AsyncRef = QRT::InterfaceRef<BE::Deprecated::IAsyncVideoSource>;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

constexpr const char* kAsyncTimeoutMessage =
    "We have timed out on an async source. This probably shouldn't happen and will result in "
    "performance problems.";

std::atomic<bool> sTimeoutAssertionSilenced{false};

// One read of one frame, shared by every handle that wants that frame (equal
// frame keys); a handle with the null key starts no read at all. The read's
// arguments and the interface it was started through are guarded by the
// registry lock; the outcome of a queued read is written by its completion
// callback on an executor thread, without any lock. A failure is the read's,
// so it reaches every handle waiting on the key, not only the one that
// started the read: the others would otherwise wait for a frame that no read
// is bringing any more.
struct SharedRead
{
    // The arguments of the read, as the handle that started it gave them.
    SourceRef mSource;
    TickTime mTime;
    BE::VideoFrameRequest mRequest;
    MF::BinaryData mBinaryData;
    BE::ColorProfile mColorProfile;
    Guid mKey;
    std::int32_t mCachePriority = VF::kCachePriority_High;
    // Set while the read runs on the source's asynchronous-read interface;
    // empty once it is queued on the video source prefetcher.
    AsyncRef mAsync;

    // True once the queued read's callback has run (after the frame, if any,
    // went into the cache).
    std::atomic<bool> mFinished{false};
    // 0, or the negative status the queued read ended with (kResult_PrefetchIncomplete
    // when it answered success without a frame).
    std::atomic<QRT::Result> mFailure{QRT::kResult_Success};

    void Finish(QRT::Result inStatus)
    {
        if (QRT::Failed(inStatus))
        {
            QRT::Result expected = QRT::kResult_Success;
            while (!mFailure.compare_exchange_weak(expected, inStatus) && QRT::Succeeded(expected))
            {
            }
        }
        mFinished.store(true, std::memory_order_release);
    }

    // Queues the read on the video source prefetcher. The callback holds only
    // this shared state, never a handle, so that no handle is ever released by
    // the prefetcher while it or this registry holds a lock. It runs after the
    // cache insertion: a read that answers success but left no frame under the
    // key has brought nothing, and ends as failed, or the handles waiting on
    // the key would wait for it for ever.
    void Enqueue(const std::shared_ptr<SharedRead>& inSelf)
    {
        EnqueueVideoSourcePrefetch(
            mTime, mSource, mRequest, mBinaryData, mColorProfile, mKey, mCachePriority,
            [inSelf](QRT::Result inStatus)
            {
                if (QRT::Succeeded(inStatus) &&
                    !VF::SharedVideoFrameCache::RetrieveFromCache(inSelf->mKey))
                    inStatus = kResult_PrefetchIncomplete;
                inSelf->Finish(inStatus);
            });
    }
};

struct KeyEntry
{
    uint32_t mCount = 0;
    std::shared_ptr<SharedRead> mRead;
};

using KeyTable = std::map<Guid, KeyEntry>;

// The module-wide key table: how many live handles share the read of each
// frame key. Created on first use and never destroyed, so that handles
// released late during unloading still find it.
struct PrefetchRegistry
{
    QRT::CriticalSection mLock;
    KeyTable mKeys;
};

PrefetchRegistry& GetRegistry()
{
    static PrefetchRegistry* const sRegistry = new PrefetchRegistry;
    return *sRegistry;
}

// Drops one handle's reference on inKey. True when it was the last one (the
// read is then nobody else's). A key that is gone (flushed at shutdown) is not
// the handle's to end. Requires the registry lock.
bool ReleaseKeyLocked(KeyTable& ioKeys, const Guid& inKey)
{
    const auto found = ioKeys.find(inKey);
    if (found == ioKeys.end())
        return false;
    if (--found->second.mCount > 0)
        return false;
    ioKeys.erase(found);
    return true;
}

// A frame that a handle of a higher cache priority takes from the cache goes
// back in at that priority. Called without any lock: the insertion notifies.
void RaiseCachePriority(const FrameRef& inFrame, const Guid& inKey, std::int32_t inPriority)
{
    const std::optional<std::int32_t> cached =
        VF::SharedVideoFrameCache::GetInstance().GetCachedPriority(inKey);
    if (cached && *cached < inPriority)
        VF::SharedVideoFrameCache::InsertIntoCache(inFrame, inKey, inPriority);
}

// The prefetch handle over one frame of a back-end video source.
//
// Owned by the render request that collected it (and by whoever else holds a
// reference). Called from the thread that sets the request up, the render
// queue's housekeeping thread and a cancelling thread; mMutex serialises those
// calls on the handle's own state. Lock order: mMutex, then the registry lock,
// then the video source prefetcher's lock. No frame read and no cache
// insertion is made while any of them is held.
class MediaNodePrefetcher : public QRT::Implements<IRenderableNodePrefetch>
{
public:
    MediaNodePrefetcher(SourceRef inSource, AsyncRef inAsync, TickTime inTime,
                        const BE::VideoFrameRequest& inRequest, const MF::BinaryData& inBinaryData,
                        const BE::ColorProfile& inColorProfile, const Guid& inKey,
                        std::int32_t inCachePriority)
        : mSource(std::move(inSource))
        , mAsync(std::move(inAsync))
        , mTime(inTime)
        , mRequest(inRequest)
        , mBinaryData(inBinaryData)
        , mColorProfile(inColorProfile)
        , mKey(inKey)
        , mCachePriority(inCachePriority)
    {
    }

    ~MediaNodePrefetcher() { CancelPrefetch(); }

    QRT::Result InitiatePrefetch() override
    {
        std::unique_lock guard(mMutex);
        // Started already, or made inert by a failed start, or done.
        if (mRegistered || mFrame || mOver || !mSource)
            return QRT::kResult_Success;

        if (!mKey.IsNil())
        {
            if (!mCacheDependency)
            {
                VF::SharedVideoFrameCache::RegisterDependencyOnFrame(mKey);
                mCacheDependency = true;
            }
            // A frame cached already needs no read.
            if (FrameRef cached = VF::SharedVideoFrameCache::RetrieveFromCache(mKey))
            {
                mFrame = cached;
                const Guid key = mKey;
                guard.unlock();
                RaiseCachePriority(cached, key, mCachePriority);
                return QRT::kResult_Success;
            }
        }

        mHold = mSource->GetPrefetchHold();
        if (mAsync && !mAsync->IsAsyncEnabled())
            mAsync.Reset();

        // Without a key there is nothing to share, cache or wait for: the
        // handle starts nothing and is not registered. Asked for its frame, it
        // asks the source for what the source holds.
        if (mKey.IsNil())
            return QRT::kResult_Success;

        QRT::Result status = QRT::kResult_Success;
        try
        {
            PrefetchRegistry& registry = GetRegistry();
            QRT::CriticalSectionLock lock(registry.mLock, "InitiatePrefetch");
            auto [entry, start] = registry.mKeys.try_emplace(mKey);
            if (start)
                entry->second.mRead = MakeRead();
            ++entry->second.mCount;
            mRead = entry->second.mRead;
            mRegistered = true;

            if (start)
            {
                if (mAsync)
                {
                    status = mAsync->StartAsyncRead(mTime, mRequest, mBinaryData, mColorProfile);
                    if (QRT::Failed(status))
                    {
                        ReleaseKeyLocked(registry.mKeys, mKey);
                        mRegistered = false;
                        mRead.reset();
                    }
                    else
                    {
                        mRead->mAsync = mAsync;
                    }
                }
                else
                {
                    mRead->Enqueue(mRead);
                }
            }
        }
        catch (...)
        {
            // The read could not be queued (no prefetch executors): leave
            // nothing registered that no read will ever end.
            UndoRegistration();
            BecomeInert();
            throw;
        }

        if (QRT::Failed(status))
        {
            BecomeInert();
            return status;
        }
        return QRT::kResult_Success;
    }

    QRT::Result GetPrefetchedFrame(FrameRef& outFrame) override
    {
        outFrame.Reset();
        std::unique_lock guard(mMutex);
        if (mFrame || mOver)
        {
            outFrame = mFrame;
            mHold.reset();
            return QRT::kResult_Success;
        }
        const Guid key = mKey;
        const SourceRef source = mSource;
        const std::shared_ptr<SharedRead> read = mRead;
        guard.unlock();

        const bool failed = read && QRT::Failed(read->mFailure.load());
        FrameRef frame;
        if (!key.IsNil())
            frame = VF::SharedVideoFrameCache::RetrieveFromCache(key);
        if (frame)
        {
            RaiseCachePriority(frame, key, mCachePriority);
        }
        else if (source)
        {
            source->GetVideoFrame(mTime, mRequest, mBinaryData, mColorProfile,
                                  BE::Deprecated::kFrameRequestFlag_NoBlock, frame);
            if (frame && !key.IsNil())
                VF::SharedVideoFrameCache::InsertIntoCache(frame, key, mCachePriority);
        }

        guard.lock();
        if (frame)
        {
            if (!mFrame)
                mFrame = frame;
            outFrame = mFrame;
        }
        // A null-key handle that got a frame keeps it and still answers
        // pending this time; the next query hands the kept frame out and
        // answers 0.
        if ((frame && !key.IsNil()) || failed || !mSource)
        {
            // Over for good: later queries answer the same without asking again.
            mOver = true;
            ReleaseRegistration();
            return QRT::kResult_Success;
        }
        return kResult_PrefetchIncomplete;
    }

    QRT::Result CancelPrefetch() override
    {
        std::unique_lock guard(mMutex);
        if (!mFrame && mRegistered)
        {
            PrefetchRegistry& registry = GetRegistry();
            QRT::CriticalSectionLock lock(registry.mLock, "CancelPrefetch");
            if (ReleaseKeyLocked(registry.mKeys, mKey) && mRead)
            {
                if (mRead->mAsync)
                {
                    mRead->mAsync->CancelAsyncRead(mRead->mTime, mRead->mRequest,
                                                   mRead->mBinaryData, mRead->mColorProfile);
                    mRead->mAsync.Reset();
                }
                else
                {
                    CancelVideoSourcePrefetch(mRead->mSource, mKey);
                }
            }
            mRegistered = false;
        }
        else
        {
            mFrame.Reset();
        }
        mRead.reset();
        mHold.reset();
        if (mCacheDependency && !mKey.IsNil())
        {
            VF::SharedVideoFrameCache::UnregisterDependencyOnFrame(mKey);
            mCacheDependency = false;
        }
        return QRT::kResult_Success;
    }

    void GetPrefetchKey(QRT::Guid& outKey) const override
    {
        std::lock_guard guard(mMutex);
        outKey = mKey;
    }

    bool ContinueWaitingForPrefetch(double inElapsedSeconds) override
    {
        {
            std::lock_guard guard(mMutex);
            if (!mRegistered)
                return false;
        }
        FrameRef frame;
        if (GetPrefetchedFrame(frame) == QRT::kResult_Success)
            return false;

        AsyncRef async;
        {
            std::lock_guard guard(mMutex);
            async = mAsync;
        }
        if (!async)
            return true;
        if (async->WaitForAsyncRead(mTime, mRequest, mBinaryData, mColorProfile, inElapsedSeconds))
            return true;

        // The asynchronous read timed out (or failed): read the frame through
        // the video source prefetcher instead. Several handles may share the
        // read; the first to get here switches it over, the others just stop
        // waiting on the source.
        bool switched = false;
        {
            std::lock_guard guard(mMutex);
            mAsync.Reset();
            if (mRegistered && mRead)
            {
                PrefetchRegistry& registry = GetRegistry();
                QRT::CriticalSectionLock lock(registry.mLock, "ContinueWaitingForPrefetch");
                if (mRead->mAsync)
                {
                    // Withdraw the start, so that the source forgets the read.
                    mRead->mAsync->CancelAsyncRead(mRead->mTime, mRead->mRequest,
                                                   mRead->mBinaryData, mRead->mColorProfile);
                    mRead->mAsync.Reset();
                    switched = true;
                    try
                    {
                        mRead->Enqueue(mRead);
                    }
                    catch (...)
                    {
                        // No prefetch executors (the contract has reported it):
                        // end the read as failed so that no handle waits for it.
                        mRead->Finish(kResult_Cancelled);
                    }
                }
            }
        }
        if (switched && !sTimeoutAssertionSilenced.load())
            mvxcore::debug::BreakAfterAssertDialog("false", kAsyncTimeoutMessage, __FILE__,
                                                   __LINE__, __func__);
        return true;
    }

private:
    std::shared_ptr<SharedRead> MakeRead() const
    {
        auto read = std::make_shared<SharedRead>();
        read->mSource = mSource;
        read->mTime = mTime;
        read->mRequest = mRequest;
        read->mBinaryData = mBinaryData;
        read->mColorProfile = mColorProfile;
        read->mKey = mKey;
        read->mCachePriority = mCachePriority;
        return read;
    }

    // Gives up the key reference once the frame is there or the read is over.
    // When the frame came by another road (the cache, or frames the source
    // holds) while the key's read still waits on the video source prefetcher,
    // the last handle takes that read back, so that it neither runs for nobody
    // nor stays counted. Requires mMutex.
    void ReleaseRegistration()
    {
        if (mRegistered)
        {
            PrefetchRegistry& registry = GetRegistry();
            QRT::CriticalSectionLock lock(registry.mLock, "UnregisterPrefetch");
            if (ReleaseKeyLocked(registry.mKeys, mKey) && mRead && !mRead->mAsync &&
                !mRead->mFinished.load(std::memory_order_acquire))
                CancelVideoSourcePrefetch(mRead->mSource, mKey);
            mRegistered = false;
        }
        mRead.reset();
        mHold.reset();
    }

    // Takes back a registration made by InitiatePrefetch. Requires mMutex.
    void UndoRegistration()
    {
        if (!mRegistered)
            return;
        PrefetchRegistry& registry = GetRegistry();
        QRT::CriticalSectionLock lock(registry.mLock, "UnregisterPrefetch");
        ReleaseKeyLocked(registry.mKeys, mKey);
        mRegistered = false;
        mRead.reset();
    }

    // After a failed start: no source, no key, nothing held. Requires mMutex.
    void BecomeInert()
    {
        mSource.Reset();
        mAsync.Reset();
        if (mCacheDependency && !mKey.IsNil())
            VF::SharedVideoFrameCache::UnregisterDependencyOnFrame(mKey);
        mCacheDependency = false;
        mKey = Guid();
        mHold.reset();
    }

    mutable std::mutex mMutex;
    SourceRef mSource;
    // Held only while the source reports its asynchronous reads enabled.
    AsyncRef mAsync;
    const TickTime mTime;
    const BE::VideoFrameRequest mRequest;
    const MF::BinaryData mBinaryData;
    const BE::ColorProfile mColorProfile;
    Guid mKey;
    const std::int32_t mCachePriority;
    bool mCacheDependency = false;
    bool mRegistered = false;
    // Set once the prefetch has ended (frame taken, read over, or inert).
    bool mOver = false;
    FrameRef mFrame;
    BE::Deprecated::PrefetchHold mHold;
    // The read this handle waits for, while registered.
    std::shared_ptr<SharedRead> mRead;
};

} // namespace

QRT::InterfaceRef<IRenderableNodePrefetch>
CreateMediaNodePrefetcher(const SourceRef& inSource, TickTime inTime,
                          const BE::VideoFrameRequest& inRequest,
                          const MF::BinaryData& inBinaryData,
                          const BE::ColorProfile& inColorProfile, std::int32_t inCachePriority)
{
    MVX_INPUT_CONTRACT(inSource != nullptr);
    AsyncRef async = QRT::QueryRef<BE::Deprecated::IAsyncVideoSource>(inSource);
    if (async && !async->IsAsyncEnabled())
        async.Reset();
    if (!async && !inSource->IsPrefetchWanted(inTime))
        return {};
    const Guid key = inSource->GetFrameKey(inTime, inRequest, inBinaryData, inColorProfile);
    return QRT::Allocated<MediaNodePrefetcher>::Create<IRenderableNodePrefetch>(
        inSource, std::move(async), inTime, inRequest, inBinaryData, inColorProfile, key,
        inCachePriority);
}

void FlushMediaNodePrefetchRegistry()
{
    PrefetchRegistry& registry = GetRegistry();
    KeyTable flushed;
    {
        QRT::CriticalSectionLock lock(registry.mLock, "FlushPrefetchRegistry");
        flushed.swap(registry.mKeys);
        // Every shared read ends here: asynchronous starts are withdrawn so
        // that their sources forget them, and every read reports itself
        // cancelled so that no handle left alive waits for it.
        for (auto& [key, entry] : flushed)
        {
            SharedRead& read = *entry.mRead;
            if (read.mAsync)
            {
                read.mAsync->CancelAsyncRead(read.mTime, read.mRequest, read.mBinaryData,
                                             read.mColorProfile);
                read.mAsync.Reset();
            }
            read.Finish(kResult_Cancelled);
        }
    }
    // The entries (and the sources they hold) are released after the lock.
    flushed.clear();
}

uint32_t GetMediaNodePrefetchReferenceCount(const Guid& inKey)
{
    PrefetchRegistry& registry = GetRegistry();
    QRT::CriticalSectionLock lock(registry.mLock, "GetPrefetchReferenceCount");
    const auto found = registry.mKeys.find(inKey);
    return found == registry.mKeys.end() ? 0 : found->second.mCount;
}

void SilenceMediaNodePrefetchTimeoutAssertion(bool inSilenced)
{
    sTimeoutAssertionSilenced.store(inSilenced);
}

} // namespace ML
