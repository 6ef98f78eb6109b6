// The stages of one 10 ms frame of the full model at 48000 Hz, each alone.
#include <benchmark/benchmark.h>

#include <random>
#include <string>

#include "bench_engine.h"
#include "bench_sound.h"
#include "kernels/fft.h"
#include "kernels/packed_matrix.h"
#include "kernels/vector_math.h"
#include "noise_canceller/feature_context.h"
#include "noise_canceller/hop_pipeline.h"
#include "noise_canceller/mask_shaper.h"
#include "noise_canceller/network_weights.h"
#include "noise_canceller/networks.h"
#include "noise_canceller/noise_cleaner_generations.h"
#include "noise_canceller/noise_cleaner_v0_0_6.h"
#include "noise_canceller/spectral_cleaner.h"
#include "noise_canceller/spectral_kernels.h"
#include "resampler/resampler.h"
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

// One matrix of the network with its bias; the counter says how fast its weights are read.
using Packed = std::vector<CONTAINERS::PackedMatrix> NOISE_CANCELLER::PackedNetwork::*;

void layer(benchmark::State& state, Packed list, std::size_t index) {
    Full const full;
    auto const& matrix = ((*full.params->packed).*list)[index];
    std::vector<float> const x(matrix.rows(), 0.5f);
    std::vector<float> const bias(matrix.cols(), 0.1f);
    std::vector<float> out(matrix.cols());
    for (auto _ : state) {
        matrix.affine(x.data(), bias.data(), out.data());
        benchmark::DoNotOptimize(out.data());
    }
    std::size_t const size = matrix.isHalfPrecision() ? 2 : 4;
    state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations()) *
                            static_cast<std::int64_t>(matrix.rows() * matrix.cols() * size));
}

[[maybe_unused]] bool const layersRegistered = [] {
    using NOISE_CANCELLER::PackedNetwork;
    struct NamedList {
        char const* name;
        Packed list;
    };
    Full const full;
    for (auto const& [name, list] : {NamedList{"gate", &PackedNetwork::gates},
                                     {"rectified", &PackedNetwork::nonLinear},
                                     {"linear", &PackedNetwork::linear}}) {
        for (std::size_t i = 0; i < ((*full.params->packed).*list).size(); ++i) {
            std::string const title = std::string("layer/") + name + "/" + std::to_string(i);
            benchmark::RegisterBenchmark(title.c_str(), layer, list, i);
        }
    }
    return true;
}();

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
    NOISE_CANCELLER::SpectralCleaner cleaner(*full.params, *full.params, full.environment->second,
                                             NOISE_CANCELLER::generation(6),
                                             NOISE_CANCELLER::Synthesis::FromKept);
    std::vector<float> x;
    for (auto _ : state) cleaner.analyse({full.sound.data(), full.params->frameLength}, x);
}
BENCHMARK(analysis);

// From spectrum to network input, without window and transform.
void features(benchmark::State& state) {
    Full full;
    auto const& params = *full.params;
    std::vector<std::complex<float>> spectrum(params.coefficientNumber);
    for (auto& value : spectrum) value = {1e4f * full.noise(full.random), 0.0f};
    NOISE_CANCELLER::FeatureContext context(params.previewFrames, params.bands.bands(),
                                            10 * full.x.size());
    std::vector<float> powers;
    std::vector<float> x;
    for (auto _ : state) {
        NOISE_CANCELLER::NOISE_CLEANER_FUNCTIONS::calcFeatures(spectrum, powers, 1.0f, params);
        context.push(powers, params.mu, params.sd, x);
        benchmark::DoNotOptimize(x.data());
    }
}
BENCHMARK(features);

void mask(benchmark::State& state) {
    Full const full;
    NOISE_CANCELLER::MaskShaper shaper(*full.params);
    std::vector<float> const bands(full.params->bands.bands(), 0.7f);
    for (auto _ : state) benchmark::DoNotOptimize(shaper.shape(bands).data());
}
BENCHMARK(mask);

// Queues, overlap-add and delay of one frame, around a model that copies.
void overlapAdd(benchmark::State& state) {
    Full const full;
    NOISE_CANCELLER::HopPipeline pipeline(full.params->pipelineShape());
    std::vector<float> frame(full.params->step, 100.0f);
    for (auto _ : state) {
        pipeline.process(frame, [&](std::span<float const> in, std::vector<float>& out) {
            out.assign(in.begin(), in.end());
        });
        benchmark::DoNotOptimize(frame.data());
    }
}
BENCHMARK(overlapAdd);

void synthesis(benchmark::State& state) {
    Full full;
    NOISE_CANCELLER::SpectralCleaner cleaner(*full.params, *full.params, full.environment->second,
                                             NOISE_CANCELLER::generation(6),
                                             NOISE_CANCELLER::Synthesis::FromKept);
    std::vector<float> x;
    std::vector<float> out;
    cleaner.analyse({full.sound.data(), full.params->frameLength}, x);
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
