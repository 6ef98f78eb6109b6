// The additions to the C interface: attenuation limit, bypass, meters, lists and texts.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <thread>

#include "engine.h"
#include "support/error_bound.h"
#include "support/random.h"

using namespace sdk_test;
using test_support::ErrorBound;
using test_support::NcShape;
using test_support::Random;
using test_support::randomNcWeight;

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
        Engine::add("random", randomNcWeight({}));
        Engine::add("closed", closedNcWeight({}));
        Engine::add("level", randomNcWeight({.version = "0.0.5", .timeStamp = "l"}));
        Engine::add("band", randomNcWeight({.version = "NC_1.0.0"}));
        Engine::add("vad", test_support::randomVadWeight({}));
        Engine::addIdentity("narrow", 8000, 20);
    }
    Engine engine_;
};

std::vector<float> whiteNoise(std::size_t n, std::uint64_t seed) {
    auto noise = Random(seed).normal(n, 0.1F);
    for (float& v : noise) v = std::clamp(v, -0.6F, 0.6F);
    return noise;
}

std::size_t latencyOf(void* session) {
    return static_cast<std::size_t>(MorvaExt_SessionLatencySamples(session));
}

}  // namespace

// ---- attenuation limit ----

TEST_F(Extension, TheLimitMixesInTheDelayedInput) {
    ErrorBound bound("limit, 16-bit steps", 0.05);
    auto const sound = whiteNoise(8000, 1);
    auto const check = [&](int ms, char const* model, float limitDb) {
        auto* const session = openNc(16000, 16000, ms, model);
        ASSERT_EQ(MorvaExt_NC_SetAttenuationLimit(session, limitDb), 0);
        for (float const refused : {-1.0F, -INFINITY, NAN}) {
            ASSERT_EQ(MorvaExt_NC_SetAttenuationLimit(session, refused), 1);
        }
        auto const latency = latencyOf(session);
        auto const out = cleanAll(session, sound);
        float const gain = std::pow(10.0F, -limitDb / 20.0F);
        for (std::size_t i = latency; i < out.size(); ++i) {
            bound.add(out[i], gain * sound[i - latency], kOneStep);
        }
    };
    for (int const ms : kDurations) check(ms, "random", 0.0F);
    for (float const limitDb : {0.5F, 12.0F, 40.0F, INFINITY}) check(20, "closed", limitDb);
}

// ---- bypass ----

// However often the switch is thrown, the output is the fade between what sessions give that are
// never and always bypassed: no click, no shift, and nothing missing after a time without. Where
// the rate stays, bypassed sound is the delayed input to the bit.
TEST_F(Extension, SwitchingFadesBetweenNeverAndAlways) {
    Random random(9);
    TRACE_SEED(random);
    // The filter's table is read without interpolation: a clock that has run for another time may
    // round to the next entry.
    ErrorBound sameRate("switching, 16-bit steps", 0.05);
    ErrorBound otherRate("switching between rates, 16-bit steps", 8.0);
    auto const check = [&](int in, int out, int ms) {
        SCOPED_TRACE(::testing::Message() << in << " -> " << out << " Hz, " << ms << " ms");
        auto const sound = whiteNoise(samples(in, 1200), 10);
        auto* const always = openNc(in, out, ms, "narrow");
        MorvaExt_NC_SetBypass(always, 1);
        auto const bypassed = cleanAll(always, sound);
        auto const cleaned = cleanAll(openNc(in, out, ms, "narrow"), sound);
        std::size_t const size = samples(out, ms);
        auto const latency = latencyOf(always);
        for (std::size_t i = size + latency; in == out && i < bypassed.size(); ++i) {
            ASSERT_EQ(bypassed[i], sound[i - latency]) << i;
        }
        auto* const session = openNc(in, out, ms, "narrow");
        std::vector<float> shares = {0.0F};
        auto const switched = cleanAll(session, sound, [&](std::size_t k) {
            bool const change = k > 1 && random.chance(0.2);  // the first frame of `always` fades
            shares.push_back(change ? 1.0F - shares.back() : shares.back());
            MorvaExt_NC_SetBypass(session, shares.back() != 0.0F);
        });
        for (std::size_t i = 0; i < switched.size(); ++i) {
            float const from = shares[i / size];
            float const passed = static_cast<float>(i % size + 1) / static_cast<float>(size);
            float const share = from + passed * (shares[i / size + 1] - from);
            auto& bound = in == out ? sameRate : otherRate;
            bound.add(switched[i], cleaned[i] + share * (bypassed[i] - cleaned[i]), kOneStep);
        }
    };
    for (int const hz : kRates) {
        for (int const ms : kDurations) check(hz, hz, ms);
    }
    check(48000, 16000, 10);
    check(44100, 48000, 20);
    check(8000, 96000, 40);
}

// ---- meters ----

TEST_F(Extension, MetersEqualSeparateSessions) {
    auto const check = [](int hz, int ms, std::string const& model, std::string const& vad) {
        auto* const nc = openNc(hz, hz, ms, model.c_str());
        bool const asks = vad != model;
        ASSERT_EQ(asks ? MorvaExt_NC_EnableVoice(nc, vad.c_str()) : 0, 0);
        auto const sound = toPcm(voice(hz, 1.0, 6));
        auto const scores = Stream(Kind::voice, hz, hz, ms, vad).run(sound);
        auto const levels = Stream(Kind::level, hz, hz, ms, model).run(sound);
        std::vector<short> out(samples(hz, ms));
        forEachFrame(sound, out.size(), [&](std::size_t k, auto const& in) {
            float voiceScore = NAN;
            float noiseDb = NAN;
            ASSERT_EQ(clean(nc, in, out), 0);
            ASSERT_EQ(MorvaExt_NC_FrameMeters(nc, &voiceScore, &noiseDb), 0);
            ASSERT_EQ(voiceScore, scores[k]) << hz << " Hz, frame " << k;
            ASSERT_NEAR(noiseDb, levels[k], 0.01F);  // but for rounding
        });
    };
    for (int const hz : {8000, 16000, 44100, 48000}) {
        for (int const ms : {10, 30}) {
            check(hz, ms, "level", "vad");
            check(hz, ms, "band", "band");  // by itself
            check(hz, ms, "band", "vad");
        }
    }
}

TEST_F(Extension, WhatASessionCanDo) {
    auto* const session = openNc(16000, 16000, 10, "random");
    EXPECT_EQ(MorvaExt_NC_SetBackgroundSpeaker(session, 1), 0);
    EXPECT_EQ(MorvaExt_NC_SetBackgroundSpeaker(openNc(16000, 16000, 10, "level"), 1), 1);
    for (char const* model : {"nothing", static_cast<char const*>(nullptr)}) {
        float score = 0.0F;
        EXPECT_EQ(MorvaExt_NC_FrameMeters(session, &score, nullptr), 0);
        EXPECT_TRUE(std::isnan(score));
        auto const seen = observe([&] { return MorvaExt_NC_EnableVoice(session, model); });
        cleanAll(session, whiteNoise(160, 7));
        EXPECT_EQ(seen.result, model == nullptr ? 0 : -3) << seen.err;
    }
}

// ---- what there is ----

TEST_F(Extension, ListOfModels) {
    auto const longWeight = randomNcWeight({.frameLength = 512, .filtrEnd = 128, .timeStamp = "n"});
    Engine::add(std::string(300, 'z').c_str(), longWeight);
    EXPECT_EQ(MorvaExt_ListModels(nullptr, 0), 7);
    std::vector<MorvaExtModelInfo> models(9);
    EXPECT_EQ(MorvaExt_ListModels(models.data(), 9), 7);
    std::vector<std::string> seen;
    for (auto const& model : models) {
        seen.push_back(std::string(model.name) + " " + model.version + " " +
                       std::to_string(model.sampleRate) + " " + std::to_string(model.frameMs));
    }
    EXPECT_THAT(seen, ::testing::ElementsAre(
                          "band NC_1.0.0 16000 20", "closed 0.0.6 16000 20", "level 0.0.5 16000 20",
                          "narrow 0.0.6 8000 20", "random 0.0.6 16000 20", "vad VAD_0.0.1 8000 30",
                          std::string(127, 'z') + " 0.0.6 16000 32", "  0 0", "  0 0"));
}

TEST(ExtensionTexts, OfTheLastErrorTheVersionAndTheProcessor) {
    observe([] { return Morva_NC_CloseSession(nullptr); });
    EXPECT_THAT(MorvaExt_LastError(), ::testing::HasSubstr("TRY TO GET NULL INSTANCE"));
    std::string other = "not run";
    std::thread([&] { other = MorvaExt_LastError(); }).join();
    EXPECT_EQ(other, "");
    EXPECT_THAT(MorvaExt_Version(), MatchesPattern(std::string("[0-9]+\\.[0-9]+\\.[0-9]+")));
    EXPECT_THAT(MorvaExt_ProcessorFeatures(), MatchesPattern(std::string(".*avx2.*|neon")));
}

namespace {
std::vector<std::string> taken;
}

TEST(ExtensionTexts, GoToWhoTakesThemAndArePrintedAgainAfterwards) {
    auto const talk = [] {
        return Morva_SDK_SetModel(nullptr, "m") + Morva_NC_CloseSession(&taken);
    };
    MorvaExt_SetDiagnostics([](int stream, char const* text) {
        taken.push_back(std::to_string(stream) + text + "\n");
    });
    EXPECT_THAT(observe(talk), gives(2 - 3));
    MorvaExt_SetDiagnostics(nullptr);
    auto const printed = observe(talk);
    EXPECT_THAT(taken, ::testing::ElementsAre("1" + printed.out, "2" + printed.err));
}
