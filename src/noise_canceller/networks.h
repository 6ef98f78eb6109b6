// The networks that turn one frame of features into a mask (or a voice score). Kernels over views
// of the weights; state and scratch belong to the caller, so networks of one weight may run on
// several threads. After the first call nothing is allocated. Sigmoids are evaluated in double
// precision.
#pragma once

#include <vector>

#include "noise_canceller/network_weights.h"

namespace MORVA::NOISE_CANCELLER {

struct NetworkScratch {
    // Room for layers of that width, so that the first frame allocates nothing either.
    void reserve(std::size_t widest);

    std::vector<float> joined;  // state and features
    std::vector<float> gate;
    std::vector<float> reset;
    std::vector<float> rectified;
    std::vector<float> linear;
};

namespace NOISE_CLEANER_FUNCTIONS {

// In all of them `x` holds F features on entry and the network's output on return, and `state` (H
// values) is updated in place; H is 0 for the feed-forward network.

// Layer-normalised gated network: reset gate before the first layer, update gate after it (the gate
// weights the old state), layer normalisation of both branches of every hidden layer (Ba, Kiros,
// Hinton: Layer Normalization, 2016). Output in 0..1.
void calcRMForwardProp_GRU_Layernorm(std::vector<float>& state, std::vector<float>& x,
                                     LayernormWeights const& weights, NetworkScratch& scratch);

// Gated network without reset gate and normalisation; the gate weights the new value, and the next
// layer reads the first layer's output, not the state. Output in 0..1.
void calcRMForwardProp_GRU_Modify(std::vector<float>& state, std::vector<float>& x,
                                  GatedWeights const& weights, NetworkScratch& scratch);

// The same layers without gate and state. Output in 0..1.
void calcRMForwardProp_FeedForward(std::vector<float>& state, std::vector<float>& x,
                                   FeedForwardWeights const& weights, NetworkScratch& scratch);

// As calcRMForwardProp_GRU_Modify, but L is the number of matrices in "WeightLinear", whose last
// one is the output layer, and the output is left as it comes (a logit).
void calcRMForwardProp_GRU_VAD_Modify(std::vector<float>& state, std::vector<float>& x,
                                      GatedWeights const& weights, NetworkScratch& scratch);

// 1 / (1 + exp(-v)) in double precision.
void sigmoid(std::vector<float>& values);

}  // namespace NOISE_CLEANER_FUNCTIONS

// One overload per kind of weights, for code that is written once for several generations.
inline void runNetwork(std::vector<float>& state, std::vector<float>& x,
                       LayernormWeights const& weights, NetworkScratch& scratch) {
    NOISE_CLEANER_FUNCTIONS::calcRMForwardProp_GRU_Layernorm(state, x, weights, scratch);
}
inline void runNetwork(std::vector<float>& state, std::vector<float>& x,
                       GatedWeights const& weights, NetworkScratch& scratch) {
    NOISE_CLEANER_FUNCTIONS::calcRMForwardProp_GRU_Modify(state, x, weights, scratch);
}
inline void runNetwork(std::vector<float>& state, std::vector<float>& x,
                       FeedForwardWeights const& weights, NetworkScratch& scratch) {
    NOISE_CLEANER_FUNCTIONS::calcRMForwardProp_FeedForward(state, x, weights, scratch);
}

}  // namespace MORVA::NOISE_CANCELLER
