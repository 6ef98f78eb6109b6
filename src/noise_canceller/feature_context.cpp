#include "noise_canceller/feature_context.h"

namespace MORVA::NOISE_CANCELLER {

FeatureContext::FeatureContext(std::size_t frames, std::size_t width, std::size_t capacity)
    : frames_(frames), width_(width), queue_(capacity) {
    reset();
}

void FeatureContext::reset() {
    queue_.start = queue_.end = 0;
    queue_.push_backNULL(frames_ * width_);
}

void FeatureContext::push(std::vector<float> const& features, std::vector<float> const& mean,
                          std::vector<float> const& deviation, std::vector<float>& x) {
    queue_.start += width_;
    queue_.push_back(features.data(), features.size());
    x.assign(queue_.readPosition(), queue_.readPosition() + queue_.unread());
    // Counters instead of a remainder per value: the two vectors need not be as long as a frame.
    std::size_t m = 0;
    std::size_t d = 0;
    for (float& value : x) {
        value = (value - mean[m]) / deviation[d];
        if (++m == mean.size()) m = 0;
        if (++d == deviation.size()) d = 0;
    }
}

}  // namespace MORVA::NOISE_CANCELLER
