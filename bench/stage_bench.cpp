// The stages of one 10 ms frame of the full model at 48000 Hz, each alone.
#include <benchmark/benchmark.h>

#include <memory>
#include <random>

#include "bench_engine.h"
#include "kernels/row_kernels.h"
#include "noise_canceller/band_model.h"
#include "resampler/resampler.h"
#include "weights/model_environment.h"

namespace {

using namespace MORVA;
using namespace NOISE_CANCELLER;
using CONTAINERS::Finish;
using CONTAINERS::Rows;

struct Full {
    Full() : environment(CONTAINERS::makeModelEnvironment()) {
        environment->first = std::make_shared<WEIGHTS::Weight>();
        std::wstring const path = (morva_bench::modelFolder() / "c6.xs.f.ca03f4.mvw").wstring();
        environment->first->read(UTILS::Path(path.c_str()));
        params = std::make_unique<BandParams>(*environment, 10);
        for (std::size_t i = 0; i < params->frameLength; ++i) {
            sound.push_back(1000.0f * noise(random));
        }
    }
    FrameSpectrum frames() const {
        return {*params, *params, environment->second, WindowPair::Vorbis, Synthesis::FromKept};
    }
    BandShape const& shape() const { return params->weights->shape; }
    Rows rows(std::size_t width) {
        Rows rows(shape().groups, width);
        for (std::size_t r = 0; r < rows.count(); ++r) {
            for (std::size_t i = 0; i < width; ++i) rows[r][i] = noise(random);
        }
        return rows;
    }

    CONTAINERS::ModelEnvironment environment;
    std::unique_ptr<BandParams> params;
    std::mt19937 random{3};
    std::normal_distribution<float> noise;
    std::vector<float> sound;
};

// Window, transform and level.
void analysis(benchmark::State& state) {
    Full const full;
    auto frames = full.frames();
    for (auto _ : state) {
        benchmark::DoNotOptimize(frames.analyse(full.sound).data());
        benchmark::DoNotOptimize(frames.levelGain(full.sound));
    }
}
BENCHMARK(analysis);

void features(benchmark::State& state) {
    Full const full;
    auto frames = full.frames();
    auto const& spectrum = frames.analyse(full.sound);
    BandFeatures features(full.params->weights->layout, full.shape().kinds);
    for (auto _ : state) benchmark::DoNotOptimize(features.of(spectrum, 1.0f).data());
}
BENCHMARK(features);

void network(benchmark::State& state) {
    Full full;
    BandNetwork network(full.params->weights);
    std::vector<float> x(full.params->weights->mean);
    for (auto& value : x) value += full.noise(full.random);
    for (auto _ : state) {
        network.run(x);
        benchmark::DoNotOptimize(network.masks().data());
    }
}
BENCHMARK(network);

// The recurrent layers of one block: over the groups of bands, both ways, and over time.
void acrossGroups(benchmark::State& state) {
    Full full;
    auto const& kernels = CONTAINERS::rowKernels();
    auto const& across = *full.params->weights->blocks[0].across;
    auto const channels = full.rows(full.shape().channels);
    Rows sums(full.shape().groups, across.input.width);
    Rows both(full.shape().groups, across.output.inputs);
    for (auto _ : state) {
        kernels.product(across.input, channels, nullptr, sums, Finish::none);
        kernels.bothWays(across.forwards, across.backwards, sums, both);
        benchmark::DoNotOptimize(both[0]);
    }
}
BENCHMARK(acrossGroups);

void alongTime(benchmark::State& state) {
    Full full;
    auto const& kernels = CONTAINERS::rowKernels();
    auto const& along = full.params->weights->blocks[0].along;
    auto channels = full.rows(full.shape().channels);
    Rows sums(full.shape().groups, along.input.width);
    Rows recalled(full.shape().groups, along.stateToNew.width);
    Rows memory(full.shape().groups, full.shape().channels);
    Rows onto(full.shape().groups, full.shape().channels);
    for (auto _ : state) {
        kernels.product(along.input, channels, nullptr, sums, Finish::none);
        kernels.product(along.stateToGates, memory, &sums, sums, Finish::none);
        kernels.product(along.stateToNew, memory, nullptr, recalled, Finish::none);
        kernels.step(sums, recalled, memory, onto);
        benchmark::DoNotOptimize(onto[0]);
    }
}
BENCHMARK(alongTime);

// Mask, inverse transform, window.
void synthesis(benchmark::State& state) {
    Full const full;
    auto frames = full.frames();
    std::vector<float> out;
    std::vector<float> mask(full.params->bins(), 1.0f);
    frames.analyse(full.sound);
    for (auto _ : state) {
        frames.applyMask(mask, 0.0f);
        frames.finish(out);
    }
}
BENCHMARK(synthesis);

// Queues, overlap-add and delay of one frame, around a model that copies.
void overlapAdd(benchmark::State& state) {
    Full const full;
    HopPipeline pipeline(full.params->pipeline(10));
    std::vector<float> frame(full.params->step, 100.0f);
    for (auto _ : state) {
        pipeline.process(frame, [&](std::span<float const> in, std::vector<float>& out) {
            out.assign(in.begin(), in.end());
        });
        benchmark::DoNotOptimize(frame.data());
    }
}
BENCHMARK(overlapAdd);

void resample(benchmark::State& state) {
    auto const from = static_cast<unsigned long>(state.range(0));
    UTILS::Resampler resampler(from, static_cast<unsigned long>(state.range(1)));
    std::vector<float> const in(from, 0.25f);
    std::vector<float> out;
    for (auto _ : state) resampler.resample(in, out);
}
BENCHMARK(resample)->Args({320, 480})->Args({480, 320})->Args({441, 480})->Args({960, 480});

}  // namespace
