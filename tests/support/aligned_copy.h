// A copy of values at a chosen distance, in elements, from a 64-byte boundary: for tests that
// results do not depend on where their operands lie.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <vector>

namespace test_support {

class OffsetBuffer {
public:
    OffsetBuffer(std::size_t n, std::size_t offset) : memory_(n + offset + line / sizeof(float)) {
        auto const address = reinterpret_cast<std::uintptr_t>(memory_.data());
        std::size_t const pad = (line - address % line) % line / sizeof(float);
        first_ = pad + offset;
    }
    OffsetBuffer(std::vector<float> const& values, std::size_t offset)
        : OffsetBuffer(values.size(), offset) {
        std::copy(values.begin(), values.end(), data());
    }

    float* data() { return memory_.data() + first_; }
    std::vector<float> values(std::size_t n) { return {data(), data() + n}; }

private:
    static constexpr std::size_t line = 64;
    std::vector<float> memory_;
    std::size_t first_ = 0;
};

}  // namespace test_support
