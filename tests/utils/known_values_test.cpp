// Values known by hand, and the edges, of the small parts that the comparison of whole cleaners
// with a reference exercises otherwise: windows, statistics, energies.
#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "utils/background_speaker_fix.h"
#include "utils/en_threshold.h"
#include "utils/exception.h"
#include "utils/mean_energy.h"
#include "utils/noise.h"
#include "utils/sum_of_squares.h"
#include "utils/vector_rms.h"
#include "utils/windows.h"

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

// One active frame of energy 1 and a window of one frame: the gate then reads energies directly.
TEST(EnThreshold, RampBetweenTheTwoLimits) {
    double const low = 1.0 / 80.0;
    double const high = 1.0 / 15.0;
    for (auto const& [energy, wanted] : {std::pair(low / 2, 0.0), std::pair((low + high) / 2, 0.25),
                                         std::pair(high * 1.01, 1.0)}) {
        EnThreshold gate(1, 5, 0.5f);
        EXPECT_EQ(gate.setCurrentData(Values(16, 1.0f)), 1.0f);
        Values const frame(16, static_cast<float>(std::sqrt(energy)));
        EXPECT_NEAR(gate.setCurrentData(frame), wanted, 1e-5);
    }
}

TEST(MeanEnergy, InitialEnergyCountsAsTheFirstActiveFrame) {
    MeanEnergy mean(1, 3, 1.0f, 100.0f);
    Values const silence(8);
    EXPECT_EQ(mean.setCurrentData(silence.data(), silence.size()), 100.0f);
    Values const frame(8, 2.0f);
    for (double const wanted : {104.0 / 2, 108.0 / 3, 4.0, 4.0}) {
        EXPECT_NEAR(mean.setCurrentData(frame.data(), frame.size()), wanted, 1e-5);
    }
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

// One frame of history: reference 1 and energy 9 are the level -10 dB.
TEST(BackgroundSpeakerFix, HalfWayBetweenTheLevelsCutsThirtyDecibels) {
    BackgroundSpeakerFix stage(-12.5f, -7.5f, 1, 2, 2.0f, true, 30, {1.0f});
    Values frame{3.0f};
    stage.frame_compute(frame);
    EXPECT_NEAR(frame[0], 3.0e-3, 1e-6);
}

TEST(Statistics, RefuseWindowsThatDivideByZero) {
    EXPECT_THROW(EnThreshold(0, 1, 0.0f), MORVA_Exception);
    EXPECT_THROW(EnThreshold(1, 0, 0.0f), MORVA_Exception);
    EXPECT_THROW(MeanEnergy(0, 1, 0.0f, 0.0f), MORVA_Exception);
    EXPECT_THROW(MeanEnergy(1, 0, 0.0f, 0.0f), MORVA_Exception);
    EXPECT_THROW(Noise(0, 4), MORVA_Exception);
    EXPECT_THROW(BackgroundSpeakerFix(10, 15, 40, 2, 2.0f, true, 30, Values(10)), MORVA_Exception);
}
