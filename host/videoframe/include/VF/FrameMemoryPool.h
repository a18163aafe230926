#pragma once

// VF::FrameMemoryPool: recycled, 64-byte aligned pixel buffers.
//
// A frame's pixel memory is taken from a pool and given back when the frame's
// last reference goes. Sizes are rounded up to size classes (multiples of
// 4 KiB below 32 KiB, above that eighths of the power of two below the size,
// so at most 12.5 % is wasted), and a returned buffer serves the next request
// of its class: steady-state rendering asks the system for no memory and
// touches no fresh pages. Buffers the pool keeps count against its byte cap;
// when a return would exceed it, the least recently returned buffers go back
// to the system first.
//
// Threads: every function may be called from any thread. One mutex guards
// the free lists and is held only to link or unlink a buffer; system
// allocation and release happen outside it.
//
// The shared pool (GetShared) lives for the whole process and serves
// VF::CreateVideoFrame. Its cap is an eighth of physical memory, at most
// 2 GiB (at least 64 MiB).

#include <cstddef>
#include <cstdint>
#include <deque>
#include <list>
#include <mutex>
#include <unordered_map>

namespace VF
{

struct PoolBuffer
{
    void* mData = nullptr; // 64-byte aligned; null for an empty buffer
    size_t mCapacity = 0;  // the size class: usable bytes
};

struct FrameMemoryPoolStatistics
{
    uint64_t mSystemAllocations = 0; // buffers taken from the system
    uint64_t mReuses = 0;            // acquisitions served by a recycled buffer
    uint64_t mSystemReleases = 0;    // buffers given back to the system (trim, cap)
    uint64_t mBuffersPooled = 0;     // buffers waiting in the pool now
    uint64_t mBytesPooled = 0;       // their bytes
    uint64_t mBytesInUse = 0;        // bytes of buffers handed out and not returned
};

class FrameMemoryPool
{
public:
    explicit FrameMemoryPool(size_t inByteCap);
    // Frees every pooled buffer. Buffers still handed out must be returned
    // before (a pool must outlive its frames; the shared one never dies).
    ~FrameMemoryPool();
    FrameMemoryPool(const FrameMemoryPool&) = delete;
    FrameMemoryPool& operator=(const FrameMemoryPool&) = delete;

    // The process-wide pool.
    static FrameMemoryPool& GetShared();

    // The size class that serves inBytes (inBytes > 0).
    static size_t SizeClassFor(size_t inBytes) noexcept;

    // A buffer of at least inBytes (inBytes > 0, input contract), 64-byte
    // aligned; an empty buffer when the system has no memory.
    PoolBuffer Acquire(size_t inBytes);
    // Gives a buffer of this pool back. An empty buffer is ignored.
    void Return(PoolBuffer inBuffer) noexcept;

    void SetByteCap(size_t inByteCap);
    size_t GetByteCap() const;
    // Gives every pooled buffer back to the system.
    void Trim();

    FrameMemoryPoolStatistics GetStatistics() const;

private:
    struct Pooled
    {
        PoolBuffer mBuffer;
    };
    using PooledList = std::list<Pooled>;

    // Unlinks pooled buffers, least recently returned first, until the pooled
    // bytes fit inCap; appends them to outRelease. Requires mMutex.
    void TrimToLocked(size_t inCap, PooledList& outRelease);
    // Frees the buffers of inRelease; called without the mutex.
    static void FreeBuffers(PooledList& ioRelease) noexcept;

    // Guards everything below.
    mutable std::mutex mMutex;
    size_t mByteCap;
    // Every pooled buffer in return order, least recent at the front.
    PooledList mByAge;
    // Nodes kept for reuse so that linking a buffer allocates nothing.
    PooledList mSpareNodes;
    // Per size class: positions in mByAge, oldest at the front.
    std::unordered_map<size_t, std::deque<PooledList::iterator>> mByClass;
    FrameMemoryPoolStatistics mStatistics;
};

} // namespace VF
