// Spectral features of the voice-activity model: log energies of pooled bins, and the level tracker
// that brings every frame to one loudness before they are taken.
#pragma once

#include <cstddef>
#include <vector>

namespace MORVA::NOISE_CANCELLER {

// Pools B = FrameLength / 2 + 1 powers in place: the lower quarter stays single, above it each
// octave is averaged in groups twice as wide as in the octave below (B = 121 gives 31 + 15 + 15 =
// 61 values).
void poolBands(std::vector<float>& powers);
std::size_t pooledBandCount(std::size_t bins);

// Follows the mean energy of the frames that hold sound: fast up, slowly otherwise.
class LevelTracker {
public:
    // Takes one frame and returns the gain that brings the tracked level to its target amplitude.
    float gainFor(std::vector<float> const& frame);

private:
    double level_ = 4000000.0;  // mean square; starts at the target, 2000 squared
};

}  // namespace MORVA::NOISE_CANCELLER
