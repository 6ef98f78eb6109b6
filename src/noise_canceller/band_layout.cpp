#include "noise_canceller/band_layout.h"

#include <algorithm>
#include <cmath>
#include <numeric>
#include <string>

#include "utils/exception.h"

namespace MORVA::NOISE_CANCELLER {
namespace {

[[noreturn]] void refuse(std::string const& why) {
    UTILS::raise(why, "src/noise_canceller/band_layout", "BandLayout");
}

}  // namespace

BandLayout::BandLayout(std::size_t bins, int depth) : bins_(bins) {
    if (depth < 0 || depth > kMaxDepth) {
        refuse("COMPRESS_RATE is " + std::to_string(depth) + ", must be 0.." +
               std::to_string(kMaxDepth));
    }
    if (depth > 0 && bins % (std::size_t{1} << (depth + 1)) != 0) {
        refuse("a band of " + std::to_string(bins) + " bins does not divide into the groups of " +
               "COMPRESS_RATE " + std::to_string(depth));
    }
    std::size_t const single = bins >> depth;
    append(1, single);
    for (int octave = 1; octave <= depth; ++octave) append(std::size_t{1} << octave, single / 2);
}

BandLayout::BandLayout(std::size_t bins, std::vector<float> const& widths) : bins_(bins) {
    std::size_t left = bins;
    for (float const width : widths) {
        bool const whole =
            width >= 1.0f && width <= static_cast<float>(bins) && width == std::floor(width);
        if (!whole) {
            refuse("BandWidths holds " + std::to_string(width) + ", must be whole numbers from 1");
        }
        auto const count = static_cast<std::size_t>(width);
        if (count > left) break;
        left -= count;
        append(count, 1);
    }
    if (left != 0 || bands_ != widths.size()) {
        refuse("BandWidths does not add up to " + std::to_string(bins));
    }
}

void BandLayout::append(std::size_t width, std::size_t bands) {
    bands_ += bands;
    if (!runs_.empty() && runs_.back().width == width) {
        runs_.back().bands += bands;
    } else {
        runs_.push_back({width, bands});
    }
}

void BandLayout::compress(std::vector<float>& powers) const {
    forEachBand([&](std::size_t band, std::size_t first, std::size_t last) {
        float const* const bin = powers.data();
        powers[band] = std::accumulate(bin + first + 1, bin + last, bin[first]);
    });
    powers.resize(bands_);
}

void BandLayout::expand(std::span<float const> bands, std::vector<float>& bins) const {
    bins.resize(bins_);
    forEachBand([&](std::size_t band, std::size_t first, std::size_t last) {
        std::fill(bins.data() + first, bins.data() + last, bands[band]);
    });
}

}  // namespace MORVA::NOISE_CANCELLER
