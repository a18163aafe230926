#include "QRT/WeakReference.h"

#include "QRT/Allocator.h"

#include <chrono>
#include <new>
#include <thread>

namespace QRT
{

WeakBlock* WeakBlock::Create()
{
    void* memory = Allocator::Allocate(sizeof(WeakBlock));
    return new (memory) WeakBlock();
}

bool WeakBlock::TryAddStrong() noexcept
{
    uint32_t count = mStrong.load(std::memory_order_acquire);
    for (int attempt = 0;; ++attempt)
    {
        if (count == 0)
            return false;
        if (mStrong.compare_exchange_weak(count, count + 1, std::memory_order_acq_rel,
                                          std::memory_order_acquire))
            return true;
        // Contended: spin 1, 2, 4, 8, 16 times, then sleep 1 ms per attempt.
        if (attempt < 5)
        {
            for (int spin = 0; spin < (1 << attempt); ++spin)
                std::this_thread::yield();
        }
        else
        {
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        }
        count = mStrong.load(std::memory_order_acquire);
    }
}

void WeakBlock::ReleaseBlockRef() noexcept
{
    if (mBlockRefs.fetch_sub(1, std::memory_order_acq_rel) == 1)
    {
        this->~WeakBlock();
        Allocator::Dispose(this);
    }
}

} // namespace QRT
