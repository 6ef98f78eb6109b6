#include "statistics/mean_energy.h"

#include <algorithm>
#include <iterator>

#include "statistics/energy_history.h"
#include "utils/exception.h"

namespace MORVA::UTILS {
namespace {

std::size_t checked(std::size_t frames) {
    if (frames == 0) {
        raise("The energy mean needs at least one frame", "src/statistics/mean_energy",
              "MeanEnergy");
    }
    return frames;
}

}  // namespace

MeanEnergy::MeanEnergy(std::size_t K, std::size_t M, float activityThreshold, float initialEnergy)
    : windowFrames(checked(K)),
      activeFrames(checked(M)),
      threshold(activityThreshold),
      firstEnergy(initialEnergy),
      frameEnergies(K, 0.0),
      activeEnergies(1, initialEnergy),
      activeEnergySum(initialEnergy),
      spareNodes(M - 1, 0.0) {}

void MeanEnergy::reset() {
    std::fill(frameEnergies.begin(), frameEnergies.end(), 0.0);
    frameEnergySum = 0.0;
    spareNodes.splice(spareNodes.end(), activeEnergies, std::next(activeEnergies.begin()),
                      activeEnergies.end());
    activeEnergies.front() = activeEnergySum = firstEnergy;
    activeCount = 1;
}

float MeanEnergy::setCurrentData(float const* frame, std::size_t n) {
    double const energy = meanEnergy({frame, n});
    frameEnergySum += replaceOldest(frameEnergies, energy / static_cast<double>(windowFrames));
    // Here the window's mean decides, not the single frame.
    if (frameEnergySum >= threshold) addActive(energy);
    return static_cast<float>(activeEnergySum / static_cast<double>(activeCount));
}

void MeanEnergy::addActive(double energy) {
    if (activeCount >= activeFrames) {
        activeEnergySum += replaceOldest(activeEnergies, energy);
        return;
    }
    ++activeCount;
    activeEnergySum += energy;
    activeEnergies.splice(activeEnergies.end(), spareNodes, spareNodes.begin());
    activeEnergies.back() = energy;
}

}  // namespace MORVA::UTILS
