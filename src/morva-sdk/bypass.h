// The way around the model: the caller's own sound at the session's latency, cross-faded against
// the cleaned sound, so that switching neither clicks nor shifts. One thread at a time; the switch
// itself may be thrown from any thread.
#pragma once

#include <atomic>
#include <cstddef>
#include <memory>
#include <vector>

#include "utils/cyclic_block_data.h"
#include "utils/resampler.h"

namespace MORVA::MORVA_SDK {

class Bypass {
public:
    // `inputFrame` and `outputFrame` in samples, `latency` in output samples.
    Bypass(std::size_t inputFrame, std::size_t outputFrame, std::size_t latency);

    void set(bool on) { target_.store(on, std::memory_order_relaxed); }

    // Remembers one input frame on the internal scale. To be called before the frame is cleaned.
    void remember(std::vector<float> const& input);

    // Mixes the delayed input into one cleaned output frame, as far as the switch asks for it.
    void mix(std::vector<float>& cleaned);

private:
    UTILS::Resampler toOutput_;
    std::vector<float> converted_;
    CONTAINERS::CyclicBlockData delayed_;
    std::atomic<bool> target_ = false;
    float share_ = 0.0f;  // of the bypassed sound, at the end of the last frame
};

}  // namespace MORVA::MORVA_SDK
