#include "utils/vector_rms.h"

#include <gtest/gtest.h>

#include <cmath>

#include "support/error_bound.h"
#include "support/random.h"
#include "utils/sum_of_squares.h"

using MORVA::UTIL_FUNCTIONS::vectorRMS;
using test_support::ErrorBound;
using test_support::Random;

TEST(VectorRms, AgreesWithAPlainSum) {
    Random random(4);
    TRACE_SEED(random);
    ErrorBound rms("vectorRMS, relative", 1.5e-7);
    ErrorBound energy("sumOfSquares, relative", 1e-14);
    for (std::size_t n = 1; n < 300; ++n) {
        std::vector<float> const v = random.normal(n, random.uniform(1e-3f, 1e4f));
        double squares = 0.0;
        for (float const x : v) squares += static_cast<double>(x) * x;
        double const wanted = std::sqrt(squares / static_cast<double>(n)) + 1e-6;
        rms.add(vectorRMS(v), wanted, wanted);
        energy.add(MORVA::UTILS::sumOfSquares(v), squares, squares);
    }
}

TEST(VectorRms, NeverZeroAndNotANumberWhenEmpty) {
    EXPECT_EQ(vectorRMS(std::vector<float>(5, 0.0f)), 1e-6f);
    EXPECT_TRUE(std::isnan(vectorRMS({})));
}

// A square beyond float's range is infinite there, but not in the energies that sum in double.
TEST(VectorRms, RoundsEachSquareToFloat) {
    EXPECT_TRUE(std::isinf(vectorRMS({1e30f})));
    EXPECT_NEAR(MORVA::UTILS::sumOfSquares(std::vector<float>{1e30f}), 1e60, 1e53);
}
