// The voice-activity model against a plain double-precision reference, and its parts one by one.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <deque>
#include <numbers>

#include "models.h"
#include "noise_canceller/vad_cleaner_v0_0_1.h"
#include "reference_cleaner.h"
#include "support/error_bound.h"
#include "support/random.h"

using namespace MORVA::NOISE_CANCELLER;
using cleaner_test::modelFrom;
using MORVA::CONTAINERS::Matrix;
using reference::affine;
using reference::Values;
using test_support::ErrorBound;
using test_support::Random;
using test_support::randomVadWeight;
using test_support::VadShape;
using test_support::WeightWriter;

namespace {

class ReferenceVad {
public:
    ReferenceVad(MORVA::WEIGHTS::Weight const& weight, bool watchdog)
        : weight_(weight),
          length_(static_cast<std::size_t>(weight.getReference<int>("FrameLength"))),
          watchdog_(watchdog),
          samples_(length_, 0.0),
          state_(weight.getReference<std::vector<Matrix>>("WeightNonLinear").back().rows, 0.0) {
        context_.assign(5,
                        standardised(Values(weight.getReference<std::vector<float>>("MU").size())));
    }

    double score(Values const& frame) {
        double energy = 0.0;
        for (double const v : frame) energy += v * v / static_cast<double>(frame.size());
        double const alpha = std::pow(10.0, -0.02);
        if (energy >= 10000.0) {
            double const share = energy > 2.0 * level_ ? alpha : 1.0 - alpha;
            level_ += share * (energy - level_);
        }
        for (double const v : frame) samples_.push_back(v * 2000.0 / (std::sqrt(level_) + 1e-7));
        samples_.erase(samples_.begin(), samples_.end() - static_cast<long>(length_));
        double const y = logit();
        if (watchdog_) watch(y);
        return calibrated(y);
    }
    int resets = 0;

private:
    using Vector = std::vector<float>;
    using Vectors = std::vector<Vector>;

    Values standardised(Values x) const {
        for (std::size_t k = 0; k < x.size(); ++k) {
            x[k] = (x[k] - weight_.getReference<Vector>("MU")[k]) /
                   std::sqrt(weight_.getReference<Vector>("SD")[k] + 1e-7);
        }
        return x;
    }

    // The lowest quarter as it is, then pairs up to the half, fours above.
    Values pooled(Values const& power) const {
        std::size_t const quarter = power.size() / 4;
        Values bands(power.begin(), power.begin() + static_cast<long>(quarter + 1));
        for (std::size_t i = quarter + 1, width = 2; i < power.size(); i += width) {
            if (i == 2 * quarter + 1) width = 4;
            double sum = 0.0;
            for (std::size_t k = i; k < i + width; ++k) sum += power[k];
            bands.push_back(sum / static_cast<double>(width));
        }
        return bands;
    }

    double logit() {
        reference::Spectrum windowed;
        for (std::size_t i = 0; i < length_; ++i) {
            double const turn = 2.0 * std::numbers::pi * static_cast<double>(i) /
                                (static_cast<double>(length_) - 1.0);
            windowed.push_back(samples_[i] * (0.54 - 0.46 * std::cos(turn)));
        }
        auto const spectrum = reference::dft(windowed);
        Values power;
        for (std::size_t k = 0; k <= length_ / 2; ++k) power.push_back(std::norm(spectrum[k]));
        auto bands = pooled(power);
        for (double& v : bands) v = std::log(v + 1.0);
        context_.pop_front();
        context_.push_back(standardised(bands));
        Values x = state_;
        for (auto const& frame : context_) x.insert(x.end(), frame.begin(), frame.end());

        auto const gate = affine(x, weight_.getReference<Matrix>("WeightGRU"),
                                 weight_.getReference<Vector>("BaesGRU"));
        auto const& layers = weight_.getReference<std::vector<Matrix>>("WeightLinear");
        auto const& biases = weight_.getReference<Vectors>("BaesLinear");
        for (std::size_t i = 0; i + 1 < layers.size(); ++i) {
            auto const a =
                affine(x, weight_.getReference<std::vector<Matrix>>("WeightNonLinear")[i],
                       weight_.getReference<Vectors>("BaesNonLinear")[i]);
            x = affine(x, layers[i], biases[i]);
            for (std::size_t k = 0; k < x.size(); ++k) x[k] += std::max(a[k], 0.0);
            for (std::size_t k = 0; i == 0 && k < x.size(); ++k) {
                double const z = reference::sigmoid(gate[gate.size() == 1 ? 0 : k]);
                state_[k] = z * x[k] + (1.0 - z) * state_[k];
            }
        }
        return affine(x, layers.back(), biases[layers.size() - 1])[0];
    }

    void watch(double y) {
        low_.push_back(reference::sigmoid(y) < 0.75);
        if (low_.size() > 200) low_.pop_front();
        ++sinceReset_;
        auto const count = static_cast<double>(std::count(low_.begin(), low_.end(), true));
        if (sinceReset_ < 300 || count <= 0.95 * static_cast<double>(low_.size())) return;
        std::fill(state_.begin(), state_.end(), 0.0);
        sinceReset_ = 0;
        ++resets;
    }

    double calibrated(double y) const {
        auto const range = weight_.values().find<Vector>("Test_MINMAX");
        if (!range) return y;
        double const a = (*range)[0];
        double const b = weight_.getReference<Vector>("Test_BestF1")[0];
        double const c = (*range)[1];
        double const s = y >= b ? (y - b) * 0.5 / (c - b) + 0.5 : (y - a) * 0.5 / (b - a);
        return std::clamp(s, 0.00001, 0.99999);
    }

    MORVA::WEIGHTS::Weight const& weight_;
    std::size_t length_;
    bool watchdog_;
    double level_ = 4000000.0;
    Values samples_;
    std::deque<Values> context_;
    Values state_;
    std::deque<bool> low_;
    int sinceReset_ = 0;
};

float scoreOf(VadCleaner_v0_0_1& cleaner, Values const& frame) {
    std::vector<float> samples(frame.begin(), frame.end());
    EXPECT_TRUE(cleaner.cleanNoise(samples));
    EXPECT_EQ(samples.size(), 1U);
    return samples.front();
}

// A weight whose network answers with `logit` whatever it hears.
std::string constantWeight(float logit, VadShape shape = {}) {
    shape.layers = 1;
    std::size_t const inputs = static_cast<std::size_t>(shape.hidden + 5 * shape.features());
    WeightWriter front;
    front.add("WeightLinear", WeightWriter::Matrices{{std::vector<float>(inputs), inputs, 1}})
        .add("WeightNonLinear", WeightWriter::Matrices{{std::vector<float>(8), 8, 1}})
        .add("BaesLinear", WeightWriter::Vectors{{logit}});
    return front.bytes() + randomVadWeight(shape);
}

}  // namespace

TEST(VoiceActivity, MatchesTheReference) {
    ErrorBound scores("voice score, uncalibrated", 2e-5);
    ErrorBound calibrated("voice score, calibrated", 2e-5);
    for (int seed = 1; seed <= 40; ++seed) {
        Random random(static_cast<std::uint64_t>(seed));
        TRACE_SEED(random);
        VadShape shape;
        shape.sampleRate = std::array{8000, 16000, 32000}[random.between(0, 2)];
        shape.frameLength = std::array{240, 160, 320, 480, 256, 512}[random.between(0, 5)];
        int const ms = shape.frameLength * 1000 / shape.sampleRate;
        if (std::ranges::count(std::array{10, 15, 20, 30, 32, 40}, ms) == 0) shape = VadShape();
        shape.hidden = static_cast<int>(random.between(1, 24));
        shape.gates = random.chance(0.3) ? 1 : shape.hidden;
        shape.layers = static_cast<int>(random.between(1, 4));
        shape.seed = static_cast<unsigned>(seed);
        if (random.chance(0.5)) shape.calibration.clear();
        auto bytes = randomVadWeight(shape);
        if (shape.layers == 1) {
            // The state's width is the rows of the last rectified matrix, which no layer reads.
            std::size_t const h = static_cast<std::size_t>(shape.hidden);
            bytes =
                WeightWriter()
                    .add("WeightNonLinear", WeightWriter::Matrices{{std::vector<float>(h), h, 1}})
                    .bytes() +
                bytes;
        }
        auto const model = modelFrom(bytes);
        auto const frameMs = std::array<std::size_t, 4>{10, 20, 30, 40}[random.between(0, 3)];
        VadCleaner_v0_0_1 cleaner(model, frameMs);
        ReferenceVad wanted(*model->first, false);
        std::size_t const n = static_cast<std::size_t>(shape.sampleRate) * frameMs / 1000;
        for (int i = 0; i < 40; ++i) {
            double const gain =
                random.chance(0.2) ? 0.0 : std::pow(10.0, random.uniform(0.5F, 4.0F));
            Values frame;
            for (float const v : random.normal(n)) {
                frame.push_back(static_cast<float>(std::clamp(gain * v, -32768.0, 32767.0)));
            }
            auto& bound = shape.calibration.empty() ? scores : calibrated;
            bound.add(scoreOf(cleaner, frame), wanted.score(frame));
        }
    }
}

TEST(VoiceActivity, CalibrationIsPiecewiseLinearAndLimited) {
    // low, middle, high, raw -> score; coinciding or missing points leave the raw value.
    struct Row {
        std::vector<float> points;
        float raw;
        float score;
    };
    for (auto const& [points, raw, score] :
         {Row{{-4, 1, 3}, 1, 0.5F}, Row{{-4, 1, 3}, 3, 0.99999F}, Row{{-4, 1, 3}, 9, 0.99999F},
          Row{{-4, 1, 3}, 2, 0.75F}, Row{{-4, 1, 3}, -4, 0.00001F}, Row{{-4, 1, 3}, -9, 0.00001F},
          Row{{-4, 1, 3}, -1.5F, 0.25F}, Row{{1, 1, 3}, 7, 7}, Row{{-4, 3, 3}, 7, 7},
          Row{{}, -7, -7}}) {
        VadShape shape;
        shape.calibration = points;
        VadCleaner_v0_0_1 cleaner(modelFrom(constantWeight(raw, shape)), 10);
        EXPECT_EQ(scoreOf(cleaner, Values(80)), score) << raw;
    }
    using Points = std::pair<std::vector<float>, std::vector<float>>;
    for (auto const& [range, middle] : {Points{{-4}, {1}}, Points{{-4, 3}, {}}}) {
        VadShape shape;
        shape.calibration.clear();
        auto const bytes =
            WeightWriter().add("Test_MINMAX", range).add("Test_BestF1", middle).bytes();
        VadCleaner_v0_0_1 cleaner(modelFrom(bytes + constantWeight(7, shape)), 10);
        EXPECT_EQ(scoreOf(cleaner, Values(80)), 7.0F);
    }
}

// Both keys of the environment, then the weight's own entry.
TEST(VoiceActivity, WatchdogSwitch) {
    std::string const key = "MORVA_VAD_ENABLE_STATE_RESET_v0_0_1";
    std::string const control = "CONTROL_" + key;
    struct Row {
        char const* first;
        char const* second;
        char const* stored;
        bool on;
    };
    for (auto const& row :
         {Row{nullptr, nullptr, nullptr, false}, Row{"TRUE", nullptr, nullptr, true},
          Row{"true", nullptr, "t", false}, Row{nullptr, "TRUE", nullptr, true},
          Row{"TRUE", "FALSE", "t", false}, Row{"FALSE", "TRUE", nullptr, true},
          Row{nullptr, nullptr, "t", true}, Row{nullptr, nullptr, "TRUE", false}}) {
        auto bytes = randomVadWeight({});
        if (row.stored != nullptr) bytes += WeightWriter().add(control, row.stored).bytes();
        auto const model = modelFrom(bytes);
        if (row.first != nullptr) cleaner_test::setText(model, key, row.first);
        if (row.second != nullptr) cleaner_test::setText(model, control, row.second);
        EXPECT_EQ(VadParams(*model).enableStateReset, row.on);
    }
}

// Through the cleaner, with a network that is steadily unsure: it is cleared when the reference is.
TEST(VoiceActivity, WatchdogClearsTheState) {
    ErrorBound bound("voice score under the watchdog", 2e-5);
    bool cleared = false;
    for (unsigned seed = 1; seed <= 6; ++seed) {
        VadShape shape;
        shape.seed = seed;
        shape.calibration = {-8.0F, 0.0F, 8.0F};
        auto const model = modelFrom(
            randomVadWeight(shape) +
            WeightWriter().add("CONTROL_MORVA_VAD_ENABLE_STATE_RESET_v0_0_1", "t").bytes());
        VadCleaner_v0_0_1 cleaner(model, 10);
        ReferenceVad wanted(*model->first, true);
        Random random(seed);
        for (int i = 0; i < 700; ++i) {
            Values frame;
            for (float const v : random.normal(80, 500.0F)) frame.push_back(v);
            bound.add(scoreOf(cleaner, frame), wanted.score(frame));
        }
        cleared = cleared || wanted.resets > 0;
    }
    EXPECT_TRUE(cleared);
}

TEST(VoiceActivity, ResetGivesTheFirstScoresAgain) {
    VadCleaner_v0_0_1 cleaner(modelFrom(randomVadWeight({})), 20);
    auto const scores = [&] {
        Random random(5);
        Values values;
        for (int i = 0; i < 30; ++i) {
            Values frame;
            for (float const v : random.normal(160, 3000.0F)) frame.push_back(v);
            values.push_back(scoreOf(cleaner, frame));
        }
        return values;
    };
    auto const first = scores();
    EXPECT_NE(scores(), first);
    EXPECT_TRUE(cleaner.resetSession());
    EXPECT_EQ(scores(), first);
}
