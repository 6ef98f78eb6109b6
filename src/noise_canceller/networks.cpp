#include "noise_canceller/networks.h"

#include <algorithm>
#include <array>
#include <numeric>

#include "kernels/elementary.h"
#include "kernels/mat_mul.h"
#include "kernels/vector_math.h"

namespace MORVA::NOISE_CANCELLER {
namespace {

using UTIL_FUNCTIONS::matMulPlusB;

void nonLinearLayer(std::vector<float> const& x, FeedForwardWeights const& weights,
                    std::size_t layer, std::vector<float>& out) {
    matMulPlusB(x, weights.packed->nonLinear[layer], weights.baesNonLinear[layer], out);
}

void linearLayer(std::vector<float> const& x, FeedForwardWeights const& weights, std::size_t layer,
                 std::vector<float>& out) {
    matMulPlusB(x, weights.packed->linear[layer], weights.baesLinear[layer], out);
}

// Of the update gate or the reset gate.
void gateLayer(std::vector<float> const& x, CONTAINERS::PackedMatrix const& matrix,
               std::vector<float> const& bias, std::vector<float>& out) {
    matMulPlusB(x, matrix, bias, out);
    NOISE_CLEANER_FUNCTIONS::sigmoid(out);
}

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
    nonLinearLayer(x, weights, layer, scratch.rectified);
    linearLayer(x, weights, layer, scratch.linear);
}

void updateGate(std::vector<float> const& x, GatedWeights const& weights, NetworkScratch& scratch) {
    gateLayer(x, weights.packed->gates[0], weights.baesGRU, scratch.gate);
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

// The same behind the update gate; the state follows the first layer's output.
void gatedHiddenLayers(std::vector<float>& state, std::vector<float>& x, std::size_t hidden,
                       GatedWeights const& weights, NetworkScratch& scratch) {
    joinState(state, x, scratch);
    updateGate(x, weights, scratch);
    plainHiddenLayers(x, hidden, weights, scratch, [&](std::vector<float> const& first) {
        blend<true>(state, first, scratch.gate);
    });
}

void maskLayer(std::vector<float>& x, FeedForwardWeights const& weights, NetworkScratch& scratch) {
    nonLinearLayer(x, weights, weights.weightNonLinear.size() - 1, scratch.joined);
    x.swap(scratch.joined);
    NOISE_CLEANER_FUNCTIONS::sigmoid(x);
}

}  // namespace

void NetworkScratch::reserve(std::size_t widest) {
    for (auto* const vector : {&joined, &gate, &reset, &rectified, &linear}) {
        vector->reserve(widest);
    }
}

namespace NOISE_CLEANER_FUNCTIONS {

void sigmoid(std::vector<float>& values) {
    alignas(64) std::array<double, 64> exponential;  // aligned: the same bits on every stack
    for (std::size_t first = 0; first < values.size(); first += exponential.size()) {
        std::size_t const count = std::min(exponential.size(), values.size() - first);
        float* const block = values.data() + first;
        for (std::size_t i = 0; i < count; ++i) exponential[i] = -static_cast<double>(block[i]);
        UTILS::exponentials({exponential.data(), count});
        for (std::size_t i = 0; i < count; ++i) {
            block[i] = static_cast<float>(1.0 / (1.0 + exponential[i]));
        }
    }
}

void calcRMForwardProp_GRU_Layernorm(std::vector<float>& state, std::vector<float>& x,
                                     LayernormWeights const& weights, NetworkScratch& scratch) {
    joinState(state, x, scratch);
    updateGate(x, weights, scratch);
    gateLayer(x, weights.packed->gates[1], weights.biasGRUReset, scratch.reset);
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
    gatedHiddenLayers(state, x, weights.weightNonLinear.size() - 1, weights, scratch);
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
    // By the number of matrices: a weight may hold more biases than it has layers.
    std::size_t const last = weights.weightLinear.size() - 1;
    gatedHiddenLayers(state, x, last, weights, scratch);
    linearLayer(x, weights, last, scratch.joined);
    x.swap(scratch.joined);
}

}  // namespace NOISE_CLEANER_FUNCTIONS
}  // namespace MORVA::NOISE_CANCELLER
