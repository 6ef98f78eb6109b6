#include "statistics/noise.h"

#include <algorithm>
#include <iterator>

#include "utils/exception.h"

namespace MORVA::UTILS {

Noise::Noise(std::size_t K, std::size_t valuesPerFrame)
    : windowFrames(K), frameSize(valuesPerFrame), mean(valuesPerFrame, 0.0f) {
    if (K == 0) raise("The noise mean needs at least one frame", "src/statistics/noise", "Noise");
}

void Noise::fillWithSilence() {
    while (frames.size() < windowFrames) addNullFrameNoise();
    for (auto& frame : frames) std::fill(frame.begin(), frame.end(), 0.0f);
    std::fill(mean.begin(), mean.end(), 0.0f);
}

Noise::Iterator Noise::addFrameNoise(float const* frame, std::size_t n) {
    return frames.emplace(frames.begin(), frame, frame + n);
}

Noise::Iterator Noise::addNullFrameNoise() {
    return frames.emplace(frames.begin(), frameSize, 0.0f);
}

Noise::Iterator Noise::addFrameNoiseRemoveBack(float const* frame, std::size_t n) {
    recycleBack().assign(frame, frame + n);
    return frames.begin();
}

Noise::Iterator Noise::addNullFrameNoiseRemoveBack() {
    recycleBack().assign(frameSize, 0.0f);
    return frames.begin();
}

void Noise::removeBackFrameInfoFromMean() {
    std::vector<float> const& back = frames.back();
    std::size_t const shared = std::min(frameSize, back.size());
    for (std::size_t i = 0; i < shared; ++i) mean[i] -= back[i];
}

void Noise::calculateNoise() {
    std::vector<float>& front = frames.front();
    std::size_t const shared = std::min(frameSize, front.size());
    for (std::size_t i = 0; i < shared; ++i) {
        front[i] /= static_cast<float>(windowFrames);
        mean[i] += front[i];
    }
}

// The oldest frame's node and memory become the newest's.
std::vector<float>& Noise::recycleBack() {
    removeBackFrameInfoFromMean();
    frames.splice(frames.begin(), frames, std::prev(frames.end()));
    return frames.front();
}

}  // namespace MORVA::UTILS
