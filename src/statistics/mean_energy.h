// Running mean of the energy of active frames: what the level normalisation divides by.
//
// Energies are mean squares of samples on the 16-bit scale. A frame allocates nothing.
#pragma once

#include <cstddef>
#include <list>

namespace MORVA::UTILS {

class MeanEnergy {
public:
    // A frame counts as active when the mean energy of the last K frames reaches the threshold;
    // the last M active frames are averaged, the initial energy counting as the first of them.
    // Throws MORVA_Exception for K or M of 0.
    MeanEnergy(std::size_t K, std::size_t M, float threshold, float initialEnergy);

    // Takes one frame and returns the mean active energy.
    float setCurrentData(float const* frame, std::size_t n);

    // Back to the state after construction; allocates nothing.
    void reset();

private:
    void addActive(double energy);

    std::size_t windowFrames;
    std::size_t activeFrames;
    double threshold;
    double firstEnergy;
    std::list<double> frameEnergies;   // energy / K of the last K frames, oldest first
    std::list<double> activeEnergies;  // energy of the last active frames, at most M
    double frameEnergySum = 0.0;
    double activeEnergySum;
    std::size_t activeCount = 1;
    std::list<double> spareNodes;  // what activeEnergies grows from
};

}  // namespace MORVA::UTILS
