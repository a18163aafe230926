#pragma once

// The foundation allocator: memory for every object made through
// QRT::Allocated<T>. Thread-safe. It counts live blocks so that tests and
// shutdown checks can prove that objects were released.

#include <cstddef>
#include <cstdint>

namespace QRT
{

class Allocator
{
public:
    // Memory aligned for any fundamental type; throws std::bad_alloc.
    static void* Allocate(size_t inSize);
    // Frees memory from Allocate; null is ignored.
    static void Dispose(void* inMemory) noexcept;
    // Blocks allocated and not yet disposed, process-wide.
    static int64_t GetLiveBlockCount() noexcept;
};

} // namespace QRT
