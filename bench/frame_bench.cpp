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

void openSession(benchmark::State& state) {
    startEngine();
    for (auto _ : state) Session const session("full", 48000);
}

void loadModel(benchmark::State& state) {
    startEngine();
    std::ifstream file(modelFolder() / "c6.xs.f.ca03f4.mvw", std::ios::binary);
    std::string const bytes{std::istreambuf_iterator<char>(file), {}};
    for (auto _ : state) {
        MORVA::WEIGHTS::Weight weight;
        benchmark::DoNotOptimize(weight.read(bytes.data(), bytes.size()));
    }
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
    benchmark::RegisterBenchmark("session_open/full/48000", openSession);
    benchmark::RegisterBenchmark("model_load/full", loadModel);
    return true;
}();

}  // namespace
