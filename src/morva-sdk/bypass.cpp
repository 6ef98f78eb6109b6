#include "morva-sdk/bypass.h"

#include <algorithm>
#include <utility>

namespace MORVA::MORVA_SDK {

// The direct conversion is late by its own filter delay; waiting adds the rest of the latency. A
// conversion with frames missing gives a frame, what waits behind it, and before both what the
// filter spoils, which is as long as twice its delay.
Bypass::Bypass(std::size_t inputFrame, std::size_t outputFrame, std::size_t latency)
    : toOutput_(inputFrame, outputFrame),
      ownDelay_(toOutput_.leadingZeros(inputFrame)),
      outputFrame_(outputFrame),
      waiting_(latency > ownDelay_ ? latency - ownDelay_ : 0),
      frames_(2 + (waiting_ + 2 * (ownDelay_ + 1)) / outputFrame),
      input_(2 * frames_ * inputFrame),
      delayed_((frames_ + 1) * outputFrame) {
    frame_.reserve(std::max(inputFrame, outputFrame));
    input_.push_backNULL(frames_ * inputFrame);
}

void Bypass::remember(std::span<float const> input) {
    input_.start += input.size();
    input_.push_back(input.data(), input.size());
}

// Leaves one output frame and what waits behind it unread.
void Bypass::convertLast(std::size_t frames) {
    std::size_t const size = input_.unread() / frames_;
    float const* at = input_.readPosition() + (frames_ - frames) * size;
    for (std::size_t i = 0; i < frames; ++i, at += size) {
        frame_.assign(at, at + size);
        toOutput_.resample(frame_, frame_);
        delayed_.push_back(frame_.data(), frame_.size());
    }
    delayed_.start = delayed_.end - waiting_ - outputFrame_;
}

void Bypass::mix(std::span<float> cleaned) {
    float const from = share_;
    float const to = target_.load(std::memory_order_relaxed) ? 1.0f : 0.0f;
    share_ = to;
    bool const ran = std::exchange(running_, from != 0.0f || to != 0.0f);
    if (!running_) return;
    // Whole frames were left out, so the filter's phase is right; its memory is not.
    if (!ran) delayed_.start = delayed_.end;
    convertLast(ran ? 1 : frames_);
    float const* const original = delayed_.readPosition();
    delayed_.start += cleaned.size();
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
