// The energy gate and the mean active energy against models that keep every frame's energy.
#include <gtest/gtest.h>

#include <cmath>

#include "support/error_bound.h"
#include "support/random.h"
#include "utils/en_threshold.h"
#include "utils/exception.h"
#include "utils/mean_energy.h"

using MORVA::UTILS::EnThreshold;
using MORVA::UTILS::MeanEnergy;
using MORVA::UTILS::MORVA_Exception;
using test_support::ErrorBound;
using test_support::Random;
using Frame = std::vector<float>;

namespace {

double energyOf(Frame const& frame) {
    double sum = 0.0;
    for (float const x : frame) sum += static_cast<double>(x) * x;
    return sum / static_cast<double>(frame.size());
}

// The sum of the newest `count` values; what is missing counts as 0.
double sumOfNewest(std::vector<double> const& values, std::size_t count) {
    double sum = 0.0;
    for (std::size_t i = values.size() - std::min(count, values.size()); i < values.size(); ++i) {
        sum += values[i];
    }
    return sum;
}

double gateModel(std::vector<double> const& frames, std::vector<double> const& active,
                 std::size_t K, std::size_t M) {
    if (active.empty()) return 1.0;
    double const mean = sumOfNewest(frames, K) / static_cast<double>(K);
    double const reference =
        sumOfNewest(active, M) / static_cast<double>(std::min(M, active.size()));
    double const position = (mean - reference / 80.0) / (reference / 15.0 - reference / 80.0);
    double const ramp = std::min(std::max(position, 0.0), 1.0);
    return ramp * ramp;
}

// Loud and quiet passages, as speech has them.
Frame frameOf(Random& random, int step) {
    float const level = step / 25 % 2 == 0 ? 900.0f : 160.0f;
    std::size_t const length = random.between(20, 60);
    return random.normal(length, level * random.uniform(0.5f, 1.5f));
}

Frame constantFrame(double energy) {
    return Frame(16, static_cast<float>(std::sqrt(energy)));
}

}  // namespace

class EnergyStatistics : public testing::TestWithParam<std::uint64_t> {};

TEST_P(EnergyStatistics, GateFollowsTheModel) {
    Random random(GetParam());
    TRACE_SEED(random);
    std::size_t const K = random.between(2, 12);
    std::size_t const M = random.between(1, 60);
    float const threshold = 400.0f * 400.0f / static_cast<float>(K);
    EnThreshold gate(K, M, threshold);
    std::vector<double> frames;
    std::vector<double> active;
    ErrorBound bound("gate, seed " + std::to_string(GetParam()), 1e-6);
    int between = 0;
    for (int step = 0; step < 300; ++step) {
        Frame frame = frameOf(random, step);
        frames.push_back(energyOf(frame));
        if (frames.back() / static_cast<double>(K) >= static_cast<double>(threshold)) {
            active.push_back(frames.back());
        }
        float const gain = gate.setCurrentData(frame);
        between += gain > 0.0f && gain < 1.0f;
        bound.add(gain, gateModel(frames, active, K, M));
        float const first = frame.front();
        EXPECT_TRUE(gate.applyEnThreshold(frame));
        ASSERT_EQ(frame.front(), gain == 0.0f ? 0.0f : first * gain);
    }
    EXPECT_GT(between, 0) << "the ramp was never visited";
}

TEST_P(EnergyStatistics, MeanFollowsTheModel) {
    Random random(GetParam() + 500);
    TRACE_SEED(random);
    std::size_t const K = random.between(1, 12);
    std::size_t const M = random.between(1, 60);
    double const initial = 4e6;
    double const threshold = 100000.0;
    MeanEnergy mean(K, M, static_cast<float>(threshold), static_cast<float>(initial));
    std::vector<double> frames;
    std::vector<double> active{initial};
    ErrorBound bound("mean energy, relative, seed " + std::to_string(GetParam()), 1e-6);
    for (int step = 0; step < 300; ++step) {
        Frame const frame = frameOf(random, step);
        frames.push_back(energyOf(frame));
        if (sumOfNewest(frames, K) / static_cast<double>(K) >= threshold) {
            active.push_back(frames.back());
        }
        double const wanted =
            sumOfNewest(active, M) / static_cast<double>(std::min(M, active.size()));
        bound.add(mean.setCurrentData(frame.data(), frame.size()), wanted, wanted);
    }
    EXPECT_GT(active.size(), M);
}

INSTANTIATE_TEST_SUITE_P(Seeds, EnergyStatistics, testing::Range<std::uint64_t>(1, 13));

TEST(EnThreshold, OpenUntilAFrameIsActive) {
    EnThreshold gate(10, 100, 100.0f);
    Frame frame{10.0f, -10.0f};
    EXPECT_EQ(gate.setCurrentData(frame), 1.0f);
    gate.applyEnThreshold(frame);
    EXPECT_EQ(frame, (Frame{10.0f, -10.0f}));
}

// One active frame of energy 1 and a window of one frame: the gate then reads energies directly.
TEST(EnThreshold, RampBetweenTheTwoLimits) {
    double const low = 1.0 / 80.0;
    double const high = 1.0 / 15.0;
    for (auto const& [energy, wanted] : {std::pair(low / 2, 0.0), std::pair((low + high) / 2, 0.25),
                                         std::pair(high * 1.01, 1.0)}) {
        EnThreshold gate(1, 5, 0.5f);
        EXPECT_EQ(gate.setCurrentData(constantFrame(1.0)), 1.0f);
        EXPECT_NEAR(gate.setCurrentData(constantFrame(energy)), wanted, 1e-5);
    }
}

// The gate asks the single frame's share, the mean asks the whole window.
TEST(EnergyStatisticsOnce, ActivityIsJudgedDifferently) {
    Frame const loud = constantFrame(1000.0);
    Frame const quiet = constantFrame(1.0);
    MeanEnergy mean(10, 50, 90.0f, 0.0f);
    mean.setCurrentData(loud.data(), loud.size());                        // window mean 100: active
    float const after = mean.setCurrentData(quiet.data(), quiet.size());  // still 100.1: active
    EXPECT_NEAR(after, 1001.0 / 3.0, 0.01);

    EnThreshold gate(10, 50, 90.0f);
    gate.setCurrentData(loud);                    // share 100: active
    EXPECT_EQ(gate.setCurrentData(quiet), 1.0f);  // share 0.1: not; 100.1 >= 1000 / 15
    for (int i = 0; i < 9; ++i) gate.setCurrentData(quiet);
    EXPECT_EQ(gate.setCurrentData(quiet), 0.0f);  // 1 <= 1000 / 80
}

TEST(MeanEnergy, InitialEnergyCountsAsTheFirstActiveFrame) {
    MeanEnergy mean(1, 3, 1.0f, 100.0f);
    Frame const silence(8);
    EXPECT_EQ(mean.setCurrentData(silence.data(), silence.size()), 100.0f);
    Frame const frame = constantFrame(4.0);
    for (double const wanted : {104.0 / 2, 108.0 / 3, 4.0, 4.0}) {
        EXPECT_NEAR(mean.setCurrentData(frame.data(), frame.size()), wanted, 1e-5);
    }
}

TEST(EnergyStatisticsOnce, EmptyWindowsAreRefused) {
    EXPECT_THROW(EnThreshold(0, 1, 0.0f), MORVA_Exception);
    EXPECT_THROW(EnThreshold(1, 0, 0.0f), MORVA_Exception);
    EXPECT_THROW(MeanEnergy(0, 1, 0.0f, 0.0f), MORVA_Exception);
    EXPECT_THROW(MeanEnergy(1, 0, 0.0f, 0.0f), MORVA_Exception);
}
