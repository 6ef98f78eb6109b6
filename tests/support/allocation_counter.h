// Counts calls of the global operator new on this thread. Include in exactly one source file of a
// test program: it replaces the operators of the whole program.
#pragma once

#include <cstddef>
#include <cstdlib>
#include <new>

namespace test_support {

inline thread_local std::size_t allocations = 0;
inline thread_local std::size_t allocatedBytes = 0;     // released ones included
inline thread_local std::size_t largestAllocation = 0;  // bytes

// The number of allocations that `work` makes.
template <class Work>
std::size_t countAllocations(Work work) {
    std::size_t const before = allocations;
    work();
    return allocations - before;
}

struct AllocationSizes {
    std::size_t total = 0;
    std::size_t largest = 0;
};

// The bytes that `work` asks for.
template <class Work>
AllocationSizes measureAllocations(Work work) {
    std::size_t const before = allocatedBytes;
    largestAllocation = 0;
    work();
    return {allocatedBytes - before, largestAllocation};
}

}  // namespace test_support

// Not inlined: the compiler would see free() meet a "new" and warn.
[[gnu::noinline]] void* operator new(std::size_t size) {
    ++test_support::allocations;
    test_support::allocatedBytes += size;
    if (size > test_support::largestAllocation) test_support::largestAllocation = size;
    if (void* const memory = std::malloc(size == 0 ? 1 : size)) return memory;
    throw std::bad_alloc();
}
[[gnu::noinline]] void operator delete(void* memory) noexcept {
    std::free(memory);
}
[[gnu::noinline]] void operator delete(void* memory, std::size_t) noexcept {
    std::free(memory);
}
