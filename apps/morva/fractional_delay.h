// Delays a stream by a part of a sample, so that a delay that it has already becomes a whole one.
//
// A sinc under a Kaiser window, flat to 0.95 of half the rate. Thread rule: one thread.
#pragma once

#include <cstdint>
#include <span>
#include <vector>

namespace morva::cli {

class FractionalDelay {
public:
    // For a stream that is late by `delay` samples. Nothing is changed when these are whole.
    explicit FractionalDelay(double delay);

    // Samples by which the result is late.
    std::int64_t wholeDelay() const { return wholeDelay_; }

    // Appends as many samples to `out` as `in` has.
    void push(std::span<float const> in, std::vector<float>& out);

private:
    std::int64_t wholeDelay_;
    std::vector<float> taps_;
    std::vector<float> window_;  // what the filter still looks back on, then the new samples
};

}  // namespace morva::cli
