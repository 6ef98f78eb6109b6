// Builds of the engine against each other, in one process and in turn: what a frame of every
// shipped model costs in each, and how far their answers lie apart.
//   build/release/morva_builds LIBRARY LIBRARY ...      the first one is what the others are held
//   to
#include <dlfcn.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <vector>

#include "bench_sound.h"
#include "cpu_clock.h"
#include "morva-sdk/morva-sdk.h"
#include "shipped_models.h"

namespace {

using morva::ShippedKind;
using morva::ShippedModel;

constexpr int kRounds = 100;
constexpr int kFrames = 100;  // of 10 ms in a round

// A library with a session of one model.
class Build {
public:
    explicit Build(char const* file) : file_(file), library_(dlopen(file, RTLD_NOW | RTLD_LOCAL)) {
        if (library_ == nullptr) fail(dlerror());
        std::wstring const folder = std::filesystem::path(MORVA_MODELS).wstring();
        if (function<decltype(Morva_SDK_GlobalInit)>("Morva_SDK_GlobalInit")(folder.c_str(), 1) !=
            0) {
            fail("the engine does not start");
        }
        for (auto const& model : morva::shippedModels) {
            std::wstring const weight = std::filesystem::path(model.file).wstring();
            function<decltype(Morva_SDK_SetModel)>("Morva_SDK_SetModel")(weight.c_str(),
                                                                         model.name);
        }
    }

    char const* file() const { return file_; }

    void open(ShippedModel const& model, int rateHz) {
        auto const rate = static_cast<MorvaSamplingRate>(rateHz);
        best_ = HUGE_VAL;
        answers_.clear();
        if (model.kind == ShippedKind::NC) {
            session_ = function<decltype(Morva_NC_CreateSession)>("Morva_NC_CreateSession")(
                rate, rate, MORVA_FRAME_10_MS, model.name);
            clean_ = function<decltype(Morva_NC_CleanAmbientNoiseFloat)>(
                "Morva_NC_CleanAmbientNoiseFloat");
            return;
        }
        bool const voice = model.kind == ShippedKind::VAD;
        clean_ = nullptr;
        session_ = function<decltype(Morva_VAD_CreateSession)>(
            voice ? "Morva_VAD_CreateSession" : "Morva_NoiseDB_CreateSession")(
            rate, MORVA_FRAME_10_MS, model.name);
        value_ = function<decltype(Morva_VAD_FrameInt16)>(voice ? "Morva_VAD_FrameInt16"
                                                                : "Morva_NoiseDB_FrameInt16");
    }

    void run(std::vector<float> const& sound, std::vector<short> const& pcm) {
        auto const size = static_cast<unsigned>(sound.size() / kFrames);
        std::vector<float> out(clean_ != nullptr ? sound.size() : kFrames);
        double const start = morva_bench::cpuSeconds();
        for (unsigned i = 0; i < kFrames; ++i) {
            if (clean_ != nullptr) {
                clean_(session_, &sound[i * size], size, &out[i * size], size);
            } else {
                out[i] = value_(session_, &pcm[i * size], size);
            }
        }
        best_ = std::min(best_, 1e6 * (morva_bench::cpuSeconds() - start) / kFrames);
        answers_ = std::move(out);
    }

    double microseconds() const { return best_; }

    double distanceTo(Build const& other) const {
        double most = 0.0;
        for (std::size_t i = 0; i < answers_.size(); ++i) {
            most = std::max(most, std::abs(static_cast<double>(answers_[i]) - other.answers_[i]));
        }
        return most;
    }

private:
    [[noreturn]] void fail(char const* why) const {
        std::fprintf(stderr, "%s: %s\n", file_, why);
        std::exit(1);
    }

    template <class Function>
    Function* function(char const* name) const {
        void* const found = dlsym(library_, name);
        if (found == nullptr) fail(dlerror());
        return reinterpret_cast<Function*>(found);
    }

    char const* file_;
    void* library_;
    void* session_ = nullptr;
    decltype(&Morva_NC_CleanAmbientNoiseFloat) clean_ = nullptr;
    decltype(&Morva_VAD_FrameInt16) value_ = nullptr;
    double best_ = 0.0;
    std::vector<float> answers_;
};

void compare(std::vector<Build>& builds, ShippedModel const& model, int rate) {
    auto const sound = morva_bench::makeSound(morva_bench::Sound::speech, rate, 1.0);
    std::vector<short> pcm;
    for (float const sample : sound) pcm.push_back(static_cast<short>(32767.0f * sample));
    for (auto& build : builds) build.open(model, rate);
    for (int round = 0; round < kRounds; ++round) {
        for (auto& build : builds) build.run(sound, pcm);
    }
    std::printf("%-20s %5d", model.name, rate);
    for (auto const& build : builds) {
        std::printf("   %7.2f us  %.3f  %.1e", build.microseconds(),
                    build.microseconds() / builds.front().microseconds(),
                    build.distanceTo(builds.front()));
    }
    std::printf("\n");
}

}  // namespace

int main(int argc, char** argv) {
    if (argc < 2) {
        std::fprintf(stderr, "usage: %s LIBRARY LIBRARY ...\n", argv[0]);
        return 2;
    }
    std::vector<Build> builds;
    for (int i = 1; i < argc; ++i) builds.emplace_back(argv[i]);
    std::printf("\nbest of %d rounds: a frame of 10 ms, ratio to the first, largest difference\n",
                kRounds);
    for (auto const& build : builds) {
        std::printf("  %s, %ju bytes\n", build.file(),
                    static_cast<std::uintmax_t>(std::filesystem::file_size(build.file())));
    }
    for (auto const& model : morva::shippedModels) {
        compare(builds, model, model.rateHz);
        if (model.rateHz != 48000) compare(builds, model, 48000);
    }
    return 0;
}
