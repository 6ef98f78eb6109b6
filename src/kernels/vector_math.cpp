#include "kernels/vector_math.h"

#include <array>
#include <cmath>

#include "kernels/vector_layer.h"

HWY_BEFORE_NAMESPACE();
namespace MORVA::UTILS {
namespace {

namespace hn = hwy::HWY_NAMESPACE;

constexpr std::size_t kSums = 8;  // interleaved partial sums
constexpr hn::CappedTag<float, kSums> kFloats;
constexpr std::size_t kLanes = hn::MaxLanes(kFloats);
constexpr std::size_t kParts = kSums / kLanes;  // registers that hold eight sums

using Floats = hn::Vec<decltype(kFloats)>;

// The sum of square(x) over the samples, in double.
template <class Square>
double sumOver(std::span<float const> samples, Square square) {
    std::array<double, kSums> partial{};
    float const* const data = samples.data();
    std::size_t const whole = samples.size() - samples.size() % kSums;
    for (std::size_t i = 0; i < whole; i += kSums) {
        for (std::size_t lane = 0; lane < kSums; ++lane) partial[lane] += square(data[i + lane]);
    }
    for (std::size_t i = whole; i < samples.size(); ++i) partial[i - whole] += square(data[i]);
    return ((partial[0] + partial[4]) + (partial[1] + partial[5])) +
           ((partial[2] + partial[6]) + (partial[3] + partial[7]));
}

void accumulate(float const* a, float const* b, Floats (&sums)[kParts]) {
    for (std::size_t i = 0; i < kParts; ++i) {
        sums[i] = hn::MulAdd(hn::LoadU(kFloats, a + i * kLanes), hn::LoadU(kFloats, b + i * kLanes),
                             sums[i]);
    }
}

// (s0 + s4) + (s2 + s6), (s1 + s5) + (s3 + s7), and the sum of the two.
float sumOfAll(Floats const (&sums)[kParts]) {
#if HWY_CAP_GE256
    constexpr hn::CappedTag<float, kSums / 2> four;
    auto const pairs = hn::Add(hn::LowerHalf(four, sums[0]), hn::UpperHalf(four, sums[0]));
#else
    auto const pairs = hn::Add(sums[0], sums[1]);
#endif
    auto const two = hn::Add(pairs, hn::Shuffle1032(pairs));
    return hn::GetLane(hn::Add(two, hn::Shuffle2301(two)));
}

}  // namespace

double sumOfSquares(std::span<float const> samples) {
    return sumOver(samples, [](float x) { return static_cast<double>(x) * x; });
}

// Two sets of sums hide the latency of the fused product.
float dotProduct(float const* a, float const* b, std::size_t n) {
    Floats even[kParts];
    Floats odd[kParts];
    for (std::size_t i = 0; i < kParts; ++i) even[i] = odd[i] = hn::Zero(kFloats);
    std::size_t i = 0;
    for (; i + 2 * kSums <= n; i += 2 * kSums) {
        accumulate(a + i, b + i, even);
        accumulate(a + i + kSums, b + i + kSums, odd);
    }
    if (i < n) accumulate(a + i, b + i, even);
    for (std::size_t part = 0; part < kParts; ++part) even[part] = hn::Add(even[part], odd[part]);
    return sumOfAll(even);
}

}  // namespace MORVA::UTILS

namespace MORVA::UTIL_FUNCTIONS {

void multiply(float const* a, float const* b, float* out, std::size_t n) {
    for (std::size_t i = 0; i < n; ++i) out[i] = a[i] * b[i];
}

float vectorRMS(std::vector<float> const& v) {
    double const sum = UTILS::sumOver(v, [](float x) { return static_cast<double>(x * x); });
    return std::sqrt(static_cast<float>(sum) / static_cast<float>(v.size())) + 1e-6f;
}

}  // namespace MORVA::UTIL_FUNCTIONS
HWY_AFTER_NAMESPACE();
