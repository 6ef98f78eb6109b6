// Exponentials and logarithms of arrays, in place, as the chosen math library computes them. A NaN
// stays one. Any thread.
#pragma once

#include <span>

namespace MORVA::UTILS {

// e^x; beyond what a double holds, the largest or smallest that the library gives. `values` is
// aligned to 64 bytes, which some libraries need for the same bits everywhere.
void exponentials(std::span<double> values);

// The natural logarithm of positive values.
void logarithms(std::span<float> values);

}  // namespace MORVA::UTILS
