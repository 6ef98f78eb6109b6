// Fits host blocks of any length to frames of a fixed one: sample in, sample out, always exactly
// one frame later. No allocation after construction.
#pragma once

#include <algorithm>
#include <cstddef>
#include <span>
#include <vector>

namespace morva::ladspa {

class FrameFifo {
public:
    explicit FrameFifo(std::size_t frame) : in_(frame), out_(frame) {}

    // In samples.
    std::size_t delay() const { return in_.size(); }

    // Back to silence.
    void reset();

    // Passes one block; `in` and `out` are equally long and may be the same memory. `clean(in,
    // out)` is called for each frame that becomes full.
    template <class Clean>
    void run(std::span<float const> in, std::span<float> out, Clean&& clean) {
        while (!in.empty()) {
            std::size_t const n = exchange(in, out);
            in = in.subspan(n);
            out = out.subspan(n);
            if (position_ < in_.size()) continue;
            clean(std::span<float const>(in_), std::span<float>(out_));
            position_ = 0;
        }
    }

private:
    // Takes from `in` and gives to `out` what the current frame has room for; returns how many.
    std::size_t exchange(std::span<float const> in, std::span<float> out);

    std::vector<float> in_;
    std::vector<float> out_;
    std::size_t position_ = 0;
};

}  // namespace morva::ladspa
