#include "utils/background_speaker_fix.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "support/error_bound.h"
#include "support/random.h"
#include "utils/exception.h"

using MORVA::UTILS::BackgroundSpeakerFix;
using MORVA::UTILS::MORVA_Exception;
using test_support::ErrorBound;
using test_support::Random;
using Frame = std::vector<float>;

namespace {

struct Settings {
    float cutStart = 10.0f;
    float cutEnd = 15.0f;
    unsigned long runFrames = 40;
    unsigned long runMinimum = 2;
    float utterance = 2.0f;
    bool variable = true;
    unsigned long frameMs = 30;
    Frame window = Frame(100, 0.5f);

    BackgroundSpeakerFix build() const {
        return {cutStart, cutEnd, runFrames, runMinimum, utterance, variable, frameMs, window};
    }
};

// Keeps every energy and computes in double; returns the factor for a frame.
class Model {
public:
    explicit Model(Settings const& settings)
        : s_(settings), energies_(settings.runFrames, 1.0), length(settings.runFrames) {
        for (float const w : s_.window) windowEnergy_ += static_cast<double>(w) * w;
    }

    double factor(Frame const& frame) {
        double energy = 0.0;
        for (float const x : frame) energy += static_cast<double>(x) * x;
        energies_.push_back(energy / windowEnergy_);
        double mean = 0.0;
        for (std::size_t i = 1; i <= length; ++i) mean += energies_[energies_.size() - i];
        mean /= static_cast<double>(length);
        level = 10.0 * std::log10(reference_ / (1.0 + mean));
        double cut = 0.0;
        if (level >= s_.cutStart) {
            cut = (level - s_.cutStart) * -60.0 / (s_.cutEnd - s_.cutStart);
        } else {
            double const keep = 1.0 - static_cast<double>(s_.frameMs) / (2000.0 * s_.utterance);
            reference_ = keep * reference_ + (1.0 - keep) * mean;
        }
        if (s_.variable && level > s_.cutEnd && length > s_.runMinimum) {
            --length;
        } else if (s_.variable && level <= s_.cutEnd && length < s_.runFrames) {
            ++length;
        }
        return std::pow(10.0, cut / 10.0);
    }

private:
    Settings s_;
    std::vector<double> energies_;
    double windowEnergy_ = 0.0;
    double reference_ = 1.0;

public:
    std::size_t length;
    double level = 0.0;
};

}  // namespace

class BackgroundSpeaker : public testing::TestWithParam<std::uint64_t> {};

// Loud passages raise the reference, the quiet ones between are cut.
TEST_P(BackgroundSpeaker, FollowsTheModel) {
    Random random(GetParam());
    TRACE_SEED(random);
    Settings settings;
    settings.cutStart = random.uniform(5.0f, 12.0f);
    settings.cutEnd = settings.cutStart + random.uniform(2.0f, 8.0f);
    settings.runFrames = random.between(1, 40);
    settings.runMinimum = random.between(1, 4);
    settings.utterance = random.uniform(0.3f, 3.0f);
    settings.variable = random.chance(0.7);
    settings.frameMs = random.chance(0.5) ? 20 : 32;
    settings.window = random.normal(random.between(10, 200), 0.7f);
    BackgroundSpeakerFix stage = settings.build();
    Model model(settings);
    ErrorBound bound("background speaker gain in dB, seed " + std::to_string(GetParam()), 1e-2);
    int cut = 0;
    std::size_t shortest = settings.runFrames;
    for (int step = 0; step < 400; ++step) {
        float const level = step / 100 % 2 == 0 ? 8000.0f : 300.0f;
        Frame frame = random.normal(64, level * random.uniform(0.8f, 1.2f));
        Frame const before = frame;
        double const wanted = model.factor(frame);
        ASSERT_TRUE(stage.frame_compute(frame));
        if (std::abs(model.level - settings.cutStart) < 1e-3) continue;  // either side is right
        cut += wanted < 1.0;
        shortest = std::min(shortest, model.length);
        double const got = std::abs(static_cast<double>(frame[0]) / before[0]);
        if (wanted < 1e-30) {
            ASSERT_LT(got, 1e-29);
        } else {
            bound.add(10.0 * std::log10(got), 10.0 * std::log10(wanted));
        }
    }
    EXPECT_GT(cut, 0);
    EXPECT_LT(cut, 400);
    if (settings.variable && settings.runFrames > settings.runMinimum) {
        EXPECT_LT(shortest, settings.runFrames) << "the averaging length never moved";
    }
}

INSTANTIATE_TEST_SUITE_P(Seeds, BackgroundSpeaker, testing::Range<std::uint64_t>(1, 17));

// One frame of history: the level of each frame is then exactly known.
TEST(BackgroundSpeakerFix, HalfWayBetweenTheLevelsCutsThirtyDecibels) {
    Settings settings;
    settings.runFrames = 1;
    settings.window = {1.0f};
    settings.cutStart = -12.5f;
    settings.cutEnd = -7.5f;
    BackgroundSpeakerFix stage = settings.build();
    // reference 1, level -10: energy 9
    Frame frame{3.0f};
    stage.frame_compute(frame);
    EXPECT_NEAR(frame[0], 3.0e-3, 1e-6);
}

TEST(BackgroundSpeakerFix, SilenceStaysSilent) {
    BackgroundSpeakerFix stage = Settings{}.build();
    Frame loud(64, 9000.0f);
    for (int i = 0; i < 50; ++i) stage.frame_compute(loud);
    for (int i = 0; i < 100; ++i) {
        Frame silence(64);
        stage.frame_compute(silence);
        ASSERT_EQ(silence, Frame(64));
    }
}

TEST(BackgroundSpeakerFix, RefusesSettingsThatDivideByZero) {
    float const nan = std::numeric_limits<float>::quiet_NaN();
    float const infinity = std::numeric_limits<float>::infinity();
    EXPECT_NO_THROW(Settings{}.build());
    EXPECT_NO_THROW((Settings{.runFrames = 100000}.build()));
    EXPECT_THROW((Settings{.runFrames = 0}.build()), MORVA_Exception);
    EXPECT_THROW((Settings{.runFrames = 100001}.build()), MORVA_Exception);
    EXPECT_THROW((Settings{.cutStart = 15.0f}.build()), MORVA_Exception);
    EXPECT_THROW((Settings{.cutStart = nan}.build()), MORVA_Exception);
    for (float const utterance : {0.0f, -1.0f, nan, infinity}) {
        EXPECT_THROW((Settings{.utterance = utterance}.build()), MORVA_Exception) << utterance;
    }
    EXPECT_THROW((Settings{.window = Frame(10)}.build()), MORVA_Exception);
    EXPECT_THROW((Settings{.window = {}}.build()), MORVA_Exception);
}
