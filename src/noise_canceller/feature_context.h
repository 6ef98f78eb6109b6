// The last P feature frames, oldest first, as one standardised network input.
#pragma once

#include <cstddef>
#include <vector>

#include "utils/cyclic_block_data.h"

namespace MORVA::NOISE_CANCELLER {

class FeatureContext {
public:
    // `frames` = P frames of `width` = K values; `capacity` of the queue in values.
    FeatureContext(std::size_t frames, std::size_t width, std::size_t capacity);

    // All frames zero.
    void reset();

    // Drops the oldest frame, appends `features` (K values) and leaves in `x` the P * K values
    // (v_i - mean[i mod |mean|]) / deviation[i mod |deviation|].
    void push(std::vector<float> const& features, std::vector<float> const& mean,
              std::vector<float> const& deviation, std::vector<float>& x);

private:
    std::size_t frames_;
    std::size_t width_;
    CONTAINERS::CyclicBlockData queue_;
};

}  // namespace MORVA::NOISE_CANCELLER
