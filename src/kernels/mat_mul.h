// The affine product of a layer. Every layer of a model runs the form over a packed matrix; the
// others, over the math library's BLAS, are here for callers who expect them.
//
// Shapes: W has `rows` x `cols` elements, row-major. x * W + b takes rows inputs and gives cols
// outputs; W * x + b the reverse. Lengths of x and b are the caller's promise (checked once, where
// a model is built); xSize is ignored; a longer bias is read up to the output length. `out` is
// resized and must not overlap the inputs. Allocates only when `out` must grow. Any thread.
#pragma once

#include <cstddef>
#include <vector>

#include "kernels/matrix.h"
#include "kernels/packed_matrix.h"

namespace MORVA::UTIL_FUNCTIONS {

using CONTAINERS::Matrix;

// out = x * W + b, in the fixed order of sums that packed_matrix.h promises
inline void matMulPlusB(std::vector<float> const& x, CONTAINERS::PackedMatrix const& W,
                        std::vector<float> const& b, std::vector<float>& out) {
    out.resize(W.cols());
    W.affine(x.data(), b.data(), out.data());
}

// out = W * x + b
void matMulPlusB(Matrix const& W, std::vector<float> const& x, Matrix const& b,
                 std::vector<float>& out);
void matMulPlusB(Matrix const& W, std::vector<float> const& x, std::vector<float> const& b,
                 std::vector<float>& out);
void matMulPlusB(Matrix const& W, float const* x, std::size_t xSize, std::vector<float> const& b,
                 std::vector<float>& out);

// out = x * W + b
void matMulPlusB(std::vector<float> const& x, Matrix const& W, Matrix const& b,
                 std::vector<float>& out);
void matMulPlusB(std::vector<float> const& x, Matrix const& W, std::vector<float> const& b,
                 std::vector<float>& out);
void matMulPlusB(float const* x, std::size_t xSize, Matrix const& W, std::vector<float> const& b,
                 std::vector<float>& out);

// out = A * B + C. An `out` that holds elements keeps its shape: the caller pays no reallocation
// and no check.
void matMulPlusB(Matrix const& A, Matrix const& B, Matrix const& C, Matrix& out);

}  // namespace MORVA::UTIL_FUNCTIONS
