// What the tests of the C interface share: the engine for the length of a test, calls with their
// printed text, frames and sounds.
#pragma once

#include <gmock/gmock.h>

#include <cmath>
#include <numbers>
#include <regex>
#include <string>
#include <utility>
#include <vector>

#include "morva-sdk/morva-ext.h"
#include "morva-sdk/morva-sdk.h"
#include "support/captured_output.h"
#include "support/temp_dir.h"
#include "support/weight_writer.h"

namespace sdk_test {

inline constexpr int kRates[] = {8000, 12000, 16000, 24000, 32000, 44100, 48000, 88200, 96000};
inline constexpr int kDurations[] = {10, 20, 30, 40};

inline MorvaSamplingRate rate(int hz) {
    return static_cast<MorvaSamplingRate>(hz);
}
inline MorvaFrameDuration duration(int ms) {
    return static_cast<MorvaFrameDuration>(ms);
}
inline unsigned samples(int hz, int ms) {
    return static_cast<unsigned>(hz * ms / 1000);
}

// What a call returned and printed.
template <class Result>
struct Outcome {
    Result result;
    std::string out;
    std::string err;
};

template <class Call>
auto observe(Call call) {
    test_support::CapturedOutput out(1);
    test_support::CapturedOutput err(2);
    auto const result = call();
    auto error = err.text();
    return Outcome<decltype(call())>{result, out.text(), std::move(error)};
}

// Matches an Outcome that printed this, and nothing on the stream that is not named.
template <class Result>
auto gives(Result result, ::testing::Matcher<std::string> const& err = std::string(),
           ::testing::Matcher<std::string> const& out = std::string()) {
    using Seen = Outcome<Result>;
    return ::testing::AllOf(::testing::Field("result", &Seen::result, result),
                            ::testing::Field("stderr", &Seen::err, err),
                            ::testing::Field("stdout", &Seen::out, out));
}

// The whole text, by the rules of POSIX on every system.
MATCHER_P(MatchesPattern, pattern, "matches " + pattern) {
    return std::regex_match(arg, std::regex(pattern, std::regex::extended));
}

// Matches an Outcome of an engine exception: its one text on standard error. `place` is what stands
// between "in file " and " Function " (a regular expression).
template <class Result>
auto fails(Result result, std::string const& function, std::string const& message,
           std::string const& place = "[a-z_/0-9-]* Line [0-9]*") {
    auto const text = "MORVA_Exeption in file " + place + " Function " + function + "\n messege ";
    return gives(result, MatchesPattern(text + message + "\n"), ::testing::_);
}

// The engine for one test, without printing.
class Engine {
public:
    explicit Engine(wchar_t const* path = nullptr) {
        observe([&] { return Morva_SDK_GlobalInit(path, 1); });
    }
    Engine(Engine const&) = delete;
    Engine& operator=(Engine const&) = delete;
    ~Engine() { Morva_SDK_GlobalDestroy(); }

    static auto addBlob(std::string const& bytes, char const* name) {
        return observe([&] {
            return Morva_SDK_SetModel_Blob(bytes.data(), static_cast<unsigned>(bytes.size()), name);
        });
    }
    static auto addFile(std::string const& file, char const* name) {
        std::wstring const path(file.begin(), file.end());
        return observe([&] { return Morva_SDK_SetModel(path.c_str(), name); });
    }
    static void add(char const* name, std::string const& weight) {
        EXPECT_EQ(addBlob(weight, name).result, 0) << name;
    }
    static void addIdentity(char const* name, int hz, int modelMs) {
        test_support::NcShape shape;
        shape.sampleRate = hz;
        shape.frameLength = hz * modelMs / 1000;
        shape.timeStamp = name;
        add(name, test_support::identityNcWeight(shape));
    }
};

inline void* openNc(int in, int out, int ms, char const* model) {
    return Morva_NC_CreateSession(rate(in), rate(out), duration(ms), model);
}

// One call for both sample types, so that tests can be written once.
template <class Sample>
int clean(void* session, std::vector<Sample> const& in, std::vector<Sample>& out) {
    auto const call = [&](auto function) {
        return function(session, in.data(), static_cast<unsigned>(in.size()), out.data(),
                        static_cast<unsigned>(out.size()));
    };
    if constexpr (std::is_same_v<Sample, short>) return call(Morva_NC_CleanAmbientNoiseInt16);
    if constexpr (std::is_same_v<Sample, float>) return call(Morva_NC_CleanAmbientNoiseFloat);
}

enum class Kind { noise, voice, level };

// The value of a model that answers with one.
template <class Sample>
float valueOf(Kind kind, void* session, std::vector<Sample> const& in) {
    auto const size = static_cast<unsigned>(in.size());
    if constexpr (std::is_same_v<Sample, short>) {
        auto* const call = kind == Kind::voice ? Morva_VAD_FrameInt16 : Morva_NoiseDB_FrameInt16;
        return call(session, in.data(), size);
    } else {
        if (kind == Kind::voice) return Morva_VAD_FrameFloat(session, in.data(), size);
        float db = NAN;
        EXPECT_EQ(MorvaExt_NoiseDB_FrameFloat(session, in.data(), size, &db), 0);
        return db;
    }
}

// Voice-like sound: harmonics of a gliding pitch in syllables, over a little noise. -1..1.
inline std::vector<float> voice(int hz, double seconds, unsigned seed, float noise = 0.01F) {
    test_support::RandomValues random(seed);
    auto const n = static_cast<std::size_t>(hz * seconds);
    auto sound = random.vector(static_cast<int>(n), -noise, noise);
    double phase = 0.0;
    for (std::size_t i = 0; i < n; ++i) {
        double const t = static_cast<double>(i) / hz;
        phase += 2.0 * std::numbers::pi * (140.0 + 30.0 * std::sin(3.0 * t + seed)) / hz;
        double const syllable = std::max(0.0, std::sin(2.0 * std::numbers::pi * 3.0 * t));
        double tone = 0.0;
        for (int k = 1; k * 180 < std::min(hz / 2, 4000); ++k) tone += std::sin(k * phase) / k;
        sound[i] += static_cast<float>(0.15 * syllable * tone);
    }
    return sound;
}

inline std::vector<short> toPcm(std::vector<float> const& sound) {
    std::vector<short> pcm(sound.size());
    for (std::size_t i = 0; i < pcm.size(); ++i) pcm[i] = static_cast<short>(sound[i] * 32767.0F);
    return pcm;
}

// The whole frames of a sound, one after the other.
template <class Sample, class Body>
void forEachFrame(std::vector<Sample> const& sound, std::size_t size, Body body) {
    for (std::size_t k = 0; (k + 1) * size <= sound.size(); ++k) {
        auto const first = sound.begin() + static_cast<std::ptrdiff_t>(k * size);
        body(k, std::vector<Sample>(first, first + static_cast<std::ptrdiff_t>(size)));
    }
}

// Cleans a sound frame by frame, with `before(k)` ahead of frame k.
template <class Sample, class Before = void (*)(std::size_t)>
std::vector<Sample> cleanAll(
    void* session, std::vector<Sample> const& sound, Before before = [](std::size_t) {}) {
    unsigned inSize = 0;
    unsigned outSize = 0;
    EXPECT_EQ(MorvaExt_SessionFrameSizes(session, &inSize, &outSize), 0);
    std::vector<Sample> all;
    std::vector<Sample> out(outSize);
    forEachFrame(sound, inSize, [&](std::size_t k, std::vector<Sample> const& frame) {
        before(k);
        EXPECT_EQ(clean(session, frame, out), 0);
        all.insert(all.end(), out.begin(), out.end());
    });
    return all;
}

// A session of any kind.
struct Stream {
    Kind kind;
    void* handle;
    std::size_t inSize;
    std::size_t outSize;

    Stream(Kind ofKind, int in, int out, int ms, std::string const& model)
        : kind(ofKind),
          inSize(samples(in, ms)),
          outSize(kind == Kind::noise ? samples(out, ms) : 1) {
        auto* const open =
            kind == Kind::voice ? Morva_VAD_CreateSession : Morva_NoiseDB_CreateSession;
        handle = kind == Kind::noise ? openNc(in, out, ms, model.c_str())
                                     : open(rate(in), duration(ms), model.c_str());
        EXPECT_NE(handle, nullptr) << model;
    }

    template <class Sample, class Out>
    void frame(std::vector<Sample> const& in, std::vector<Out>& out) const {
        if constexpr (std::is_same_v<Sample, Out>) {
            if (kind == Kind::noise) return static_cast<void>(clean(handle, in, out));
        }
        out[0] = static_cast<Out>(valueOf(kind, handle, in));
    }
    // What comes of the whole frames of a sound.
    template <class Sample>
    std::vector<float> run(std::vector<Sample> const& sound) const {
        std::vector<float> all;
        std::vector<float> out(outSize);
        forEachFrame(sound, inSize, [&](std::size_t, std::vector<Sample> const& in) {
            frame(in, out);
            all.insert(all.end(), out.begin(), out.end());
        });
        return all;
    }
};

}  // namespace sdk_test
