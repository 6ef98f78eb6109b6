#include "kernels/vector_math.h"

#include <cmath>

namespace MORVA::UTIL_FUNCTIONS {

void multiply(float const* a, float const* b, float* out, std::size_t n) {
    for (std::size_t i = 0; i < n; ++i) out[i] = a[i] * b[i];
}

float vectorRMS(std::vector<float> const& v) {
    double const sum = UTILS::sumOver(v, [](float x) { return static_cast<double>(x * x); });
    return std::sqrt(static_cast<float>(sum) / static_cast<float>(v.size())) + 1e-6f;
}

}  // namespace MORVA::UTIL_FUNCTIONS
