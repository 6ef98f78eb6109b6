// Transforms and products: right, and the same bits wherever the operands lie, which the promise of
// reproducible output rests on. (Windows, queues and statistics are compared with the reference in
// whole cleaners.)
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>

#include "kernels/fft.h"
#include "kernels/mat_mul.h"
#include "kernels/math_setup.h"
#include "support/error_bound.h"
#include "support/random.h"

using namespace MORVA::UTILS;
using MORVA::CONTAINERS::Matrix;
using MORVA::CONTAINERS::PackedMatrix;
using MORVA::UTIL_FUNCTIONS::matMulPlusB;
using test_support::ErrorBound;
using test_support::Random;
using test_support::relativeError;
using Spectrum = std::vector<std::complex<float>>;
using Vector = std::vector<float>;

namespace {

// Eleven binary digits. Without the smallest halves, which emulated processors cannot read in the
// mode of frames.
float toHalfPrecision(float value) {
    if (std::abs(value) < 1e-4f) return 0.0f;
    float const spread = value * 8193.0f;
    return spread - (spread - value);
}

// The bound's `out` = A * B + c, in double.
void addProduct(ErrorBound& bound, Vector const& out, Matrix const& A, Matrix const& B,
                Vector const& c) {
    ASSERT_EQ(out.size(), A.rows * B.cols);
    for (std::size_t i = 0; i < out.size(); ++i) {
        double sum = c[i];
        for (std::size_t k = 0; k < A.cols; ++k) {
            sum += static_cast<double>(A.data[i / B.cols * A.cols + k]) *
                   B.data[k * B.cols + i % B.cols];
        }
        bound.add(out[i], sum, std::sqrt(static_cast<double>(A.cols)));
    }
}

}  // namespace

class Transform : public testing::TestWithParam<std::size_t> {};

// (That the bins are the right ones is seen where whole cleaners are compared with a reference.)
TEST_P(Transform, ComesBackAndDoesNotDependOnAlignment) {
    configureMathLibrary(1);
    std::size_t const n = GetParam();
    Vector const x = Random(n).normal(n, 5000.0f);
    auto const fft = FFT::create(n);
    Spectrum wanted(3);        // wrong on purpose: it is resized
    Vector wantedBack(n + 5);  // likewise
    ASSERT_TRUE(fft->computeForward(x, wanted));
    ASSERT_EQ(wanted.size(), n / 2 + 1);
    ASSERT_TRUE(fft->computeBackward(wanted, wantedBack));
    EXPECT_LT(relativeError(wantedBack, x), 1e-6);
    for (std::size_t offset = 0; offset < 16; ++offset) {
        Vector in(n + 16);
        std::copy(x.begin(), x.end(), in.begin() + static_cast<long>(offset));
        Spectrum bins(wanted.size() + 8);
        auto* const first = bins.data() + offset * 7 % 8;
        ASSERT_TRUE(fft->computeForward(in.data() + offset, n, first, wanted.size()));
        ASSERT_EQ(Spectrum(first, first + wanted.size()), wanted) << "offset " << offset;
        ASSERT_TRUE(fft->computeBackward(first, wanted.size(), in.data() + offset, n));
        ASSERT_EQ(Vector(in.data() + offset, in.data() + offset + n), wantedBack) << offset;
    }
}

INSTANTIATE_TEST_SUITE_P(Lengths, Transform,
                         testing::Values(1, 2, 3, 16, 160, 240, 256, 320, 441, 480, 512, 640, 960,
                                         1024, 1301));

class Products : public testing::TestWithParam<std::uint64_t> {};

// A vector is a matrix of one row on the left, of one column on the right.
TEST_P(Products, AgreeWithDoubleSumsWhereverTheOperandsLie) {
    configureMathLibrary(1);
    Random random(GetParam());
    TRACE_SEED(random);
    std::size_t const rows = random.between(1, 200);
    std::size_t const cols = random.between(1, 200);
    std::size_t const more = random.between(1, 40);
    Matrix const W{random.normal(rows * cols), rows, cols};
    Matrix const left{random.normal(more * rows), more, rows};
    Matrix const C{random.normal(more * cols), more, cols};
    Vector const across = random.normal(cols);       // x of W * x
    Vector const down = random.normal(rows);         // x of x * W
    Vector const bias = random.normal(rows + cols);  // longer than needed: the rest is not read
    ErrorBound bound("matMulPlusB, relative to sqrt(terms), seed " + std::to_string(GetParam()),
                     4e-6);
    Vector out;
    Vector dense(5);
    matMulPlusB(down, W, bias, dense);
    addProduct(bound, dense, {down, 1, rows}, W, bias);
    matMulPlusB(W, across, bias, out);
    addProduct(bound, out, W, {across, cols, 1}, bias);
    Matrix product;
    matMulPlusB(left, W, C, product);
    addProduct(bound, product.data, left, W, C.data);
    for (bool const half : {false, true}) {
        Matrix V = W;
        if (half) std::transform(W.data.begin(), W.data.end(), V.data.begin(), toHalfPrecision);
        PackedMatrix const packed(V);
        EXPECT_EQ(packed.isHalfPrecision(),
                  half && MORVA::CONTAINERS::panelProduct().half != nullptr);
        matMulPlusB(down, packed, bias, out);
        addProduct(bound, out, {down, 1, rows}, V, bias);
        for (std::size_t offset = 0; offset < 16; ++offset) {
            Vector moved(offset);
            moved.insert(moved.end(), down.begin(), down.end());
            PackedMatrix const again(V);  // in another place behind blocks of other sizes
            Vector exact(cols + 1, -7.0f);
            again.affine(moved.data() + offset, bias.data(), exact.data());
            EXPECT_EQ(exact.back(), -7.0f) << "written past the last column";
            exact.pop_back();
            ASSERT_EQ(exact, out) << "offset " << offset;
            matMulPlusB(moved.data() + offset, rows, W, bias, exact);
            ASSERT_EQ(exact, dense) << "offset " << offset;
        }
    }
}
INSTANTIATE_TEST_SUITE_P(Seeds, Products, testing::Range<std::uint64_t>(1, 13));
