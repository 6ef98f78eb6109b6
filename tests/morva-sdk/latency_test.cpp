// Where the sound comes out: with a mask of 1 everywhere the output is the input, later by what the
// session reports; with bypass on as well. Heard in three tones whose periods have no common
// multiple within any latency.
#include <gtest/gtest.h>

#include <span>

#include "engine.h"
#include "support/error_bound.h"

using namespace sdk_test;
using test_support::ErrorBound;

namespace {

constexpr double kTwoPi = 2.0 * std::numbers::pi;
constexpr double kMeanToneHz = 338.0;  // the root of the mean square

std::vector<float> tones(int hz, double delay) {
    std::vector<float> sound(samples(hz, 360));
    for (std::size_t i = 0; i < sound.size(); ++i) {
        for (double const toneHz : {211.0, 307.0, 449.0}) {
            double const phase = kTwoPi * toneHz * (static_cast<double>(i) - delay) / hz;
            sound[i] += 0.2F * static_cast<float>(std::sin(phase));
        }
    }
    return sound;
}

// By how many samples the tones of `sound` come earlier or later than `delay`: for so little, their
// relative error is the angle.
double offset(std::span<float const> sound, int hz, double delay) {
    auto const wanted = tones(hz, delay);
    auto const from = samples(hz, 130);  // past the longest latency
    auto const count = sound.size() - from;
    return test_support::relativeError(sound.subspan(from),
                                       std::span(wanted).subspan(from, count)) *
           hz / (kTwoPi * kMeanToneHz);
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
    ErrorBound cleaned("exact latency, samples", 0.04);
    ErrorBound bypassed("latency of the bypass, whole samples", 0.04);
    // Each pair of rates meets one of the pairs of a duration and a model.
    std::size_t turn = 0;
    for (int in : kRates) {
        auto const sent = tones(in, 0);
        for (int out : kRates) {
            int const ms = kDurations[turn % 4];
            auto const& model = models[turn++ % 9];
            for (bool const bypass : {false, true}) {
                auto* const session = openNc(in, out, ms, model.c_str());
                ASSERT_EQ(MorvaExt_NC_SetBypass(session, bypass), 0);
                double latency = MorvaExt_SessionLatencySamples(session);
                if (!bypass) MorvaExt_SessionExactLatency(session, &latency);
                (bypass ? bypassed : cleaned)
                    .add(offset(cleanAll(session, sent), out, latency), 0.0);
            }
        }
    }
}
