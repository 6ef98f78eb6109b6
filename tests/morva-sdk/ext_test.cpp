// The additions to the C interface: attenuation limit, bypass, meters, lists and texts.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <functional>
#include <span>
#include <thread>

#include "engine.h"
#include "support/error_bound.h"
#include "support/random.h"

using namespace sdk_test;
using test_support::ErrorBound;
using test_support::NcShape;
using test_support::Random;
using test_support::randomNcWeight;
using test_support::randomVadWeight;

namespace {

constexpr float kOneStep = 1.0F / 32768.0F;

// A model that removes everything: the output layer's bias closes the mask.
std::string closedNcWeight(NcShape shape) {
    shape.timeStamp = "closed";
    shape.filtrEnd = shape.coefficients();
    shape.compressRate = 0;
    return test_support::DETAIL::ncWeight(shape, 0.0F, -100.0F);
}

class Extension : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_EQ(Engine::add("random", randomNcWeight({})), 0);
        ASSERT_EQ(Engine::add("closed", closedNcWeight({})), 0);
        ASSERT_EQ(Engine::add("level", randomNcWeight({.version = "0.0.5", .timeStamp = "l"})), 0);
        ASSERT_EQ(Engine::add("vad", randomVadWeight({})), 0);
        Engine::addIdentity("narrow", 8000, 20);
    }
    static void* open(int hz, int ms, char const* model) { return openNc(hz, hz, ms, model); }

    Engine engine_;
};

std::vector<float> whiteNoise(std::size_t n, std::uint64_t seed) {
    auto noise = Random(seed).normal(n, 0.1F);
    for (float& v : noise) v = std::clamp(v, -0.6F, 0.6F);
    return noise;
}

}  // namespace

// ---- attenuation limit ----

TEST_F(Extension, TheLimitMixesInTheDelayedInput) {
    auto const sound = whiteNoise(8000, 1);
    auto const check = [&](int ms, char const* model, float limitDb) {
        ErrorBound bound("limit, 16-bit steps", 0.05);
        auto* const session = open(16000, ms, model);
        ASSERT_EQ(MorvaExt_NC_SetAttenuationLimit(session, limitDb), 0);
        auto const latency = static_cast<std::size_t>(MorvaExt_SessionLatencySamples(session));
        auto const out = cleanAll(session, sound);
        float const gain = std::pow(10.0F, -limitDb / 20.0F);
        for (std::size_t i = latency; i < out.size(); ++i) {
            bound.add(out[i], gain * sound[i - latency], kOneStep);
        }
    };
    for (int const ms : kDurations) check(ms, "random", 0.0F);
    for (float const limitDb : {0.5F, 12.0F, 40.0F}) check(20, "closed", limitDb);
}

TEST_F(Extension, RefusedLimitsChangeNothing) {
    auto* const session = open(16000, 10, "closed");
    auto const loudest = [&] { return std::ranges::max(cleanAll(session, whiteNoise(3200, 2))); };
    EXPECT_EQ(MorvaExt_NC_SetAttenuationLimit(session, 0.0F), 0);
    for (float const wrong : {-1.0F, -INFINITY, NAN}) {
        EXPECT_EQ(MorvaExt_NC_SetAttenuationLimit(session, wrong), 1);
    }
    EXPECT_GT(loudest(), 0.2F);
    EXPECT_EQ(MorvaExt_NC_SetAttenuationLimit(session, INFINITY), 0);
    loudest();
    EXPECT_LT(loudest(), kOneStep);
}

// ---- bypass ----

TEST_F(Extension, BypassIsTheDelayedInputAndTheModelListens) {
    for (int const hz : kRates) {
        for (int const ms : kDurations) {
            std::size_t const size = samples(hz, ms);
            auto const sound = Random(static_cast<std::uint64_t>(hz + ms)).pcm16(12 * size);
            auto const never = cleanAll(open(hz, ms, "random"), sound);
            auto* const session = open(hz, ms, "random");
            auto const latency = static_cast<std::size_t>(MorvaExt_SessionLatencySamples(session));
            auto const got = cleanAll(session, sound, [&](std::size_t k) {
                EXPECT_EQ(MorvaExt_NC_SetBypass(session, k >= 6 && k < 9), 0);
            });
            for (std::size_t i = 0; i < got.size(); ++i) {
                if (i / size == 6 || i / size == 9) continue;  // cross-fades
                bool const on = i / size == 7 || i / size == 8;
                ASSERT_EQ(got[i], on ? sound[i - latency] : never[i])
                    << hz << " " << ms << " " << i;
            }
            ASSERT_EQ(static_cast<std::size_t>(MorvaExt_SessionLatencySamples(session)), latency);
        }
    }
}

// However often the switch is thrown, the output is the fade between what sessions give that are
// never and always bypassed: no click, no shift, and nothing missing after a time without.
TEST_F(Extension, SwitchingFadesBetweenNeverAndAlways) {
    Random random(9);
    TRACE_SEED(random);
    struct Setting {
        int in;
        int out;
        int ms;
    };
    for (auto const [in, out, ms] :
         {Setting{16000, 16000, 10}, {48000, 16000, 10}, {44100, 48000, 20}, {8000, 96000, 40}}) {
        // The filter's table is read without interpolation: a clock that has run for another time
        // may round to the next entry.
        double const limit = in == out ? 0.05 : 4.0;
        ErrorBound bound("switching, " + std::to_string(in) + " -> " + std::to_string(out), limit);
        auto const sound = whiteNoise(static_cast<std::size_t>(in) * 6 / 5, 10);
        auto* const always = openNc(in, out, ms, "narrow");
        MorvaExt_NC_SetBypass(always, 1);
        auto const bypassed = cleanAll(always, sound);
        auto const cleaned = cleanAll(openNc(in, out, ms, "narrow"), sound);

        auto* const session = openNc(in, out, ms, "narrow");
        std::vector<float> shares = {0.0F};
        auto const switched = cleanAll(session, sound, [&](std::size_t k) {
            bool const change = k > 1 && random.chance(0.2);  // the first frame of `always` fades
            shares.push_back(change ? 1.0F - shares.back() : shares.back());
            MorvaExt_NC_SetBypass(session, shares.back() != 0.0F);
        });
        std::size_t const size = samples(out, ms);
        for (std::size_t i = 0; i < switched.size(); ++i) {
            float const from = shares[i / size];
            float const passed = static_cast<float>(i % size + 1) / static_cast<float>(size);
            float const share = from + passed * (shares[i / size + 1] - from);
            bound.add(switched[i], cleaned[i] + share * (bypassed[i] - cleaned[i]), kOneStep);
        }
    }
}

// ---- meters ----

TEST_F(Extension, MetersEqualSeparateSessions) {
    for (int const hz : {8000, 16000, 44100, 48000}) {
        for (int const ms : {10, 30}) {
            auto* const nc = open(hz, ms, "level");
            auto* const db = Morva_NoiseDB_CreateSession(rate(hz), duration(ms), "level");
            auto* const voiceSession = Morva_VAD_CreateSession(rate(hz), duration(ms), "vad");
            ASSERT_EQ(MorvaExt_NC_EnableVoice(nc, "vad"), 0);
            std::vector<short> out(samples(hz, ms));
            forEachFrame(toPcm(voice(hz, 1.0, 6)), out.size(), [&](std::size_t k, auto const& in) {
                float voiceScore = NAN;
                float noiseDb = NAN;
                ASSERT_EQ(clean(nc, in, out), 0);
                ASSERT_EQ(MorvaExt_NC_FrameMeters(nc, &voiceScore, &noiseDb), 0);
                ASSERT_EQ(voiceScore, vad(voiceSession, in)) << hz << " Hz, frame " << k;
                ASSERT_NEAR(noiseDb, level(db, in), 0.01F);  // but for rounding
            });
        }
    }
}

TEST_F(Extension, VoiceIsNotANumberUntilItIsEnabled) {
    auto* const session = open(16000, 10, "random");
    auto const score = [&] {
        float value = 0.0F;
        cleanAll(session, whiteNoise(160, 7));
        EXPECT_EQ(MorvaExt_NC_FrameMeters(session, &value, nullptr), 0);
        return value;
    };
    EXPECT_TRUE(std::isnan(score()));
    auto const unknown = observe([&] { return MorvaExt_NC_EnableVoice(session, "nothing"); });
    EXPECT_EQ(unknown.result, -3);
    EXPECT_THAT(unknown.err, ::testing::HasSubstr("Weight with this name isn't found"));
    EXPECT_TRUE(std::isnan(score()));
    EXPECT_EQ(MorvaExt_NC_EnableVoice(session, nullptr), 0);
    EXPECT_THAT(score(), ::testing::AllOf(::testing::Ge(0.0F), ::testing::Le(1.0F)));
}

// Far below the smallest integer sample as well.
TEST_F(Extension, FloatLevelsFollowTheSound) {
    auto const sound = whiteNoise(16000, 8);
    auto const levelAt = [&](float gain) {
        auto* const session = Morva_NoiseDB_CreateSession(rate(16000), duration(10), "level");
        auto quiet = sound;
        for (float& sample : quiet) sample *= gain;
        return valuesOf(quiet, 160, [&](auto const& f) { return level(session, f); }).back();
    };
    EXPECT_NEAR(levelAt(1e-4F), levelAt(1e-2F) - 40.0F, 3.0F);
    EXPECT_NEAR(levelAt(1e-5F), levelAt(1e-4F) - 20.0F, 3.0F);
}

TEST_F(Extension, BackgroundSpeakerOnlyWhereThereIsOne) {
    auto* const with = open(16000, 10, "random");
    auto* const without = open(16000, 10, "level");
    EXPECT_THAT(observe([&] { return MorvaExt_NC_SetBackgroundSpeaker(with, 1); }), gives(0));
    EXPECT_THAT(observe([&] { return MorvaExt_NC_SetBackgroundSpeaker(without, 1); }), gives(1));
}

// ---- what there is ----

TEST_F(Extension, ListOfModels) {
    auto const longWeight = randomNcWeight({.frameLength = 512, .filtrEnd = 128, .timeStamp = "n"});
    ASSERT_EQ(Engine::add(std::string(300, 'z').c_str(), longWeight), 0);
    EXPECT_EQ(MorvaExt_ListModels(nullptr, 0), 6);
    std::vector<MorvaExtModelInfo> models(8);
    models[2].sampleRate = -7;
    EXPECT_EQ(MorvaExt_ListModels(models.data(), 2), 6);
    EXPECT_EQ(models[2].sampleRate, -7) << "written past the capacity";
    EXPECT_EQ(MorvaExt_ListModels(models.data(), 8), 6);
    std::vector<std::string> seen;
    for (auto const& model : models) {
        seen.push_back(std::string(model.name) + " " + model.version + " " +
                       std::to_string(model.sampleRate) + " " + std::to_string(model.frameMs));
    }
    EXPECT_THAT(seen, ::testing::ElementsAre(
                          "closed 0.0.6 16000 20", "level 0.0.5 16000 20", "narrow 0.0.6 8000 20",
                          "random 0.0.6 16000 20", "vad VAD_0.0.1 8000 30",
                          std::string(127, 'z') + " 0.0.6 16000 32", "  0 0", "  0 0"));
    EXPECT_LT(models[5].size, longWeight.size());
    EXPECT_GT(models[5].size, longWeight.size() - 1000);
}

TEST_F(Extension, LastErrorIsPerThread) {
    observe([] { return Morva_NC_CloseSession(nullptr); });
    EXPECT_THAT(MorvaExt_LastError(), ::testing::HasSubstr("Trying to close"));
    std::string other = "not run";
    std::thread([&] { other = MorvaExt_LastError(); }).join();
    EXPECT_EQ(other, "");
}

TEST(ExtensionWithoutEngine, VersionAndFeatures) {
    EXPECT_THAT(MorvaExt_Version(), ::testing::MatchesRegex("[0-9]+\\.[0-9]+\\.[0-9]+"));
    EXPECT_THAT(MorvaExt_ProcessorFeatures(), ::testing::HasSubstr("avx2"));
}
