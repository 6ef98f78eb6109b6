#include "kernels/mat_mul.h"

#include <mkl_cblas.h>

#include <algorithm>

namespace MORVA::UTIL_FUNCTIONS {
namespace {

// The bias goes into the output first, so that the product is added in place (beta = 1).
void affine(CBLAS_TRANSPOSE transpose, Matrix const& W, float const* x, std::vector<float> const& b,
            std::vector<float>& out) {
    out.resize(transpose == CblasTrans ? W.cols : W.rows);
    std::copy_n(b.data(), out.size(), out.data());
    if (W.rows == 0 || W.cols == 0) return;  // BLAS refuses a leading dimension of 0
    cblas_sgemv(CblasRowMajor, transpose, static_cast<MKL_INT>(W.rows),
                static_cast<MKL_INT>(W.cols), 1.0f, W.data.data(), static_cast<MKL_INT>(W.cols), x,
                1, 1.0f, out.data(), 1);
}

}  // namespace

void matMulPlusB(Matrix const& W, std::vector<float> const& x, Matrix const& b,
                 std::vector<float>& out) {
    affine(CblasNoTrans, W, x.data(), b.data, out);
}

void matMulPlusB(Matrix const& W, std::vector<float> const& x, std::vector<float> const& b,
                 std::vector<float>& out) {
    affine(CblasNoTrans, W, x.data(), b, out);
}

void matMulPlusB(Matrix const& W, float const* x, std::size_t, std::vector<float> const& b,
                 std::vector<float>& out) {
    affine(CblasNoTrans, W, x, b, out);
}

void matMulPlusB(std::vector<float> const& x, Matrix const& W, Matrix const& b,
                 std::vector<float>& out) {
    affine(CblasTrans, W, x.data(), b.data, out);
}

void matMulPlusB(std::vector<float> const& x, Matrix const& W, std::vector<float> const& b,
                 std::vector<float>& out) {
    affine(CblasTrans, W, x.data(), b, out);
}

void matMulPlusB(float const* x, std::size_t, Matrix const& W, std::vector<float> const& b,
                 std::vector<float>& out) {
    affine(CblasTrans, W, x, b, out);
}

void matMulPlusB(Matrix const& A, Matrix const& B, Matrix const& C, Matrix& out) {
    if (out.data.empty()) {
        out.rows = A.rows;
        out.cols = B.cols;
        out.data.resize(out.rows * out.cols);
    }
    std::copy(C.data.begin(), C.data.end(), out.data.begin());
    if (A.rows == 0 || A.cols == 0 || B.cols == 0) return;
    cblas_sgemm(CblasRowMajor, CblasNoTrans, CblasNoTrans, static_cast<MKL_INT>(A.rows),
                static_cast<MKL_INT>(B.cols), static_cast<MKL_INT>(A.cols), 1.0f, A.data.data(),
                static_cast<MKL_INT>(A.cols), B.data.data(), static_cast<MKL_INT>(B.cols), 1.0f,
                out.data.data(), static_cast<MKL_INT>(out.cols));
}

}  // namespace MORVA::UTIL_FUNCTIONS
