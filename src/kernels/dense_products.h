// Products of plain matrices, added to what `out` holds, as the chosen math library computes them.
// Lengths are the caller's promise; `out` overlaps no operand. Any thread.
#pragma once

#include "kernels/matrix.h"

namespace MORVA::UTIL_FUNCTIONS {

// out += W x
void addProduct(CONTAINERS::Matrix const& W, float const* x, float* out);
// out += x W
void addProduct(float const* x, CONTAINERS::Matrix const& W, float* out);
// out += A B, the rows of `out` being out.cols apart
void addProduct(CONTAINERS::Matrix const& A, CONTAINERS::Matrix const& B, CONTAINERS::Matrix& out);

}  // namespace MORVA::UTIL_FUNCTIONS
