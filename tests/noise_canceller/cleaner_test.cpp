// The noise cleaners of all generations and the noise level against a plain double-precision
// reference, on random shapes, parameters and sounds.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstdio>

#include "models.h"
#include "reference_cleaner.h"
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

// Values that survive the way through text: quarters of whole numbers.
double quarters(Random& random, std::size_t low, std::size_t high) {
    return static_cast<double>(random.between(4 * low, 4 * high)) / 4.0;
}

// Each with its default now and then; a parameter at its default is not written into the model.
Tunables randomTunables(Random& random, int depth) {
    auto const on = [&] { return random.chance(0.4); };
    auto const rarely = [&] { return random.chance(0.2); };
    auto const whole = [&](std::size_t low, std::size_t high) {
        return static_cast<int>(random.between(low, high));
    };
    Tunables t;
    if (on()) t.smootCoef = whole(1, 64) / 64.0;
    t.smootRmModify = on();
    t.highFreqSmoot = on();
    t.clipFix = on();
    if (!rarely()) t.clipPoint = whole(1000, 32768);
    t.skipFrame = on();
    t.volumeUp = on();
    if (!rarely()) t.volumePercent = quarters(random, 0, 200);
    t.threshCut = on();
    if (!rarely()) t.threshRef = whole(1, 1000);
    t.useRmThreshold = on();
    if (!rarely()) t.rmThreshold = whole(1, 64) / 64.0;
    t.rescale = !on();
    if (!rarely()) t.rescaleAmpl = quarters(random, 100, 10000);
    if (!rarely()) t.rescaleEnergy = quarters(random, 0, 2000);
    t.compressRate = depth;
    t.speakerFix = on();
    if (!rarely()) {
        t.cutStart = quarters(random, 1, 12);
        t.cutEnd = t.cutStart + quarters(random, 1, 9);
    }
    if (!rarely()) t.runFrames = quarters(random, 1, 50);
    if (!rarely()) t.runMinimum = whole(1, 10);
    if (!rarely()) t.utterance = whole(8, 160) / 64.0;
    t.variableWindow = !on();
    return t;
}

NcShape randomShape(Random& random, int generation) {
    NcShape shape;
    shape.version = "0.0." + std::to_string(generation);
    shape.sampleRate = std::array{8000, 16000, 32000}[random.between(0, 2)];
    shape.frameLength = shape.sampleRate * std::array{20, 30, 32}[random.between(0, 2)] / 1000;
    shape.compressRate = static_cast<int>(random.between(0, 3));
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

// Noise in steps of loudness over 70 dB, with digital silence between.
Values randomSound(Random& random, std::size_t length, std::size_t frame) {
    Values sound;
    while (sound.size() < length) {
        double const gain =
            random.chance(0.2) ? 0.0 : 10000.0 * std::pow(10.0, -random.uniform(0.0F, 3.5F));
        auto const part = random.normal(frame * random.between(1, 12), 1.0F);
        double last = 0.0;
        for (float const v : part) {
            last = 0.6 * last + v;
            sound.push_back(static_cast<float>(std::clamp(gain * last, -32768.0, 32767.0)));
        }
    }
    sound.resize(length);
    return sound;
}

struct Setup {
    ModelEnvironment model;
    std::string parameters;
};

// Half of the parameters come from the environment, half from the weight.
Setup makeModel(Random& random, NcShape const& shape, Tunables const& tunables) {
    auto const suffix = "_v0_0_" + std::to_string(shape.generation());
    auto const defaults = Tunables().byName(shape.generation());
    std::vector<std::pair<std::string, std::string>> texts;
    WeightWriter writer;
    std::string parameters;
    for (auto const& [name, value] : tunables.byName(shape.generation())) {
        if (value == defaults.at(name)) continue;
        auto const key = "MORVA_" + name + suffix;
        bool const inWeight = random.chance(0.5);
        char text[40];
        if (auto const* flag = std::get_if<bool>(&value)) {
            std::snprintf(text, sizeof text, "%s", *flag ? "TRUE" : "FALSE");
            if (inWeight) writer.add("CONTROL_" + key, *flag ? "t" : "f");
        } else if (auto const* whole = std::get_if<int>(&value)) {
            std::snprintf(text, sizeof text, "%d", *whole);
            if (inWeight) writer.add("CONTROL_" + key, *whole);
        } else {
            std::snprintf(text, sizeof text, "%.9g", std::get<double>(value));
            if (inWeight) writer.add("CONTROL_" + key, static_cast<float>(std::get<double>(value)));
        }
        parameters += name + "=" + text + " ";
        if (!inWeight) texts.emplace_back(key, text);
    }
    Setup setup{modelFrom(writer.bytes() + randomNcWeight(shape)), parameters};
    for (auto const& [key, text] : texts) setText(setup.model, key, text.c_str());
    return setup;
}

class AgainstReference : public ::testing::TestWithParam<int> {
protected:
    static constexpr int kCases = 40;

    // `compare(engine's frame, reference)` after every session frame.
    template <class Compare>
    void run(int seed, bool level, Compare compare) {
        Random random(static_cast<std::uint64_t>(1000 * GetParam() + seed));
        TRACE_SEED(random);
        auto const shape = randomShape(random, GetParam());
        auto const tunables = randomTunables(random, shape.compressRate);
        auto const setup = makeModel(random, shape, tunables);
        auto const frameMs = std::array<std::size_t, 4>{10, 20, 30, 40}[random.between(0, 3)];
        auto const rateHz = static_cast<std::size_t>(shape.sampleRate);
        auto const modelMs = static_cast<std::size_t>(shape.frameLength) * 1000 / rateHz;
        SCOPED_TRACE(::testing::Message()
                     << shape.sampleRate << " Hz, model " << modelMs << " ms, frames " << frameMs
                     << " ms, bins " << shape.filtrBegin << ".." << shape.filtrEnd << ", P "
                     << shape.previewFrames << ", L " << shape.layers << ", H " << shape.hidden
                     << ", G " << shape.gates << ", " << setup.parameters);
        auto const cleaner = makeCleaner(level ? 0 : GetParam(), setup.model, frameMs);
        ASSERT_EQ(cleaner->getVersion(), shape.version);
        reference::Cleaner wanted(reference::Model(*setup.model->first, tunables, GetParam()),
                                  modelMs, frameMs);
        std::size_t const size = rateHz * frameMs / 1000;
        // The energy gate remembers 4 s of active frames, the level reference 3 s.
        bool const longEnough = seed % 8 == 0;
        auto const sound = randomSound(random, size * ((longEnough ? 7000 : 600) / frameMs), size);
        for (std::size_t at = 0; at + size <= sound.size(); at += size) {
            Values const in(sound.begin() + static_cast<long>(at),
                            sound.begin() + static_cast<long>(at + size));
            std::vector<float> frame(in.begin(), in.end());
            ASSERT_TRUE(cleaner->cleanNoise(frame));
            auto const out = wanted.clean(in);
            compare(frame, out, wanted);
        }
    }
};

}  // namespace

TEST_P(AgainstReference, CleanedSound) {
    ErrorBound bound("generation " + std::to_string(GetParam()) + ", share of 16-bit full scale",
                     1e-5);
    for (int seed = 0; seed < kCases; ++seed) {
        run(seed, false, [&](std::vector<float> const& got, Values const& out, auto const&) {
            ASSERT_EQ(got.size(), out.size());
            for (std::size_t i = 0; i < out.size(); ++i) bound.add(got[i], out[i], 32768.0);
        });
    }
}
INSTANTIATE_TEST_SUITE_P(Generation, AgainstReference, ::testing::Range(1, 7),
                         ::testing::PrintToStringParamName());

namespace {
class NoiseLevel : public AgainstReference {};
}  // namespace

TEST_P(NoiseLevel, OfWhatIsRemoved) {
    ErrorBound bound("noise level, dB", 0.001);
    for (int seed = 0; seed < kCases; ++seed) {
        run(seed, true, [&](std::vector<float> const& got, Values const&, auto const& wanted) {
            ASSERT_EQ(got.size(), 1U);
            bound.add(got[0], wanted.noiseLevelDb());
        });
    }
}
INSTANTIATE_TEST_SUITE_P(Generation, NoiseLevel, ::testing::Values(5));

// A reset happens on the session's thread, where nothing may fail half-way.
TEST(NoiseLevelReset, IsLikeNewAndAllocatesNothing) {
    Random random(3);
    NcShape const shape{.version = "0.0.5"};
    Tunables tunables;
    tunables.threshCut = tunables.rescale = true;
    auto const cleaner = makeCleaner(0, makeModel(random, shape, tunables).model, 10);
    auto const sound = randomSound(random, 160 * 400, 160);
    auto const levels = [&] {
        std::vector<float> all;
        for (std::size_t at = 0; at < sound.size(); at += 160) {
            std::vector<float> frame(sound.begin() + static_cast<long>(at),
                                     sound.begin() + static_cast<long>(at + 160));
            cleaner->cleanNoise(frame);
            all.push_back(frame.front());
        }
        return all;
    };
    auto const first = levels();
    EXPECT_EQ(test_support::countAllocations([&] { EXPECT_TRUE(cleaner->resetSession()); }), 0U);
    EXPECT_EQ(levels(), first);
}

TEST(Pipeline, RefusesFramesOfAnotherLength) {
    for (int generation : {0, 6}) {
        auto const model =
            modelFrom(randomNcWeight({.version = generation == 0 ? "0.0.5" : "0.0.6"}));
        for (std::size_t const length : {0, 159, 161, 4000}) {
            std::vector<float> frame(length);
            EXPECT_THROW(makeCleaner(generation, model, 10)->cleanNoise(frame),
                         MORVA::UTILS::MORVA_Exception);
        }
    }
}

// What is left of the level when nothing is removed, 90 dB below a full-scale input.
TEST(NoiseLevelOfIdentity, IsBelowMinus50) {
    ErrorBound bound("noise level of an identity mask over -60 dB", 10.0);
    Random random(5);
    for (int hz : {8000, 16000, 32000}) {
        for (int modelMs : {20, 30, 32}) {
            NcShape const shape{
                .version = "0.0.5", .sampleRate = hz, .frameLength = hz * modelMs / 1000};
            auto const cleaner =
                makeCleaner(0, modelFrom(test_support::identityNcWeight(shape)), 10);
            for (int n = 0; n < 60; ++n) {
                // A tone, then full-scale noise, then a square.
                auto frame = random.normal(static_cast<std::size_t>(hz) / 100);
                for (std::size_t i = 0; i < frame.size(); ++i) {
                    if (n < 20) frame[i] = std::sin(0.3F * static_cast<float>(i));
                    if (n >= 40) frame[i] = std::copysign(1.0F, frame[i]);
                    frame[i] = 32767.0F * std::clamp(frame[i], -1.0F, 1.0F);
                }
                ASSERT_TRUE(cleaner->cleanNoise(frame));
                bound.add(frame.at(0), -60.0);
            }
        }
    }
}

TEST(BackgroundSpeaker, CanBeSwitchedWhileItRuns) {
    auto const model = modelFrom(test_support::identityNcWeight({}));
    MORVA::NOISE_CANCELLER::NoiseCleaner_v0_0_6 cleaner(model, 10);
    auto const plain = makeCleaner(6, model, 10);
    Random random(4);
    // The last of `count` frames, from the cleaner and from one that is never switched.
    auto const last = [&](int count, float level) {
        std::pair<std::vector<float>, std::vector<float>> out;
        for (int i = 0; i < count; ++i) {
            out.first = out.second = random.normal(160, level);
            cleaner.cleanNoise(out.first);
            plain->cleanNoise(out.second);
        }
        return out;
    };
    test_support::CapturedOutput const quiet(1);
    EXPECT_TRUE(cleaner.background_speaker_fix_switch(true));
    auto const [loud, wanted] = last(100, 6000.0F);
    EXPECT_EQ(loud, wanted);
    EXPECT_LT(std::abs(last(50, 60.0F).first.back()), 1e-3F);
    EXPECT_TRUE(cleaner.background_speaker_fix_switch(false));
    auto const [off, quietly] = last(50, 60.0F);
    EXPECT_EQ(off, quietly);
}
