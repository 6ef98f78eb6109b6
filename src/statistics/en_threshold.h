// Energy gate: closes when the recent frames are quiet against the recent active frames.
//
// Energies are mean squares of samples on the 16-bit scale. Fully open from 1/15 of the mean active
// energy upwards, fully closed up to 1/80, a squared ramp between. A frame allocates nothing.
#pragma once

#include <cstddef>
#include <list>
#include <vector>

namespace MORVA::UTILS {

class EnThreshold {
public:
    // K frames of recent energy against M active frames; a frame is active when its energy / K
    // reaches the threshold. Throws MORVA_Exception for K or M of 0.
    EnThreshold(std::size_t K, std::size_t M, float threshold);

    // Judges one frame and returns the new gain, 0 .. 1; 1 until a frame has been active.
    float setCurrentData(std::vector<float> const& frame);

    // Scales a vector by the latest gain; always true.
    bool applyEnThreshold(std::vector<float>& frame);

    // Back to the state after construction; allocates nothing.
    void reset();

private:
    float gate() const;

    std::size_t windowFrames;
    std::size_t activeFrames;
    double threshold;
    std::list<double> frameEnergies;   // energy / K of the last K frames, oldest first
    std::list<double> activeEnergies;  // energy of the last M active frames, oldest first
    double frameEnergySum = 0.0;
    double activeEnergySum = 0.0;
    std::size_t activeCount = 0;
    float gain = 1.0f;
};

}  // namespace MORVA::UTILS
