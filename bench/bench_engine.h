// The engine with the shipped models, for one benchmark process.
#pragma once

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <vector>

#include "morva-sdk/morva-ext.h"
#include "morva-sdk/morva-sdk.h"

namespace morva_bench {

struct ShippedModel {
    char const* name;
    char const* file;
};
inline constexpr ShippedModel kNoiseModels[] = {{"small_8k", "NC_small_8k.mvw"},
                                                {"small_16k", "NC_small_16k.mvw"},
                                                {"full", "c6.xs.f.ca03f4.mvw"}};
inline constexpr ShippedModel kVoiceModel = {"voice", "VAD_weight.mvw"};
inline constexpr ShippedModel kLevelModel = {"level", "noise_level_16k.mvw"};
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
        auto const add = [](ShippedModel const& model) {
            auto const file = std::filesystem::path(model.file).wstring();
            if (Morva_SDK_SetModel(file.c_str(), model.name) != 0) std::exit(1);
        };
        for (auto const& model : kNoiseModels) add(model);
        add(kVoiceModel);
        add(kLevelModel);
        return true;
    }();
    static_cast<void>(started);
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
