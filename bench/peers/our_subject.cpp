// The engine as a subject of the comparison.
#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <utility>

#include "bench_engine.h"
#include "subject.h"

namespace morva_bench {
namespace {

class Ours final : public Subject {
public:
    Ours(char const* model, int rate) : session_(model, rate), frame_(frameSize(rate)) {}
    void frame(float const* samples) override {
        frame_.assign(samples, samples + frame_.size());
        std::size_t position = 0;
        session_.clean(frame_, position);
    }

private:
    static std::size_t frameSize(int rate) { return static_cast<std::size_t>(rate / 100); }
    Session session_;
    std::vector<float> frame_;
};

class OurVoice final : public Subject {
public:
    explicit OurVoice(int rate)
        : handle_(Morva_VAD_CreateSession(static_cast<MorvaSamplingRate>(rate), MORVA_FRAME_10_MS,
                                          "default_VAD")),
          length_(static_cast<unsigned>(rate / 100)) {
        if (handle_ == nullptr) std::exit(1);
    }
    ~OurVoice() override { Morva_VAD_CloseSession(handle_); }
    void frame(float const* samples) override { Morva_VAD_FrameFloat(handle_, samples, length_); }

private:
    void* handle_;
    unsigned length_;
};

int rateOf(std::string const& model) {
    std::vector<MorvaExtModelInfo> models(
        static_cast<std::size_t>(MorvaExt_ListModels(nullptr, 0)));
    MorvaExt_ListModels(models.data(), static_cast<int>(models.size()));
    auto const found = std::ranges::find_if(
        models, [&](MorvaExtModelInfo const& info) { return info.name == model; });
    return found != models.end() ? found->sampleRate : 0;
}

}  // namespace

void addOurs(Contestants& all, std::vector<std::string> const& files) {
    startEngine();
    std::vector<std::pair<std::string, int>> places = {{"full_NC-ca03f4", 48000},
                                                       {"full_NC-ca03f4", 32000},
                                                       {"small_NC", 48000},
                                                       {"small_NC", 16000},
                                                       {"small_NC_8k", 8000}};
    for (auto const& file : files) {
        auto const path = std::filesystem::absolute(file);
        auto const name = path.filename().string();
        if (Morva_SDK_SetModel(path.wstring().c_str(), name.c_str()) != 0) std::exit(1);
        int const rate = rateOf(name);
        places.emplace_back(name, rate);
        if (rate != 48000) places.emplace_back(name, 48000);
    }
    for (auto const& [model, rate] : places) {
        all.push_back({"this engine, " + model, rate, std::make_unique<Ours>(model.c_str(), rate)});
    }
    for (int const rate : {8000, 48000}) {
        all.push_back({"this engine, default_VAD", rate, std::make_unique<OurVoice>(rate)});
    }
}

}  // namespace morva_bench
