#include "kernels/mat_mul.h"

#include <algorithm>

#include "kernels/dense_products.h"

namespace MORVA::UTIL_FUNCTIONS {
namespace {

// The bias goes into the output first, so that the product is added in place.
void columnForm(Matrix const& W, float const* x, std::vector<float> const& b,
                std::vector<float>& out) {
    out.resize(W.rows);
    std::copy_n(b.data(), out.size(), out.data());
    addProduct(W, x, out.data());
}

void rowForm(float const* x, Matrix const& W, std::vector<float> const& b,
             std::vector<float>& out) {
    out.resize(W.cols);
    std::copy_n(b.data(), out.size(), out.data());
    addProduct(x, W, out.data());
}

}  // namespace

void matMulPlusB(Matrix const& W, std::vector<float> const& x, Matrix const& b,
                 std::vector<float>& out) {
    columnForm(W, x.data(), b.data, out);
}

void matMulPlusB(Matrix const& W, std::vector<float> const& x, std::vector<float> const& b,
                 std::vector<float>& out) {
    columnForm(W, x.data(), b, out);
}

void matMulPlusB(Matrix const& W, float const* x, std::size_t, std::vector<float> const& b,
                 std::vector<float>& out) {
    columnForm(W, x, b, out);
}

void matMulPlusB(std::vector<float> const& x, Matrix const& W, Matrix const& b,
                 std::vector<float>& out) {
    rowForm(x.data(), W, b.data, out);
}

void matMulPlusB(std::vector<float> const& x, Matrix const& W, std::vector<float> const& b,
                 std::vector<float>& out) {
    rowForm(x.data(), W, b, out);
}

void matMulPlusB(float const* x, std::size_t, Matrix const& W, std::vector<float> const& b,
                 std::vector<float>& out) {
    rowForm(x, W, b, out);
}

void matMulPlusB(Matrix const& A, Matrix const& B, Matrix const& C, Matrix& out) {
    if (out.data.empty()) {
        out.rows = A.rows;
        out.cols = B.cols;
        out.data.resize(out.rows * out.cols);
    }
    std::copy(C.data.begin(), C.data.end(), out.data.begin());
    addProduct(A, B, out);
}

}  // namespace MORVA::UTIL_FUNCTIONS
