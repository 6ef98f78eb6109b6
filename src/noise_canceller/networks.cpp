#include "noise_canceller/networks.h"

#include <cmath>
#include <numeric>

#include "utils/mat_mul.h"
#include "utils/vector_rms.h"

namespace MORVA::NOISE_CANCELLER {
namespace {

using UTIL_FUNCTIONS::matMulPlusB;

// x <- [state, x]
void joinState(std::vector<float> const& state, std::vector<float>& x, NetworkScratch& scratch) {
    scratch.joined.assign(state.begin(), state.end());
    scratch.joined.insert(scratch.joined.end(), x.begin(), x.end());
    x.swap(scratch.joined);
}

// To zero mean and unit deviation, then scale and shift. The divisor carries the 1e-6 of vectorRMS.
void normalise(std::vector<float>& values, std::vector<float> const& gain,
               std::vector<float> const& bias) {
    double const sum = std::accumulate(values.begin(), values.end(), 0.0);
    float const mean = static_cast<float>(sum) / static_cast<float>(values.size());
    for (float& value : values) value -= mean;
    float const scale = 1.0f / UTIL_FUNCTIONS::vectorRMS(values);
    for (std::size_t i = 0; i < values.size(); ++i)
        values[i] = values[i] * scale * gain[i] + bias[i];
}

// x <- linear + max(rectified, 0); a NaN counts as non-negative.
void combineBranches(NetworkScratch const& scratch, std::vector<float>& x) {
    x.resize(scratch.rectified.size());
    for (std::size_t i = 0; i < x.size(); ++i) {
        float const a = scratch.rectified[i];
        x[i] = a < 0.0f ? scratch.linear[i] : a + scratch.linear[i];
    }
}

// h <- keep h + (1 - keep) x with the gate (one per unit, or one for all) weighting the old state,
// or, with `gateNew`, the new value.
template <bool gateNew>
void blend(std::vector<float>& state, std::vector<float> const& x, std::vector<float> const& gate) {
    std::size_t const stride = gate.size() == 1 ? 0 : 1;
    for (std::size_t i = 0; i < state.size(); ++i) {
        float const z = gate[i * stride];
        state[i] = gateNew ? z * x[i] + (1.0f - z) * state[i] : z * state[i] + (1.0f - z) * x[i];
    }
}

void branches(std::vector<float> const& x, std::size_t layer, FeedForwardWeights const& weights,
              NetworkScratch& scratch) {
    matMulPlusB(x, weights.weightNonLinear[layer], weights.baesNonLinear[layer], scratch.rectified);
    matMulPlusB(x, weights.weightLinear[layer], weights.baesLinear[layer], scratch.linear);
}

void gateOf(std::vector<float> const& x, GatedWeights const& weights, NetworkScratch& scratch) {
    matMulPlusB(x, weights.weightGRU, weights.baesGRU, scratch.gate);
    NOISE_CLEANER_FUNCTIONS::sigmoid(scratch.gate);
}

// Hidden layers without normalisation; `afterFirst` sees the first layer's output.
template <class AfterFirst>
void plainHiddenLayers(std::vector<float>& x, std::size_t hidden, FeedForwardWeights const& weights,
                       NetworkScratch& scratch, AfterFirst&& afterFirst) {
    for (std::size_t i = 0; i < hidden; ++i) {
        branches(x, i, weights, scratch);
        combineBranches(scratch, x);
        if (i == 0) afterFirst(x);
    }
}

void outputLayer(std::vector<float>& x, CONTAINERS::Matrix const& matrix,
                 std::vector<float> const& bias, NetworkScratch& scratch) {
    matMulPlusB(x, matrix, bias, scratch.joined);
    x.swap(scratch.joined);
}

void maskLayer(std::vector<float>& x, FeedForwardWeights const& weights, NetworkScratch& scratch) {
    outputLayer(x, weights.weightNonLinear.back(), weights.baesNonLinear.back(), scratch);
    NOISE_CLEANER_FUNCTIONS::sigmoid(x);
}

}  // namespace

namespace NOISE_CLEANER_FUNCTIONS {

void sigmoid(std::vector<float>& values) {
    for (float& value : values) {
        value = static_cast<float>(1.0 / (1.0 + std::exp(-static_cast<double>(value))));
    }
}

void calcRMForwardProp_GRU_Layernorm(std::vector<float>& state, std::vector<float>& x,
                                     LayernormWeights const& weights, NetworkScratch& scratch) {
    joinState(state, x, scratch);
    gateOf(x, weights, scratch);
    matMulPlusB(x, weights.weightGRUReset, weights.biasGRUReset, scratch.reset);
    sigmoid(scratch.reset);
    for (std::size_t i = 0; i < state.size(); ++i) x[i] *= scratch.reset[i];

    std::size_t const hidden = weights.weightNonLinear.size() - 1;
    for (std::size_t i = 0; i < hidden; ++i) {
        branches(x, i, weights, scratch);
        normalise(scratch.rectified, weights.gainNonLinearNorm[i], weights.biasNonLinearNorm[i]);
        normalise(scratch.linear, weights.gainLinearNorm[i], weights.biasLinearNorm[i]);
        combineBranches(scratch, x);
        if (i == 0) {
            blend<false>(state, x, scratch.gate);
            x.assign(state.begin(), state.end());
        }
    }
    maskLayer(x, weights, scratch);
}

void calcRMForwardProp_GRU_Modify(std::vector<float>& state, std::vector<float>& x,
                                  GatedWeights const& weights, NetworkScratch& scratch) {
    joinState(state, x, scratch);
    gateOf(x, weights, scratch);
    plainHiddenLayers(
        x, weights.weightNonLinear.size() - 1, weights, scratch,
        [&](std::vector<float> const& first) { blend<true>(state, first, scratch.gate); });
    maskLayer(x, weights, scratch);
}

void calcRMForwardProp_FeedForward(std::vector<float>&, std::vector<float>& x,
                                   FeedForwardWeights const& weights, NetworkScratch& scratch) {
    plainHiddenLayers(x, weights.weightNonLinear.size() - 1, weights, scratch,
                      [](std::vector<float> const&) {});
    maskLayer(x, weights, scratch);
}

void calcRMForwardProp_GRU_VAD_Modify(std::vector<float>& state, std::vector<float>& x,
                                      GatedWeights const& weights, NetworkScratch& scratch) {
    joinState(state, x, scratch);
    gateOf(x, weights, scratch);
    plainHiddenLayers(
        x, weights.weightLinear.size() - 1, weights, scratch,
        [&](std::vector<float> const& first) { blend<true>(state, first, scratch.gate); });
    // By the number of matrices: a weight may hold more biases than it has layers.
    std::size_t const last = weights.weightLinear.size() - 1;
    outputLayer(x, weights.weightLinear[last], weights.baesLinear[last], scratch);
}

}  // namespace NOISE_CLEANER_FUNCTIONS
}  // namespace MORVA::NOISE_CANCELLER
