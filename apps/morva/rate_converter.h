// Brings a mono stream of any rate to another, for files whose rate the engine does not take.
//
// Samples are floats; the result is time-aligned with the input (no delay). Thread rule: one
// thread.
#pragma once

#include <samplerate.h>

#include <memory>
#include <span>
#include <vector>

namespace morva::cli {

class RateConverter {
public:
    // Equal rates pass the samples through. Throws Error when the ratio is beyond 1:256.
    RateConverter(int fromHz, int toHz);

    // Appends to `out` what can be converted so far.
    void push(std::span<float const> in, std::vector<float>& out);
    // Appends the rest; nothing can be pushed after it.
    void finish(std::vector<float>& out);

private:
    void run(std::span<float const> in, bool last, std::vector<float>& out);

    double ratio_;
    std::unique_ptr<SRC_STATE, SRC_STATE* (*)(SRC_STATE*)> state_;  // null: equal rates
};

}  // namespace morva::cli
