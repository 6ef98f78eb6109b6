// Single to half precision. Any thread.
#pragma once

#include <cstdint>
#include <span>

namespace MORVA::UTILS {

// Rounds every value to the nearest half; returns whether all were exact. A NaN is not. The spans
// have one length, a multiple of 8.
bool toHalfPrecision(std::span<float const> values, std::span<std::uint16_t> halves);

}  // namespace MORVA::UTILS
