// What the fuzzers share: a fresh engine per input, sessions that close themselves, and checks that
// end the program where the sanitizers cannot see a fault.
#pragma once

#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "morva-sdk/morva-ext.h"
#include "morva-sdk/morva-sdk.h"

namespace fuzz {

inline void require(bool holds, char const* what) {
    if (holds) return;
    std::fprintf(stderr, "broken: %s\n", what);
    std::abort();
}

class Engine {
public:
    explicit Engine(wchar_t const* folder = nullptr) {
        require(Morva_SDK_GlobalInit(folder, 1) == 0, "the engine starts");
    }
    ~Engine() { require(Morva_SDK_GlobalDestroy() == 0, "the engine ends"); }
    Engine(Engine const&) = delete;
    Engine& operator=(Engine const&) = delete;

    int setModel(std::string const& weight, char const* name) const {
        return Morva_SDK_SetModel_Blob(weight.data(), static_cast<unsigned>(weight.size()), name);
    }
};

// A noise-cancellation session; false when the engine refused to open it.
class NcSession {
public:
    NcSession(int inputRate, int outputRate, int durationMs, char const* model)
        : handle_(Morva_NC_CreateSession(static_cast<MorvaSamplingRate>(inputRate),
                                         static_cast<MorvaSamplingRate>(outputRate),
                                         static_cast<MorvaFrameDuration>(durationMs), model)) {
        if (handle_ == nullptr) return;
        unsigned in = 0;
        unsigned out = 0;
        require(MorvaExt_SessionFrameSizes(handle_, &in, &out) == 0, "a session has frame sizes");
        inputSize_ = in;
        output_.resize(out);
    }
    ~NcSession() {
        if (handle_ != nullptr) require(Morva_NC_CloseSession(handle_) == 0, "a session closes");
    }
    NcSession(NcSession const&) = delete;
    NcSession& operator=(NcSession const&) = delete;

    explicit operator bool() const { return handle_ != nullptr; }
    std::size_t inputSize() const { return inputSize_; }

    // Cleans one frame and checks that every sample is a legal one.
    std::vector<float> const& clean(std::vector<float> const& frame) {
        int const result = Morva_NC_CleanAmbientNoiseFloat(
            handle_, frame.data(), static_cast<unsigned>(frame.size()), output_.data(),
            static_cast<unsigned>(output_.size()));
        require(result == 0, "a frame of the right size is cleaned");
        for (float const sample : output_) {
            require(sample >= -1.0F && sample < 1.0F, "output samples are finite and in range");
        }
        return output_;
    }

private:
    void* handle_;
    std::size_t inputSize_ = 0;
    std::vector<float> output_;
};

// Noise with a slow swell, -1..1: always the same, and made only once.
class TestSignal {
public:
    std::vector<float> frame(std::size_t size) {
        static std::vector<float> const sound = make();
        std::vector<float> samples(size);
        for (auto& sample : samples) sample = sound[time_++ % sound.size()];
        return samples;
    }

private:
    static std::vector<float> make() {
        std::mt19937 engine(1);
        std::uniform_real_distribution<float> noise(-1.0F, 1.0F);
        std::vector<float> sound(200'000);
        for (std::size_t i = 0; i < sound.size(); ++i) {
            sound[i] = 0.6F * std::sin(static_cast<float>(i) * 0.001F) * noise(engine);
        }
        return sound;
    }

    std::size_t time_ = 0;
};

}  // namespace fuzz
