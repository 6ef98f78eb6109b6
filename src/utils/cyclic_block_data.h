// Sample queue between a session's frames and a model's overlapping analysis blocks.
//
// Storage is one linear array: the unread samples always lie contiguous at readPosition(). Nothing
// is allocated after construction.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace MORVA::CONTAINERS {

class CyclicBlockData {
public:
    // The owner chooses a capacity that the unread samples plus one append never exceed; appends
    // do not check it.
    explicit CyclicBlockData(std::size_t capacity);

    // Each appends n samples and returns 0. 16-bit samples keep their integer value.
    int push_back(float const* samples, std::size_t n);
    int push_back(short const* samples, std::size_t n);
    int push_backNULL(std::size_t n);

    // A reader takes blocks at readPosition() and advances `start` by its hop.
    std::size_t unread() const { return static_cast<std::size_t>(end - start); }
    float const* readPosition() const { return data.data() + start; }

    std::vector<float> data;  // capacity + 1 samples
    std::uint64_t start = 0;  // first unread sample
    std::uint64_t end = 0;    // one past the last written sample

private:
    // Room for n samples at the end; moves the unread tail to the front when it must.
    float* claim(std::size_t n);
};

}  // namespace MORVA::CONTAINERS
