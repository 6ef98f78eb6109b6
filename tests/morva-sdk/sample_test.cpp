// What sessions make of samples: hostile ones, equal ones, formats, resets, rounding modes.
#include <gtest/gtest.h>

#include <algorithm>
#include <cfenv>
#include <limits>
#include <span>

#include "engine.h"
#include "support/error_bound.h"

using namespace sdk_test;

namespace {

class Samples : public ::testing::Test {
protected:
    Samples() {
        for (std::string const name : {"NC_small_8k", "NC_small_16k", "c6.xs.f.ca03f4"}) {
            auto const file = MORVA_TEST_MODELS + name + ".mvw";
            EXPECT_EQ(Engine::addFile(file, name.c_str()).result, 0);
        }
        Engine::addIdentity("id", 16000, 20);
        Engine::add("band", test_support::randomNcWeight({.version = "NC_1.0.0"}));
        Engine::add("vad", test_support::randomVadWeight({}));
        Engine::add("db", test_support::randomNcWeight({.version = "0.0.5"}));
    }
    Engine engine_;
};

constexpr float kInf = std::numeric_limits<float>::infinity();
constexpr float kTiny = std::numeric_limits<float>::denorm_min();
constexpr float kHighest = 0.999969482421875F;
using Frame = std::vector<float>;

// The last three are sounds without measure.
Frame const kHostile[] = {{NAN},           {kInf},         {-kInf},     {kInf, NAN, -kInf},
                          {kTiny, -kTiny}, {1e-40F, 1.0F}, {NAN, 0.1F}, {2.0F, -2.0F},
                          {1e38F, 0.0F},   {3e38F, -3e38F}};

// Fills frames of a sound with one pattern each.
Frame disturbed(Frame sound, std::size_t at, std::size_t frame, std::span<Frame const> patterns) {
    for (auto const& pattern : patterns) {
        for (std::size_t i = 0; i < frame; ++i) sound[at + i] = pattern[i % pattern.size()];
        at += frame;
    }
    return sound;
}

Stream scores(int hz, int ms) {
    return {Kind::voice, hz, 0, ms, "vad"};
}
Stream levels(int hz, int ms) {
    return {Kind::level, hz, 0, ms, "db"};
}

}  // namespace

// With a mask of 1 nothing at all is left a second after ten bad frames; a trained model, whose
// level reference remembers loud frames for three seconds, is close to undisturbed.
TEST_F(Samples, HostileSoundStaysInRangeAndIsForgotten) {
    for (auto const& [hz, model] : {std::pair{16000, "id"},
                                    {44100, "id"},
                                    {48000, "id"},
                                    {48000, "NC_small_8k"},
                                    {48000, "NC_small_16k"},
                                    {48000, "c6.xs.f.ca03f4"},
                                    {48000, "band"}}) {
        bool const remembers = model != std::string("id");
        auto const sound = voice(hz, 2.2, 5);
        auto const frame = samples(hz, 10);
        auto const quiet = cleanAll(openNc(hz, hz, 10, model), sound);
        // What is loud beyond measure raises a trained model's level for longer.
        auto const patterns = std::span(kHostile).first(remembers ? 7 : std::size(kHostile));
        auto const noisy =
            cleanAll(openNc(hz, hz, 10, model), disturbed(sound, 50 * frame, frame, patterns));
        EXPECT_THAT(noisy, ::testing::Each(
                               ::testing::AllOf(::testing::Ge(-1.0F), ::testing::Le(kHighest))));
        std::size_t const after = 160 * frame;
        double const error = test_support::relativeError(std::span(noisy).subspan(after),
                                                         std::span(quiet).subspan(after));
        EXPECT_LT(error, remembers ? 0.4 : 3e-8) << model << " at " << hz;
    }
    auto const bad = disturbed(voice(48000, 1.0, 6), 9600, 480, kHostile);
    for (float const s : scores(48000, 10).run(bad)) ASSERT_TRUE(s >= 1e-5F && s <= 0.99999F) << s;
    for (float const db : levels(48000, 10).run(bad)) ASSERT_TRUE(db >= -60.0F && db < 91.0F) << db;
}

// The two sample types differ in nothing but the format: int16 is the truncated float. One
// buffer serves both directions.
TEST_F(Samples, Int16IsTheTruncatedFloat) {
    auto const pcm = toPcm(voice(48000, 0.5, 8));
    Frame unit(pcm.begin(), pcm.end());
    for (float& v : unit) v /= 32768.0F;
    EXPECT_EQ(scores(48000, 20).run(pcm), scores(48000, 20).run(unit));
    EXPECT_EQ(levels(48000, 20).run(pcm), levels(48000, 20).run(unit));
    auto* const session = openNc(48000, 48000, 20, "NC_small_16k");
    for (std::size_t at = 0; at + 960 <= unit.size(); at += 960) {
        float* const frame = &unit[at];
        EXPECT_EQ(Morva_NC_CleanAmbientNoiseFloat(session, frame, 960, frame, 960), 0);
    }
    std::vector<short> truncated;
    for (float const v : unit) truncated.push_back(static_cast<short>(v * 32768.0F));
    EXPECT_EQ(cleanAll(openNc(48000, 48000, 20, "NC_small_16k"), pcm), truncated);
}

TEST_F(Samples, ResetNoiseLevelSessionsAreLikeNew) {
    for (int hz : kRates) {
        for (int ms : kDurations) {
            auto const sound = voice(hz, 0.36, 11, 0.2F);
            auto const stream = levels(hz, ms);
            auto const first = levels(hz, ms).run(sound);
            EXPECT_NE(
                stream.run(disturbed(voice(hz, 0.5, 12, 0.9F), 0, samples(hz, ms) / 2, kHostile)),
                first);
            ASSERT_EQ(Morva_NoiseDB_ResetSession(stream.handle), 1);
            EXPECT_EQ(stream.run(sound), first) << hz << " Hz, " << ms << " ms";
        }
    }
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
                                            cleanAll(openNc(hz, hz, 10, "band"), sound),
                                            scores(hz, 10).run(sound), levels(hz, 30).run(sound)};
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
