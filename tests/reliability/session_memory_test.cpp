// What is remembered, and for how long: a sound's level for three seconds.
#include "morva-sdk/engine.h"
#include "noise_canceller/noise_cleaner_generations.h"
#include "noise_canceller/noise_cleaner_v0_0_6.h"
#include "noise_canceller/spectral_cleaner.h"
#include "weights/model_environment.h"

using namespace sdk_test;

// Features of two streams that hear one sound after frames of different loudness.
TEST(SessionMemory, LoudnessIsForgottenAfterThreeSeconds) {
    using namespace MORVA;
    auto const bytes = test_support::randomNcWeight({.sampleRate = 16000, .frameLength = 320});
    auto const environment = CONTAINERS::makeModelEnvironment();
    environment->first = std::make_shared<WEIGHTS::Weight>();
    ASSERT_TRUE(environment->first->read(bytes.data(), bytes.size()));
    NOISE_CANCELLER::NoiseCleaner_v0_0_6::Params const params(*environment, 10);

    constexpr std::size_t kHopsPerSecond = 100;
    std::size_t const memory = 3 * kHopsPerSecond + params.previewFrames - 1;  // hops
    test_support::RandomValues random(3);
    auto const sound = random.vector(320, -3000.0F, 3000.0F);
    auto const featuresAfter = [&](float gain, std::size_t hops) {
        NOISE_CANCELLER::SpectralCleaner cleaner(params, params, environment->second,
                                                 NOISE_CANCELLER::generation(6),
                                                 NOISE_CANCELLER::Synthesis::FromKept);
        std::vector<float> x;
        auto other = sound;
        for (float& sample : other) sample *= gain;
        for (std::size_t i = 0; i < kHopsPerSecond; ++i) cleaner.analyse(other.data(), x);
        for (std::size_t i = 0; i < hops; ++i) cleaner.analyse(sound.data(), x);
        return x;
    };
    auto const same =
        ::testing::Pointwise(::testing::FloatNear(1e-4F), featuresAfter(1.0F, memory));
    EXPECT_THAT(featuresAfter(5.0F, memory), same);
    EXPECT_THAT(featuresAfter(5.0F, memory - 1), ::testing::Not(same));
}
