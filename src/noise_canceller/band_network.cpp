#include "noise_canceller/band_network.h"

#include <algorithm>
#include <utility>

namespace MORVA::NOISE_CANCELLER {

using CONTAINERS::Finish;
using CONTAINERS::kRowUnit;
using CONTAINERS::paddedTo;
using CONTAINERS::Rows;

BandNetwork::BandNetwork(std::shared_ptr<BandWeights const> weights)
    : weights_(std::move(weights)),
      shape_(weights_->shape),
      kernels_(CONTAINERS::rowKernels()),
      states_(shape_.depth, Rows(shape_.groups, shape_.channels)),
      standard_(shape_.bands + 2 * shape_.reach),
      seen_(shape_.groups, shape_.seen()),
      channels_(shape_.groups, shape_.channels),
      normed_(shape_.groups, shape_.channels),
      sums_(shape_.groups, std::max({6 * paddedTo(kRowUnit, shape_.across),
                                     3 * paddedTo(kRowUnit, shape_.channels), shape_.decoded})),
      across_(shape_.groups, 2 * paddedTo(kRowUnit, shape_.across)),
      output_(shape_.groups, 2 * shape_.groupBands),
      scored_(shape_.scored),
      answers_(paddedTo(kRowUnit, 2 * shape_.bands + 1)) {}

void BandNetwork::reset() {
    for (auto& state : states_) state.clear();
}

// Beyond the first and the last band a group sees zeros.
void BandNetwork::see(std::span<float const> features) {
    std::size_t const width = shape_.groupBands + 2 * shape_.reach;
    for (std::size_t kind = 0; kind < shape_.kinds; ++kind) {
        for (std::size_t k = 0; k < shape_.bands; ++k) {
            std::size_t const i = kind * shape_.bands + k;
            standard_[shape_.reach + k] = (features[i] - weights_->mean[i]) * weights_->scale[i];
        }
        for (std::size_t group = 0; group < shape_.groups; ++group) {
            std::copy_n(standard_.data() + group * shape_.groupBands, width,
                        seen_[group] + kind * width);
        }
    }
}

void BandNetwork::runAcross(BandWeights::Across const& across) {
    kernels_.normalise(across.norm, channels_, normed_);
    kernels_.product(across.input, normed_, nullptr, sums_, Finish::none);
    kernels_.bothWays(across.forwards, across.backwards, sums_, across_);
    kernels_.product(across.output, across_, &channels_, channels_, Finish::none);
}

void BandNetwork::runAlong(BandWeights::Along const& along, Rows& state) {
    kernels_.normalise(along.norm, channels_, normed_);
    kernels_.product(along.input, normed_, nullptr, sums_, Finish::none);
    kernels_.product(along.stateToGates, state, &sums_, sums_, Finish::none);
    kernels_.product(along.stateToNew, state, nullptr, normed_, Finish::none);
    kernels_.step(sums_, normed_, state, channels_);
}

void BandNetwork::decode() {
    kernels_.product(weights_->spread, normed_, nullptr, sums_, Finish::none);
    kernels_.product(weights_->spreadSeen, seen_, &sums_, sums_, Finish::rectified);
    kernels_.product(weights_->output, sums_, nullptr, output_, Finish::none);
    float* masks = answers_.data();
    float* shares = masks + shape_.bands;
    for (std::size_t group = 0; group < shape_.groups; ++group) {
        masks = std::copy_n(output_[group], shape_.groupBands, masks);
        shares = std::copy_n(output_[group] + shape_.groupBands, shape_.groupBands, shares);
    }
}

float BandNetwork::voiceLogit() {
    weights_->score.affine(normed_[0], weights_->scoreBias.data(), scored_.data());
    float logit = weights_->voiceBias;
    for (std::size_t i = 0; i < scored_.size(); ++i) {
        logit += std::max(scored_[i], 0.0f) * weights_->voice[i];
    }
    return logit;
}

void BandNetwork::run(std::span<float const> features) {
    see(features);
    kernels_.product(weights_->gather, seen_, &weights_->place, channels_, Finish::rectified);
    for (std::size_t i = 0; i < states_.size(); ++i) {
        auto const& block = weights_->blocks[i];
        if (block.across) runAcross(*block.across);
        runAlong(block.along, states_[i]);
    }
    kernels_.normalise(weights_->norm, channels_, normed_);
    decode();
    answers_[2 * shape_.bands] = voiceLogit();
    kernels_.sigmoid(answers_);
}

}  // namespace MORVA::NOISE_CANCELLER
