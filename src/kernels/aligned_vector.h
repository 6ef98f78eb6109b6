// A vector whose memory begins with a cache line, which is as wide as the widest registers.
#pragma once

#include <cstddef>
#include <new>
#include <vector>

namespace MORVA::CONTAINERS {

template <class T>
struct CacheLineAllocator {
    using value_type = T;
    CacheLineAllocator() = default;
    template <class U>
    CacheLineAllocator(CacheLineAllocator<U> const&) {}
    T* allocate(std::size_t n) {
        return static_cast<T*>(::operator new (n * sizeof(T), std::align_val_t{64}));
    }
    void deallocate(T* p, std::size_t) { ::operator delete (p, std::align_val_t{64}); }
    bool operator==(CacheLineAllocator const&) const { return true; }
};

template <class T>
using AlignedVector = std::vector<T, CacheLineAllocator<T>>;

}  // namespace MORVA::CONTAINERS
