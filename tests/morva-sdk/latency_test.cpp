// Where the sound comes out: with a mask of 1 everywhere the output is the input, later by what the
// session reports; with bypass on as well. Found by the phases of three tones whose periods have no
// common multiple within any latency.
#include <gtest/gtest.h>

#include <array>
#include <complex>
#include <cstdlib>

#include "engine.h"
#include "support/error_bound.h"

using namespace sdk_test;
using test_support::ErrorBound;

namespace {

constexpr double kTwoPi = 2.0 * std::numbers::pi;
constexpr double kTonesHz[] = {211.0, 307.0, 449.0};

std::vector<float> tones(int hz) {
    std::vector<float> sound(static_cast<std::size_t>(hz * 36 / 100));
    for (std::size_t i = 0; i < sound.size(); ++i) {
        for (double const f : kTonesHz) {
            double const phase = kTwoPi * f * static_cast<double>(i) / hz;
            sound[i] += 0.2F * static_cast<float>(std::sin(phase));
        }
    }
    return sound;
}

// By how many samples one tone of `sound` comes later than `delay`.
double lateness(std::vector<float> const& sound, double toneHz, int hz, int delay) {
    auto const from = static_cast<std::size_t>(hz) * 13 / 100;  // past the longest latency
    auto const n = static_cast<double>(sound.size() - from);
    std::complex<double> projection;
    for (std::size_t i = from; i < sound.size(); ++i) {
        double const hann = 1.0 - std::cos(kTwoPi * static_cast<double>(i - from) / n);
        double const phase = kTwoPi * toneHz * (static_cast<double>(i) - delay) / hz;
        projection += hann * static_cast<double>(sound[i]) * std::polar(1.0, -phase);
    }
    return -std::arg(projection * std::complex(0.0, 1.0)) * hz / (kTwoPi * toneHz);
}

}  // namespace

TEST(Latency, IsWhatIsReported) {
    Engine engine;
    std::vector<std::string> models;
    for (int hz : {8000, 16000, 32000}) {
        for (int ms : {20, 30, 32}) {
            models.push_back(std::to_string(hz) + "/" + std::to_string(ms));
            Engine::addIdentity(models.back().c_str(), hz, ms);
        }
    }
    // A whole number is reported, which the bypass keeps to.
    ErrorBound cleaned("latency, samples", 0.52);
    ErrorBound bypassed("latency of the bypass, samples", 0.02);
    // Each pair of rates meets one, or all 36, of the pairs of a duration and a model.
    int const perPair = std::getenv("MORVA_TEST_FULL") != nullptr ? 36 : 1;
    std::size_t turn = 0;
    for (int in : kRates) {
        auto const sent = tones(in);
        for (int out : kRates) {
            for (int i = 0; i < perPair; ++i, ++turn) {
                int const ms = kDurations[turn % 4];
                auto const& model = models[turn % 9];
                for (bool const bypass : {false, true}) {
                    auto* const session = openNc(in, out, ms, model.c_str());
                    ASSERT_EQ(MorvaExt_NC_SetBypass(session, bypass), 0);
                    int const latency = MorvaExt_SessionLatencySamples(session);
                    auto const sound = cleanAll(session, sent);
                    for (double const tone : kTonesHz) {
                        (bypass ? bypassed : cleaned).add(lateness(sound, tone, out, latency), 0.0);
                    }
                    EXPECT_EQ(MorvaExt_SessionLatencySamples(session), latency)
                        << in << " -> " << out << " Hz, " << ms << " ms, " << model;
                }
            }
        }
    }
}
