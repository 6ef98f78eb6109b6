// What the voice-activity model reads from its weight and environment. Read once per cleaner.
#pragma once

#include <cstddef>
#include <optional>
#include <vector>

#include "noise_canceller/feature_statistics.h"
#include "noise_canceller/network_weights.h"
#include "noise_canceller/shared_objects.h"
#include "weights/model_environment.h"

namespace MORVA::NOISE_CANCELLER {

// Maps raw network outputs piecewise linearly: low -> 0, middle -> 0.5, high -> 1.
struct Calibration {
    float low;
    float middle;
    float high;

    // The score of a raw output, limited to 0.00001..0.99999.
    float apply(float raw) const;
};

struct VadParams : FeatureStatistics, GatedWeights {
    using Environment = CONTAINERS::ModelEnvironment::element_type;

    static constexpr std::size_t kContextFrames = 4;  // before the newest one
    static constexpr float kEpsilon = 1e-7f;          // added to "SD", a variance

    // Throws MORVA_Exception for missing values and shapes that do not fit.
    explicit VadParams(Environment& environment);

    std::size_t sampleRate;
    std::size_t frameLength;  // analysis frame and FFT length, samples
    std::size_t bins;         // frameLength / 2 + 1
    std::size_t featureCount;
    std::size_t stateSize;
    std::optional<Calibration> calibration;
    bool enableStateReset;
    SharedWindow hammingWindow;
    SharedTransform transform;

    // (value - mean) / deviation of feature k
    float standardise(float value, std::size_t k) const;

private:
    void checkShapes() const;
};

}  // namespace MORVA::NOISE_CANCELLER
