// The noise cleaners of all generations and the noise level against a plain double-precision
// reference, on random shapes, parameters and sounds.
#include <gtest/gtest.h>

#include <array>
#include <cstdio>

#include "models.h"
#include "reference.h"
#include "support/allocation_counter.h"
#include "support/error_bound.h"
#include "support/random.h"
#include "utils/exception.h"

using namespace cleaner_test;
using reference::Tunables;
using reference::Values;
using test_support::ErrorBound;
using test_support::NcShape;
using test_support::Random;
using test_support::randomNcWeight;
using test_support::WeightWriter;

namespace {

enum class Kind { flag, whole, real };
struct Tunable {
    char const* name;
    Kind kind;
    double byDefault, low, high;
};
// The last seven belong to the generations from 6 on.
constexpr Tunable kTunables[] = {
    {"SMOOT_COEF", Kind::real, 1, 1 / 64.0, 1},
    {"SMOOT_RM_MODIFY", Kind::flag, 0, 0, 1},
    {"HIGH_FREQ_SMOOT", Kind::flag, 0, 0, 1},
    {"ENABLE_CLIP_FIX", Kind::flag, 0, 0, 1},
    {"CLIP_FIX_POINT", Kind::whole, 25000, 1000, 32768},
    {"SKIP_FRAME", Kind::flag, 0, 0, 1},
    {"VOLUME_UP", Kind::flag, 0, 0, 1},
    {"VOLUME_UP_PERCENT", Kind::real, 0, 0, 200},
    {"ENABLE_THRESH_CUT", Kind::flag, 0, 0, 1},
    {"THRESH_CUT_REF_EN", Kind::whole, 100, 1, 1000},
    {"ENABLE_RM_THRESHOLD", Kind::flag, 0, 0, 1},
    {"RM_THRESHOLD", Kind::real, 0.5, 1 / 64.0, 1},
    {"ENABLE_RESCALE", Kind::flag, 1, 0, 1},
    {"RESCALE_REF_AMPL", Kind::real, 2000, 100, 10000},
    {"RESCALE_REF_EN", Kind::real, 100, 0, 2000},
    {"COMPRESS_RATE", Kind::whole, 2, 0, 3},
    {"ENABLE_BACKGROUND_SPEAKER_FIX", Kind::flag, 0, 0, 1},
    {"BACKGROUND_SPEAKER_FIX_CUT_START_DB", Kind::real, 10, 1, 12},
    {"BACKGROUND_SPEAKER_FIX_CUT_END_DB", Kind::real, 15, 13, 21},
    {"BACKGROUND_SPEAKER_FIX_RUN_FRAME_COUNT", Kind::real, 40, 1, 50},
    {"BACKGROUND_SPEAKER_FIX_RUN_MIN_LEN", Kind::whole, 2, 1, 10},
    {"BACKGROUND_SPEAKER_FIX_UTTERANCE_LEN", Kind::real, 2, 1 / 8.0, 2.5},
    {"BACKGROUND_SPEAKER_FIX_VAR_WIND_MODE", Kind::flag, 1, 0, 1},
};

// Whole numbers, and others in steps that survive the way through text.
Tunables randomTunables(Random& random) {
    Tunables values;
    for (auto const& t : kTunables) {
        double const step = t.kind == Kind::real ? 1 / 64.0 : 1;
        auto const steps = random.between(0, static_cast<std::size_t>((t.high - t.low) / step));
        bool const usual = random.chance(t.kind == Kind::flag ? 0.2 : 0.3);
        values[t.name] = usual ? t.byDefault : t.low + step * static_cast<double>(steps);
    }
    return values;
}

NcShape randomBandShape(Random& random, double compressRate) {
    NcShape shape{.version = "NC_1.0.0"};
    shape.sampleRate = std::array{16000, 48000}[random.between(0, 1)];
    shape.frameLength = shape.sampleRate / 50;
    shape.filtrEnd = shape.frameLength / 2;
    shape.compressRate = static_cast<int>(compressRate);
    do {
        shape.groupBands = static_cast<int>(random.between(2, 12));
    } while (shape.compressedBands() % shape.groupBands != 0);
    shape.groupReach = static_cast<int>(random.between(0, 4));
    shape.previewFrames = random.chance(0.5) ? 1 : 3;
    shape.layers = static_cast<int>(random.between(2, 3));
    shape.hidden = static_cast<int>(random.between(2, 24));
    shape.gates = static_cast<int>(random.between(0, 18));
    shape.seed = static_cast<unsigned>(random.between(1, 1000000));
    return shape;
}

NcShape randomShape(Random& random, int generation, double compressRate) {
    if (generation == 10) return randomBandShape(random, compressRate);
    NcShape shape;
    shape.version = "0.0." + std::to_string(generation);
    shape.sampleRate = std::array{8000, 16000, 32000}[random.between(0, 2)];
    shape.frameLength = shape.sampleRate * std::array{20, 30, 32}[random.between(0, 2)] / 1000;
    shape.compressRate = static_cast<int>(compressRate);
    int const unit = shape.compressRate == 0 ? 1 : 2 << shape.compressRate;
    shape.filtrBegin = static_cast<int>(random.between(0, 20));
    int const most = (shape.coefficients() - shape.filtrBegin) / unit;
    shape.filtrEnd = shape.filtrBegin + unit * static_cast<int>(random.between(1, most));
    shape.previewFrames = static_cast<int>(random.between(1, 4));
    shape.layers = static_cast<int>(random.between(1, 4));
    shape.hidden = static_cast<int>(random.between(1, 24));
    shape.gates = random.chance(0.3) ? 1 : shape.hidden;
    shape.seed = static_cast<unsigned>(random.between(1, 1000000));
    return shape;
}

// Half of the parameters come from the environment, half from the weight; what has its default is
// written nowhere.
ModelEnvironment makeModel(Random& random, NcShape const& shape, Tunables const& tunables) {
    std::vector<std::pair<std::string, std::string>> texts;
    WeightWriter writer;
    for (auto const& [name, kind, byDefault, low, high] : kTunables) {
        double const value = tunables.at(name);
        if (value == byDefault) continue;
        auto const key = "MORVA_" + (name + shape.suffix());
        if (random.chance(0.5)) {
            if (kind == Kind::flag) writer.add("CONTROL_" + key, value != 0 ? "t" : "f");
            if (kind == Kind::whole) writer.add("CONTROL_" + key, static_cast<int>(value));
            if (kind == Kind::real) writer.add("CONTROL_" + key, static_cast<float>(value));
        } else {
            char number[40];
            std::snprintf(number, sizeof number, "%.9g", value);
            texts.emplace_back(key, kind != Kind::flag ? number : value != 0 ? "TRUE" : "FALSE");
        }
    }
    auto model = modelFrom(writer.bytes() + randomNcWeight(shape));
    for (auto const& [key, text] : texts) setText(model, key, text.c_str());
    return model;
}

// 16-bit samples.
class AgainstReference : public ::testing::TestWithParam<int> {
protected:
    static bool givesSound() { return GetParam() > 0 && GetParam() <= 10; }

    // A parameter of 0 stands for the noise level, which is generation 5's; 11 and 12 for voice
    // score and noise level of generation 10.
    void run(std::uint64_t seed, ErrorBound& bound) {
        int const generation = GetParam() == 0 ? 5 : std::min(GetParam(), 10);
        Random random(1000 * static_cast<std::uint64_t>(GetParam()) + seed);
        TRACE_SEED(random);
        auto const tunables = randomTunables(random);
        auto const shape = randomShape(random, generation, tunables.at("COMPRESS_RATE"));
        auto const model = makeModel(random, shape, tunables);
        auto const frameMs = 10 * random.between(1, 4);
        SCOPED_TRACE(::testing::PrintToString(tunables));
        auto const cleaner = makeCleaner(GetParam(), model, frameMs);
        ASSERT_EQ(cleaner->getVersion(), shape.version);
        reference::Cleaner wanted(*model->first, tunables, generation, frameMs);
        // The energy gate remembers 4 s of active frames, the level reference 3 s.
        std::size_t const ms = seed % 8 == 0 ? 7000 : 600;
        std::size_t const size = static_cast<std::size_t>(shape.sampleRate) * frameMs / 1000;
        for (auto frame : randomFrames(random, ms / frameMs, size)) {
            auto const out = wanted.clean(reference::valuesOf(frame));
            ASSERT_TRUE(cleaner->cleanNoise(frame));
            ASSERT_EQ(frame.size(), givesSound() ? size : 1);
            if (GetParam() == 11) {
                bound.add(frame[0], wanted.voiceScore());
            } else if (!givesSound()) {
                bound.add(frame[0], wanted.noiseLevelDb());
            }
            for (std::size_t i = 0; givesSound() && i < size; ++i)
                bound.add(frame[i], out[i], 32768.0);
        }
    }
};

}  // namespace

// The level in dB, sound as a share of the 16-bit full scale.
TEST_P(AgainstReference, GivesTheSame) {
    ErrorBound bound("generation " + std::to_string(GetParam()), givesSound() ? 1e-5 : 1e-3);
    for (std::uint64_t seed = 0; seed < 40; ++seed) run(seed, bound);
}
INSTANTIATE_TEST_SUITE_P(Generation, AgainstReference,
                         ::testing::Values(0, 1, 2, 3, 4, 5, 6, 10, 11, 12),
                         ::testing::PrintToStringParamName());

// The models that sessions reset; those of NC_1.0.0 and the noise level's on the session's thread,
// where nothing may fail half-way.
TEST(Reset, IsLikeNew) {
    Random random(3);
    NcShape const shape{.version = "0.0.5"};
    auto tunables = randomTunables(random);
    tunables["COMPRESS_RATE"] = shape.compressRate;
    tunables["ENABLE_THRESH_CUT"] = tunables["ENABLE_RESCALE"] = 1;
    auto const level = makeModel(random, shape, tunables);
    auto const band = modelFrom(randomNcWeight({.version = "NC_1.0.0"}));
    auto const vad = modelFrom(test_support::randomVadWeight({}));
    for (auto const& [model, weight] : {std::pair{0, level}, {7, vad}, {11, band}, {12, band}}) {
        auto const cleaner = makeCleaner(model, weight, 10);
        auto const sound = randomFrames(random, 400, model == 7 ? 80 : 160);
        auto const answers = [&] {
            std::vector<float> all;
            for (auto frame : sound) {
                cleaner->cleanNoise(frame);
                all.push_back(frame.front());
            }
            return all;
        };
        auto const first = answers();
        EXPECT_NE(answers(), first);
        auto const reset = [&] { EXPECT_TRUE(cleaner->resetSession()); };
        auto const allocations = test_support::countAllocations(reset);
        EXPECT_LE(allocations, model == 7 ? 1U : 0U);
        EXPECT_EQ(answers(), first);
    }
}

TEST(Pipeline, RefusesFramesOfAnotherLength) {
    for (int const generation : {0, 6}) {
        auto const model =
            modelFrom(randomNcWeight({.version = generation == 0 ? "0.0.5" : "0.0.6"}));
        for (std::size_t const length : {0, 159, 161, 4000}) {
            std::vector<float> frame(length);
            EXPECT_THROW(makeCleaner(generation, model, 10)->cleanNoise(frame),
                         MORVA::UTILS::MORVA_Exception);
        }
    }
}

TEST(BackgroundSpeaker, CanBeSwitchedWhileItRuns) {
    auto const model = modelFrom(test_support::identityNcWeight({}));
    MORVA::NOISE_CANCELLER::NoiseCleaner_v0_0_6 cleaner(model, 10);
    auto const plain = makeCleaner(6, model, 10);
    Random random(4);
    // The last of many frames, from the cleaner and from one that is never switched.
    auto const last = [&](bool on, float level) {
        EXPECT_TRUE(cleaner.background_speaker_fix_switch(on));
        std::pair<std::vector<float>, std::vector<float>> out;
        for (int i = 0; i < 100; ++i) {
            out.first = out.second = random.normal(160, level);
            cleaner.cleanNoise(out.first);
            plain->cleanNoise(out.second);
        }
        return out;
    };
    auto const [loud, wanted] = last(true, 6000.0F);
    EXPECT_EQ(loud, wanted);
    EXPECT_LT(std::abs(last(true, 60.0F).first.back()), 1e-3F);
    auto const [off, quietly] = last(false, 60.0F);
    EXPECT_EQ(off, quietly);
}
