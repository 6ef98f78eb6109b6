// Fits host blocks of any length to frames of a fixed one: sample in, sample out, always exactly
// one frame later. No allocation after construction.
#pragma once

#include <algorithm>
#include <cstddef>
#include <span>
#include <vector>

namespace morva::plugins {

// One channel of a host's block: samples in -1..1 that lie `step` floats apart.
struct Lane {
    float const* in = nullptr;
    float* out = nullptr;
    std::size_t step = 1;
};

class FrameFifo {
public:
    FrameFifo(std::size_t channels, std::size_t frame);

    // In samples.
    std::size_t delay() const { return frame_; }
    // Samples that the current frame holds.
    std::size_t filled() const { return filled_; }

    // Back to silence.
    void reset();

    // Passes one block, a lane per channel. Any two lanes may share memory, also crosswise.
    // `clean(channel, in, out)` is called for each channel of each frame that becomes full.
    template <class Clean>
    void run(std::span<Lane const> lanes, std::size_t samples, Clean&& clean) {
        for (std::size_t done = 0; done < samples;) {
            done += exchange(lanes, done, samples - done);
            if (filled_ < frame_) continue;
            for (std::size_t c = 0; c < lanes.size(); ++c) {
                clean(c, std::span<float const>(part(in_, c)), part(out_, c));
            }
            filled_ = 0;
        }
    }

private:
    // Takes from the lanes at `start` and gives to them what the frame has room for, at most
    // `samples`; returns how many.
    std::size_t exchange(std::span<Lane const> lanes, std::size_t start, std::size_t samples);
    std::span<float> part(std::vector<float>& all, std::size_t channel) const {
        return std::span(all).subspan(channel * frame_, frame_);
    }

    std::size_t frame_;
    std::vector<float> in_;  // channel after channel
    std::vector<float> out_;
    std::size_t filled_ = 0;
};

}  // namespace morva::plugins
