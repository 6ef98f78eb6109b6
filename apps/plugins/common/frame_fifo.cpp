#include "frame_fifo.h"

namespace morva::plugins {

FrameFifo::FrameFifo(std::size_t channels, std::size_t frame)
    : frame_(frame), in_(channels * frame), out_(channels * frame) {}

void FrameFifo::reset() {
    std::ranges::fill(in_, 0.0F);
    std::ranges::fill(out_, 0.0F);
    filled_ = 0;
}

std::size_t FrameFifo::exchange(std::span<Lane const> lanes, std::size_t start,
                                std::size_t samples) {
    std::size_t const n = std::min(samples, frame_ - filled_);
    // All is read before anything is written: the host may work in place.
    for (std::size_t c = 0; c < lanes.size(); ++c) {
        auto const& [in, out, step] = lanes[c];
        float* const frame = part(in_, c).data() + filled_;
        for (std::size_t i = 0; i < n; ++i) frame[i] = in[(start + i) * step];
    }
    for (std::size_t c = 0; c < lanes.size(); ++c) {
        auto const& [in, out, step] = lanes[c];
        float const* const frame = part(out_, c).data() + filled_;
        for (std::size_t i = 0; i < n; ++i) out[(start + i) * step] = frame[i];
    }
    filled_ += n;
    return n;
}

}  // namespace morva::plugins
