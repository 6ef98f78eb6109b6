#include "utils/vector_rms.h"

#include <cmath>

#include "utils/sum_of_squares.h"

namespace MORVA::UTIL_FUNCTIONS {

float vectorRMS(std::vector<float> const& v) {
    double const sum = UTILS::sumOver(v, [](float x) { return static_cast<double>(x * x); });
    return std::sqrt(static_cast<float>(sum) / static_cast<float>(v.size())) + 1e-6f;
}

}  // namespace MORVA::UTIL_FUNCTIONS
