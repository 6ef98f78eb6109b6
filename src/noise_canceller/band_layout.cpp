#include "noise_canceller/band_layout.h"

#include <algorithm>
#include <numeric>
#include <string>

#include "utils/exception.h"

namespace MORVA::NOISE_CANCELLER {

BandLayout::BandLayout(std::size_t bins, int depth) : bins_(bins), depth_(depth) {
    auto const refuse = [](std::string const& why) {
        UTILS::raise(why, "src/noise_canceller/band_layout", "BandLayout");
    };
    if (depth < 0 || depth > kMaxDepth) {
        refuse("COMPRESS_RATE is " + std::to_string(depth) + ", must be 0.." +
               std::to_string(kMaxDepth));
    }
    if (depth > 0 && bins % (std::size_t{1} << (depth + 1)) != 0) {
        refuse("a band of " + std::to_string(bins) + " bins does not divide into the groups of " +
               "COMPRESS_RATE " + std::to_string(depth));
    }
}

void BandLayout::compress(std::vector<float>& powers) const {
    std::size_t const single = bins_ >> depth_;
    std::size_t read = single;
    std::size_t written = single;
    for (int octave = 1; octave <= depth_; ++octave) {
        std::size_t const width = std::size_t{1} << octave;
        for (std::size_t const end = single << octave; read < end; read += width) {
            float const* const group = powers.data() + read;
            powers[written++] = std::accumulate(group + 1, group + width, group[0]);
        }
    }
    powers.resize(written);
}

void BandLayout::expand(std::vector<float> const& bands, std::vector<float>& bins) const {
    bins.resize(bins_);
    std::size_t const single = bins_ >> depth_;
    std::copy_n(bands.begin(), single, bins.begin());
    auto band = bands.begin() + static_cast<std::ptrdiff_t>(single);
    auto target = bins.begin() + static_cast<std::ptrdiff_t>(single);
    for (int octave = 1; octave <= depth_; ++octave) {
        std::size_t const width = std::size_t{1} << octave;
        std::size_t const groups = (single << (octave - 1)) / width;
        for (std::size_t g = 0; g < groups; ++g) target = std::fill_n(target, width, *band++);
    }
}

}  // namespace MORVA::NOISE_CANCELLER
