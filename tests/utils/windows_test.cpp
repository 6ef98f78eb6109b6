#include "utils/windows.h"

#include <gtest/gtest.h>

#include <cmath>
#include <vector>

#include "support/error_bound.h"

using namespace MORVA::UTIL_FUNCTIONS;
using test_support::ErrorBound;

namespace {

using Generator = void (*)(std::size_t, float*, std::size_t);
constexpr float untouched = -7.0f;

// The window of n values; one more value shows that nothing is written behind them.
std::vector<float> window(Generator generate, std::size_t n) {
    std::vector<float> values(n + 1, untouched);
    generate(n, values.data(), n);
    EXPECT_EQ(values.back(), untouched);
    values.pop_back();
    return values;
}

void expectClose(std::vector<float> const& got, std::vector<double> const& wanted) {
    ASSERT_EQ(got.size(), wanted.size());
    for (std::size_t i = 0; i < got.size(); ++i) EXPECT_NEAR(got[i], wanted[i], 1e-7) << i;
}

}  // namespace

TEST(Windows, KnownValues) {
    expectClose(window(generateHammingWindowVector, 5), {0.08, 0.54, 1.0, 0.54, 0.08});
    double const quarter = std::sqrt(0.5);
    expectClose(window(generateVorbisWindowVector, 4), {0.0, quarter, 1.0, quarter});
    expectClose(window(generateTriangularWindowVector, 8), {0, .25, .5, .75, 1, .75, .5, .25});
    expectClose(window(generateTriangularWindowVector, 5), {0, 0.4, 1, 0.6, 0});
    expectClose(window(generateTriangularWindowVector, 1), {0});
}

TEST(Windows, DegenerateLengths) {
    for (Generator const generate : {generateHammingWindowVector, generateVorbisWindowVector,
                                     generateTriangularWindowVector}) {
        EXPECT_TRUE(window(generate, 0).empty());
    }
    EXPECT_TRUE(std::isnan(window(generateHammingWindowVector, 1).front()));
}

class WindowShape : public testing::TestWithParam<std::size_t> {};

TEST_P(WindowShape, HammingIsSymmetric) {
    auto const w = window(generateHammingWindowVector, GetParam());
    for (std::size_t i = 0; i < w.size(); ++i) EXPECT_NEAR(w[i], w[w.size() - 1 - i], 1e-6) << i;
}

TEST_P(WindowShape, VorbisIsPowerComplementaryAtHalfLength) {
    std::size_t const n = GetParam();
    auto const w = window(generateVorbisWindowVector, n);
    EXPECT_EQ(w.front(), 0.0f);
    EXPECT_EQ(w[n / 2], 1.0f);
    ErrorBound bound("w[i]^2 + w[i + n/2]^2 - 1, n = " + std::to_string(n), 3e-7);
    for (std::size_t i = 0; i < n / 2; ++i) {
        bound.add(
            static_cast<double>(w[i]) * w[i] + static_cast<double>(w[i + n / 2]) * w[i + n / 2],
            1.0);
    }
}

TEST_P(WindowShape, TriangleHalvesMirrorExactly) {
    std::size_t const n = GetParam();
    auto const w = window(generateTriangularWindowVector, n);
    for (std::size_t i = 0; i < n / 2; ++i) {
        EXPECT_EQ(w[i], static_cast<float>(2.0 * static_cast<double>(i) / static_cast<double>(n)));
        EXPECT_EQ(w[n / 2 + i], 1.0f - w[i]);
    }
}

INSTANTIATE_TEST_SUITE_P(Lengths, WindowShape, testing::Values(2, 160, 240, 320, 480, 640, 1024));
