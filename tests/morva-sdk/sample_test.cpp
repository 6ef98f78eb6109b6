// What sessions make of samples: hostile ones, equal ones, formats, resets, rounding modes.
#include <gtest/gtest.h>

#include <algorithm>
#include <cfenv>
#include <limits>
#include <span>
#include <tuple>

#include "engine.h"

using namespace sdk_test;
using test_support::randomNcWeight;
using test_support::randomVadWeight;

namespace {

class Samples : public ::testing::Test {
protected:
    Samples() {
        for (std::string const name : {"NC_small_8k", "NC_small_16k", "c6.xs.f.ca03f4"}) {
            EXPECT_EQ(Engine::addShipped(MORVA_TEST_MODELS + name + ".mvw", name.c_str()), 0);
        }
        Engine::addIdentity("id", 16000, 20);
        EXPECT_EQ(Engine::add("vad", randomVadWeight({})), 0);
        EXPECT_EQ(Engine::add("db", randomNcWeight({.version = "0.0.5"})), 0);
    }
    Engine engine_;
};

constexpr float kInf = std::numeric_limits<float>::infinity();
constexpr float kTiny = std::numeric_limits<float>::denorm_min();
using Frame = std::vector<float>;

// The first four are no sound at all, the last three sounds without measure.
Frame const kHostile[] = {{NAN},         {kInf},          {-kInf},        {kInf, NAN, -kInf},
                          {2.0F, -2.0F}, {kTiny, -kTiny}, {1e-40F, 1.0F}, {NAN, 0.1F},
                          {1e38F, 0.0F}, {3e38F, -3e38F}};

// Fills frames of a sound with one pattern each.
Frame disturbed(Frame sound, std::size_t at, std::size_t frame, std::span<Frame const> patterns) {
    for (auto const& pattern : patterns) {
        for (std::size_t i = 0; i < frame; ++i) sound[at + i] = pattern[i % pattern.size()];
        at += frame;
    }
    return sound;
}

double snrDb(std::span<float const> wanted, std::span<float const> got) {
    double signal = 1e-20;
    double error = 1e-20;
    for (std::size_t i = 0; i < wanted.size(); ++i) {
        double const difference = static_cast<double>(got[i]) - wanted[i];
        signal += static_cast<double>(wanted[i]) * wanted[i];
        error += difference * difference;
    }
    return 10.0 * std::log10(signal / error);
}

// The values of a new session of a model that answers with one.
template <class Sample>
Frame scores(int hz, int ms, std::vector<Sample> const& sound) {
    auto* const session = Morva_VAD_CreateSession(rate(hz), duration(ms), "vad");
    return valuesOf(sound, samples(hz, ms), [&](auto const& f) { return vad(session, f); });
}
template <class Sample>
Frame levels(int hz, int ms, std::vector<Sample> const& sound) {
    auto* const session = Morva_NoiseDB_CreateSession(rate(hz), duration(ms), "db");
    return valuesOf(sound, samples(hz, ms), [&](auto const& f) { return level(session, f); });
}

}  // namespace

// With a mask of 1 nothing at all is left a second after ten bad frames; a trained model, whose
// level reference remembers loud frames for three seconds, is close to undisturbed.
TEST_F(Samples, HostileSoundStaysInRangeAndIsForgotten) {
    for (auto const& [hz, model, leastDb] : {std::tuple{16000, "id", 150.0},
                                             {44100, "id", 150.0},
                                             {48000, "id", 150.0},
                                             {48000, "NC_small_8k", 10.0},
                                             {48000, "NC_small_16k", 10.0},
                                             {48000, "c6.xs.f.ca03f4", 10.0}}) {
        auto const sound = voice(hz, 2.2, 5);
        auto const frame = samples(hz, 10);
        auto const quiet = cleanAll(openNc(hz, hz, 10, model), sound);
        // What is loud beyond measure raises a trained model's level for longer.
        auto const patterns = std::span(kHostile).first(leastDb > 100.0 ? std::size(kHostile) : 7);
        auto const noisy =
            cleanAll(openNc(hz, hz, 10, model), disturbed(sound, 50 * frame, frame, patterns));
        EXPECT_TRUE(std::ranges::all_of(
            noisy, [](float y) { return y >= -1.0F && y <= 0.999969482421875F; }));
        std::size_t const after = 160 * frame;
        EXPECT_GT(snrDb(std::span(quiet).subspan(after), std::span(noisy).subspan(after)), leastDb)
            << model << " at " << hz;
    }
    auto const bad = disturbed(voice(48000, 1.0, 6), 9600, 480, kHostile);
    for (float const s : scores(48000, 10, bad)) ASSERT_TRUE(s >= 1e-5F && s <= 0.99999F) << s;
    for (float const db : levels(48000, 10, bad)) ASSERT_TRUE(db >= -60.0F && db < 91.0F) << db;
}

TEST_F(Samples, WhatIsNoSoundIsSilenceAndLoudSamplesClip) {
    auto const sound = voice(48000, 0.5, 5);
    auto const cleanedWith = [&](Frame const& pattern) {
        return cleanAll(openNc(48000, 44100, 10, "c6.xs.f.ca03f4"),
                        disturbed(sound, 4800, 480, {&pattern, 1}));
    };
    auto const silent = cleanedWith({0.0F});
    for (auto const& pattern : std::span(kHostile).first(4))
        EXPECT_EQ(cleanedWith(pattern), silent);
    EXPECT_EQ(cleanedWith({3e38F, -3e38F}), cleanedWith({1e7F, -1e7F}));
    auto const loud = cleanAll(openNc(16000, 16000, 10, "id"), Frame(1600, 3e38F));
    EXPECT_EQ(*std::ranges::max_element(loud), 0.999969482421875F);
}

// Up to the rounding of the transforms.
TEST_F(Samples, FullScaleSaturates) {
    auto const high = cleanAll(openNc(16000, 16000, 10, "id"), Frame(1600, 1.0F));
    EXPECT_EQ(*std::ranges::max_element(high), 0.999969482421875F);
    EXPECT_GE(high.back(), 0.99993F);
    auto const low = cleanAll(openNc(16000, 16000, 10, "id"), std::vector<short>(1600, -32768));
    EXPECT_LE(low.back(), -32767);
}

// The two sample types differ in nothing but the format: int16 is the truncated float.
TEST_F(Samples, Int16IsTheTruncatedFloat) {
    for (auto const& [in, out] : {std::pair{16000, 16000}, {48000, 44100}}) {
        auto const pcm = toPcm(voice(in, 0.5, 8));
        Frame unit(pcm.begin(), pcm.end());
        for (float& v : unit) v /= 32768.0F;
        std::vector<short> truncated;
        for (float const v : cleanAll(openNc(in, out, 20, "NC_small_16k"), unit)) {
            truncated.push_back(static_cast<short>(v * 32768.0F));
        }
        EXPECT_EQ(cleanAll(openNc(in, out, 20, "NC_small_16k"), pcm), truncated);
        EXPECT_EQ(scores(in, 20, pcm), scores(in, 20, unit));
        EXPECT_EQ(levels(in, 20, pcm), levels(in, 20, unit));
    }
}

TEST_F(Samples, ResetNoiseLevelSessionsAreLikeNew) {
    for (int hz : kRates) {
        for (int ms : kDurations) {
            auto const size = samples(hz, ms);
            auto const sound = voice(hz, 0.36, 11, 0.2F);
            auto const loud = disturbed(voice(hz, 0.5, 12, 0.9F), 0, size / 2, kHostile);
            auto* const session = Morva_NoiseDB_CreateSession(rate(hz), duration(ms), "db");
            auto const frame = [&](auto const& f) { return level(session, f); };
            auto const first = levels(hz, ms, sound);
            EXPECT_NE(valuesOf(loud, size, frame), first);
            ASSERT_EQ(Morva_NoiseDB_ResetSession(session), 1);
            EXPECT_EQ(valuesOf(sound, size, frame), first) << hz << " Hz, " << ms << " ms";
        }
    }
}

// Refused frames change nothing, and one buffer serves both directions.
TEST_F(Samples, InPlaceBetweenRefusedFrames) {
    auto const sound = voice(48000, 0.3, 14);
    auto const wanted = cleanAll(openNc(48000, 48000, 10, "c6.xs.f.ca03f4"), sound);
    auto* const session = openNc(48000, 48000, 10, "c6.xs.f.ca03f4");
    auto buffer = sound;
    for (std::size_t at = 0; at + 480 <= buffer.size(); at += 480) {
        float* const frame = &buffer[at];
        observe([&] {
            return Morva_NC_CleanAmbientNoiseFloat(session, frame, 479, frame, 480) +
                   Morva_NC_CleanAmbientNoiseFloat(session, frame, 480, nullptr, 480);
        });
        EXPECT_EQ(Morva_NC_CleanAmbientNoiseFloat(session, frame, 480, frame, 480), 0);
    }
    EXPECT_EQ(buffer, wanted);
}

// Whatever the caller's thread rounds to and does with denormal numbers, from the opening of a
// session on; and its mode is as it was afterwards.
TEST_F(Samples, TheCallersRoundingChangesNoBit) {
    for (int hz : {44100, 48000, 16000}) {
        auto const sound = voice(hz, 1.2, 15);
        std::vector<Frame> wanted;
        for (int const mode : {FE_TONEAREST, FE_DOWNWARD, FE_UPWARD, FE_TOWARDZERO}) {
            std::fesetround(mode);
            std::vector<Frame> const got = {cleanAll(openNc(hz, hz, 10, "c6.xs.f.ca03f4"), sound),
                                            cleanAll(openNc(hz, 24000, 20, "NC_small_8k"), sound),
                                            scores(hz, 10, sound), levels(hz, 30, sound)};
            int const after = std::fegetround();
            std::fesetround(FE_TONEAREST);
            EXPECT_EQ(after, mode);
            if (wanted.empty()) wanted = got;
            EXPECT_TRUE(got == wanted) << hz << " Hz, mode " << mode;
        }
    }
    volatile float const tiny = kTiny;
    EXPECT_GT(tiny * 2.0F, 0.0F);
}
