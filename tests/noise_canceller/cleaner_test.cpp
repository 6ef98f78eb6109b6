// The noise cleaners of all generations and the noise level against a plain double-precision
// reference, on random shapes, parameters and sounds.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstdio>

#include "noise_canceller/noise_cleaner_generations.h"
#include "noise_canceller/noise_cleaner_v0_0_6.h"
#include "noise_canceller/noise_db_cleaner_v0_0_1.h"
#include "reference_cleaner.h"
#include "support/captured_output.h"
#include "support/error_bound.h"
#include "support/random.h"
#include "support/weight_writer.h"

using namespace MORVA::NOISE_CANCELLER;
using reference::Tunables;
using reference::Values;
using test_support::ErrorBound;
using test_support::NcShape;
using test_support::Random;
using test_support::WeightWriter;

namespace {

// Values that survive the way through text: quarters of whole numbers.
double quarters(Random& random, std::size_t low, std::size_t high) {
    return static_cast<double>(random.between(4 * low, 4 * high)) / 4.0;
}

Tunables randomTunables(Random& random, int depth) {
    auto const on = [&] { return random.chance(0.4); };
    Tunables t;
    if (on()) t.smootCoef = static_cast<double>(random.between(1, 64)) / 64.0;
    t.smootRmModify = on();
    t.highFreqSmoot = on();
    t.clipFix = on();
    t.clipPoint = static_cast<int>(random.between(1000, 32768));
    t.skipFrame = on();
    t.volumeUp = on();
    t.volumePercent = quarters(random, 0, 200);
    t.threshCut = on();
    t.threshRef = static_cast<int>(random.between(1, 1000));
    t.useRmThreshold = on();
    t.rmThreshold = static_cast<double>(random.between(1, 64)) / 64.0;
    t.rescale = !on();
    t.rescaleAmpl = quarters(random, 100, 10000);
    t.rescaleEnergy = quarters(random, 0, 2000);
    t.compressRate = depth;
    t.speakerFix = on();
    t.cutStart = quarters(random, 1, 12);
    t.cutEnd = t.cutStart + quarters(random, 1, 9);
    t.runFrames = quarters(random, 1, 50);
    t.runMinimum = static_cast<int>(random.between(1, 10));
    t.utterance = static_cast<double>(random.between(8, 160)) / 64.0;
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
    Setup setup{MORVA::CONTAINERS::makeModelEnvironment(), {}};
    WeightWriter writer;
    for (auto const& [name, value] : tunables.byName(shape.generation())) {
        auto const key = "MORVA_" + name + suffix;
        char text[40];
        if (auto const* flag = std::get_if<bool>(&value)) {
            std::snprintf(text, sizeof text, "%s", *flag ? "TRUE" : "FALSE");
        } else if (auto const* whole = std::get_if<int>(&value)) {
            std::snprintf(text, sizeof text, "%d", *whole);
        } else {
            std::snprintf(text, sizeof text, "%.9g", std::get<double>(value));
        }
        setup.parameters += name + "=" + text + " ";
        if (random.chance(0.5)) {
            setup.model->second.insert<std::string>(key, text, MORVA::CONTAINERS::InsertMode::keep);
        } else if (auto const* flag = std::get_if<bool>(&value)) {
            writer.add("CONTROL_" + key, *flag ? "t" : "f");
        } else if (auto const* whole = std::get_if<int>(&value)) {
            writer.add("CONTROL_" + key, *whole);
        } else {
            writer.add("CONTROL_" + key, static_cast<float>(std::get<double>(value)));
        }
    }
    auto const bytes = writer.bytes() + randomNcWeight(shape);
    setup.model->first = std::make_shared<MORVA::WEIGHTS::Weight>();
    setup.model->first->read(bytes.data(), bytes.size());
    return setup;
}

std::unique_ptr<NoiseCleaner> build(int generation, ModelEnvironment const& model,
                                    std::size_t frameMs) {
    test_support::CapturedOutput const quiet(1);
    switch (generation) {
        case 0:
            return std::make_unique<NoiseDBCleaner_v0_0_1>(model, frameMs);
        case 1:
            return std::make_unique<NoiseCleaner_v0_0_1>(model, frameMs);
        case 2:
            return std::make_unique<NoiseCleaner_v0_0_2>(model, frameMs);
        case 3:
            return std::make_unique<NoiseCleaner_v0_0_3>(model, frameMs);
        case 4:
            return std::make_unique<NoiseCleaner_v0_0_4>(model, frameMs);
        case 5:
            return std::make_unique<NoiseCleaner_v0_0_5>(model, frameMs);
        default:
            return std::make_unique<NoiseCleaner_v0_0_6>(model, frameMs);
    }
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
        auto const cleaner = build(level ? 0 : GetParam(), setup.model, frameMs);
        reference::Cleaner wanted(reference::Model(*setup.model->first, tunables, GetParam()),
                                  modelMs, frameMs);
        std::size_t const size = rateHz * frameMs / 1000;
        auto const sound = randomSound(random, size * (800 / frameMs), size);
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
