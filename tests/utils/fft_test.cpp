#include "utils/fft.h"

#include <gtest/gtest.h>

#include <cmath>
#include <numbers>

#include "support/aligned_copy.h"
#include "support/error_bound.h"
#include "support/random.h"
#include "utils/math_setup.h"

using MORVA::UTILS::FFT;
using test_support::ErrorBound;
using test_support::OffsetBuffer;
using test_support::Random;

namespace {

using Spectrum = std::vector<std::complex<float>>;

// The defining sum in double; the phase index is reduced first, so that it stays exact.
std::complex<double> referenceBin(std::vector<float> const& x, std::size_t k) {
    std::complex<double> sum = 0.0;
    double const step = -2.0 * std::numbers::pi / static_cast<double>(x.size());
    for (std::size_t j = 0; j < x.size(); ++j) {
        sum += static_cast<double>(x[j]) *
               std::polar(1.0, step * static_cast<double>(j * k % x.size()));
    }
    return sum;
}

double norm(std::vector<float> const& x) {
    double sum = 0.0;
    for (float const v : x) sum += static_cast<double>(v) * v;
    return std::sqrt(sum);
}

}  // namespace

class Transform : public testing::TestWithParam<std::size_t> {
protected:
    void SetUp() override { MORVA::UTILS::configureMathLibrary(1); }
};

TEST_P(Transform, AgreesWithTheDefiningSum) {
    std::size_t const n = GetParam();
    Random random(n);
    std::vector<float> const x = random.normal(n, 5000.0f);
    auto const fft = FFT::create(n);
    Spectrum spectrum(3);  // wrong on purpose: it is resized
    ASSERT_TRUE(fft->computeForward(x, spectrum));
    ASSERT_EQ(spectrum.size(), n / 2 + 1);
    {
        ErrorBound bound("forward, relative to the norm, n = " + std::to_string(n), 1e-6);
        for (std::size_t k = 0; k < spectrum.size(); ++k) {
            std::complex<double> const wanted = referenceBin(x, k);
            bound.add(spectrum[k].real(), wanted.real(), norm(x));
            bound.add(spectrum[k].imag(), wanted.imag(), norm(x));
        }
    }
    EXPECT_EQ(spectrum.front().imag(), 0.0f);
    if (n % 2 == 0) {
        EXPECT_EQ(spectrum.back().imag(), 0.0f);
    }

    std::vector<float> back(n + 5);
    ASSERT_TRUE(fft->computeBackward(spectrum, back));
    ASSERT_EQ(back.size(), n);
    ErrorBound bound("backward of forward, n = " + std::to_string(n), 1e-6);
    for (std::size_t i = 0; i < n; ++i) bound.add(back[i], x[i], 5000.0);
}

// The same bits wherever the operands lie, which the promise of reproducible output rests on.
TEST_P(Transform, DoesNotDependOnAlignment) {
    std::size_t const n = GetParam();
    Random random(n + 1);
    std::vector<float> const x = random.normal(n);
    auto const fft = FFT::create(n);
    Spectrum wanted;
    std::vector<float> wantedBack;
    ASSERT_TRUE(fft->computeForward(x, wanted));
    ASSERT_TRUE(fft->computeBackward(wanted, wantedBack));
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

TEST(FFT, OthersWorkOnAfterOneIsDestroyed) {
    auto const kept = FFT::create(320);
    Spectrum before;
    Spectrum after;
    Random random(9);
    std::vector<float> const x = random.normal(320);
    ASSERT_TRUE(kept->computeForward(x, before));
    FFT::create(320).reset();
    ASSERT_TRUE(kept->computeForward(x, after));
    EXPECT_EQ(before, after);
}
