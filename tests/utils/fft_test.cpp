#include "kernels/fft.h"

#include <gtest/gtest.h>

#include "kernels/math_setup.h"
#include "support/aligned_copy.h"
#include "support/error_bound.h"
#include "support/random.h"

using MORVA::UTILS::FFT;
using test_support::OffsetBuffer;
using test_support::Random;
using test_support::relativeError;
using Spectrum = std::vector<std::complex<float>>;

class Transform : public testing::TestWithParam<std::size_t> {};

// The same bits wherever the operands lie, which the promise of reproducible output rests on.
// (That they are the right ones is seen where whole cleaners are compared with a reference.)
TEST_P(Transform, ComesBackAndDoesNotDependOnAlignment) {
    MORVA::UTILS::configureMathLibrary(1);
    std::size_t const n = GetParam();
    std::vector<float> const x = Random(n).normal(n, 5000.0f);
    auto const fft = FFT::create(n);
    Spectrum wanted(3);                    // wrong on purpose: it is resized
    std::vector<float> wantedBack(n + 5);  // likewise
    ASSERT_TRUE(fft->computeForward(x, wanted));
    ASSERT_EQ(wanted.size(), n / 2 + 1);
    ASSERT_TRUE(fft->computeBackward(wanted, wantedBack));
    EXPECT_LT(relativeError(wantedBack, x), 1e-6);
    for (std::size_t offset = 0; offset < 16; ++offset) {
        OffsetBuffer in(x, offset);
        OffsetBuffer out(2 * wanted.size(), offset * 7 % 16);
        auto* const bins = reinterpret_cast<std::complex<float>*>(out.data());
        ASSERT_TRUE(fft->computeForward(in.data(), n, bins, wanted.size()));
        ASSERT_EQ(Spectrum(bins, bins + wanted.size()), wanted) << "offset " << offset;
        ASSERT_TRUE(fft->computeBackward(bins, wanted.size(), in.data(), n));
        ASSERT_EQ(in.values(n), wantedBack) << "offset " << offset;
    }
}

INSTANTIATE_TEST_SUITE_P(Lengths, Transform,
                         testing::Values(1, 2, 3, 16, 160, 240, 256, 320, 441, 480, 512, 640, 960,
                                         1024));

TEST(FFT, ReportsALengthThatHasNoTransform) {
    Spectrum spectrum;
    EXPECT_FALSE(FFT::create(0)->computeForward({}, spectrum));
}
