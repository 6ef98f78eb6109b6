// Sampling rates in hertz that the engine takes, and how other rates reach it.
#pragma once

#include <algorithm>
#include <array>
#include <optional>
#include <string>

#include "error.h"

namespace morva::cli {

inline constexpr std::array engineRatesHz{8000,  12000, 16000, 24000, 32000,
                                          44100, 48000, 88200, 96000};
static_assert(std::ranges::is_sorted(engineRatesHz), "engineRateFor takes the first that fits");

// The rate at which a file of `rateHz` passes through the engine: its own, or the next higher one
// so that nothing of its band is lost. Nothing above the highest engine rate.
constexpr std::optional<int> engineRateFor(int rateHz) {
    auto const found = std::ranges::lower_bound(engineRatesHz, rateHz);
    if (rateHz < 1 || found == engineRatesHz.end()) return std::nullopt;
    return *found;
}

// The same for what is known to the user as `name`; throws Error when the engine takes no such
// rate.
inline int requireEngineRate(std::string const& name, int rateHz) {
    if (auto const rate = engineRateFor(rateHz)) return *rate;
    throw Error(name + ": a rate of " + std::to_string(rateHz) + " Hz is not supported (at most " +
                std::to_string(engineRatesHz.back()) + " Hz)");
}

// Samples per frame; 441 for 44100 Hz and 10 ms.
constexpr int frameSize(int rateHz, int frameMs) {
    return rateHz * frameMs / 1000;
}

}  // namespace morva::cli
