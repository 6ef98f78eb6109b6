#include "utils/vector_math.h"

#include <mkl_vml.h>

namespace MORVA::UTIL_FUNCTIONS {

void multiply(float const* a, float const* b, float* out, std::size_t n) {
    vsMul(static_cast<MKL_INT>(n), a, b, out);
}

}  // namespace MORVA::UTIL_FUNCTIONS
