#include "kernels/dense_products.h"

#include "kernels/vector_layer.h"
#include "kernels/vector_math.h"

HWY_BEFORE_NAMESPACE();
namespace MORVA::UTIL_FUNCTIONS {

using CONTAINERS::Matrix;

void addProduct(Matrix const& W, float const* x, float* out) {
    std::size_t const whole = W.cols - W.cols % 8;  // as dotProduct wants it
    for (std::size_t r = 0; r < W.rows; ++r) {
        float const* const row = W.data.data() + r * W.cols;
        float sum = UTILS::dotProduct(row, x, whole);
        for (std::size_t c = whole; c < W.cols; ++c) sum += row[c] * x[c];
        out[r] += sum;
    }
}

void addProduct(float const* x, Matrix const& W, float* out) {
    float const* row = W.data.data();
    for (std::size_t r = 0; r < W.rows; ++r, row += W.cols) {
        for (std::size_t c = 0; c < W.cols; ++c) out[c] += x[r] * row[c];
    }
}

void addProduct(Matrix const& A, Matrix const& B, Matrix& out) {
    for (std::size_t r = 0; r < A.rows; ++r) {
        addProduct(A.data.data() + r * A.cols, B, out.data.data() + r * out.cols);
    }
}

}  // namespace MORVA::UTIL_FUNCTIONS
HWY_AFTER_NAMESPACE();
