// Where the sound comes out. With a mask of 1 everywhere the output is the input, later by what the
// session reports: found by cross-correlation of the output with the continuous input sound.
// The default run covers every pair of rates and every model frame with every duration; set
// MORVA_TEST_FULL to run all 2,916 combinations.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <complex>
#include <cstdlib>
#include <map>

#include "engine.h"
#include "support/error_bound.h"
#include "utils/resampler.h"

using namespace sdk_test;
using MORVA::UTILS::Resampler;
using test_support::ErrorBound;

namespace {

using Complex = std::complex<double>;
constexpr double kTwoPi = 2.0 * std::numbers::pi;

// Tones within the band of every rate, with fixed random phases: a sound that is known at every
// point in time.
class Tones {
public:
    static constexpr int kCount = 40;
    static constexpr double kAmplitude = 0.02;

    Tones() {
        test_support::RandomValues random(7);
        auto const jitter = random.vector(kCount, 0.0F, 1.0F);
        auto const phases = random.vector(kCount, 0.0F, 1.0F);
        for (std::size_t k = 0; k < kCount; ++k) {
            frequency_.push_back(150.0 + 70.0 * (static_cast<double>(k) + jitter[k]));
            phase_.push_back(kTwoPi * phases[k]);
        }
    }

    std::vector<float> at(int hz, double seconds) const {
        std::vector<float> sound(static_cast<std::size_t>(seconds * hz));
        std::vector<double> sum(sound.size());
        forEachTone(
            hz, [&](std::size_t, std::size_t i, Complex z) { sum[i] += z.imag(); }, sum.size());
        std::transform(sum.begin(), sum.end(), sound.begin(),
                       [](double v) { return static_cast<float>(kAmplitude * v); });
        return sound;
    }

    // The delay in seconds at which `sound` from sample `from` on correlates best with the tones.
    double delayOf(std::vector<float> const& sound, int hz, std::size_t from) const {
        std::vector<Complex> projection(kCount);
        forEachTone(
            hz,
            [&](std::size_t k, std::size_t i, Complex z) {
                if (i >= from) projection[k] += static_cast<double>(sound[i]) * z;
            },
            sound.size());
        auto const correlation = [&](double delay) {
            double sum = 0.0;
            for (std::size_t k = 0; k < kCount; ++k) {
                sum += (projection[k] * std::polar(1.0, -kTwoPi * frequency_[k] * delay)).imag();
            }
            return sum;
        };
        double best = 0.0;
        for (double delay = 0.0; delay < 0.12; delay += 2e-5) {
            if (correlation(delay) > correlation(best)) best = delay;
        }
        for (double step = 1e-5; step > 1e-9; step /= 2.0) {
            for (double const near : {best - step, best + step}) {
                if (correlation(near) > correlation(best)) best = near;
            }
        }
        return best;
    }

private:
    template <class Body>
    void forEachTone(int hz, Body body, std::size_t n) const {
        for (std::size_t k = 0; k < kCount; ++k) {
            Complex z = std::polar(1.0, phase_[k]);
            Complex const turn = std::polar(1.0, kTwoPi * frequency_[k] / hz);
            for (std::size_t i = 0; i < n; ++i, z *= turn) body(k, i, z);
        }
    }

    std::vector<double> frequency_;
    std::vector<double> phase_;
};

// Milliseconds from sound to sound inside the model's pipeline.
int pipelineMs(int modelMs, int frameMs) {
    static std::map<int, std::map<int, int>> const table = {
        {20, {{10, 10}, {20, 10}, {30, 10}, {40, 10}}},
        {30, {{10, 25}, {20, 25}, {30, 15}, {40, 25}}},
        {32, {{10, 31}, {20, 28}, {30, 30}, {40, 28}}},
    };
    return table.at(modelMs).at(frameMs);
}

struct Setting {
    int in;
    int out;
    int ms;
    int modelHz;
    int modelMs;
};

std::string modelName(Setting const& s) {
    return std::to_string(s.modelHz) + "/" + std::to_string(s.modelMs);
}

// Each conversion that runs begins with expected - produced + 1 zeros at its output rate.
double zerosBy(unsigned in, unsigned out) {
    if (in == out) return 0.0;
    Resampler resampler(in, out);
    std::vector<float> result;
    auto const produced = resampler.resample(std::vector<float>(in), result);
    return static_cast<double>(result.size()) - produced + 1.0;
}

class Latency : public ::testing::Test {
protected:
    Latency() {
        for (int hz : {8000, 16000, 32000}) {
            for (int ms : {20, 30, 32}) {
                Engine::addIdentity((std::to_string(hz) + "/" + std::to_string(ms)).c_str(), hz,
                                    ms);
            }
        }
        for (int hz : kRates) sounds_[hz] = tones_.at(hz, 0.36);
    }

    void check(Setting const& s) {
        SCOPED_TRACE(::testing::Message() << s.in << " -> " << s.out << " Hz, " << s.ms
                                          << " ms, model " << modelName(s));
        auto* const session = openNc(s.in, s.out, s.ms, modelName(s).c_str());
        ASSERT_NE(session, nullptr);
        unsigned const model = samples(s.modelHz, s.ms);
        double const atModel =
            zerosBy(samples(s.in, s.ms), model) + pipelineMs(s.modelMs, s.ms) * s.modelHz / 1000;
        double const expected = atModel * s.out / s.modelHz + zerosBy(model, samples(s.out, s.ms));
        EXPECT_EQ(MorvaExt_SessionLatencySamples(session), std::lround(expected));

        auto const cleaned = cleanAll(session, sounds_[s.in]);
        double const found =
            tones_.delayOf(cleaned, s.out, static_cast<std::size_t>(s.out) * 13 / 100) * s.out;
        shift_.add(found, expected);
        EXPECT_EQ(Morva_NC_CloseSession(session), 0);
    }

    Engine engine_;
    Tones tones_;
    std::map<int, std::vector<float>> sounds_;
    ErrorBound shift_{"latency, output samples", 0.02};
};

}  // namespace

TEST_F(Latency, IsTheReportedSum) {
    bool const full = std::getenv("MORVA_TEST_FULL") != nullptr;
    int turn = 0;
    for (int in : kRates) {
        for (int out : kRates) {
            for (int ms : kDurations) {
                for (int model = 0; model < 9; ++model) {
                    // Every pair of rates once, every duration with every model 81 / 36 times.
                    if (!full && turn % 36 != (ms / 10 - 1) * 9 + model) continue;
                    check({in, out, ms, std::array{8000, 16000, 32000}[model % 3],
                           std::array{20, 30, 32}[model / 3]});
                }
            }
            turn += 7;  // shares no factor with 36
        }
    }
}

// Without conversion the output is the delayed input sample by sample.
TEST_F(Latency, IdentityWithoutConversionIsExact) {
    ErrorBound rounding("identity without conversion, 16-bit units", 0.05);
    for (int hz : {8000, 16000, 32000}) {
        for (int modelMs : {20, 30, 32}) {
            for (int ms : kDurations) {
                Setting const s{hz, hz, ms, hz, modelMs};
                auto const sound = voice(hz, 0.5, 3);
                auto* const session = openNc(hz, hz, ms, modelName(s).c_str());
                auto const cleaned = cleanAll(session, sound);
                auto const delay = static_cast<std::size_t>(pipelineMs(modelMs, ms) * hz / 1000);
                for (std::size_t i = 0; i < cleaned.size(); ++i) {
                    rounding.add(cleaned[i], i < delay ? 0.0 : sound[i - delay], 1.0 / 32768.0);
                }
                shift_.add(MorvaExt_SessionLatencySamples(session), static_cast<double>(delay));
            }
        }
    }
}
