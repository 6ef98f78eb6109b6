// A model behind the conversion to its rate: what every kind of session sends its frames through.
// All samples are floats on the 16-bit scale.
#pragma once

#include <cstddef>
#include <memory>
#include <vector>

#include "morva-sdk/frame_converter.h"
#include "morva-sdk/vocabulary.h"
#include "noise_canceller/noise_cleaner.h"
#include "utils/non_copyable.h"

namespace MORVA::MORVA_SDK {

class ModelStage : private UTILS::NonCopyMovable {
public:
    // `inputFrame` in samples at the caller's rate.
    ModelStage(std::unique_ptr<NOISE_CANCELLER::NoiseCleaner> cleaner, std::size_t inputFrame,
               MorvaFrameDuration duration);

    // Replaces a frame of the caller by what the model leaves of it: its cleaned frame, at the
    // model's rate, or its one value.
    void run(std::vector<float>& frame);

    // Back to the start state, where the model supports it.
    void reset();

    std::size_t modelFrame() const { return modelFrame_; }
    FrameConverter const& converter() const { return toModel_; }

private:
    std::size_t modelFrame_;
    FrameConverter toModel_;
    std::unique_ptr<NOISE_CANCELLER::NoiseCleaner> cleaner_;
};

}  // namespace MORVA::MORVA_SDK
