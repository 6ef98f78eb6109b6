// Compression of a band of FFT bins into coarser bands: the lowest B / 2^c bins stay single, above
// them every octave is summed in groups twice as wide as in the octave below, up to 2^c. Depth c =
// 0 keeps every bin. Read-only after construction; any thread.
#pragma once

#include <cstddef>
#include <vector>

namespace MORVA::NOISE_CANCELLER {

class BandLayout {
public:
    static constexpr int kMaxDepth = 16;

    // `bins` = B. Throws MORVA_Exception when the depth lies outside 0..16 or the bins do not
    // divide into its groups (B must be a multiple of 2^(c + 1) for c > 0).
    BandLayout(std::size_t bins, int depth);

    std::size_t bins() const { return bins_; }
    // K = B (c + 2) / 2^(c + 1)
    std::size_t bands() const {
        return bins_ * static_cast<std::size_t>(depth_ + 2) >> (depth_ + 1);
    }

    // Sums B powers into K bands, in place.
    void compress(std::vector<float>& powers) const;

    // Copies each of K band values to all bins of its group; `bins` gets B values.
    void expand(std::vector<float> const& bands, std::vector<float>& bins) const;

private:
    std::size_t bins_;
    int depth_;
};

}  // namespace MORVA::NOISE_CANCELLER
