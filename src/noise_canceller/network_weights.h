// Views of a weight's network values by name, with the shape checks that make every later product
// safe. The spelling "Baes" belongs to the weight format. Read-only; they stay valid as long as the
// weight.
//
// F is the width of the feature input, H the width of the recurrent state, L the number of matrices
// in "WeightNonLinear": L - 1 hidden layers, each with a rectified and a linear branch, and the
// output layer.
#pragma once

#include <cstddef>
#include <memory>
#include <vector>

#include "kernels/matrix.h"
#include "kernels/packed_matrix.h"
#include "weights/weight.h"

namespace MORVA::NOISE_CANCELLER {

// The same matrices laid out for fast products, shared by all sessions of a model.
struct PackedNetwork {
    std::vector<CONTAINERS::PackedMatrix> nonLinear;
    std::vector<CONTAINERS::PackedMatrix> linear;
    std::vector<CONTAINERS::PackedMatrix> gates;  // update gate, reset gate
};

using Vectors = std::vector<std::vector<float>>;
using Matrices = std::vector<CONTAINERS::Matrix>;

struct FeedForwardWeights {
    explicit FeedForwardWeights(WEIGHTS::Weight const& weight);

    Matrices const& weightLinear;
    Matrices const& weightNonLinear;
    Vectors const& baesLinear;
    Vectors const& baesNonLinear;
    std::shared_ptr<PackedNetwork const> packed;  // what the products run on; set once checked

    std::vector<CONTAINERS::Matrix const*> gates() const { return {}; }
    // The network has no recurrent state.
    std::size_t stateWidth(std::size_t) const { return 0; }
    // The widest vector between layers, for `inputs` values into the first. Of checked weights.
    std::size_t widest(std::size_t inputs) const;
    // Throws MORVA_Exception naming the value and both shapes unless the network takes F features
    // to `outputs` values.
    void check(std::size_t features, std::size_t outputs) const;

protected:
    // Checks a chain of `hidden` layers from `width` inputs and returns the width of the last one;
    // `firstHidden` is the width that the first hidden layer must have, 0 for any.
    std::size_t checkHiddenLayers(std::size_t hidden, std::size_t width,
                                  std::size_t firstHidden) const;
    // The same with the output layer, down to `outputs`.
    void checkLayers(std::size_t width, std::size_t firstHidden, std::size_t outputs) const;
};

struct GatedWeights : FeedForwardWeights {
    explicit GatedWeights(WEIGHTS::Weight const& weight);

    CONTAINERS::Matrix const& weightGRU;  // (H + F) x G, G = H or 1
    std::vector<float> const& baesGRU;    // G

    std::vector<CONTAINERS::Matrix const*> gates() const { return {&weightGRU}; }
    std::size_t stateWidth(std::size_t features) const;
    void check(std::size_t features, std::size_t outputs) const;

protected:
    void checkGate(std::size_t state, std::size_t features) const;
};

struct LayernormWeights : GatedWeights {
    explicit LayernormWeights(WEIGHTS::Weight const& weight);

    CONTAINERS::Matrix const& weightGRUReset;  // (H + F) x H
    std::vector<float> const& biasGRUReset;    // H
    Vectors const& gainLinearNorm;             // per hidden layer, as wide as its output
    Vectors const& biasLinearNorm;
    Vectors const& gainNonLinearNorm;
    Vectors const& biasNonLinearNorm;

    std::vector<CONTAINERS::Matrix const*> gates() const { return {&weightGRU, &weightGRUReset}; }
    std::size_t stateWidth(std::size_t features) const;
    void check(std::size_t features, std::size_t outputs) const;
};

// How many matrices of each kind the layers use; a weight may hold more, which nobody has checked.
struct LayerCounts {
    std::size_t nonLinear;
    std::size_t linear;
};

// Packs the matrices of checked weights.
PackedNetwork packNetwork(FeedForwardWeights const& weights,
                          std::vector<CONTAINERS::Matrix const*> const& gates,
                          LayerCounts const& used);

// Shape checks for other models: throw MORVA_Exception naming the value, its shape and the one
// needed.
void requireShape(char const* name, CONTAINERS::Matrix const& matrix, std::size_t rows,
                  std::size_t cols);
void requireLength(char const* name, std::vector<float> const& values, std::size_t length);
void requireCount(char const* name, std::size_t count, std::size_t atLeast);
[[noreturn]] void refuseWeight(std::string const& why);

}  // namespace MORVA::NOISE_CANCELLER
