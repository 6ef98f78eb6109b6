// Transforms and products: right, and the same bits wherever the operands lie, which the promise of
// reproducible output rests on; the edges of the statistics. (Their values are compared with the
// reference in whole cleaners, as are the windows and the queues.)
#include <gtest/gtest.h>
#include <immintrin.h>

#include <algorithm>
#include <cmath>

#include "kernels/fft.h"
#include "kernels/mat_mul.h"
#include "kernels/math_setup.h"
#include "statistics/background_speaker_fix.h"
#include "statistics/en_threshold.h"
#include "statistics/mean_energy.h"
#include "statistics/noise.h"
#include "support/error_bound.h"
#include "support/random.h"
#include "utils/exception.h"

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

// Without the smallest halves, which emulated processors cannot read in the mode of frames.
float toHalfPrecision(float value) {
    if (std::abs(value) < 1e-4f) return 0.0f;
    return _cvtsh_ss(static_cast<unsigned short>(_cvtss_sh(value, _MM_FROUND_TO_NEAREST_INT)));
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
        std::ranges::copy(x, in.begin() + static_cast<long>(offset));
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
                                         1024));

TEST(FFT, ReportsALengthThatHasNoTransform) {
    Spectrum spectrum;
    EXPECT_FALSE(FFT::create(0)->computeForward({}, spectrum));
}

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
    Matrix const biasMatrix{bias, 1, bias.size()};
    ErrorBound bound("matMulPlusB, relative to sqrt(terms), seed " + std::to_string(GetParam()),
                     4e-6);
    Vector out(5);
    auto const check = [&](bool first, Vector const& x) {
        auto const product = [&](auto const&... operands) {
            matMulPlusB(operands..., out);
            return out;
        };
        auto const wanted = first ? product(x, W, biasMatrix) : product(W, x, biasMatrix);
        if (first) addProduct(bound, wanted, {x, 1, rows}, W, bias);
        if (!first) addProduct(bound, wanted, W, {x, cols, 1}, bias);
        EXPECT_EQ(first ? product(x, W, bias) : product(W, x, bias), wanted);
        for (std::size_t offset = 0; offset < 16; ++offset) {
            Vector moved(offset);
            moved.insert(moved.end(), x.begin(), x.end());
            float const* const at = moved.data() + offset;
            Matrix const V = W;  // in another place behind blocks of other sizes
            ASSERT_EQ(first ? product(at, rows, V, bias) : product(V, at, cols, bias), wanted)
                << "offset " << offset;
        }
    };
    check(true, down);
    check(false, across);
    Matrix product;
    matMulPlusB(left, W, C, product);
    addProduct(bound, product.data, left, W, C.data);
    for (bool const half : {false, true}) {
        Matrix V = W;
        if (half) std::ranges::transform(V.data, V.data.begin(), toHalfPrecision);
        PackedMatrix const packed(V);
        EXPECT_EQ(packed.isHalfPrecision(), half);
        matMulPlusB(down, packed, bias, out);
        addProduct(bound, out, {down, 1, rows}, V, bias);
        Vector exact(cols + 1, -7.0f);
        packed.affine(down.data(), bias.data(), exact.data());
        EXPECT_EQ(exact.back(), -7.0f) << "written past the last column";
    }
}
INSTANTIATE_TEST_SUITE_P(Seeds, Products, testing::Range<std::uint64_t>(1, 13));

// A matrix that has the room keeps its shape; a product without terms is the bias.
TEST(MatMul, EdgesOfTheShapes) {
    Matrix wide{Vector(12, -1.0f), 3, 4};
    matMulPlusB(Matrix{{1, 2, 3, 4, 5, 6}, 3, 2}, Matrix{{1, 0, 0, 1}, 2, 2},
                Matrix{Vector(12, 0.0f), 3, 4}, wide);
    EXPECT_EQ(wide.cols, 4u);
    EXPECT_EQ(wide.data, (Vector{1, 2, 0, 0, 3, 4, 0, 0, 5, 6, 0, 0}));
    Vector out;
    matMulPlusB(Vector{}, Matrix{{}, 0, 2}, Vector{1, 2}, out);
    EXPECT_EQ(out, (Vector{1, 2}));
    matMulPlusB(Matrix{{}, 2, 0}, Vector{}, Vector{3, 4}, out);
    EXPECT_EQ(out, (Vector{3, 4}));
}

// Taking the oldest frame out of the mean leaves it in the history, so a following exchange takes
// it out once more.
TEST(Noise, TheOldestFrameCanBeTakenOutTwice) {
    Noise noise(2, 1);
    noise.fillWithSilence();
    for (float const value : {4.0f, 8.0f}) {
        noise.addFrameNoiseRemoveBack(&value, 1);
        noise.calculateNoise();
    }
    noise.removeBackFrameInfoFromMean();
    EXPECT_EQ(noise.mean.front(), 4.0f);
    noise.addNullFrameNoiseRemoveBack();
    noise.calculateNoise();
    EXPECT_EQ(noise.mean.front(), 2.0f);
}

TEST(Statistics, RefuseWindowsThatDivideByZero) {
    EXPECT_THROW(EnThreshold(0, 1, 0.0f), MORVA_Exception);
    EXPECT_THROW(EnThreshold(1, 0, 0.0f), MORVA_Exception);
    EXPECT_THROW(MeanEnergy(0, 1, 0.0f, 0.0f), MORVA_Exception);
    EXPECT_THROW(MeanEnergy(1, 0, 0.0f, 0.0f), MORVA_Exception);
    EXPECT_THROW(Noise(0, 4), MORVA_Exception);
    EXPECT_THROW(BackgroundSpeakerFix(10, 15, 40, 2, 2.0f, true, 30, Vector(10)), MORVA_Exception);
}
