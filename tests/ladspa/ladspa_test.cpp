// The plugin through its library file, as hosts load it. The process uses the engine library itself
// too.
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <ladspa.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <map>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "morva-ext.h"
#include "morva-sdk/vocabulary.h"
#include "support/captured_output.h"
#include "support/random.h"

using MORVA::MORVA_SDK::kSamplingRatesHz;
using test_support::CapturedOutput;
using test_support::Random;

namespace {

LADSPA_Descriptor const* descriptor(unsigned long index) {
    static auto const function = [] {
        void* const library = dlopen(MORVA_LADSPA, RTLD_NOW | RTLD_GLOBAL);
        if (library == nullptr) throw std::runtime_error(dlerror());
        return reinterpret_cast<LADSPA_Descriptor_Function>(dlsym(library, "ladspa_descriptor"));
    }();
    return function(index);
}

// A host's side of one instance; ports are found by name, as hosts do.
class Instance {
public:
    explicit Instance(int hz, unsigned long channels = 1) : channels_(channels) {
        handle_.reset(type().instantiate(&type(), static_cast<unsigned long>(hz)));
        if (!handle_) return;
        for (unsigned long port = 0; port < type().PortCount; ++port) {
            if (!LADSPA_IS_PORT_CONTROL(type().PortDescriptors[port])) continue;
            type().connect_port(handle_.get(), port, &controls_[type().PortNames[port]]);
        }
        control("Attenuation limit (dB)") = 100.0F;
        activate();
    }

    explicit operator bool() const { return handle_ != nullptr; }
    void activate() { type().activate(handle_.get()); }
    float& control(std::string const& name) { return controls_.at(name); }

    void run(std::vector<float const*> const& in, std::vector<float*> const& out, std::size_t n) {
        for (unsigned long c = 0; c < channels_; ++c) {
            type().connect_port(handle_.get(), c, const_cast<float*>(in[c]));
            type().connect_port(handle_.get(), channels_ + c, out[c]);
        }
        type().run(handle_.get(), n);
    }

    // A whole mono sound in blocks of up to `longest` samples.
    std::vector<float> clean(std::vector<float> const& sound, std::size_t longest) {
        Random random(longest);
        std::vector<float> out(sound.size(), NAN);
        for (std::size_t at = 0; at < sound.size();) {
            auto const n = std::min<std::size_t>(random.between(0, longest), sound.size() - at);
            run({sound.data() + at}, {out.data() + at}, n);
            at += n;
        }
        return out;
    }

private:
    struct Cleanup {
        unsigned long channels;
        void operator()(void* handle) const { descriptor(channels - 1)->cleanup(handle); }
    };

    LADSPA_Descriptor const& type() const { return *descriptor(channels_ - 1); }

    unsigned long channels_;
    std::map<std::string, float> controls_;
    std::unique_ptr<void, Cleanup> handle_{nullptr, Cleanup{channels_}};
};

std::vector<float> noise(int samples, std::uint64_t seed) {
    auto sound = Random(seed).normal(static_cast<std::size_t>(samples), 0.1F);
    for (float& v : sound) v = std::clamp(v, -0.9F, 0.9F);
    return sound;
}

// The sound as the engine library cleans it.
std::vector<float> cleanedByLibrary(int hz, std::vector<float> const& sound) {
    char const* const model = hz <= 8000    ? "NC_small_8k.mvw"
                              : hz <= 16000 ? "NC_small_16k.mvw"
                                            : "c6.xs.f.ca03f4.mvw";
    auto const path = std::string(MORVA_MODELS_DIR "/") + model;
    CapturedOutput const quiet(1);
    EXPECT_EQ(Morva_SDK_GlobalInit(nullptr, 1), 0);
    EXPECT_EQ(Morva_SDK_SetModel(std::wstring(path.begin(), path.end()).c_str(), "model"), 0);
    auto const rate = static_cast<MorvaSamplingRate>(hz);
    void* const session = Morva_NC_CreateSession(rate, rate, MORVA_FRAME_10_MS, "model");
    auto const n = static_cast<unsigned>(hz / 100);
    std::vector<float> out(sound.size() / n * n);
    for (std::size_t at = 0; at < out.size(); at += n) {
        EXPECT_EQ(Morva_NC_CleanAmbientNoiseFloat(session, &sound[at], n, &out[at], n), 0);
    }
    Morva_SDK_GlobalDestroy();
    return out;
}

}  // namespace

// Same sound as the library's, one FIFO frame later, whatever the host's blocks.
TEST(Ladspa, SoundIsTheLibrarysForAnyBlockLength) {
    for (int const hz : kSamplingRatesHz) {
        auto const sound = noise(hz / 2, 1);
        std::vector<float> wanted(static_cast<std::size_t>(hz / 100));  // silence
        auto const cleaned = cleanedByLibrary(hz, sound);
        wanted.insert(wanted.end(), cleaned.begin(), cleaned.end());
        wanted.resize(sound.size());
        for (std::size_t const longest : {1U, 64U, 5000U}) {
            EXPECT_EQ(Instance(hz).clean(sound, longest), wanted)
                << hz << " Hz, blocks to " << longest;
        }
    }
}

TEST(Ladspa, BypassArrivesAfterTheReportedLatency) {
    for (int const hz : kSamplingRatesHz) {
        Instance plugin(hz);
        plugin.control("Bypass") = 1.0F;
        auto const sound = noise(hz / 4, 2);
        auto const out = plugin.clean(sound, 256);
        auto const latency = static_cast<std::size_t>(plugin.control("latency"));
        ASSERT_GT(latency, static_cast<std::size_t>(hz / 100));
        ASSERT_LT(latency, out.size() / 2);
        for (std::size_t i = latency + static_cast<std::size_t>(hz / 50); i < out.size(); ++i) {
            ASSERT_NEAR(out[i], sound[i - latency], 1e-6F) << hz << " Hz, sample " << i;
        }
    }
}

TEST(Ladspa, LimitIsFollowedAndNonsenseIsSurvived) {
    Instance plugin(16000);
    auto const sound = noise(16000, 3);
    auto const levelDb = [&](float limit) {
        plugin.control("Attenuation limit (dB)") = limit;
        auto const out = plugin.clean(sound, 512);
        double sum = 0.0;
        for (std::size_t i = 8000; i < out.size(); ++i) sum += std::pow(out[i], 2.0);
        return 10.0 * std::log10(sum);
    };
    double const all = levelDb(0.0F);
    constexpr float big = std::numeric_limits<float>::infinity();
    EXPECT_NEAR(all - levelDb(12.0F), 12.0, 0.5);
    for (float const none : {100.0F, big}) EXPECT_GT(all - levelDb(none), 20.0);
    for (float const nonsense : {-5.0F, -big, std::nanf("")})
        EXPECT_NEAR(levelDb(nonsense), all, 0.01);
}

TEST(Ladspa, ChannelsAreApartAndMayBeCleanedInPlace) {
    Instance stereo(48000, 2);
    Instance mono(48000);
    auto left = noise(24000, 4);
    auto right = noise(24000, 5);
    auto const wantedLeft = mono.clean(left, 333);
    mono.activate();  // forgets what it heard
    auto const wantedRight = mono.clean(right, 333);
    stereo.run({left.data(), right.data()}, {left.data(), right.data()}, left.size());
    EXPECT_EQ(left, wantedLeft);
    EXPECT_EQ(right, wantedRight);
}

TEST(Ladspa, OtherRatesAreRefusedOnStandardErrorAndTheEngineEndsWithTheLast) {
    CapturedOutput out(1);
    for (int const hz : {0, 11025, 22050, 47999, 192000}) {
        CapturedOutput err(2);
        EXPECT_FALSE(Instance(hz));
        EXPECT_NE(err.text().find("morva_ladspa: "), std::string::npos) << hz;
        auto first = std::make_unique<Instance>(16000);
        Instance second(48000, 2);
        first.reset();
        EXPECT_TRUE(second && Instance(8000));
    }
    CapturedOutput const err(2);
    EXPECT_LT(MorvaExt_ListModels(nullptr, 0), 0);  // the plugin's engine is not the library's
    EXPECT_EQ(out.text(), "");
}
