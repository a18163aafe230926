#include "QRT/Allocator.h"

#include <atomic>
#include <cstdlib>
#include <new>

namespace QRT
{
namespace
{
std::atomic<int64_t> sLiveBlocks{0};
}

void* Allocator::Allocate(size_t inSize)
{
    void* memory = std::malloc(inSize == 0 ? 1 : inSize);
    if (!memory)
        throw std::bad_alloc();
    sLiveBlocks.fetch_add(1, std::memory_order_relaxed);
    return memory;
}

void Allocator::Dispose(void* inMemory) noexcept
{
    if (!inMemory)
        return;
    sLiveBlocks.fetch_sub(1, std::memory_order_relaxed);
    std::free(inMemory);
}

int64_t Allocator::GetLiveBlockCount() noexcept
{
    return sLiveBlocks.load(std::memory_order_relaxed);
}

} // namespace QRT
