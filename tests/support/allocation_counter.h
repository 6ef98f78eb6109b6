// Counts calls of the global operator new on this thread, and can make one of them fail. Include in
// exactly one source file of a test program: it replaces the operators of the whole program.
#pragma once

#include <malloc.h>

#include <cstddef>
#include <cstdlib>
#include <new>

namespace test_support {

inline thread_local std::size_t allocations = 0;
inline thread_local std::size_t allocatedBytes = 0;     // released ones included
inline thread_local std::size_t largestAllocation = 0;  // bytes
inline thread_local std::size_t releases = 0;           // calls of the global operator delete
inline thread_local std::size_t heldBytes = 0;  // allocated and not released, as malloc rounds
inline thread_local std::size_t failingAllocation = 0;  // which one from now on throws; 0: none

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

namespace test_support::DETAIL {

inline void* allocate(std::size_t size, std::size_t alignment) {
    if (failingAllocation != 0 && --failingAllocation == 0) throw std::bad_alloc();
    ++allocations;
    allocatedBytes += size;
    if (size > largestAllocation) largestAllocation = size;
    std::size_t const rounded = (size + alignment - 1) / alignment * alignment;
    void* const memory =
        alignment == 1 ? std::malloc(size == 0 ? 1 : size) : std::aligned_alloc(alignment, rounded);
    if (memory == nullptr) throw std::bad_alloc();
    heldBytes += malloc_usable_size(memory);
    return memory;
}

inline void release(void* memory) noexcept {
    if (memory != nullptr) {
        ++releases;
        heldBytes -= malloc_usable_size(memory);
    }
    std::free(memory);
}

}  // namespace test_support::DETAIL

// Not inlined: the compiler would see free() meet a "new" and warn.
[[gnu::noinline]] void* operator new(std::size_t size) {
    return test_support::DETAIL::allocate(size, 1);
}
[[gnu::noinline]] void* operator new(std::size_t size, std::align_val_t alignment) {
    return test_support::DETAIL::allocate(size, static_cast<std::size_t>(alignment));
}
[[gnu::noinline]] void operator delete(void* memory) noexcept {
    test_support::DETAIL::release(memory);
}
[[gnu::noinline]] void operator delete(void* memory, std::size_t) noexcept {
    test_support::DETAIL::release(memory);
}
[[gnu::noinline]] void operator delete(void* memory, std::align_val_t) noexcept {
    test_support::DETAIL::release(memory);
}
[[gnu::noinline]] void operator delete(void* memory, std::size_t, std::align_val_t) noexcept {
    test_support::DETAIL::release(memory);
}
