// One 10 ms frame end to end, for every shipped model, rate and kind of sound; model load and
// session open.
#include <benchmark/benchmark.h>

#include <fstream>
#include <iterator>

#include "bench_engine.h"
#include "bench_sound.h"
#include "weights/weight.h"

namespace {

using namespace morva_bench;

void cleanFrames(benchmark::State& state, char const* model, int rate, Sound kind) {
    startEngine();
    Session session(model, rate);
    auto const sound = makeSound(kind, rate, 4.0);
    std::size_t position = 0;
    for (int i = 0; i < 100; ++i) session.clean(sound, position);
    for (auto _ : state) session.clean(sound, position);
    // Seconds of processor time per second of sound, on one thread.
    state.counters["real_time_factor"] =
        benchmark::Counter(0.01 * static_cast<double>(state.iterations()),
                           benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
}

// Opens and closes a session, whose model's shared parts are there already.
void openNoiseSession(benchmark::State& state, char const* model) {
    startEngine();
    Session const first(model, 48000);
    for (auto _ : state) Session const session(model, 48000);
}

template <auto create, auto close>
void openValueSession(benchmark::State& state, char const* model) {
    startEngine();
    auto const open = [&] { return create(MORVA_RATE_48000, MORVA_FRAME_10_MS, model); };
    void* const first = open();
    for (auto _ : state) close(open());
    close(first);
}

// From bytes in memory to a weight.
void loadModel(benchmark::State& state, char const* name) {
    std::ifstream file(modelFolder() / name, std::ios::binary);
    std::string const bytes{std::istreambuf_iterator<char>(file), {}};
    for (auto _ : state) {
        MORVA::WEIGHTS::Weight weight;
        benchmark::DoNotOptimize(weight.read(bytes.data(), bytes.size()));
    }
    state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * bytes.size()));
}

struct NamedSound {
    char const* name;
    Sound kind;
};
constexpr NamedSound kSounds[] = {{"speech", Sound::speech},
                                  {"silence", Sound::silence},
                                  {"denormal", Sound::denormal},
                                  {"clipped", Sound::clipped}};

[[maybe_unused]] bool const registered = [] {
    for (auto const& model : kNoiseModels) {
        for (int const rate : kRates) {
            for (auto const& sound : kSounds) {
                // Other sounds than speech only where their cost is compared.
                if (sound.kind != Sound::speech && rate != 48000) continue;
                std::string const name = std::string("frame/") + model.name + "/" +
                                         std::to_string(rate) + "/" + sound.name;
                benchmark::RegisterBenchmark(name.c_str(), cleanFrames, model.name, rate,
                                             sound.kind);
            }
        }
    }
    auto const load = [](ShippedModel const& model) {
        std::string const name = std::string("model_load/") + model.name;
        benchmark::RegisterBenchmark(name.c_str(), loadModel, model.file);
    };
    for (auto const& model : kNoiseModels) {
        load(model);
        std::string const name = std::string("session_open/") + model.name;
        benchmark::RegisterBenchmark(name.c_str(), openNoiseSession, model.name);
    }
    load(kVoiceModel);
    load(kLevelModel);
    benchmark::RegisterBenchmark("session_open/voice",
                                 openValueSession<Morva_VAD_CreateSession, Morva_VAD_CloseSession>,
                                 kVoiceModel.name);
    benchmark::RegisterBenchmark(
        "session_open/level",
        openValueSession<Morva_NoiseDB_CreateSession, Morva_NoiseDB_CloseSession>,
        kLevelModel.name);
    return true;
}();

}  // namespace
