// Decides when a recurrent state has listened to non-speech for so long that it should start
// afresh: more than 95 % of the last 200 scores were low, and the last restart is at least 300
// frames ago.
#pragma once

#include <array>
#include <cmath>
#include <cstddef>
#include <cstdint>

namespace MORVA::NOISE_CANCELLER {

class StateWatchdog {
public:
    // Takes one raw output (a logit); true when the state is to be cleared now.
    bool observe(float logit) {
        bool const low = kLowScore > 1.0 / (1.0 + std::exp(-static_cast<double>(logit)));
        std::uint8_t& slot = flags_[next_];
        lowCount_ += low;
        lowCount_ -= slot;  // zero until the ring has filled
        slot = low;
        next_ = (next_ + 1) % kWindow;
        if (stored_ < kWindow) ++stored_;
        ++frames_;
        bool const mostlyLow =
            static_cast<float>(lowCount_) > static_cast<float>(stored_) * kLowFraction;
        if (!mostlyLow || frames_ < kMinFramesBetween) return false;
        frames_ = 0;
        return true;
    }

private:
    static constexpr std::size_t kWindow = 200;  // frames
    static constexpr double kLowScore = 0.75;    // probability
    static constexpr float kLowFraction = 0.95f;
    static constexpr std::size_t kMinFramesBetween = 300;  // frames

    std::array<std::uint8_t, kWindow> flags_{};
    std::size_t next_ = 0;
    std::size_t stored_ = 0;
    std::size_t lowCount_ = 0;
    std::size_t frames_ = 0;
};

}  // namespace MORVA::NOISE_CANCELLER
