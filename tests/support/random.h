// Seeded generators for tests. The seed is part of the trace of every failure inside its scope.
#pragma once

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <random>
#include <vector>

namespace test_support {

class Random {
public:
    explicit Random(std::uint64_t seed) : seed_(seed), engine_(seed) {}

    std::uint64_t seed() const { return seed_; }

    // Both ends included.
    std::size_t between(std::size_t low, std::size_t high) {
        return std::uniform_int_distribution<std::size_t>(low, high)(engine_);
    }
    float uniform(float low, float high) {
        return std::uniform_real_distribution<float>(low, high)(engine_);
    }
    bool chance(double probability) { return std::bernoulli_distribution(probability)(engine_); }

    std::vector<float> normal(std::size_t n, float deviation = 1.0f) {
        std::normal_distribution<float> distribution(0.0f, deviation);
        std::vector<float> values(n);
        for (float& value : values) value = distribution(engine_);
        return values;
    }
    std::vector<short> pcm16(std::size_t n) {
        std::uniform_int_distribution<int> distribution(-32768, 32767);
        std::vector<short> values(n);
        for (short& value : values) value = static_cast<short>(distribution(engine_));
        return values;
    }

private:
    std::uint64_t seed_;
    std::mt19937_64 engine_;
};

}  // namespace test_support

#define TRACE_SEED(random) SCOPED_TRACE(::testing::Message() << "seed " << (random).seed())
