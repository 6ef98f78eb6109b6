// Smoothed level of the noise: its mean square over a hop, smoothed by 0.9 per hop, in decibels re
// one squared unit of the 16-bit sample scale (-60 for nothing).
#pragma once

#include "noise_canceller/hop_pipeline.h"

namespace MORVA::NOISE_CANCELLER {

class NoiseLevelMeter {
public:
    // For models that do not say what noise is: it is what they remove, input minus output.
    void measure(HopPipeline::CompletedHop const& hop);
    void add(float power);
    float levelDb() const;
    void reset() { power_ = 0.0f; }

private:
    float power_ = 0.0f;
};

}  // namespace MORVA::NOISE_CANCELLER
