// The stages of one 10 ms frame of the full model at 48000 Hz, each alone.
#include <benchmark/benchmark.h>

#include <random>

#include "bench_engine.h"
#include "bench_sound.h"
#include "noise_canceller/network_weights.h"
#include "noise_canceller/networks.h"
#include "noise_canceller/noise_cleaner_generations.h"
#include "noise_canceller/noise_cleaner_v0_0_6.h"
#include "noise_canceller/spectral_cleaner.h"
#include "utils/fft.h"
#include "utils/mat_mul.h"
#include "utils/resampler.h"
#include "utils/vector_math.h"
#include "weights/model_environment.h"

namespace {

using namespace MORVA;
using NOISE_CANCELLER::NoiseCleaner_v0_0_6;

struct Full {
    Full() : environment(CONTAINERS::makeModelEnvironment()) {
        environment->first = std::make_shared<WEIGHTS::Weight>();
        std::wstring const path = (morva_bench::modelFolder() / "c6.xs.f.ca03f4.mvw").wstring();
        environment->first->read(UTILS::Path(path.c_str()));
        params = std::make_unique<NoiseCleaner_v0_0_6::Params>(*environment, 10);
        for (int i = 0; i < 320 * 2; ++i) sound.push_back(1000.0f * noise(random));
        x.resize(params->featureWidth());
        for (auto& value : x) value = noise(random);
    }
    CONTAINERS::ModelEnvironment environment;
    std::unique_ptr<NoiseCleaner_v0_0_6::Params> params;
    std::mt19937 random{3};
    std::normal_distribution<float> noise;
    std::vector<float> sound;
    std::vector<float> x;
};

void network(benchmark::State& state) {
    Full full;
    std::vector<float> h(full.params->stateWidth());
    NOISE_CANCELLER::NetworkScratch scratch;
    for (auto _ : state) {
        auto x = full.x;
        NOISE_CANCELLER::runNetwork(h, x, *full.params, scratch);
        benchmark::DoNotOptimize(x.data());
    }
}
BENCHMARK(network);

void layer(benchmark::State& state, CONTAINERS::Matrix const& matrix) {
    std::vector<float> x(matrix.rows, 0.5f);
    std::vector<float> bias(matrix.cols, 0.1f);
    std::vector<float> out;
    for (auto _ : state) {
        UTIL_FUNCTIONS::matMulPlusB(x, matrix, bias, out);
        benchmark::DoNotOptimize(out.data());
    }
    state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations()) *
                            static_cast<std::int64_t>(matrix.data.size() * sizeof(float)));
}

void layers(benchmark::State& state) {
    Full const full;
    auto const& p = *full.params;
    switch (state.range(0)) {
        case 0:
            layer(state, p.weightGRU);
            break;
        case 1:
            layer(state, p.weightNonLinear[0]);
            break;
        case 2:
            layer(state, p.weightNonLinear[1]);
            break;
        default:
            layer(state, p.weightNonLinear.back());
            break;
    }
}
BENCHMARK(layers)->DenseRange(0, 3);

void transformPair(benchmark::State& state) {
    auto const fft = UTILS::FFT::create(640);
    std::vector<float> in(640, 1.0f);
    std::vector<std::complex<float>> spectrum;
    for (auto _ : state) {
        UTIL_FUNCTIONS::multiply(in.data(), in.data(), in.data(), in.size());
        fft->computeForward(in, spectrum);
        fft->computeBackward(spectrum, in);
    }
}
BENCHMARK(transformPair);

void analysis(benchmark::State& state) {
    Full full;
    NOISE_CANCELLER::SpectralCleaner cleaner(*full.params, full.environment->second,
                                             NOISE_CANCELLER::generation(6),
                                             NOISE_CANCELLER::Synthesis::FromKept);
    std::vector<float> x;
    for (auto _ : state) cleaner.analyse(full.sound.data(), x);
}
BENCHMARK(analysis);

void synthesis(benchmark::State& state) {
    Full full;
    NOISE_CANCELLER::SpectralCleaner cleaner(*full.params, full.environment->second,
                                             NOISE_CANCELLER::generation(6),
                                             NOISE_CANCELLER::Synthesis::FromKept);
    std::vector<float> x;
    std::vector<float> out;
    cleaner.analyse(full.sound.data(), x);
    std::vector<float> const mask(full.params->bands.bands(), 1.0f);
    for (auto _ : state) {
        cleaner.applyMask(mask, 0.0f);
        cleaner.finish(out);
    }
}
BENCHMARK(synthesis);

void resample(benchmark::State& state) {
    auto const from = static_cast<unsigned long>(state.range(0));
    UTILS::Resampler resampler(from, static_cast<unsigned long>(state.range(1)));
    std::vector<float> const in(from, 0.25f);
    std::vector<float> out;
    for (auto _ : state) resampler.resample(in, out);
}
BENCHMARK(resample)->Args({480, 320})->Args({320, 480})->Args({441, 320})->Args({960, 320});

}  // namespace
