#include "morva-sdk/bypass.h"

#include <algorithm>

namespace MORVA::MORVA_SDK {

Bypass::Bypass(std::size_t inputFrame, std::size_t outputFrame, std::size_t latency)
    : toOutput_(inputFrame, outputFrame), delayed_(latency + 2 * outputFrame) {
    converted_.reserve(std::max(inputFrame, outputFrame));
    // The direct conversion is late by its own filter delay; the queue adds the rest.
    std::size_t const ownDelay = toOutput_.leadingZeros(inputFrame);
    delayed_.push_backNULL(latency > ownDelay ? latency - ownDelay : 0);
}

void Bypass::remember(std::vector<float> const& input) {
    toOutput_.resample(input, converted_);
    delayed_.push_back(converted_.data(), converted_.size());
}

void Bypass::mix(std::vector<float>& cleaned) {
    float const* const original = delayed_.readPosition();
    delayed_.start += cleaned.size();
    float const from = share_;
    float const to = target_.load(std::memory_order_relaxed) ? 1.0f : 0.0f;
    share_ = to;
    if (from == 0.0f && to == 0.0f) return;
    if (from == 1.0f && to == 1.0f) {  // to the bit
        std::copy_n(original, cleaned.size(), cleaned.begin());
        return;
    }
    // One frame is the length of the cross-fade.
    float const step = (to - from) / static_cast<float>(cleaned.size());
    for (std::size_t i = 0; i < cleaned.size(); ++i) {
        float const share = from + step * static_cast<float>(i + 1);
        cleaned[i] += share * (original[i] - cleaned[i]);
    }
}

}  // namespace MORVA::MORVA_SDK
