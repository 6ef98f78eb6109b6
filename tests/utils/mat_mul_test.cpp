#include "kernels/mat_mul.h"

#include <gtest/gtest.h>
#include <immintrin.h>

#include <algorithm>
#include <cmath>

#include "kernels/math_setup.h"
#include "support/aligned_copy.h"
#include "support/error_bound.h"
#include "support/random.h"

using MORVA::CONTAINERS::Matrix;
using MORVA::CONTAINERS::PackedMatrix;
using MORVA::UTIL_FUNCTIONS::matMulPlusB;
using test_support::ErrorBound;
using test_support::OffsetBuffer;
using test_support::Random;
using Vector = std::vector<float>;

namespace {

// Without the smallest halves, which emulated processors cannot read in the mode of frames.
float toHalfPrecision(float value) {
    if (std::abs(value) < 1e-4f) return 0.0f;
    return _cvtsh_ss(static_cast<unsigned short>(_cvtss_sh(value, _MM_FROUND_TO_NEAREST_INT)));
}

}  // namespace

class Products : public testing::TestWithParam<std::uint64_t> {
protected:
    void SetUp() override { MORVA::UTILS::configureMathLibrary(1); }
};

// A vector is a matrix of one row on the left, of one column on the right.
TEST_P(Products, AllFormsAgreeWithDoubleSums) {
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
    // A * B + c, in double.
    auto const check = [&](Vector const& out, Matrix const& A, Matrix const& B, Vector const& c) {
        ASSERT_EQ(out.size(), A.rows * B.cols);
        for (std::size_t i = 0; i < out.size(); ++i) {
            double sum = c[i];
            for (std::size_t k = 0; k < A.cols; ++k) {
                sum += static_cast<double>(A.data[i / B.cols * A.cols + k]) *
                       B.data[k * B.cols + i % B.cols];
            }
            bound.add(out[i], sum, std::sqrt(static_cast<double>(A.cols)));
        }
    };
    Vector out(5);
    for (int form = 0; form < 3; ++form) {
        if (form == 0) matMulPlusB(W, across, biasMatrix, out);
        if (form == 1) matMulPlusB(W, across, bias, out);
        if (form == 2) matMulPlusB(W, across.data(), across.size(), bias, out);
        check(out, W, {across, cols, 1}, bias);
        if (form == 0) matMulPlusB(down, W, biasMatrix, out);
        if (form == 1) matMulPlusB(down, W, bias, out);
        if (form == 2) matMulPlusB(down.data(), down.size(), W, bias, out);
        check(out, {down, 1, rows}, W, bias);
    }
    Matrix product;
    matMulPlusB(left, W, C, product);
    check(product.data, left, W, C.data);
    for (bool const half : {false, true}) {
        Matrix V = W;
        if (half) std::ranges::transform(V.data, V.data.begin(), toHalfPrecision);
        PackedMatrix const packed(V);
        EXPECT_EQ(packed.isHalfPrecision(), half);
        matMulPlusB(down, packed, bias, out);
        check(out, {down, 1, rows}, V, bias);
        Vector exact(cols + 1, -7.0f);
        packed.affine(down.data(), bias.data(), exact.data());
        EXPECT_EQ(exact.back(), -7.0f) << "written past the last column";
    }
}

// The operands are placed exactly; blocks of other sizes move the matrix.
TEST_P(Products, DoNotDependOnAlignment) {
    Random random(GetParam() + 1000);
    TRACE_SEED(random);
    Vector const x = random.normal(random.between(1, 300));
    Vector const y = random.normal(random.between(1, 300));
    Vector const values = random.normal(x.size() * y.size());
    Vector const bias = random.normal(std::max(x.size(), y.size()));
    std::pair<Vector, Vector> wanted;
    for (std::size_t offset = 0; offset < 16; ++offset) {
        Vector const shift(offset * 4 + 1);
        Matrix const W{values, x.size(), y.size()};
        std::pair<Vector, Vector> out;
        matMulPlusB(OffsetBuffer(x, offset).data(), x.size(), W, bias, out.first);
        matMulPlusB(W, OffsetBuffer(y, offset * 5 % 16).data(), y.size(), bias, out.second);
        if (offset == 0) wanted = out;
        ASSERT_EQ(out, wanted) << "offset " << offset;
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
