#include "floor.h"

#include <benchmark/benchmark.h>
#include <immintrin.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <filesystem>
#include <numeric>
#include <span>

#include "bench_engine.h"
#include "cpu_clock.h"
#include "kernels/packed_matrix.h"
#include "resampler/interpolation_filter.h"
#include "weights/weight.h"

namespace morva_bench {
namespace {

using MORVA::CONTAINERS::Matrix;
using MORVA::CONTAINERS::PackedMatrix;

constexpr std::size_t kLargeBytes = std::size_t{256} << 20;
constexpr std::size_t kPanel = 32;  // columns are padded to whole panels

double packedBytes(Matrix const& matrix) {
    PackedMatrix const packed(matrix);
    std::size_t const cols = (packed.cols() + kPanel - 1) / kPanel * kPanel;
    return static_cast<double>(cols * packed.rows() * (packed.isHalfPrecision() ? 2 : 4));
}

double resamplerOperations(int from, int to) {
    if (from == to) return 0.0;
    auto const divisor = std::gcd(from, to);
    MORVA::UTILS::InterpolationFilter const filter(static_cast<std::uint64_t>(from / divisor),
                                                   static_cast<std::uint64_t>(to / divisor));
    return 2.0 * static_cast<double>(filter.taps()) * (to / 100);
}

// The usual count of a real transform.
double transformOperations(double n) {
    return 2.5 * n * std::log2(n);
}

// Reads `values` once and returns bytes per second.
double readingRate(std::span<float const> values, int times) {
    double const start = cpuSeconds();
    for (int t = 0; t < times; ++t) {
        __m256 sums[8] = {};
        for (std::size_t i = 0; i + 64 <= values.size(); i += 64) {
            for (std::size_t k = 0; k < 8; ++k) {
                sums[k] = _mm256_add_ps(sums[k], _mm256_loadu_ps(values.data() + i + 8 * k));
            }
        }
        for (auto& sum : sums) benchmark::DoNotOptimize(sum);
    }
    return static_cast<double>(values.size()) * sizeof(float) * times / (cpuSeconds() - start);
}

// Fused products of registers only, of the widest that the processor has: operations per second.
constexpr std::size_t kChains = 12;  // enough to hide the latency of a product
constexpr int kTimes = 2000000;

[[gnu::target("avx512f")]] double productRateOf16() {
    __m512 const factor = _mm512_set1_ps(0.999f);
    __m512 sums[kChains];
    for (auto& sum : sums) sum = factor;
    double const start = cpuSeconds();
    for (int t = 0; t < kTimes; ++t) {
        for (auto& sum : sums) sum = _mm512_fmadd_ps(sum, factor, factor);
    }
    for (auto& sum : sums) benchmark::DoNotOptimize(sum);
    return 2.0 * 16.0 * kChains * kTimes / (cpuSeconds() - start);
}

double productRate() {
    if (__builtin_cpu_supports("avx512f")) return productRateOf16();
    __m256 const factor = _mm256_set1_ps(0.999f);
    __m256 sums[kChains];
    for (auto& sum : sums) sum = factor;
    double const start = cpuSeconds();
    for (int t = 0; t < kTimes; ++t) {
        for (auto& sum : sums) sum = _mm256_fmadd_ps(sum, factor, factor);
    }
    for (auto& sum : sums) benchmark::DoNotOptimize(sum);
    return 2.0 * 8.0 * kChains * kTimes / (cpuSeconds() - start);
}

// Calls add(matrix, times) for each of the network's matrices, `times` of which a hop multiplies
// by: those of a band network run through once for every group of bands.
template <class Add>
void forEachMatrix(MORVA::WEIGHTS::Weight const& weight, Add&& add) {
    auto const place = weight.values().find<Matrix>("WeightPlace");
    double const groups = place ? static_cast<double>(place->rows) : 1.0;
    for (char const* name :
         {"WeightGRU", "WeightGRU_reset", "WeightGather", "WeightSpread", "WeightOutput"}) {
        if (auto const matrix = weight.values().find<Matrix>(name)) add(*matrix, groups);
    }
    for (char const* name :
         {"WeightLinear", "WeightNonLinear", "WeightGroupsIn", "WeightGroupsState",
          "WeightGroupsOut", "WeightTimeIn", "WeightTimeState", "WeightScore"}) {
        auto const list = weight.values().find<std::vector<Matrix>>(name);
        if (!list) continue;
        double const times = std::string(name) == "WeightScore" ? 1.0 : groups;
        for (auto const& matrix : *list) add(matrix, times);
    }
}

}  // namespace

FrameWork frameWork(std::string const& model, std::string const& file, int rate) {
    MORVA::WEIGHTS::Weight weight;
    std::wstring const path = (modelFolder() / file).wstring();
    if (!weight.read(MORVA::UTILS::Path(path.c_str()))) std::exit(1);
    FrameWork work{model, rate, 0, 0.0, 0.0};
    double products = 0.0;
    forEachMatrix(weight, [&](Matrix const& matrix, double times) {
        auto const size = static_cast<double>(matrix.data.size());
        work.parameters += matrix.data.size();
        work.weightBytes += times > 1.0 ? sizeof(float) * size : packedBytes(matrix);
        if (times > 1.0) products += times * size;  // what runs once hides behind the reading
    });
    auto const [modelRate, frameMs] = weight.getWeightInfo();
    double const hopsPerFrame = 10.0 / (static_cast<double>(frameMs) / 2.0);
    double const points = static_cast<double>(modelRate) * static_cast<double>(frameMs) / 1000.0;
    work.weightBytes *= hopsPerFrame;
    work.operations = hopsPerFrame * 2.0 * (transformOperations(points) + products) +
                      resamplerOperations(rate, modelRate) + resamplerOperations(modelRate, rate);
    return work;
}

Machine::Machine() : values_(kLargeBytes / sizeof(float), 1.0f) {}

void Machine::measure() {
    memory_ = std::max(memory_, readingRate(values_, 1));
    peak_ = std::max(peak_, productRate());
}

double Machine::bytesPerSecond(FrameWork const& work) const {
    auto const count = static_cast<std::size_t>(work.weightBytes) / sizeof(float);
    double best = 0.0;
    for (int i = 0; i < 10; ++i) {
        best = std::max(best, readingRate(std::span(values_).first(count), 100));
    }
    return best;
}

}  // namespace morva_bench
