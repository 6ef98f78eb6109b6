// Bands of neighbouring FFT bins. Read-only after construction; any thread.
#pragma once

#include <cstddef>
#include <span>
#include <vector>

namespace MORVA::NOISE_CANCELLER {

class BandLayout {
public:
    static constexpr int kMaxDepth = 16;

    // The lowest `bins` / 2^c bins stay single, above them every octave is summed in groups twice
    // as wide as in the octave below, up to 2^c; that makes bins (c + 2) / 2^(c + 1) bands. Depth
    // c = 0 keeps every bin. Throws MORVA_Exception when the depth lies outside 0..16 or the bins
    // do not divide into its groups (they must be a multiple of 2^(c + 1) for c > 0).
    BandLayout(std::size_t bins, int depth);

    // Bands of these widths, all together `bins` wide. Throws MORVA_Exception for what is no
    // positive whole number and for another sum.
    BandLayout(std::size_t bins, std::vector<float> const& widths);

    std::size_t bins() const { return bins_; }
    std::size_t bands() const { return bands_; }

    // Calls body(band, first, last) for every band and its bins first <= k < last.
    template <class Body>
    void forEachBand(Body&& body) const {
        std::size_t band = 0;
        std::size_t bin = 0;
        for (auto const& run : runs_) {
            for (std::size_t i = 0; i < run.bands; ++i, bin += run.width) {
                body(band++, bin, bin + run.width);
            }
        }
    }

    // Sums powers of bins into bands, in place.
    void compress(std::vector<float>& powers) const;

    // Copies each of the bands' values to all bins of its group; `bins` gets one value per bin.
    void expand(std::span<float const> bands, std::vector<float>& bins) const;

private:
    // Neighbouring bands of one width.
    struct Run {
        std::size_t width;
        std::size_t bands;
    };
    void append(std::size_t width, std::size_t bands);

    std::size_t bins_;
    std::size_t bands_ = 0;
    std::vector<Run> runs_;
};

}  // namespace MORVA::NOISE_CANCELLER
