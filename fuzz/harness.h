// What the fuzzers share: a fresh engine per input, sessions that close themselves, and checks that
// end the program where the sanitizers cannot see a fault.
#pragma once

#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <random>
#include <string>
#include <vector>

#include "morva-sdk/morva-ext.h"
#include "morva-sdk/morva-sdk.h"
#include "support/weight_writer.h"

namespace fuzz {

inline void require(bool holds, char const* what) {
    if (holds) return;
    std::fprintf(stderr, "broken: %s\n", what);
    std::abort();
}

// A model whose frames cost little.
inline test_support::NcShape smallShape(std::string version = "0.0.6") {
    return {.version = std::move(version),
            .sampleRate = 8000,
            .frameLength = 160,
            .filtrEnd = 64,
            .previewFrames = 2,
            .hidden = 4,
            .gates = 4};
}

class Engine {
public:
    explicit Engine(wchar_t const* folder = nullptr) {
        require(Morva_SDK_GlobalInit(folder, 1) == 0, "the engine starts");
    }
    ~Engine() { require(Morva_SDK_GlobalDestroy() == 0, "the engine ends"); }
    Engine(Engine const&) = delete;
    Engine& operator=(Engine const&) = delete;

    static int setModel(std::string const& weight, char const* name) {
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
        unsigned out = 0;
        require(MorvaExt_SessionFrameSizes(handle_, &inputSize_, &out) == 0, "frame sizes");
        output_.resize(out);
    }
    ~NcSession() {
        if (handle_ != nullptr) require(Morva_NC_CloseSession(handle_) == 0, "a session closes");
    }
    NcSession(NcSession const&) = delete;
    NcSession& operator=(NcSession const&) = delete;

    explicit operator bool() const { return handle_ != nullptr; }
    unsigned inputSize() const { return inputSize_; }

    // Cleans one frame and checks that every sample is a legal one.
    std::vector<float> const& clean(std::vector<float> const& frame) {
        int const result =
            Morva_NC_CleanAmbientNoiseFloat(handle_, frame.data(), inputSize_, output_.data(),
                                            static_cast<unsigned>(output_.size()));
        require(result == 0, "a frame of the right size is cleaned");
        for (float const sample : output_) {
            require(sample >= -1.0F && sample < 1.0F, "output samples are finite and in range");
        }
        return output_;
    }

private:
    void* handle_;
    unsigned inputSize_ = 0;
    std::vector<float> output_;
};

// Noise with a slow swell, -1..1, always the same: frame `index` of that size.
inline std::vector<float> signalFrame(std::size_t size, std::size_t index) {
    static auto const noise = test_support::RandomValues(1).vector(10007, -1.0F, 1.0F);
    std::vector<float> frame(size);
    for (std::size_t i = 0; i < size; ++i) {
        std::size_t const at = index * size + i;
        frame[i] = 0.6F * std::sin(static_cast<float>(at % 20000) * 0.001F) * noise[at % 10007];
    }
    return frame;
}

// Runs a model for ten frames, if it can be opened at all.
inline void run(int inputRate, int outputRate, int durationMs, char const* model) {
    NcSession session(inputRate, outputRate, durationMs, model);
    for (std::size_t i = 0; session && i < 10; ++i) {
        session.clean(signalFrame(session.inputSize(), i));
    }
}

}  // namespace fuzz
