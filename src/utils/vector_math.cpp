#include "utils/vector_math.h"

namespace MORVA::UTIL_FUNCTIONS {

void multiply(float const* a, float const* b, float* out, std::size_t n) {
    for (std::size_t i = 0; i < n; ++i) out[i] = a[i] * b[i];
}

}  // namespace MORVA::UTIL_FUNCTIONS
