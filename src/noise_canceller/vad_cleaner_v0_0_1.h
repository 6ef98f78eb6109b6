// Voice activity: one speech score per session frame. Level normalisation, Hamming-windowed
// spectrum of the newest FrameLength samples, pooled log energies, five frames of context, a small
// gated network, and a calibration of its output.
#pragma once

#include <vector>

#include "noise_canceller/networks.h"
#include "noise_canceller/noise_cleaner.h"
#include "noise_canceller/state_watchdog.h"
#include "noise_canceller/vad_features.h"
#include "noise_canceller/vad_params.h"
#include "utils/cyclic_block_data.h"

namespace MORVA::NOISE_CANCELLER {

class VadCleaner_v0_0_1 final : public NoiseCleaner {
public:
    using Params = VadParams;

    // `frameMs` is the session's frame length; the models know 10, 15, 20, 30, 32 and 40 ms.
    VadCleaner_v0_0_1(ModelEnvironment model, std::size_t frameMs);

    // Replaces the frame by its score.
    bool cleanNoise(std::vector<float>& frame) override;

    // Restores the start state; always true.
    bool resetSession() override;

    // Features and network for one analysis window of `n` = FrameLength samples; the raw output.
    float probabilityCalc(float const* window, std::size_t n);

    // Watches raw outputs and clears the recurrent state after long stretches of confident
    // non-speech.
    void state_reset_functionality(float logit);

private:
    void fillContext();

    Params params_;
    LevelTracker level_;
    CONTAINERS::CyclicBlockData samples_;
    CONTAINERS::CyclicBlockData features_;
    std::vector<float> state_;
    StateWatchdog watchdog_;

    std::vector<float> windowed_;
    std::vector<std::complex<float>> spectrum_;
    std::vector<float> powers_;
    std::vector<float> x_;
    NetworkScratch scratch_;
};

}  // namespace MORVA::NOISE_CANCELLER
