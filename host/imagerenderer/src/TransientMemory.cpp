// The transient memory pool: 64-byte aligned scratch blocks that are kept after
// they are freed and handed out again for requests of the same size class, so a
// renderer that works frame after frame touches no fresh pages (a fresh 1080p
// frame costs tens of milliseconds of page faults on a virtual machine).
//
// Each block starts with a 64-byte header (guard word and rounded size) in front
// of the address the caller receives. One process-wide pool, guarded by one mutex;
// the lock is held only to push or pop a free list, never while touching memory.

#include "IR/ImageRenderer.h"
#include "mvxcore/debug/Contract.h"

#include <cstdlib>
#include <mutex>
#include <unordered_map>
#include <vector>

namespace
{

constexpr std::size_t kAlignment = 64;
constexpr std::size_t kHeaderBytes = 64;
constexpr std::uint64_t kGuardLive = 0x49525472616E7331ull; // block handed out
constexpr std::uint64_t kGuardFree = 0x4952547266726565ull; // block in the pool
constexpr std::size_t kMaximumCachedBytes = std::size_t(1) << 30;

struct BlockHeader
{
    std::uint64_t guard;
    std::size_t classBytes;
};

// The size class of a request: powers of two up to 4 KiB, above that the next
// multiple of a quarter of the enclosing power of two (at most 25% waste).
std::size_t SizeClass(std::size_t inSize)
{
    std::size_t size = inSize < kAlignment ? kAlignment : inSize;
    if (size <= 4096)
    {
        std::size_t p = kAlignment;
        while (p < size)
            p <<= 1;
        return p;
    }
    std::size_t p = 4096;
    while (p * 2 < size)
        p <<= 1;
    const std::size_t step = p / 4;
    return (size + step - 1) / step * step;
}

class TransientPool
{
public:
    void* Allocate(std::size_t inSize)
    {
        const std::size_t classBytes = SizeClass(inSize);
        void* raw = nullptr;
        {
            std::lock_guard<std::mutex> lock(mMutex);
            auto found = mFree.find(classBytes);
            if (found != mFree.end() && !found->second.empty())
            {
                raw = found->second.back();
                found->second.pop_back();
                mCachedBytes -= classBytes;
            }
        }
        if (raw == nullptr)
        {
            raw = std::aligned_alloc(kAlignment, classBytes + kHeaderBytes);
            if (raw == nullptr)
                return nullptr;
        }
        auto* header = static_cast<BlockHeader*>(raw);
        header->guard = kGuardLive;
        header->classBytes = classBytes;
        return static_cast<std::uint8_t*>(raw) + kHeaderBytes;
    }

    void Free(void* inBlock)
    {
        void* raw = static_cast<std::uint8_t*>(inBlock) - kHeaderBytes;
        auto* header = static_cast<BlockHeader*>(raw);
        MVX_INPUT_CONTRACT(header->guard == kGuardLive);
        header->guard = kGuardFree;
        const std::size_t classBytes = header->classBytes;
        {
            std::lock_guard<std::mutex> lock(mMutex);
            if (mCachedBytes + classBytes <= kMaximumCachedBytes)
            {
                mFree[classBytes].push_back(raw);
                mCachedBytes += classBytes;
                return;
            }
        }
        std::free(raw);
    }

    std::size_t CachedBytes()
    {
        std::lock_guard<std::mutex> lock(mMutex);
        return mCachedBytes;
    }

private:
    // Guards mFree and mCachedBytes.
    std::mutex mMutex;
    // Free blocks (raw addresses, header included) by class size.
    std::unordered_map<std::size_t, std::vector<void*>> mFree;
    std::size_t mCachedBytes = 0;
};

TransientPool& Pool()
{
    // Never destroyed: blocks may be freed by static destructors of other libraries.
    static TransientPool* sPool = new TransientPool;
    return *sPool;
}

} // namespace

void* IR_AllocateTransientMemoryBlock(std::size_t inSize)
{
    MVX_INPUT_CONTRACT(inSize > 0);
    if (inSize > (std::size_t(1) << 40))
        return nullptr;
    return Pool().Allocate(inSize);
}

void IR_FreeTransientMemoryBlock(void* inBlock)
{
    if (inBlock == nullptr)
        return;
    Pool().Free(inBlock);
}

std::size_t IR_TransientMemoryCachedBytes()
{
    return Pool().CachedBytes();
}
