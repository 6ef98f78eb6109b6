// What every layer and program may know of the C interface: the rates and durations that the engine
// takes, and the kinds of session. Nothing but constants, for any processor.
#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>

#include "morva-sdk/morva-sdk.h"

namespace MORVA::MORVA_SDK {

enum class MorvaSessionType : int {
    Unknown = 0,  // answers a question about a session that does not exist
    NoiseCancellation = 1,
    VoiceActivity = 2,
    NoiseLevel = 3,
};

#define MORVA_VALUE(number) number,
inline constexpr std::array kSamplingRatesHz{MORVA_SAMPLING_RATES(MORVA_VALUE)};
inline constexpr std::array kFrameDurationsMs{MORVA_FRAME_DURATIONS(MORVA_VALUE)};
#undef MORVA_VALUE
static_assert(std::is_sorted(kSamplingRatesHz.begin(), kSamplingRatesHz.end()));

constexpr bool isSamplingRate(int hz) {
    return std::find(kSamplingRatesHz.begin(), kSamplingRatesHz.end(), hz) !=
           kSamplingRatesHz.end();
}
constexpr bool isFrameDuration(int ms) {
    return std::find(kFrameDurationsMs.begin(), kFrameDurationsMs.end(), ms) !=
           kFrameDurationsMs.end();
}

// Samples per frame: rate * duration / 1000, truncated; 0 for a negative rate or duration.
constexpr std::size_t getSampleCount(MorvaFrameDuration duration, MorvaSamplingRate rate) {
    auto const samples = std::int64_t{rate} * duration / 1000;
    return samples > 0 ? static_cast<std::size_t>(samples) : 0;
}

}  // namespace MORVA::MORVA_SDK
