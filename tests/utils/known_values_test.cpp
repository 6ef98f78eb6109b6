// Values known by hand, and the edges, of the small parts that the comparison of whole cleaners
// with a reference exercises otherwise: windows, statistics, energies.
#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "kernels/vector_math.h"
#include "kernels/windows.h"
#include "statistics/background_speaker_fix.h"
#include "statistics/en_threshold.h"
#include "statistics/mean_energy.h"
#include "statistics/noise.h"
#include "utils/exception.h"

using namespace MORVA::UTIL_FUNCTIONS;
using namespace MORVA::UTILS;
using Values = std::vector<float>;

namespace {

Values window(void (*generate)(std::size_t, float*, std::size_t), std::size_t n) {
    Values values(n + 1, -7.0f);
    generate(n, values.data(), n);
    EXPECT_EQ(values.back(), -7.0f) << "written past the end";
    values.pop_back();
    return values;
}

void expectClose(Values const& got, std::vector<double> const& wanted) {
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
    EXPECT_TRUE(std::isnan(window(generateHammingWindowVector, 1).front()));
}

// A square beyond float's range is infinite, but not in the energies that sum in double.
TEST(Energies, Edges) {
    EXPECT_EQ(vectorRMS(Values(5, 0.0f)), 1e-6f);
    EXPECT_TRUE(std::isnan(vectorRMS({})));
    EXPECT_TRUE(std::isinf(vectorRMS({1e30f})));
    EXPECT_NEAR(sumOfSquares(Values{1e30f}), 1e60, 1e53);
}

// Taking the oldest frame out of the mean leaves it in the history, so a following exchange takes
// it out once more.
TEST(Noise, TheOldestFrameCanBeTakenOutTwice) {
    Noise noise(2, 1);
    float const silence = 0.0f;
    noise.addFrameNoise(&silence, 1);
    noise.addNullFrameNoise();
    for (float const value : {4.0f, 8.0f}) {
        noise.addFrameNoiseRemoveBack(&value, 1);
        noise.calculateNoise();
    }
    EXPECT_EQ(noise.mean.front(), 6.0f);
    noise.removeBackFrameInfoFromMean();
    EXPECT_EQ(noise.mean.front(), 4.0f);
    noise.addNullFrameNoiseRemoveBack();
    noise.calculateNoise();
    EXPECT_EQ(noise.mean.front(), 2.0f);
    EXPECT_EQ(noise.frames.size(), 2u);
}

TEST(Statistics, RefuseWindowsThatDivideByZero) {
    EXPECT_THROW(EnThreshold(0, 1, 0.0f), MORVA_Exception);
    EXPECT_THROW(EnThreshold(1, 0, 0.0f), MORVA_Exception);
    EXPECT_THROW(MeanEnergy(0, 1, 0.0f, 0.0f), MORVA_Exception);
    EXPECT_THROW(MeanEnergy(1, 0, 0.0f, 0.0f), MORVA_Exception);
    EXPECT_THROW(Noise(0, 4), MORVA_Exception);
    EXPECT_THROW(BackgroundSpeakerFix(10, 15, 40, 2, 2.0f, true, 30, Values(10)), MORVA_Exception);
}
