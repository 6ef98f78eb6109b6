#include "kernels/elementary.h"

#include <mkl_vml.h>

#include <cmath>

namespace MORVA::UTILS {

void exponentials(std::span<double> values) {
    vdExp(static_cast<MKL_INT>(values.size()), values.data(), values.data());
}

// The library's own logarithm differs from processor to processor.
void logarithms(std::span<float> values) {
    for (float& value : values) value = std::log(value);
}

}  // namespace MORVA::UTILS
