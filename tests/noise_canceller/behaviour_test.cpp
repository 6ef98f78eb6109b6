// What the cleaners promise in a few numbers: reconstruction, known values of the small kernels,
// the noise level, the switch of the background-speaker stage.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <numbers>

#include "noise_canceller/mask_shaper.h"
#include "noise_canceller/noise_cleaner_generations.h"
#include "noise_canceller/noise_cleaner_v0_0_6.h"
#include "noise_canceller/noise_db_cleaner_v0_0_1.h"
#include "noise_canceller/spectral_kernels.h"
#include "support/captured_output.h"
#include "support/error_bound.h"
#include "support/random.h"
#include "support/weight_writer.h"

using namespace MORVA::NOISE_CANCELLER;
using test_support::CapturedOutput;
using test_support::ErrorBound;
using test_support::identityNcWeight;
using test_support::NcShape;
using test_support::Random;
using test_support::randomNcWeight;
using test_support::WeightWriter;

namespace {

ModelEnvironment modelFrom(std::string const& bytes) {
    auto const model = MORVA::CONTAINERS::makeModelEnvironment();
    model->first = std::make_shared<MORVA::WEIGHTS::Weight>();
    model->first->read(bytes.data(), bytes.size());
    return model;
}

NcShape shapeOf(int generation, int modelMs = 20) {
    NcShape shape;
    shape.version = "0.0." + std::to_string(generation);
    shape.frameLength = 16 * modelMs;
    return shape;
}

std::vector<float> cleaned(NoiseCleaner& cleaner, std::vector<float> const& sound,
                           std::size_t frame) {
    std::vector<float> all;
    for (std::size_t at = 0; at + frame <= sound.size(); at += frame) {
        std::vector<float> block(sound.begin() + static_cast<long>(at),
                                 sound.begin() + static_cast<long>(at + frame));
        cleaner.cleanNoise(block);
        all.insert(all.end(), block.begin(), block.end());
    }
    return all;
}

// One frame's mask of v0.0.6 after shaping, from compressed values of 1 in no compression.
class Shaping {
public:
    explicit Shaping(std::string const& records)
        : model_(modelFrom(WeightWriter().add("FiltrBegin", 10).add("FiltrEnd", 12).bytes() +
                           records + weight())),
          params_(*model_, 10),
          shaper_(params_) {}
    float at(float m, std::size_t bin = 10) { return shaper_.shape({m, m})[bin]; }

private:
    static std::string weight() {
        NcShape shape;
        shape.filtrBegin = 10;
        shape.filtrEnd = 12;
        shape.compressRate = 0;
        return randomNcWeight(shape);
    }
    ModelEnvironment model_;
    NoiseCleaner_v0_0_6::Params params_;
    MaskShaper shaper_;
};

std::string control(char const* name, float value) {
    return WeightWriter().add(std::string("CONTROL_MORVA_") + name + "_v0_0_6", value).bytes();
}
std::string on(char const* name) {
    return WeightWriter().add(std::string("CONTROL_MORVA_") + name + "_v0_0_6", "t").bytes();
}

}  // namespace

template <class Cleaner>
void expectIdentity(int generation) {
    ErrorBound bound("identity of generation " + std::to_string(generation) + ", 16-bit units",
                     0.05);
    for (int modelMs : {20, 30, 32}) {
        Cleaner cleaner(modelFrom(identityNcWeight(shapeOf(generation, modelMs))), 10);
        Random random(static_cast<std::uint64_t>(modelMs));
        auto const sound = random.normal(8000, 8000.0F);
        auto const out = cleaned(cleaner, sound, 160);
        std::size_t const delay = pipelineDelayMs(static_cast<std::size_t>(modelMs), 10) * 16;
        for (std::size_t i = 0; i < out.size(); ++i)
            bound.add(out[i], i < delay ? 0.0 : sound[i - delay]);
    }
}

TEST(Identity, ReconstructsTheDelayedInput) {
    expectIdentity<NoiseCleaner_v0_0_1>(1);
    expectIdentity<NoiseCleaner_v0_0_2>(2);
    expectIdentity<NoiseCleaner_v0_0_3>(3);
    expectIdentity<NoiseCleaner_v0_0_4>(4);
    expectIdentity<NoiseCleaner_v0_0_5>(5);
    expectIdentity<NoiseCleaner_v0_0_6>(6);
}

// Sessions of one model share the weight and nothing that changes.
TEST(State, BelongsToTheCleaner) {
    for (int generation = 1; generation <= 6; ++generation) {
        auto const model = modelFrom(randomNcWeight(shapeOf(generation)));
        auto const make = [&]() -> std::unique_ptr<NoiseCleaner> {
            switch (generation) {
                case 1:
                    return std::make_unique<NoiseCleaner_v0_0_1>(model, 10);
                case 2:
                    return std::make_unique<NoiseCleaner_v0_0_2>(model, 10);
                case 3:
                    return std::make_unique<NoiseCleaner_v0_0_3>(model, 10);
                case 4:
                    return std::make_unique<NoiseCleaner_v0_0_4>(model, 10);
                case 5:
                    return std::make_unique<NoiseCleaner_v0_0_5>(model, 10);
                default:
                    return std::make_unique<NoiseCleaner_v0_0_6>(model, 10);
            }
        };
        Random random(1);
        auto const sound = random.normal(4800, 3000.0F);
        auto const other = random.normal(4800, 20.0F);
        auto const alone = cleaned(*make(), sound, 160);
        auto const a = make();
        auto const b = make();
        std::vector<float> mixed;
        for (std::size_t at = 0; at < sound.size(); at += 160) {
            std::vector<float> frame(sound.begin() + static_cast<long>(at),
                                     sound.begin() + static_cast<long>(at + 160));
            std::vector<float> disturbance(other.begin() + static_cast<long>(at),
                                           other.begin() + static_cast<long>(at + 160));
            b->cleanNoise(disturbance);
            a->cleanNoise(frame);
            mixed.insert(mixed.end(), frame.begin(), frame.end());
        }
        EXPECT_EQ(mixed, alone) << generation;
        EXPECT_EQ(a->getVersion(), "0.0." + std::to_string(generation));
        EXPECT_TRUE(a->resetSession());  // changes nothing
        EXPECT_NE(cleaned(*a, sound, 160), alone) << generation;
    }
}

TEST(MaskShaping, KnownValues) {
    Shaping plain("");
    EXPECT_FLOAT_EQ(plain.at(0.5F), 0.25F);
    EXPECT_EQ(plain.at(1.0F), 1.0F);
    EXPECT_EQ(plain.at(1.0F, 9), 0.0F);
    EXPECT_EQ(plain.at(1.0F, 12), 0.0F);

    Shaping smooth(control("SMOOT_COEF", 0.3F));
    for (float const wanted : {0.3F, 0.51F, 0.657F}) EXPECT_FLOAT_EQ(smooth.at(1.0F), wanted);

    Shaping threshold(on("ENABLE_RM_THRESHOLD"));
    EXPECT_FLOAT_EQ(threshold.at(0.5F), 0.125F);
    EXPECT_FLOAT_EQ(threshold.at(std::sqrt(0.6F)), 0.6F);
    // The next frame is smoothed against what was applied.
    Shaping both(on("ENABLE_RM_THRESHOLD") + control("SMOOT_COEF", 0.5F));
    EXPECT_FLOAT_EQ(both.at(std::sqrt(0.5F)), 0.125F);
    EXPECT_FLOAT_EQ(both.at(1.0F), 0.5625F);

    Shaping soft(on("SMOOT_RM_MODIFY"));
    EXPECT_FLOAT_EQ(soft.at(0.05F), 0.025F + 0.00125F);
    EXPECT_NEAR(soft.at(0.9F), 0.81F, 1e-4F);
    EXPECT_NEAR(soft.at(0.001F), 0.001F * 0.7270F, 1e-5F);
}

TEST(Kernels, PeakLimiterLooksAtPositivePeaksOnly) {
    auto const model = modelFrom(randomNcWeight({}));
    NoiseCleaner_v0_0_6::Params const params(*model, 10);
    std::vector<float> frame = {-30000.0F, 20000.0F};
    NOISE_CLEANER_FUNCTIONS::applyClipFix(frame, params);
    EXPECT_EQ(frame, (std::vector{-30000.0F, 20000.0F}));
    frame = {30000.0F, -10.0F};
    NOISE_CLEANER_FUNCTIONS::applyClipFix(frame, params);
    EXPECT_FLOAT_EQ(frame[0], 25000.0F);
    EXPECT_FLOAT_EQ(frame[1], -8.3333333F);
}

TEST(NoiseLevel, OfNothingRemovedIsBelowMinus50) {
    float worst = -100.0F;
    Random random(5);
    for (int hz : {8000, 16000, 32000}) {
        for (int modelMs : {20, 30, 32}) {
            for (float amplitude : {0.0F, 1.0F, 3000.0F, 32767.0F}) {
                auto shape = shapeOf(5);
                shape.sampleRate = hz;
                shape.frameLength = hz * modelMs / 1000;
                NoiseDBCleaner_v0_0_1 cleaner(modelFrom(identityNcWeight(shape)), 10);
                for (int n = 0; n < 60; ++n) {
                    // A tone, then full-scale noise, then a square.
                    auto frame = random.normal(static_cast<std::size_t>(hz) / 100);
                    for (std::size_t i = 0; i < frame.size(); ++i) {
                        if (n < 20) frame[i] = std::sin(0.3F * static_cast<float>(i));
                        frame[i] = n < 40 ? std::clamp(frame[i], -1.0F, 1.0F)
                                          : std::copysign(1.0F, frame[i]);
                        frame[i] *= amplitude;
                    }
                    ASSERT_TRUE(cleaner.cleanNoise(frame));
                    worst = std::max(worst, frame.at(0));
                }
            }
        }
    }
    std::printf("[    bound ] noise level of an identity mask: %.1f dB (limit -50)\n",
                static_cast<double>(worst));
    EXPECT_LT(worst, -50.0F);
    EXPECT_GE(worst, -60.0F);
}

// A mask of 0 everywhere removes everything: the level follows the input with 0.9 per hop.
TEST(NoiseLevel, RisesWithItsTimeConstant) {
    NcShape shape = shapeOf(5);
    auto const k = static_cast<std::size_t>(shape.compressedBands());
    auto const h = static_cast<std::size_t>(shape.hidden);
    auto const weight = WeightWriter()
                            .add("BaesNonLinear",
                                 WeightWriter::Vectors{std::vector<float>(h), std::vector<float>(h),
                                                       std::vector<float>(k, -200.0F)})
                            .bytes() +
                        randomNcWeight(shape);
    for (std::size_t frameMs : {10U, 20U, 40U}) {
        NoiseDBCleaner_v0_0_1 cleaner(modelFrom(weight), frameMs);
        double power = 0.0;
        for (int n = 0; n < 30; ++n) {
            std::vector<float> frame(16 * frameMs, 1000.0F);
            cleaner.cleanNoise(frame);
            // The first hop stands for the silence before the start.
            for (std::size_t hop = 0; hop < frameMs / 10; ++hop) {
                bool const first = n == 0 && hop == 0;
                power = 0.9 * power + (first ? 0.0 : 0.1 * 1e6);
            }
            ASSERT_NEAR(frame.at(0), 10.0 * std::log10(power + 1e-6), 1e-2) << n;
        }
    }
}

// 30 ms model frames hop by 15 ms: every third of the 10 ms frames completes none.
TEST(NoiseLevel, IsUnchangedByAFrameWithoutHop) {
    NoiseDBCleaner_v0_0_1 cleaner(modelFrom(randomNcWeight(shapeOf(5, 30))), 10);
    Random random(3);
    std::vector<float> levels;
    for (int n = 0; n < 30; ++n) {
        auto frame = random.normal(160, 5000.0F);
        cleaner.cleanNoise(frame);
        levels.push_back(frame.at(0));
    }
    EXPECT_EQ(levels[0], -60.0F);
    for (std::size_t n = 3; n < levels.size(); ++n)
        EXPECT_EQ(levels[n] == levels[n - 1], n % 3 == 0) << n;
}

TEST(BackgroundSpeaker, SwitchIsHeardAndSaid) {
    auto const model = modelFrom(identityNcWeight({}));
    NoiseCleaner_v0_0_6 cleaner(model, 10);
    NoiseCleaner_v0_0_6 plain(model, 10);
    Random random(4);
    auto const main = random.normal(16000, 6000.0F);
    auto const background = random.normal(8000, 60.0F);
    auto const switched = [&](bool setting) {
        CapturedOutput out(1);
        EXPECT_TRUE(cleaner.background_speaker_fix_switch(setting));
        return out.text();
    };
    EXPECT_EQ(switched(true), "Parameter env_enable_background_speaker_fix set to: 1\n");
    auto const loud = cleaned(cleaner, main, 160);
    auto const untouched = cleaned(plain, main, 160);
    EXPECT_TRUE(std::equal(loud.begin() + 3200, loud.end(), untouched.begin() + 3200));
    auto const quiet = cleaned(cleaner, background, 160);
    EXPECT_LT(std::abs(quiet.back()), 1e-3F);
    EXPECT_EQ(switched(false), "Parameter env_enable_background_speaker_fix set to: 0\n");
    cleaned(plain, background, 160);
    cleaned(cleaner, background, 320 / 2);
    cleaned(plain, background, 160);
    EXPECT_EQ(cleaned(cleaner, background, 160), cleaned(plain, background, 160));
}
