#include "utils/packed_matrix.h"

#include <gtest/gtest.h>
#include <immintrin.h>

#include <cmath>

#include "support/error_bound.h"
#include "support/random.h"

using MORVA::CONTAINERS::Matrix;
using MORVA::CONTAINERS::PackedMatrix;
using test_support::ErrorBound;
using test_support::Random;

namespace {

// Without the smallest halves, which emulated processors cannot read in the mode of frames.
float toHalfPrecision(float value) {
    if (std::abs(value) < 1e-4f) return 0.0f;
    return _cvtsh_ss(static_cast<unsigned short>(_cvtss_sh(value, _MM_FROUND_TO_NEAREST_INT)));
}

}  // namespace

// Seed and whether the values are exact in half precision.
class PackedProduct : public testing::TestWithParam<std::tuple<std::uint64_t, bool>> {};

TEST_P(PackedProduct, AgreesWithDoubleSums) {
    auto const [seed, half] = GetParam();
    Random random(seed);
    TRACE_SEED(random);
    std::size_t const rows = random.between(1, 200);
    std::size_t const cols = random.between(1, 200);
    Matrix W{random.normal(rows * cols), rows, cols};
    if (half) {
        for (float& value : W.data) value = toHalfPrecision(value);
    }
    auto const x = random.normal(rows);
    auto const bias = random.normal(cols);

    PackedMatrix const packed(W);
    EXPECT_EQ(packed.isHalfPrecision(), half);
    std::vector<float> out(cols + 1, -7.0f);
    packed.affine(x.data(), bias.data(), out.data());
    EXPECT_EQ(out.back(), -7.0f) << "written past the last column";

    ErrorBound bound("packed product, relative to sqrt(terms), seed " + std::to_string(seed), 2e-6);
    for (std::size_t c = 0; c < cols; ++c) {
        double sum = bias[c];
        for (std::size_t r = 0; r < rows; ++r) {
            sum += static_cast<double>(x[r]) * W.data[r * cols + c];
        }
        bound.add(out[c], sum, std::sqrt(static_cast<double>(rows)));
    }
}

INSTANTIATE_TEST_SUITE_P(Seeds, PackedProduct,
                         testing::Combine(testing::Range<std::uint64_t>(1, 9), testing::Bool()));
