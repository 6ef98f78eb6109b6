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

void registerFrames(char const* model) {
    for (int const rate : kRates) {
        for (auto const& sound : kSounds) {
            // Other sounds than speech only where their cost is compared.
            if (sound.kind != Sound::speech && rate != 48000) continue;
            auto const name =
                std::string("frame/") + model + '/' + std::to_string(rate) + '/' + sound.name;
            benchmark::RegisterBenchmark(name.c_str(), cleanFrames, model, rate, sound.kind);
        }
    }
}

auto* openerOf(morva::ShippedKind kind) {
    using enum morva::ShippedKind;
    if (kind == NC) return &openNoiseSession;
    return kind == VAD ? &openValueSession<Morva_VAD_CreateSession, Morva_VAD_CloseSession>
                       : &openValueSession<Morva_NoiseDB_CreateSession, Morva_NoiseDB_CloseSession>;
}

[[maybe_unused]] bool const registered = [] {
    for (auto const& [file, name, kind, rate, maxRate] : morva::shippedModels) {
        if (kind == morva::ShippedKind::NC) registerFrames(name);
        auto const load = std::string("model_load/") + name;
        benchmark::RegisterBenchmark(load.c_str(), loadModel, file);
        auto const open = std::string("session_open/") + name;
        benchmark::RegisterBenchmark(open.c_str(), openerOf(kind), name);
    }
    return true;
}();

}  // namespace
