// The plugin library loaded as a host loads it, in a process that uses the engine library itself.
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
#include "morva-sdk.h"
#include "support/captured_output.h"
#include "support/random.h"

using test_support::CapturedOutput;
using test_support::Random;

namespace {

constexpr int kRates[] = {8000, 12000, 16000, 24000, 32000, 44100, 48000, 88200, 96000};

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
    LADSPA_Descriptor const& type() const { return *descriptor(channels_ - 1); }
    void activate() { type().activate(handle_.get()); }
    float& control(std::string const& name) { return controls_.at(name); }

    void run(std::vector<float const*> const& in, std::vector<float*> const& out, std::size_t n) {
        for (unsigned long c = 0; c < channels_; ++c) {
            type().connect_port(handle_.get(), c, const_cast<float*>(in[c]));
            type().connect_port(handle_.get(), channels_ + c, out[c]);
        }
        type().run(handle_.get(), n);
    }

    // A whole mono sound in blocks of the lengths that `next` names.
    template <class Next>
    std::vector<float> clean(std::vector<float> const& sound, Next next) {
        std::vector<float> out(sound.size(), NAN);
        for (std::size_t at = 0; at < sound.size();) {
            std::size_t const n = std::min<std::size_t>(next(), sound.size() - at);
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
    unsigned long channels_;
    std::map<std::string, float> controls_;
    std::unique_ptr<void, Cleanup> handle_{nullptr, Cleanup{channels_}};
};

std::vector<float> noise(std::size_t n, std::uint64_t seed) {
    auto sound = Random(seed).normal(n, 0.1F);
    for (float& v : sound) v = std::clamp(v, -0.9F, 0.9F);
    return sound;
}

// The process's own engine, from the shared library, beside the plugin's.
class OwnEngine {
public:
    OwnEngine() {
        CapturedOutput const quiet(1);
        EXPECT_EQ(Morva_SDK_GlobalInit(L"" MORVA_MODELS_DIR, 1), 0);
        EXPECT_EQ(Morva_SDK_SetModel(L"NC_small_8k.mvw", "8"), 0);
        EXPECT_EQ(Morva_SDK_SetModel(L"NC_small_16k.mvw", "16"), 0);
        EXPECT_EQ(Morva_SDK_SetModel(L"c6.xs.f.ca03f4.mvw", "32"), 0);
    }
    OwnEngine(OwnEngine const&) = delete;
    OwnEngine& operator=(OwnEngine const&) = delete;
    ~OwnEngine() { Morva_SDK_GlobalDestroy(); }

    static void* open(int hz) {
        auto const rate = static_cast<MorvaSamplingRate>(hz);
        char const* const model = hz <= 8000 ? "8" : hz <= 16000 ? "16" : "32";
        return Morva_NC_CreateSession(rate, rate, MORVA_FRAME_10_MS, model);
    }
    static std::vector<float> clean(int hz, std::vector<float> const& sound) {
        void* const session = open(hz);
        auto const n = static_cast<unsigned>(hz / 100);
        std::vector<float> out(sound.size() / n * n);
        for (std::size_t at = 0; at < out.size(); at += n) {
            EXPECT_EQ(Morva_NC_CleanAmbientNoiseFloat(session, &sound[at], n, &out[at], n), 0);
        }
        return out;
    }
};

}  // namespace

TEST(Ladspa, TwoPluginsWithTheirPorts) {
    ASSERT_EQ(descriptor(2), nullptr);
    for (unsigned long const channels : {1UL, 2UL}) {
        auto const& type = *descriptor(channels - 1);
        EXPECT_STREQ(type.Label, channels == 1 ? "morva_mono" : "morva_stereo");
        ASSERT_EQ(type.PortCount, 2 * channels + 3);
        for (unsigned long port = 0; port < 2 * channels; ++port) {
            EXPECT_TRUE(LADSPA_IS_PORT_AUDIO(type.PortDescriptors[port]));
            EXPECT_EQ(LADSPA_IS_PORT_INPUT(type.PortDescriptors[port]) != 0, port < channels);
        }
        unsigned long const last = type.PortCount - 1;
        EXPECT_STREQ(type.PortNames[last], "latency");
        EXPECT_EQ(type.PortDescriptors[last], LADSPA_PORT_CONTROL | LADSPA_PORT_OUTPUT);
    }
    EXPECT_NE(descriptor(0)->UniqueID, descriptor(1)->UniqueID);
}

// Same sound as the library's, one FIFO frame later, whatever the host's blocks.
TEST(Ladspa, SoundIsTheLibrarysForAnyBlockLength) {
    OwnEngine const own;
    for (int const hz : kRates) {
        Random random(static_cast<std::uint64_t>(hz));
        TRACE_SEED(random);
        auto const sound = noise(static_cast<std::size_t>(hz) / 2, 1);
        auto const wanted = OwnEngine::clean(hz, sound);
        auto const fifo = static_cast<std::size_t>(hz / 100);
        for (int const blocks : {0, 1, 2}) {
            Instance plugin(hz);
            ASSERT_TRUE(plugin);
            auto const got = plugin.clean(sound, [&]() -> std::size_t {
                if (blocks == 0) return fifo;
                return blocks == 1 ? random.between(1, 64) : random.between(0, 5000);
            });
            EXPECT_TRUE(std::all_of(got.begin(), got.begin() + static_cast<long>(fifo),
                                    [](float v) { return v == 0.0F; }));
            EXPECT_TRUE(
                std::equal(got.begin() + static_cast<long>(fifo), got.end(), wanted.begin()))
                << hz << " Hz, blocks " << blocks;
        }
    }
}

TEST(Ladspa, BypassArrivesAfterTheReportedLatency) {
    for (int const hz : kRates) {
        Instance plugin(hz);
        plugin.control("Bypass") = 1.0F;
        auto const sound = noise(static_cast<std::size_t>(hz) / 4, 2);
        auto const faded = static_cast<std::size_t>(hz / 50);
        auto const out = plugin.clean(sound, [] { return 256U; });
        auto const latency = static_cast<std::size_t>(plugin.control("latency"));
        ASSERT_GT(latency, static_cast<std::size_t>(hz / 100));
        ASSERT_LT(latency, out.size() / 2);
        for (std::size_t i = latency + faded; i < out.size(); ++i) {
            ASSERT_NEAR(out[i], sound[i - latency], 1e-6F) << hz << " Hz, sample " << i;
        }
    }
}

TEST(Ladspa, LimitIsFollowedAndNonsenseIsSurvived) {
    Instance plugin(16000);
    auto const sound = noise(16000, 3);
    auto const power = [&](float limit) {
        plugin.control("Attenuation limit (dB)") = limit;
        auto const out = plugin.clean(sound, [] { return 512U; });
        double sum = 0.0;
        for (std::size_t i = 8000; i < out.size(); ++i) sum += std::pow(out[i], 2.0);
        return sum;
    };
    double const all = power(0.0F);
    EXPECT_NEAR(10.0 * std::log10(all / power(12.0F)), 12.0, 0.5);
    EXPECT_GT(10.0 * std::log10(all / power(100.0F)), 20.0);
    constexpr float big = std::numeric_limits<float>::infinity();
    for (float const nonsense : {-5.0F, -big, std::nanf("")}) {
        EXPECT_NEAR(power(nonsense) / all, 1.0, 1e-3) << nonsense;
    }
    EXPECT_GT(10.0 * std::log10(all / power(big)), 20.0);
}

TEST(Ladspa, ChannelsAreApartAndMayBeCleanedInPlace) {
    Instance stereo(48000, 2);
    Instance mono(48000);
    auto left = noise(24000, 4);
    auto right = noise(24000, 5);
    auto const wantedLeft = mono.clean(left, [] { return 333U; });
    mono.activate();  // forgets what it heard
    auto const wantedRight = mono.clean(right, [] { return 333U; });
    stereo.run({left.data(), right.data()}, {left.data(), right.data()}, left.size());
    EXPECT_EQ(left, wantedLeft);
    EXPECT_EQ(right, wantedRight);
}

TEST(Ladspa, OtherRatesAreRefusedOnStandardError) {
    for (int const hz : {0, 11025, 22050, 47999, 192000}) {
        CapturedOutput captured(2);
        CapturedOutput out(1);
        bool const opened{Instance(hz)};
        EXPECT_EQ(out.text(), "");
        EXPECT_NE(captured.text().find("morva_ladspa: "), std::string::npos) << hz;
        EXPECT_FALSE(opened) << hz;
    }
}

TEST(Ladspa, InstancesShareAnEngineThatEndsWithTheLast) {
    CapturedOutput out(1);
    CapturedOutput err(2);
    for (int round = 0; round < 3; ++round) {
        auto first = std::make_unique<Instance>(16000);
        auto second = std::make_unique<Instance>(48000, 2);
        ASSERT_TRUE(*first && *second);
        first.reset();
        auto const third = std::make_unique<Instance>(8000);
        ASSERT_TRUE(*third);
        second.reset();
        auto const sound = third->clean(noise(8000, 6), [] { return 64U; });
        EXPECT_TRUE(
            std::all_of(sound.begin(), sound.end(), [](float v) { return std::isfinite(v); }));
    }
    // The plugin's engine is not the one of the library that this program is linked to.
    EXPECT_LT(MorvaExt_ListModels(nullptr, 0), 0);
    EXPECT_NE(err.text().find("TRY TO GET NULL INSTANCE"), std::string::npos);
    EXPECT_EQ(out.text(), "");
}
