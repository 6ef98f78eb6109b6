// What sessions make of samples: hostile ones, equal ones, formats, resets.
#include <gtest/gtest.h>

#include <algorithm>
#include <cfenv>
#include <limits>

#include "engine.h"

using namespace sdk_test;
using test_support::randomNcWeight;
using test_support::randomVadWeight;

namespace {

constexpr char const* kShipped[] = {"NC_small_8k", "NC_small_16k", "c6.xs.f.ca03f4"};

class Samples : public ::testing::Test {
protected:
    Samples() {
        for (std::string const name : kShipped) {
            EXPECT_EQ(Engine::addShipped(MORVA_TEST_MODELS + name + ".mvw", name.c_str()), 0);
        }
        Engine::addIdentity("id", 16000, 20);
        EXPECT_EQ(Engine::add("vad", randomVadWeight({})), 0);
        EXPECT_EQ(Engine::add("db", randomNcWeight({.version = "0.0.5"})), 0);
    }
    Engine engine_;
};

// One hostile frame of each kind after the other.
std::vector<float> hostileFrame(int kind, std::size_t n) {
    constexpr float inf = std::numeric_limits<float>::infinity();
    constexpr float nan = std::numeric_limits<float>::quiet_NaN();
    constexpr float tiny = std::numeric_limits<float>::denorm_min();
    constexpr float huge = std::numeric_limits<float>::max();
    std::vector<std::vector<float>> const patterns = {
        {nan},         {inf},         {-inf},        {inf, -inf}, {nan, 0.1F, inf, 1e38F},
        {huge, -huge}, {1e38F, 0.0F}, {tiny, -tiny}, {-0.0F},     {2.0F, -2.0F},
        {1e-40F, 1.0F}};
    auto const& pattern = patterns[static_cast<std::size_t>(kind) % patterns.size()];
    std::vector<float> frame(n);
    for (std::size_t i = 0; i < n; ++i) frame[i] = pattern[i % pattern.size()];
    return frame;
}
constexpr int kHostileKinds = 11;

// Puts hostile frames into a sound from `at` on.
std::vector<float> disturbed(std::vector<float> sound, std::size_t at, std::size_t frame,
                             int first = 0, int count = kHostileKinds) {
    for (int kind = first; kind < first + count; ++kind, at += frame) {
        std::ranges::copy(hostileFrame(kind, frame), sound.begin() + static_cast<long>(at));
    }
    return sound;
}

double snrDb(std::vector<float> const& wanted, std::vector<float> const& got, std::size_t from) {
    double signal = 1e-20;
    double error = 1e-20;
    for (std::size_t i = from; i < wanted.size(); ++i) {
        signal += static_cast<double>(wanted[i]) * wanted[i];
        error +=
            (static_cast<double>(got[i]) - wanted[i]) * (static_cast<double>(got[i]) - wanted[i]);
    }
    return 10.0 * std::log10(signal / error);
}

}  // namespace

// With a mask of 1 nothing at all is left a second after eleven bad frames; a trained model, whose
// level reference remembers loud frames for three seconds, is close to undisturbed. Samples that
// are no sound are like silence to it.
TEST_F(Samples, HostileSoundStaysInRangeAndIsForgotten) {
    auto const afterwards = [](int hz, std::string const& model, int first, int count) {
        auto const sound = voice(hz, 2.2, 5);
        auto const frame = samples(hz, 10);
        std::size_t const at = 50 * frame;
        auto const quiet = cleanAll(openNc(hz, hz, 10, model.c_str()), sound);
        auto const noisy =
            cleanAll(openNc(hz, hz, 10, model.c_str()), disturbed(sound, at, frame, first, count));
        EXPECT_TRUE(std::ranges::all_of(
            noisy, [](float y) { return y >= -1.0F && y <= 0.999969482421875F; }));
        std::size_t const second =
            at + static_cast<std::size_t>(count) * frame + static_cast<std::size_t>(hz);
        return snrDb(quiet, noisy, second);
    };
    for (int hz : {16000, 44100, 48000}) EXPECT_GT(afterwards(hz, "id", 0, kHostileKinds), 150.0);
    double worst = 1000.0;
    for (std::string const model : kShipped) {
        for (int kind : {0, 1, 2, 3, 7, 8, 9, 10}) {  // but for what is a sound without measure
            worst = std::min(worst, afterwards(48000, model, kind, 1));
        }
    }
    std::printf("[   after  ] hostile frames, trained models: at least %.1f dB\n", worst);
    EXPECT_GT(worst, 10.0);
}

TEST_F(Samples, WhatIsNoSoundIsSilence) {
    auto const sound = voice(48000, 0.5, 5);
    for (int kind = 0; kind < 4; ++kind) {  // those without a sound in them
        auto silent = sound;
        std::fill_n(silent.begin() + 4800, 480, 0.0F);
        EXPECT_EQ(cleanAll(openNc(48000, 44100, 10, "c6.xs.f.ca03f4"),
                           disturbed(sound, 4800, 480, kind, 1)),
                  cleanAll(openNc(48000, 44100, 10, "c6.xs.f.ca03f4"), silent))
            << kind;
    }
}

TEST_F(Samples, HostileSoundLeavesFiniteValues) {
    auto const sound = voice(48000, 2.0, 6);
    auto const bad = disturbed(sound, 480 * 20, 480);
    auto const run = [&](auto open, auto frame, std::vector<float> const& input) {
        auto* const session = open();
        return valuesOf(input, 480, [&](auto const& f) { return frame(session, f); });
    };
    auto const openVad = [] { return Morva_VAD_CreateSession(rate(48000), duration(10), "vad"); };
    auto const openDb = [] { return Morva_NoiseDB_CreateSession(rate(48000), duration(10), "db"); };
    auto const vadOf = [](void* s, std::vector<float> const& f) { return vad(s, f); };
    auto const levelOf = [](void* s, std::vector<float> const& f) { return level(s, f); };
    for (float const score : run(openVad, vadOf, bad))
        ASSERT_TRUE(score >= 1e-5F && score <= 0.99999F);
    auto const levels = run(openDb, levelOf, bad);
    for (float const db : levels) ASSERT_TRUE(db >= -60.0F && db < 91.0F) << db;
    EXPECT_NEAR(levels.back(), run(openDb, levelOf, sound).back(), 3.0F);
}

// What the changed weights of the fuzzer show at length.
TEST_F(Samples, AWeightOfNoNumbersGivesLegalSamples) {
    test_support::WeightWriter bad;
    bad.add("MU", std::vector<float>{NAN}).add("SD", std::vector<float>{1e-38F});
    ASSERT_EQ(Engine::add("nan", bad.bytes() + randomNcWeight({.timeStamp = "nan"})), 0);
    for (float const y : cleanAll(openNc(16000, 48000, 10, "nan"), voice(16000, 0.1, 5)))
        ASSERT_TRUE(y >= -1.0F && y < 1.0F) << y;
}

TEST_F(Samples, FullScaleSaturates) {
    auto* const session = openNc(16000, 16000, 10, "id");
    auto* const session16 = openNc(16000, 16000, 10, "id");
    std::vector<float> const loud(1600, 1.0F);
    auto const out = cleanAll(session, loud);
    EXPECT_FLOAT_EQ(out.back(), 0.999969482421875F);
    EXPECT_LE(*std::ranges::max_element(out), 0.999969482421875F);
    auto const low = cleanAll(session16, std::vector<short>(1600, -32768));
    EXPECT_LE(low.back(), -32767);
    EXPECT_EQ(*std::ranges::min_element(low), low.back());
}

// The two sample types differ in nothing but the format: int16 is the truncated float.
TEST_F(Samples, Int16IsTheTruncatedFloat) {
    for (auto const& [in, out] : {std::pair{16000, 16000}, {48000, 44100}}) {
        auto const pcm = toPcm(voice(in, 0.5, 8));
        std::vector<float> unit(pcm.begin(), pcm.end());
        for (float& v : unit) v /= 32768.0F;
        std::vector<short> truncated;
        for (float const v : cleanAll(openNc(in, out, 20, "NC_small_16k"), unit)) {
            truncated.push_back(static_cast<short>(v * 32768.0F));
        }
        EXPECT_EQ(cleanAll(openNc(in, out, 20, "NC_small_16k"), pcm), truncated);
    }
}

// Any grouping of the same samples into frames runs the same hops; only the delay differs.
TEST_F(Samples, FrameLengthChangesOnlyTheDelay) {
    auto const sound = voice(16000, 1.2, 9);
    auto const ten = cleanAll(openNc(16000, 16000, 10, "NC_small_16k"), sound);
    for (int ms : {20, 30, 40}) {
        EXPECT_EQ(cleanAll(openNc(16000, 16000, ms, "NC_small_16k"), sound), ten) << ms;
    }
}

TEST_F(Samples, ResetNoiseLevelSessionsAreLikeNew) {
    for (int hz : kRates) {
        for (int ms : kDurations) {
            auto const sound = voice(hz, 0.36, 11, 0.2F);
            auto const loud = disturbed(voice(hz, 0.5, 12, 0.9F), 0, samples(hz, ms) / 2);
            auto* const session = Morva_NoiseDB_CreateSession(rate(hz), duration(ms), "db");
            auto const levels = [&](std::vector<float> const& input) {
                return valuesOf(input, samples(hz, ms),
                                [&](auto const& f) { return level(session, f); });
            };
            auto const first = levels(sound);
            EXPECT_NE(levels(loud), first);
            ASSERT_EQ(Morva_NoiseDB_ResetSession(session), 1);
            EXPECT_EQ(levels(sound), first) << hz << " Hz, " << ms << " ms";
            EXPECT_GT(first.back(), first.front());
        }
    }
}

TEST_F(Samples, RefusedFramesChangeNothing) {
    auto const sound = voice(44100, 0.3, 13);
    auto const wanted = cleanAll(openNc(44100, 48000, 10, "NC_small_16k"), sound);
    auto* const session = openNc(44100, 48000, 10, "NC_small_16k");
    std::vector<float> got;
    std::vector<float> out(480);
    for (std::size_t at = 0; at + 441 <= sound.size(); at += 441) {
        std::vector<float> const frame(sound.begin() + static_cast<long>(at),
                                       sound.begin() + static_cast<long>(at + 441));
        observe([&] {
            return Morva_NC_CleanAmbientNoiseFloat(session, frame.data(), 440, out.data(), 480) +
                   Morva_NC_CleanAmbientNoiseFloat(session, frame.data(), 441, nullptr, 480);
        });
        EXPECT_EQ(clean(session, frame, out), 0);
        got.insert(got.end(), out.begin(), out.end());
    }
    EXPECT_EQ(got, wanted);
}

// One buffer for both directions, and the caller's treatment of denormal numbers.
TEST_F(Samples, InPlaceAndWithTheCallersRounding) {
    auto const sound = voice(48000, 0.3, 14);
    auto const wanted = cleanAll(openNc(48000, 48000, 10, "c6.xs.f.ca03f4"), sound);
    auto* const session = openNc(48000, 48000, 10, "c6.xs.f.ca03f4");
    auto buffer = sound;
    for (std::size_t at = 0; at + 480 <= buffer.size(); at += 480) {
        EXPECT_EQ(Morva_NC_CleanAmbientNoiseFloat(session, &buffer[at], 480, &buffer[at], 480), 0);
    }
    EXPECT_EQ(buffer, wanted);
    volatile float const tiny = std::numeric_limits<float>::denorm_min();
    EXPECT_GT(tiny * 2.0F, 0.0F);
    EXPECT_EQ(std::fegetround(), FE_TONEAREST);
}
