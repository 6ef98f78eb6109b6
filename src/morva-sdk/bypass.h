// The way around the model: the caller's own sound at the session's latency, cross-faded against
// the cleaned sound, so that switching neither clicks nor shifts.
//
// While it is off, nothing but a copy of the last input frames is kept. The frame that finds the
// switch on converts all of them at once; the filter of the conversion has then heard enough to
// give what it would give had it run all the time.
#pragma once

#include <atomic>
#include <cstddef>
#include <span>
#include <vector>

#include "resampler/resampler.h"
#include "utils/cyclic_block_data.h"

namespace MORVA::MORVA_SDK {

class Bypass {
public:
    // `inputFrame` and `outputFrame` in samples, `latency` in output samples.
    Bypass(std::size_t inputFrame, std::size_t outputFrame, std::size_t latency);

    // [any thread]
    void set(bool on) { target_.store(on, std::memory_order_relaxed); }

    // Remembers one input frame on the internal scale. To be called before the frame is cleaned.
    void remember(std::span<float const> input);

    // Mixes the delayed input into one cleaned output frame, as far as the switch asks for it.
    void mix(std::span<float> cleaned);

private:
    void convertLast(std::size_t frames);

    UTILS::Resampler toOutput_;
    std::size_t ownDelay_;  // of the conversion, output samples
    std::size_t outputFrame_;
    std::size_t waiting_;  // converted samples that wait for their time between two frames
    std::size_t frames_;   // input frames that make up for not having run
    std::vector<float> frame_;
    CONTAINERS::CyclicBlockData input_;
    CONTAINERS::CyclicBlockData delayed_;
    std::atomic<bool> target_ = false;
    bool running_ = false;
    float share_ = 0.0f;  // of the bypassed sound, at the end of the last frame
};

}  // namespace MORVA::MORVA_SDK
