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

// The linker sends every block that is resampled through here: --wrap of Resampler::resample.
namespace {
thread_local std::size_t resampledBlocks = 0;
}
extern "C" {
unsigned __real__ZN5MORVA5UTILS9Resampler8resampleERKSt6vectorIfSaIfEERS4_(
    void*, std::vector<float> const&, std::vector<float>&);
unsigned __wrap__ZN5MORVA5UTILS9Resampler8resampleERKSt6vectorIfSaIfEERS4_(
    void* resampler, std::vector<float> const& in, std::vector<float>& out) {
    ++resampledBlocks;
    return __real__ZN5MORVA5UTILS9Resampler8resampleERKSt6vectorIfSaIfEERS4_(resampler, in, out);
}
}

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

std::vector<float> sine(int hz, double frequency, float amplitude, double seconds) {
    std::vector<float> sound(static_cast<std::size_t>(hz * seconds));
    for (std::size_t i = 0; i < sound.size(); ++i) {
        double const angle = 2.0 * std::numbers::pi * frequency * static_cast<double>(i) / hz;
        sound[i] = amplitude * static_cast<float>(std::sin(angle));
    }
    return sound;
}

std::vector<float> whiteNoise(std::size_t n, std::uint64_t seed) {
    auto noise = Random(seed).normal(n, 0.1F);
    for (float& v : noise) v = std::clamp(v, -0.6F, 0.6F);
    return noise;
}

float largestStep(std::vector<float> const& sound) {
    float largest = 0.0F;
    for (std::size_t i = 1; i < sound.size(); ++i) {
        largest = std::max(largest, std::abs(sound[i] - sound[i - 1]));
    }
    return largest;
}

// Cleans `sound` and calls `before(k)` ahead of frame k.
std::vector<float> cleanWith(void* session, std::vector<float> const& sound,
                             std::function<void(std::size_t)> const& before) {
    unsigned size = 0;
    unsigned outSize = 0;
    EXPECT_EQ(MorvaExt_SessionFrameSizes(session, &size, &outSize), 0);
    std::vector<float> all;
    std::vector<float> out(outSize);
    for (std::size_t k = 0; (k + 1) * size <= sound.size(); ++k) {
        before(k);
        auto const* const first = sound.data() + k * size;
        EXPECT_EQ(clean(session, std::vector<float>(first, first + size), out), 0);
        all.insert(all.end(), out.begin(), out.end());
    }
    return all;
}

// Mean power of frames of 256 samples at every fourth bin, Hann window.
std::vector<double> meanSpectrum(std::span<float const> sound) {
    constexpr std::size_t n = 256;
    std::vector<double> power(n / 8 + 1);
    for (std::size_t at = 0; at + n <= sound.size(); at += n / 2) {
        for (std::size_t k = 0; k < power.size(); ++k) {
            double re = 0.0;
            double im = 0.0;
            for (std::size_t i = 0; i < n; ++i) {
                double const angle = 2.0 * std::numbers::pi * static_cast<double>(4 * k * i % n) /
                                     static_cast<double>(n);
                double const hann =
                    0.5 - 0.5 * std::cos(2.0 * std::numbers::pi * static_cast<double>(i) / n);
                re += hann * sound[at + i] * std::cos(angle);
                im -= hann * sound[at + i] * std::sin(angle);
            }
            power[k] += re * re + im * im;
        }
    }
    return power;
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

TEST_F(Extension, NoBinFallsBelowTheLimit) {
    ASSERT_EQ(Engine::addShipped(MORVA_TEST_MODELS "NC_small_16k.mvw", "shipped"), 0);
    constexpr float limitDb = 12.0F;
    for (char const* const model : {"shipped", "random", "closed"}) {
        auto* const limited = open(16000, 10, model);
        ASSERT_EQ(MorvaExt_NC_SetAttenuationLimit(limited, limitDb), 0);
        auto const latency = static_cast<std::size_t>(MorvaExt_SessionLatencySamples(limited));
        auto const sound = whiteNoise(3 * 16000, 3);
        auto const cleaned = cleanAll(limited, sound);
        constexpr std::size_t settled = 16000;
        auto const in = meanSpectrum(std::span(sound).subspan(settled, 32000 - latency));
        auto const out = meanSpectrum(std::span(cleaned).subspan(settled + latency));
        double lowest = 0.0;
        for (std::size_t k = 0; k < in.size(); ++k) {
            lowest = std::min(lowest, 10.0 * std::log10(out[k] / in[k]));
        }
        EXPECT_GE(lowest, -limitDb - 0.05) << model;
        if (std::string(model) != "random") {
            EXPECT_LE(lowest, -limitDb + 0.5) << model;
        }
    }
}

TEST_F(Extension, RefusedLimitsChangeNothing) {
    auto* const session = open(16000, 10, "closed");
    EXPECT_EQ(MorvaExt_NC_SetAttenuationLimit(session, 0.0F), 0);
    for (float const wrong : {-1.0F, -INFINITY, NAN}) {
        EXPECT_EQ(MorvaExt_NC_SetAttenuationLimit(session, wrong), 1);
    }
    auto const open = cleanAll(session, sine(16000, 440.0, 0.5F, 0.2));
    EXPECT_GT(std::ranges::max(open), 0.49F);
    EXPECT_EQ(MorvaExt_NC_SetAttenuationLimit(session, INFINITY), 0);
    auto const shut = cleanAll(session, sine(16000, 440.0, 0.5F, 0.2));
    EXPECT_LT(std::ranges::max(std::span(shut).subspan(1600)), kOneStep);
}

TEST_F(Extension, ChangesDoNotClick) {
    constexpr float amplitude = 0.5F;
    auto const sound = sine(16000, 100.0, amplitude, 2.0);
    float const ownStep = largestStep(sound);
    // Steepest slope of a fade over a hop of 160 samples with a power-complementary window.
    float const fade = amplitude * 3.0F / 160.0F;
    Random random(4);
    TRACE_SEED(random);
    for (bool const limits : {true, false}) {
        auto* const session = open(16000, 10, "closed");
        auto const out = cleanWith(session, sound, [&](std::size_t k) {
            if (!limits) {
                MorvaExt_NC_SetBypass(session, random.chance(0.3));
            } else if (k % 3 == 0) {
                float const db = random.chance(0.5) ? 0.0F : random.uniform(0.0F, 60.0F);
                MorvaExt_NC_SetAttenuationLimit(session, db);
            }
        });
        EXPECT_LE(largestStep(out), ownStep + fade) << (limits ? "limit" : "bypass");
        EXPECT_GT(largestStep(out), ownStep * 0.9F);
    }
}

// ---- bypass ----

TEST_F(Extension, BypassIsTheInputAtTheReportedLatency) {
    for (int const hz : kRates) {
        for (int const ms : kDurations) {
            SCOPED_TRACE(::testing::Message() << hz << " Hz, " << ms << " ms");
            Random random(static_cast<std::uint64_t>(hz + ms));
            auto const sound = random.pcm16(static_cast<std::size_t>(hz) / 2);
            auto* const session = open(hz, ms, "narrow");
            int const latency = MorvaExt_SessionLatencySamples(session);
            ASSERT_GT(latency, 0);
            ASSERT_EQ(MorvaExt_NC_SetBypass(session, 1), 0);
            EXPECT_EQ(MorvaExt_SessionLatencySamples(session), latency);
            auto const out = cleanAll(session, sound);
            // From the second frame on the cross-fade is over.
            auto const from =
                std::max<std::size_t>(samples(hz, ms), static_cast<std::size_t>(latency));
            std::span const got = std::span(out).subspan(from);
            EXPECT_TRUE(std::ranges::equal(
                got,
                std::span(sound).subspan(from - static_cast<std::size_t>(latency), got.size())));
            EXPECT_EQ(Morva_NC_CloseSession(session), 0);
        }
    }
}

// Between different rates the two ways may differ by rounding to a sample, but not by more.
TEST_F(Extension, BypassBetweenRatesKeepsItsPlace) {
    for (auto const& [in, out] : {std::pair{48000, 16000}, {16000, 48000}, {44100, 8000}}) {
        auto const sound = sine(in, 300.0, 0.5F, 0.5);
        auto* const cleaned = openNc(in, out, 10, "narrow");
        auto* const bypassed = openNc(in, out, 10, "narrow");
        ASSERT_EQ(MorvaExt_NC_SetBypass(bypassed, 1), 0);
        auto const a = cleanAll(cleaned, sound);
        auto const b = cleanAll(bypassed, sound);
        ASSERT_EQ(a.size(), b.size());
        double const slope = 2.0 * std::numbers::pi * 300.0 / out * 0.5;
        ErrorBound bound(std::to_string(in) + " -> " + std::to_string(out) + ", samples", 1.1);
        for (std::size_t i = a.size() / 2; i < a.size(); ++i) bound.add(a[i], b[i], slope);
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
        auto const switched = cleanWith(session, sound, [&](std::size_t k) {
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

TEST_F(Extension, BypassConvertsNothingWhileItIsOff) {
    auto* const session = openNc(48000, 16000, 10, "narrow");
    std::vector<std::size_t> conversions;
    std::size_t before = 0;
    cleanWith(session, whiteNoise(48000 / 5, 11), [&](std::size_t k) {
        if (k > 0) conversions.push_back(resampledBlocks - before);
        before = resampledBlocks;
        MorvaExt_NC_SetBypass(session, k >= 10 && k < 13);
    });
    std::vector<std::size_t> expected(19, 2);  // into the model and out of it
    expected[11] = expected[12] = expected[13] = 3;
    EXPECT_GT(conversions[10], 3U);  // makes up for what was left out
    expected[10] = conversions[10];
    EXPECT_EQ(conversions, expected);
}

TEST_F(Extension, TheModelListensDuringBypass) {
    auto const sound = whiteNoise(16000, 5);
    auto* const steady = open(16000, 10, "random");
    auto* const switched = open(16000, 10, "random");
    auto const wanted = cleanAll(steady, sound);
    auto const got = cleanWith(switched, sound, [&](std::size_t k) {
        MorvaExt_NC_SetBypass(switched, k >= 20 && k < 40);
    });
    auto const between = [&](std::size_t first, std::size_t last) {
        return std::equal(got.begin() + static_cast<long>(first * 160),
                          got.begin() + static_cast<long>(last * 160),
                          wanted.begin() + static_cast<long>(first * 160));
    };
    EXPECT_TRUE(between(0, 20));
    EXPECT_FALSE(between(20, 40));
    EXPECT_TRUE(between(41, 100));
}

// ---- meters ----

TEST_F(Extension, MetersEqualSeparateSessions) {
    for (int const hz : {8000, 16000, 44100, 48000}) {
        for (int const ms : {10, 30}) {
            SCOPED_TRACE(::testing::Message() << hz << " Hz, " << ms << " ms");
            unsigned const size = samples(hz, ms);
            auto* const nc = open(hz, ms, "level");
            auto* const db = Morva_NoiseDB_CreateSession(rate(hz), duration(ms), "level");
            auto* const voiceSession = Morva_VAD_CreateSession(rate(hz), duration(ms), "vad");
            ASSERT_EQ(MorvaExt_NC_EnableVoice(nc, "vad"), 0);
            auto const sound = toPcm(voice(hz, 1.0, 6));
            std::vector<short> out(size);
            for (std::size_t at = 0; at + size <= sound.size(); at += size) {
                std::vector<short> const frame(sound.begin() + static_cast<long>(at),
                                               sound.begin() + static_cast<long>(at + size));
                float voiceScore = NAN;
                float noiseDb = NAN;
                ASSERT_EQ(clean(nc, frame, out), 0);
                ASSERT_EQ(MorvaExt_NC_FrameMeters(nc, &voiceScore, &noiseDb), 0);
                ASSERT_EQ(voiceScore, vad(voiceSession, frame));
                ASSERT_NEAR(noiseDb, level(db, frame), 0.01F);  // but for rounding
            }
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

TEST_F(Extension, FloatLevelIsTheIntegerLevel) {
    auto* const integers = Morva_NoiseDB_CreateSession(rate(16000), duration(10), "level");
    auto* const floats = Morva_NoiseDB_CreateSession(rate(16000), duration(10), "level");
    Random random(8);
    TRACE_SEED(random);
    for (int k = 0; k < 50; ++k) {
        auto const frame = random.pcm16(160);
        std::vector<float> same(frame.size());
        std::ranges::transform(frame, same.begin(), [](short s) { return kOneStep * s; });
        ASSERT_EQ(level(integers, frame), level(floats, same));
    }
}

TEST_F(Extension, BackgroundSpeakerOnlyWhereThereIsOne) {
    auto* const with = open(16000, 10, "random");
    auto* const without = open(16000, 10, "level");
    EXPECT_THAT(observe([&] { return MorvaExt_NC_SetBackgroundSpeaker(with, 1); }),
                gives(0, "", "Parameter env_enable_background_speaker_fix set to: 1\n"));
    EXPECT_THAT(observe([&] { return MorvaExt_NC_SetBackgroundSpeaker(without, 1); }), gives(1));
}

// ---- what there is ----

TEST_F(Extension, ListOfModels) {
    ASSERT_EQ(Engine::add(std::string(300, 'z').c_str(), randomNcWeight({.sampleRate = 8000,
                                                                         .frameLength = 256,
                                                                         .filtrEnd = 128,
                                                                         .timeStamp = "long"})),
              0);
    EXPECT_EQ(MorvaExt_ListModels(nullptr, 0), 6);
    std::vector<MorvaExtModelInfo> models(8);
    models[2].sampleRate = -7;
    EXPECT_EQ(MorvaExt_ListModels(models.data(), 2), 6);
    EXPECT_EQ(models[2].sampleRate, -7) << "written past the capacity";
    EXPECT_EQ(MorvaExt_ListModels(models.data(), 8), 6);
    std::vector<std::string> names;
    for (int i = 0; i < 6; ++i) names.emplace_back(models[static_cast<std::size_t>(i)].name);
    EXPECT_THAT(names, ::testing::ElementsAre("closed", "level", "narrow", "random", "vad",
                                              std::string(127, 'z')));
    EXPECT_STREQ(models[1].version, "0.0.5");
    EXPECT_EQ(models[1].sampleRate, 16000);
    EXPECT_EQ(models[1].frameMs, 20);
    EXPECT_EQ(models[5].frameMs, 32);
    EXPECT_STREQ(models[4].version, "VAD_0.0.1");
    auto const fileSize = randomNcWeight({.version = "0.0.5", .timeStamp = "l"}).size();
    EXPECT_LT(models[1].size, fileSize);
    EXPECT_GT(models[1].size, fileSize / 2);
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

TEST_F(Extension, WrongHandlesAreRefused) {
    auto* const vadSession = Morva_VAD_CreateSession(rate(16000), duration(10), "vad");
    int nothing = 0;
    float const frame[160] = {};
    float value = 0.0F;
    for (void* const handle :
         {vadSession, static_cast<void*>(&nothing), static_cast<void*>(nullptr)}) {
        auto const wrong = observe([&] {
            return std::vector<int>{MorvaExt_NC_SetAttenuationLimit(handle, 0.0F),
                                    MorvaExt_NC_SetBypass(handle, 1),
                                    MorvaExt_NC_SetBackgroundSpeaker(handle, 1),
                                    MorvaExt_NC_EnableVoice(handle, "vad"),
                                    MorvaExt_NC_FrameMeters(handle, &value, &value),
                                    MorvaExt_NoiseDB_FrameFloat(handle, frame, 160, &value)};
        });
        EXPECT_THAT(wrong.result, ::testing::Each(2));
        EXPECT_EQ(observe([&] { return MorvaExt_SessionLatencySamples(handle); }).result, -2);
    }
    EXPECT_EQ(
        observe([&] { return MorvaExt_SessionFrameSizes(&nothing, nullptr, nullptr); }).result, 2);
}
