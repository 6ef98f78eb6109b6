#include "noise_canceller/network_weights.h"

#include <algorithm>
#include <string>

#include "utils/exception.h"

namespace MORVA::NOISE_CANCELLER {
namespace {

using CONTAINERS::Matrix;

std::string shape(std::size_t rows, std::size_t cols) {
    return std::to_string(rows) + " x " + std::to_string(cols);
}

}  // namespace

void refuseWeight(std::string const& why) {
    UTILS::raise(why, "src/noise_canceller/network_weights", "check");
}

void requireShape(char const* name, Matrix const& matrix, std::size_t rows, std::size_t cols) {
    if (matrix.rows != rows || matrix.cols != cols || matrix.data.size() != rows * cols) {
        refuseWeight(std::string(name) + " is " + shape(matrix.rows, matrix.cols) + ", must be " +
                     shape(rows, cols));
    }
}

void requireLength(char const* name, std::vector<float> const& values, std::size_t length) {
    if (values.size() != length) {
        refuseWeight(std::string(name) + " has " + std::to_string(values.size()) +
                     " values, must have " + std::to_string(length));
    }
}

void requireCount(char const* name, std::size_t count, std::size_t atLeast) {
    if (count < atLeast) {
        refuseWeight(std::string(name) + " has " + std::to_string(count) +
                     " entries, must have at least " + std::to_string(atLeast));
    }
}

PackedNetwork packNetwork(FeedForwardWeights const& weights,
                          std::vector<Matrix const*> const& gates, LayerCounts const& used) {
    PackedNetwork packed;
    for (std::size_t i = 0; i < used.nonLinear; ++i) {
        packed.nonLinear.emplace_back(weights.weightNonLinear[i]);
    }
    for (std::size_t i = 0; i < used.linear; ++i) {
        packed.linear.emplace_back(weights.weightLinear[i]);
    }
    for (auto const* gate : gates) packed.gates.emplace_back(*gate);
    return packed;
}

FeedForwardWeights::FeedForwardWeights(WEIGHTS::Weight const& weight)
    : weightLinear(weight.getReference<Matrices>("WeightLinear")),
      weightNonLinear(weight.getReference<Matrices>("WeightNonLinear")),
      baesLinear(weight.getReference<Vectors>("BaesLinear")),
      baesNonLinear(weight.getReference<Vectors>("BaesNonLinear")) {}

std::size_t FeedForwardWeights::widest(std::size_t inputs) const {
    for (auto const& matrix : weightNonLinear) inputs = std::max(inputs, matrix.cols);
    return inputs;
}

void FeedForwardWeights::check(std::size_t features, std::size_t outputs) const {
    checkLayers(features, 0, outputs);
}

std::size_t FeedForwardWeights::checkHiddenLayers(std::size_t hidden, std::size_t width,
                                                  std::size_t firstHidden) const {
    for (std::size_t i = 0; i < hidden; ++i) {
        std::size_t const out = i == 0 && firstHidden != 0 ? firstHidden : weightNonLinear[i].cols;
        if (out == 0) refuseWeight("WeightNonLinear has an empty layer");
        requireShape("WeightNonLinear", weightNonLinear[i], width, out);
        requireShape("WeightLinear", weightLinear[i], width, out);
        requireLength("BaesNonLinear", baesNonLinear[i], out);
        requireLength("BaesLinear", baesLinear[i], out);
        width = out;
    }
    return width;
}

void FeedForwardWeights::checkLayers(std::size_t width, std::size_t firstHidden,
                                     std::size_t outputs) const {
    requireCount("WeightNonLinear", weightNonLinear.size(), 1);
    std::size_t const hidden = weightNonLinear.size() - 1;
    requireCount("BaesNonLinear", baesNonLinear.size(), hidden + 1);
    requireCount("WeightLinear", weightLinear.size(), hidden);
    requireCount("BaesLinear", baesLinear.size(), hidden);
    if (baesNonLinear.size() != hidden + 1) {
        refuseWeight("BaesNonLinear has more entries than WeightNonLinear");
    }
    width = checkHiddenLayers(hidden, width, firstHidden);
    requireShape("WeightNonLinear", weightNonLinear.back(), width, outputs);
    requireLength("BaesNonLinear", baesNonLinear.back(), outputs);
}

GatedWeights::GatedWeights(WEIGHTS::Weight const& weight)
    : FeedForwardWeights(weight),
      weightGRU(weight.getReference<Matrix>("WeightGRU")),
      baesGRU(weight.getReference<std::vector<float>>("BaesGRU")) {}

std::size_t GatedWeights::stateWidth(std::size_t features) const {
    requireCount("WeightNonLinear", weightNonLinear.size(), 1);
    std::size_t const rows = weightNonLinear.back().rows;
    // With the output layer alone the last matrix reads state and features.
    if (weightNonLinear.size() > 1) return rows;
    if (rows < features) {
        refuseWeight("WeightNonLinear has " + std::to_string(rows) + " rows, must have at least " +
                     std::to_string(features));
    }
    return rows - features;
}

void GatedWeights::checkGate(std::size_t state, std::size_t features) const {
    if (state == 0) refuseWeight("the network has no recurrent state");
    std::size_t const gates = weightGRU.cols == 1 ? 1 : state;
    requireShape("WeightGRU", weightGRU, state + features, gates);
    requireLength("BaesGRU", baesGRU, gates);
}

void GatedWeights::check(std::size_t features, std::size_t outputs) const {
    std::size_t const state = stateWidth(features);
    checkGate(state, features);
    checkLayers(state + features, state, outputs);
}

LayernormWeights::LayernormWeights(WEIGHTS::Weight const& weight)
    : GatedWeights(weight),
      weightGRUReset(weight.getReference<Matrix>("WeightGRU_reset")),
      biasGRUReset(weight.getReference<std::vector<float>>("BiasGRU_reset")),
      gainLinearNorm(weight.getReference<Vectors>("GainLinearNorm")),
      biasLinearNorm(weight.getReference<Vectors>("BiasLinearNorm")),
      gainNonLinearNorm(weight.getReference<Vectors>("GainNonLinearNorm")),
      biasNonLinearNorm(weight.getReference<Vectors>("BiasNonLinearNorm")) {}

std::size_t LayernormWeights::stateWidth(std::size_t features) const {
    return weightNonLinear.size() == 1 ? weightGRUReset.cols : GatedWeights::stateWidth(features);
}

void LayernormWeights::check(std::size_t features, std::size_t outputs) const {
    std::size_t const state = stateWidth(features);
    checkGate(state, features);
    requireShape("WeightGRU_reset", weightGRUReset, state + features, state);
    requireLength("BiasGRU_reset", biasGRUReset, state);
    checkLayers(state + features, state, outputs);
    for (std::size_t i = 0; i + 1 < weightNonLinear.size(); ++i) {
        std::size_t const width = weightNonLinear[i].cols;
        auto const requireNorm = [&](char const* name, Vectors const& values) {
            requireCount(name, values.size(), i + 1);
            requireLength(name, values[i], width);
        };
        requireNorm("GainLinearNorm", gainLinearNorm);
        requireNorm("BiasLinearNorm", biasLinearNorm);
        requireNorm("GainNonLinearNorm", gainNonLinearNorm);
        requireNorm("BiasNonLinearNorm", biasNonLinearNorm);
    }
}

}  // namespace MORVA::NOISE_CANCELLER
