#include "statistics/en_threshold.h"

#include <algorithm>

#include "statistics/energy_history.h"
#include "utils/exception.h"

namespace MORVA::UTILS {
namespace {

constexpr double kOpenDivisor = 15.0;
constexpr double kClosedDivisor = 80.0;

std::size_t checked(std::size_t frames) {
    if (frames == 0) {
        raise("The energy gate needs at least one frame", "src/statistics/en_threshold",
              "EnThreshold");
    }
    return frames;
}

}  // namespace

EnThreshold::EnThreshold(std::size_t K, std::size_t M, float activityThreshold)
    : windowFrames(checked(K)),
      activeFrames(checked(M)),
      threshold(activityThreshold),
      frameEnergies(K, 0.0),
      activeEnergies(M, 0.0) {}

void EnThreshold::reset() {
    std::fill(frameEnergies.begin(), frameEnergies.end(), 0.0);
    std::fill(activeEnergies.begin(), activeEnergies.end(), 0.0);
    frameEnergySum = activeEnergySum = 0.0;
    activeCount = 0;
    gain = 1.0f;
}

float EnThreshold::setCurrentData(std::vector<float> const& frame) {
    double const energy = meanEnergy(frame);
    double const share = energy / static_cast<double>(windowFrames);
    frameEnergySum += replaceOldest(frameEnergies, share);
    // The single frame decides, not the window's mean.
    if (share >= threshold) {
        activeCount = std::min(activeCount + 1, activeFrames);
        activeEnergySum += replaceOldest(activeEnergies, energy);
    }
    gain = gate();
    return gain;
}

bool EnThreshold::applyEnThreshold(std::vector<float>& frame) {
    if (gain == 0.0f) {
        std::fill(frame.begin(), frame.end(), 0.0f);
    } else if (gain != 1.0f) {
        for (float& value : frame) value *= gain;
    }
    return true;
}

float EnThreshold::gate() const {
    if (activeCount == 0) return 1.0f;
    double const high = activeEnergySum / (kOpenDivisor * static_cast<double>(activeCount));
    double const low = activeEnergySum / (kClosedDivisor * static_cast<double>(activeCount));
    if (frameEnergySum <= low) return 0.0f;
    if (frameEnergySum >= high) return 1.0f;
    double const position = (frameEnergySum - low) / (high - low);
    return static_cast<float>(position * position);
}

}  // namespace MORVA::UTILS
