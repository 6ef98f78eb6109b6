// The voice-activity model against a plain double-precision reference, and what it reads.
#include <gtest/gtest.h>

#include <array>

#include "models.h"
#include "reference.h"
#include "support/error_bound.h"

using namespace cleaner_test;
using test_support::ErrorBound;
using test_support::Random;
using test_support::randomVadWeight;
using test_support::VadShape;
using test_support::WeightWriter;

namespace {

constexpr char const* kReset = "CONTROL_MORVA_VAD_ENABLE_STATE_RESET_v0_0_1";

VadShape randomShape(Random& random) {
    VadShape shape;
    shape.sampleRate = std::array{8000, 16000, 32000}[random.between(0, 2)];
    shape.frameLength = std::array{240, 160, 320, 480, 256, 512}[random.between(0, 5)];
    int const ms = shape.frameLength * 1000 / shape.sampleRate;
    if (std::ranges::count(std::array{10, 15, 20, 30, 32, 40}, ms) == 0) shape = VadShape();
    shape.hidden = static_cast<int>(random.between(1, 24));
    shape.gates = random.chance(0.3) ? 1 : shape.hidden;
    shape.layers = static_cast<int>(random.between(1, 4));
    shape.seed = static_cast<unsigned>(random.seed());
    if (random.chance(0.5)) shape.calibration.clear();
    return shape;
}

// The state's width is the rows of the last rectified matrix, even where no layer reads it.
std::string stateOf(int hidden) {
    auto const rows = static_cast<std::size_t>(hidden);
    return WeightWriter()
        .add("WeightNonLinear", WeightWriter::Matrices{{std::vector<float>(rows), rows, 1}})
        .bytes();
}

// The scores of `frames` stay beside the reference's; returns how often its watchdog fired.
int compare(ModelEnvironment const& model, std::size_t frameMs, bool watchdog,
            std::vector<std::vector<float>> const& frames, ErrorBound& bound) {
    auto const cleaner = makeCleaner(7, model, frameMs);
    reference::VoiceActivity wanted(*model->first, watchdog);
    for (auto frame : frames) {
        double const score = wanted.score(reference::valuesOf(frame));
        EXPECT_TRUE(cleaner->cleanNoise(frame));
        EXPECT_EQ(frame.size(), 1U);
        bound.add(frame[0], score);
    }
    return wanted.resets;
}

}  // namespace

TEST(VoiceActivity, MatchesTheReference) {
    ErrorBound bound("voice score", 2e-5);
    for (std::uint64_t seed = 1; seed <= 40; ++seed) {
        Random random(seed);
        TRACE_SEED(random);
        auto const shape = randomShape(random);
        auto const front = shape.layers == 1 ? stateOf(shape.hidden) : std::string();
        auto const frameMs = 10 * random.between(1, 4);
        compare(
            modelFrom(front + randomVadWeight(shape)), frameMs, false,
            randomFrames(random, 40, static_cast<std::size_t>(shape.sampleRate) * frameMs / 1000),
            bound);
    }
}

// A network that is steadily unsure is cleared when the reference is.
TEST(VoiceActivity, WatchdogClearsTheState) {
    ErrorBound bound("voice score under the watchdog", 2e-5);
    for (int const source : {0, 1, 2}) {
        VadShape const shape{.calibration = {-8.0F, 0.0F, 8.0F}, .seed = 2};
        Random random(2);
        std::vector<std::vector<float>> frames(700);
        for (auto& frame : frames) frame = random.normal(80, 500.0F);
        // Both keys of the environment, and the weight's own entry.
        auto const on = source == 0 ? WeightWriter().add(kReset, "t").bytes() : std::string();
        auto const model = modelFrom(randomVadWeight(shape) + on);
        if (source == 1) setText(model, kReset + std::string("CONTROL_").size(), "TRUE");
        if (source == 2) setText(model, kReset, "TRUE");
        EXPECT_GT(compare(model, 10, true, frames, bound), 0);
    }
}
