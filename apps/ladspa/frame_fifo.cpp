#include "frame_fifo.h"

namespace morva::ladspa {

void FrameFifo::reset() {
    std::ranges::fill(in_, 0.0F);
    std::ranges::fill(out_, 0.0F);
    position_ = 0;
}

std::size_t FrameFifo::exchange(std::span<float const> in, std::span<float> out) {
    std::size_t const n = std::min(in.size(), in_.size() - position_);
    auto const at = static_cast<std::ptrdiff_t>(position_);
    // Read before written: the host may work in place.
    std::copy_n(in.begin(), n, in_.begin() + at);
    std::copy_n(out_.begin() + at, n, out.begin());
    position_ += n;
    return n;
}

}  // namespace morva::ladspa
