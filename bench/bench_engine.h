// The engine with the shipped models, for one benchmark process.
#pragma once

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "morva-sdk/morva-ext.h"
#include "morva-sdk/morva-sdk.h"
#include "shipped_models.h"

namespace morva_bench {

inline constexpr int kRates[] = {8000, 16000, 32000, 44100, 48000, 96000};

// Where the shipped models are, unless MORVA_BENCH_MODELS names another folder.
inline std::filesystem::path modelFolder() {
    char const* const other = std::getenv("MORVA_BENCH_MODELS");
    return other != nullptr ? other : MORVA_MODELS;
}

// Starts the engine once and registers every shipped model; ends the process when it cannot.
inline void startEngine() {
    static bool const started = [] {
        std::wstring const folder = modelFolder().wstring();
        if (Morva_SDK_GlobalInit(folder.c_str(), 1) != 0) std::exit(1);
        for (auto const& model : morva::shippedModels) {
            auto const file = std::filesystem::path(model.file).wstring();
            if (Morva_SDK_SetModel(file.c_str(), model.name) != 0) std::exit(1);
        }
        return true;
    }();
    static_cast<void>(started);
}

// Memory of this process.
inline long residentKib() {
    std::ifstream status("/proc/self/status");
    for (std::string line; std::getline(status, line);) {
        if (line.starts_with("VmRSS:")) return std::atol(line.c_str() + 6);
    }
    return 0;
}

// A 10 ms noise-cancellation session with the same rate in and out, closed at the end of its scope.
class Session {
public:
    Session(char const* model, int rate)
        : handle_(Morva_NC_CreateSession(static_cast<MorvaSamplingRate>(rate),
                                         static_cast<MorvaSamplingRate>(rate), MORVA_FRAME_10_MS,
                                         model)),
          frame_(static_cast<std::size_t>(rate / 100)) {
        if (handle_ == nullptr) std::exit(1);
    }
    ~Session() { Morva_NC_CloseSession(handle_); }
    Session(Session const&) = delete;
    Session& operator=(Session const&) = delete;

    // Cleans the frame at `position` of `sound`, which is read round and round.
    void clean(std::vector<float> const& sound, std::size_t& position) {
        if (position + frame_.size() > sound.size()) position = 0;
        Morva_NC_CleanAmbientNoiseFloat(handle_, sound.data() + position,
                                        static_cast<unsigned>(frame_.size()), frame_.data(),
                                        static_cast<unsigned>(frame_.size()));
        position += frame_.size();
    }

private:
    void* handle_;
    std::vector<float> frame_;
};

}  // namespace morva_bench
