#include "utils/mat_mul.h"

#include <gtest/gtest.h>

#include <cmath>

#include "support/aligned_copy.h"
#include "support/error_bound.h"
#include "support/random.h"
#include "utils/math_setup.h"

using MORVA::CONTAINERS::Matrix;
using MORVA::UTIL_FUNCTIONS::matMulPlusB;
using test_support::ErrorBound;
using test_support::OffsetBuffer;
using test_support::Random;
using Vector = std::vector<float>;

namespace {

Matrix randomMatrix(Random& random, std::size_t rows, std::size_t cols) {
    return {random.normal(rows * cols), rows, cols};
}

// Row r of A times column c of B plus C, in double. Vectors are matrices of one row or column.
double reference(Matrix const& A, Matrix const& B, Vector const& C, std::size_t r, std::size_t c) {
    double sum = C[r * B.cols + c];
    for (std::size_t k = 0; k < A.cols; ++k) {
        sum += static_cast<double>(A.data[r * A.cols + k]) * B.data[k * B.cols + c];
    }
    return sum;
}

}  // namespace

class Products : public testing::TestWithParam<std::uint64_t> {
protected:
    void SetUp() override { MORVA::UTILS::configureMathLibrary(1); }
};

TEST_P(Products, AllFormsAgreeWithDoubleSums) {
    Random random(GetParam());
    TRACE_SEED(random);
    std::size_t const rows = random.between(1, 200);
    std::size_t const cols = random.between(1, 200);
    Matrix const W = randomMatrix(random, rows, cols);
    Vector const across = random.normal(cols);       // x of W * x
    Vector const down = random.normal(rows);         // x of x * W
    Vector const bias = random.normal(rows + cols);  // longer than needed: the rest is not read
    Matrix const biasMatrix{bias, 1, bias.size()};
    ErrorBound bound("matMulPlusB, relative to sqrt(terms), seed " + std::to_string(GetParam()),
                     2e-6);

    auto const check = [&](Vector const& out, Matrix const& A, Matrix const& B) {
        ASSERT_EQ(out.size(), A.rows * B.cols);
        for (std::size_t i = 0; i < out.size(); ++i) {
            bound.add(out[i], reference(A, B, bias, i / B.cols, i % B.cols),
                      std::sqrt(static_cast<double>(A.cols)));
        }
    };
    Matrix const column{across, cols, 1};
    Matrix const row{down, 1, rows};
    Vector out(5);
    matMulPlusB(W, across, biasMatrix, out);
    check(out, W, column);
    matMulPlusB(W, across, bias, out);
    check(out, W, column);
    matMulPlusB(W, across.data(), across.size(), bias, out);
    check(out, W, column);
    matMulPlusB(down, W, biasMatrix, out);
    check(out, row, W);
    matMulPlusB(down, W, bias, out);
    check(out, row, W);
    matMulPlusB(down.data(), down.size(), W, bias, out);
    check(out, row, W);

    Matrix const A = randomMatrix(random, random.between(1, 40), rows);
    Matrix const C = randomMatrix(random, A.rows, cols);
    Matrix product;
    matMulPlusB(A, W, C, product);
    ASSERT_EQ(product.rows, A.rows);
    ASSERT_EQ(product.cols, cols);
    for (std::size_t i = 0; i < product.data.size(); ++i) {
        bound.add(product.data[i], reference(A, W, C.data, i / cols, i % cols),
                  std::sqrt(static_cast<double>(rows)));
    }
}

TEST_P(Products, DoNotDependOnAlignment) {
    Random random(GetParam() + 1000);
    TRACE_SEED(random);
    Vector const x = random.normal(random.between(1, 300));
    Vector const y = random.normal(random.between(1, 300));
    Vector const values = random.normal(x.size() * y.size());
    Vector const bias = random.normal(std::max(x.size(), y.size()));
    Vector wanted;
    Vector wantedTransposed;
    for (std::size_t offset = 0; offset < 16; ++offset) {
        // A matrix's own memory cannot be placed, but a vector's can: heap blocks of other sizes
        // before it move it, and x is placed exactly.
        Vector const shift(offset * 4 + 1);
        Matrix const W{values, x.size(), y.size()};
        OffsetBuffer left(x, offset);
        OffsetBuffer right(y, offset * 5 % 16);
        Vector out;
        Vector outTransposed;
        matMulPlusB(left.data(), x.size(), W, bias, out);
        matMulPlusB(W, right.data(), y.size(), bias, outTransposed);
        if (offset == 0) {
            wanted = out;
            wantedTransposed = outTransposed;
        }
        ASSERT_EQ(out, wanted) << "offset " << offset;
        ASSERT_EQ(outTransposed, wantedTransposed) << "offset " << offset;
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
