#include "noise_canceller/vad_features.h"

#include <algorithm>
#include <cmath>
#include <numeric>

#include "kernels/vector_math.h"

namespace MORVA::NOISE_CANCELLER {
namespace {

constexpr double kSmoothing = 0.954992586021436;  // 10^-0.02
constexpr double kEnergyFloor = 10000.0;          // an RMS of 100
constexpr double kRiseFactor = 2.0;
constexpr double kTargetLevel = 2000.0;

// Calls `group(begin, width)` for every pooled group of `bins` powers.
template <class Group>
void forEachGroup(std::size_t bins, Group&& group) {
    std::size_t const quarter = bins / 4;
    std::size_t const extra = bins % 8 == 1 ? 1 : 0;
    for (std::size_t i = 0; i < std::min(quarter + extra, bins); ++i) group(i, std::size_t{1});
    std::size_t width = 2;
    std::size_t boundary = 2 * quarter;
    for (std::size_t i = quarter + extra; i < bins; i += width) {
        if (i - extra == boundary) {
            width *= 2;
            boundary *= 2;
        }
        group(i, width);
    }
}

}  // namespace

std::size_t pooledBandCount(std::size_t bins) {
    std::size_t count = 0;
    forEachGroup(bins, [&](std::size_t, std::size_t) { ++count; });
    return count;
}

void poolBands(std::vector<float>& powers) {
    std::size_t written = 0;
    forEachGroup(powers.size(), [&](std::size_t begin, std::size_t width) {
        // A last group that would run past the spectrum is summed over what there is.
        std::size_t const end = std::min(begin + width, powers.size());
        float const sum = std::accumulate(powers.begin() + static_cast<std::ptrdiff_t>(begin),
                                          powers.begin() + static_cast<std::ptrdiff_t>(end), 0.0f);
        powers[written++] = sum / static_cast<float>(width);
    });
    powers.resize(written);
}

float LevelTracker::gainFor(std::vector<float> const& frame) {
    double const energy = UTILS::sumOfSquares(frame) / static_cast<double>(frame.size());
    if (energy >= kEnergyFloor) {
        bool const attack = energy > kRiseFactor * level_;
        double const keep = attack ? 1.0 - kSmoothing : kSmoothing;
        level_ = keep * level_ + (1.0 - keep) * energy;
    }
    return static_cast<float>(kTargetLevel / (std::sqrt(level_) + 1e-7));
}

}  // namespace MORVA::NOISE_CANCELLER
