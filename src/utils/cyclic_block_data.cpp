#include "utils/cyclic_block_data.h"

#include <algorithm>

namespace MORVA::CONTAINERS {

CyclicBlockData::CyclicBlockData(std::size_t capacity) : data(capacity + 1, 0.0f) {}

int CyclicBlockData::push_back(float const* samples, std::size_t n) {
    std::copy_n(samples, n, claim(n));
    return 0;
}

int CyclicBlockData::push_back(short const* samples, std::size_t n) {
    std::transform(samples, samples + n, claim(n),
                   [](short sample) { return static_cast<float>(sample); });
    return 0;
}

int CyclicBlockData::push_backNULL(std::size_t n) {
    std::fill_n(claim(n), n, 0.0f);
    return 0;
}

float* CyclicBlockData::claim(std::size_t n) {
    if (end + n > data.size()) {
        std::copy(data.data() + start, data.data() + end, data.data());
        end -= start;
        start = 0;
    }
    float* const room = data.data() + end;
    end += n;
    return room;
}

}  // namespace MORVA::CONTAINERS
