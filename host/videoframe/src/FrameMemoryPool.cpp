#include "VF/FrameMemoryPool.h"

#include "mvxcore/debug/Contract.h"

#include <algorithm>
#include <bit>
#include <cstdlib>
#include <new>
#include <unistd.h>

namespace VF
{
namespace
{

constexpr size_t kAlignment = 64;
constexpr size_t kSmallGranule = 4096;
constexpr size_t kSmallLimit = 32768;

size_t DefaultSharedCap()
{
    const long pages = sysconf(_SC_PHYS_PAGES);
    const long pageSize = sysconf(_SC_PAGESIZE);
    size_t physical = (pages > 0 && pageSize > 0) ? size_t(pages) * size_t(pageSize) : 0;
    const size_t cap = physical / 8;
    return std::clamp<size_t>(cap, size_t{64} << 20, size_t{2} << 30);
}

} // namespace

FrameMemoryPool::FrameMemoryPool(size_t inByteCap)
    : mByteCap(inByteCap)
{
}

FrameMemoryPool::~FrameMemoryPool()
{
    Trim();
}

FrameMemoryPool& FrameMemoryPool::GetShared()
{
    // Never destroyed: frames held by other static objects may return their
    // buffers during process exit.
    static FrameMemoryPool* sShared = new FrameMemoryPool(DefaultSharedCap());
    return *sShared;
}

size_t FrameMemoryPool::SizeClassFor(size_t inBytes) noexcept
{
    if (inBytes <= kSmallLimit)
        return (inBytes + kSmallGranule - 1) / kSmallGranule * kSmallGranule;
    // Eighths of the power of two at or below the size: waste under 12.5 %.
    const size_t step = std::bit_floor(inBytes) / 8;
    return (inBytes + step - 1) / step * step;
}

PoolBuffer FrameMemoryPool::Acquire(size_t inBytes)
{
    MVX_INPUT_CONTRACT(inBytes > 0);
    const size_t sizeClass = SizeClassFor(inBytes);
    {
        std::lock_guard lock(mMutex);
        auto found = mByClass.find(sizeClass);
        if (found != mByClass.end() && !found->second.empty())
        {
            // The most recently returned buffer of the class: its pages are the
            // likeliest to be resident and in cache.
            const PooledList::iterator node = found->second.back();
            found->second.pop_back();
            const PoolBuffer buffer = node->mBuffer;
            mSpareNodes.splice(mSpareNodes.end(), mByAge, node);
            mStatistics.mReuses++;
            mStatistics.mBuffersPooled--;
            mStatistics.mBytesPooled -= buffer.mCapacity;
            mStatistics.mBytesInUse += buffer.mCapacity;
            return buffer;
        }
    }
    void* data = std::aligned_alloc(kAlignment, sizeClass);
    if (data == nullptr)
    {
        // Give the pooled buffers of other classes back and try once more.
        Trim();
        data = std::aligned_alloc(kAlignment, sizeClass);
        if (data == nullptr)
            return PoolBuffer{};
    }
    std::lock_guard lock(mMutex);
    mStatistics.mSystemAllocations++;
    mStatistics.mBytesInUse += sizeClass;
    return PoolBuffer{data, sizeClass};
}

void FrameMemoryPool::Return(PoolBuffer inBuffer) noexcept
{
    if (inBuffer.mData == nullptr)
        return;
    PooledList release;
    try
    {
        std::lock_guard lock(mMutex);
        mStatistics.mBytesInUse -= inBuffer.mCapacity;
        if (inBuffer.mCapacity > mByteCap)
        {
            release.push_back(Pooled{inBuffer});
            mStatistics.mSystemReleases++;
        }
        else
        {
            TrimToLocked(mByteCap - inBuffer.mCapacity, release);
            if (mSpareNodes.empty())
                mSpareNodes.emplace_back();
            mSpareNodes.front().mBuffer = inBuffer;
            mByAge.splice(mByAge.end(), mSpareNodes, mSpareNodes.begin());
            mByClass[inBuffer.mCapacity].push_back(std::prev(mByAge.end()));
            mStatistics.mBuffersPooled++;
            mStatistics.mBytesPooled += inBuffer.mCapacity;
        }
    }
    catch (...)
    {
        // Bookkeeping could not allocate: the buffer goes back to the system.
        std::free(inBuffer.mData);
    }
    FreeBuffers(release);
}

void FrameMemoryPool::TrimToLocked(size_t inCap, PooledList& outRelease)
{
    while (mStatistics.mBytesPooled > inCap && !mByAge.empty())
    {
        const PooledList::iterator oldest = mByAge.begin();
        // The oldest buffer overall is also the oldest of its class.
        auto& classList = mByClass[oldest->mBuffer.mCapacity];
        classList.pop_front();
        mStatistics.mBuffersPooled--;
        mStatistics.mBytesPooled -= oldest->mBuffer.mCapacity;
        mStatistics.mSystemReleases++;
        outRelease.splice(outRelease.end(), mByAge, oldest);
    }
}

void FrameMemoryPool::FreeBuffers(PooledList& ioRelease) noexcept
{
    for (Pooled& pooled : ioRelease)
        std::free(pooled.mBuffer.mData);
    ioRelease.clear();
}

void FrameMemoryPool::SetByteCap(size_t inByteCap)
{
    PooledList release;
    {
        std::lock_guard lock(mMutex);
        mByteCap = inByteCap;
        TrimToLocked(mByteCap, release);
    }
    FreeBuffers(release);
}

size_t FrameMemoryPool::GetByteCap() const
{
    std::lock_guard lock(mMutex);
    return mByteCap;
}

void FrameMemoryPool::Trim()
{
    PooledList release;
    {
        std::lock_guard lock(mMutex);
        TrimToLocked(0, release);
        mSpareNodes.clear();
    }
    FreeBuffers(release);
}

FrameMemoryPoolStatistics FrameMemoryPool::GetStatistics() const
{
    std::lock_guard lock(mMutex);
    return mStatistics;
}

} // namespace VF
