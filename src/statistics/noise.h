// Running mean of the last K feature frames in one pass per frame, whatever K.
//
// Use: fillWithSilence(), or K times addNullFrameNoise(); then per frame addFrameNoiseRemoveBack(f)
// and exactly one calculateNoise(). Frames are stored divided by K once folded in, so that removing
// one is a subtraction. A step of fixed frame length allocates nothing.
#pragma once

#include <cstddef>
#include <list>
#include <vector>

namespace MORVA::UTILS {

class Noise {
public:
    using Iterator = std::list<std::vector<float>>::iterator;

    // K frames of frameSize values; the history starts empty. Throws MORVA_Exception for K == 0.
    Noise(std::size_t K, std::size_t frameSize);

    // K frames of silence; after the first time it allocates nothing.
    void fillWithSilence();

    // Puts a copy of the frame at the front; the mean stays as it is.
    Iterator addFrameNoise(float const* frame, std::size_t n);
    Iterator addNullFrameNoise();

    // The same in exchange for the oldest frame, which leaves the mean. The history must hold one.
    Iterator addFrameNoiseRemoveBack(float const* frame, std::size_t n);
    Iterator addNullFrameNoiseRemoveBack();

    // Takes the oldest frame out of the mean but leaves it in the history.
    void removeBackFrameInfoFromMean();

    // Divides the newest frame by K and adds it to the mean. Once per push.
    void calculateNoise();

    std::size_t windowFrames;
    std::size_t frameSize;
    std::vector<float> mean;
    std::list<std::vector<float>> frames;  // newest first

private:
    std::vector<float>& recycleBack();
};

}  // namespace MORVA::UTILS
