#include "kernels/dense_products.h"

#include <mkl_cblas.h>

namespace MORVA::UTIL_FUNCTIONS {
namespace {

using CONTAINERS::Matrix;

MKL_INT count(std::size_t n) {
    return static_cast<MKL_INT>(n);
}

void addVectorProduct(CBLAS_TRANSPOSE transpose, Matrix const& W, float const* x, float* out) {
    if (W.rows == 0 || W.cols == 0) return;  // BLAS refuses a leading dimension of 0
    cblas_sgemv(CblasRowMajor, transpose, count(W.rows), count(W.cols), 1.0f, W.data.data(),
                count(W.cols), x, 1, 1.0f, out, 1);
}

}  // namespace

void addProduct(Matrix const& W, float const* x, float* out) {
    addVectorProduct(CblasNoTrans, W, x, out);
}

void addProduct(float const* x, Matrix const& W, float* out) {
    addVectorProduct(CblasTrans, W, x, out);
}

void addProduct(Matrix const& A, Matrix const& B, Matrix& out) {
    if (A.rows == 0 || A.cols == 0 || B.cols == 0) return;
    cblas_sgemm(CblasRowMajor, CblasNoTrans, CblasNoTrans, count(A.rows), count(B.cols),
                count(A.cols), 1.0f, A.data.data(), count(A.cols), B.data.data(), count(B.cols),
                1.0f, out.data.data(), count(out.cols));
}

}  // namespace MORVA::UTIL_FUNCTIONS
