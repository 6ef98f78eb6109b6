#include "kernels/pcm.h"

#include <cmath>
#include <cstdint>
#include <limits>

#include "kernels/vector_layer.h"

HWY_BEFORE_NAMESPACE();
namespace MORVA::UTILS {
namespace {

constexpr float kFullScale = 32768.0f;
constexpr float kPcmMin = -32768.0f;
constexpr float kPcmMax = 32767.0f;
constexpr float kUnitLimit = 1e6f;
constexpr float kUnitLeast = 1e-20f;

// Written with selections only, so that the loops below become vector code.
constexpr float limited(float x, float low, float high) {
    float const number = x == x ? x : 0.0f;
    float const raised = number < low ? low : number;
    return raised > high ? high : raised;
}

}  // namespace

void pcm16ToFloat(std::span<short const> in, std::span<float> out) {
    for (std::size_t i = 0; i < in.size(); ++i) out[i] = static_cast<float>(in[i]);
}

void unitToPcm16Scale(std::span<float const> in, std::span<float> out) {
    for (std::size_t i = 0; i < in.size(); ++i) {
        float const size = std::abs(in[i]);
        bool const sound = size >= kUnitLeast && size <= std::numeric_limits<float>::max();
        out[i] = sound ? limited(in[i], -kUnitLimit, kUnitLimit) * kFullScale : 0.0f;
    }
}

void clipToPcm16(std::span<float> samples) {
    for (float& sample : samples) sample = limited(sample, kPcmMin, kPcmMax);
}

void floatToPcm16(std::span<float const> in, std::span<short> out) {
    for (std::size_t i = 0; i < in.size(); ++i) {
        out[i] = static_cast<short>(static_cast<std::int32_t>(limited(in[i], kPcmMin, kPcmMax)));
    }
}

void pcm16ScaleToUnit(std::span<float const> in, std::span<float> out) {
    for (std::size_t i = 0; i < in.size(); ++i) out[i] = in[i] * (1.0f / kFullScale);
}

}  // namespace MORVA::UTILS
HWY_AFTER_NAMESPACE();
