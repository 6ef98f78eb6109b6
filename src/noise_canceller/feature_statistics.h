// The values by which a model standardises its features. Both stay valid as long as the weight.
#pragma once

#include <vector>

#include "weights/weight.h"

namespace MORVA::NOISE_CANCELLER {

// Read before the network.
struct FeatureStatistics {
    // Throws MORVA_Exception for a missing value.
    explicit FeatureStatistics(WEIGHTS::Weight const& weight)
        : mu(weight.getReference<std::vector<float>>("MU")),
          sd(weight.getReference<std::vector<float>>("SD")) {}

    std::vector<float> const& mu;  // means
    std::vector<float> const& sd;  // deviations; of the voice-activity model variances
};

}  // namespace MORVA::NOISE_CANCELLER
