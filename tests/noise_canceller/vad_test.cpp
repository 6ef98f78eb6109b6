// The voice-activity model against a plain double-precision reference, and what it reads.
#include <gtest/gtest.h>

#include <array>

#include "models.h"
#include "noise_canceller/vad_cleaner_v0_0_1.h"
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
    std::array const known{10, 15, 20, 30, 32, 40};
    if (std::count(known.begin(), known.end(), ms) == 0) shape = VadShape();
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
    int resets = 0;
    for (unsigned seed = 1; seed <= 6; ++seed) {
        VadShape const shape{.calibration = {-8.0F, 0.0F, 8.0F}, .seed = seed};
        Random random(seed);
        std::vector<std::vector<float>> frames(700);
        for (auto& frame : frames) frame = random.normal(80, 500.0F);
        auto const on = WeightWriter().add(kReset, "t").bytes();
        resets += compare(modelFrom(randomVadWeight(shape) + on), 10, true, frames, bound);
    }
    EXPECT_GT(resets, 0);
}

// Points that coincide or are missing leave the network's answer, here always 7, as it is.
TEST(VoiceActivity, CalibrationNeedsThreePoints) {
    using Points = std::pair<std::vector<float>, std::vector<float>>;
    for (auto const& [range, middle] :
         {Points{{1, 3}, {1}}, Points{{-4, 3}, {3}}, Points{{-4}, {1}}, Points{{-4, 3}, {}}}) {
        VadShape const shape{.layers = 1, .calibration = {}};
        auto const inputs = static_cast<std::size_t>(shape.inputs());
        WeightWriter front;
        front.add("WeightLinear", WeightWriter::Matrices{{std::vector<float>(inputs), inputs, 1}})
            .add("BaesLinear", WeightWriter::Vectors{{7.0F}})
            .add("Test_MINMAX", range)
            .add("Test_BestF1", middle);
        auto const model =
            modelFrom(front.bytes() + stateOf(shape.hidden) + randomVadWeight(shape));
        std::vector<float> frame(80);
        EXPECT_TRUE(makeCleaner(7, model, 10)->cleanNoise(frame));
        EXPECT_EQ(frame[0], 7.0F);
    }
}

// Both keys of the environment, then the weight's own entry.
TEST(VoiceActivity, WatchdogSwitch) {
    using Row = std::array<char const*, 3>;
    std::pair<Row, bool> const rows[] = {
        {{nullptr, nullptr, nullptr}, false}, {{"TRUE", nullptr, nullptr}, true},
        {{"true", nullptr, "t"}, false},      {{nullptr, "TRUE", nullptr}, true},
        {{"TRUE", "FALSE", "t"}, false},      {{"FALSE", "TRUE", nullptr}, true},
        {{nullptr, nullptr, "t"}, true},      {{nullptr, nullptr, "TRUE"}, false}};
    for (auto const& [row, on] : rows) {
        auto const [first, second, stored] = row;
        WeightWriter writer;
        if (stored != nullptr) writer.add(kReset, stored);
        auto const model = modelFrom(writer.bytes() + randomVadWeight({}));
        if (first != nullptr) setText(model, kReset + std::string("CONTROL_").size(), first);
        if (second != nullptr) setText(model, kReset, second);
        EXPECT_EQ(MORVA::NOISE_CANCELLER::VadParams(*model).enableStateReset, on);
    }
}
