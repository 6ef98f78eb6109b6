// The network of version NC_1.0.0: groups of neighbouring bands run through the same layers, which
// are recurrent over time and, both ways, over the groups. Each group says for each of its bands
// what to keep and how much of it is noise; what all of them know together is the voice score.
//
// One object per stream; after construction nothing is allocated.
#pragma once

#include <memory>
#include <span>
#include <vector>

#include "kernels/row_kernels.h"
#include "noise_canceller/band_weights.h"

namespace MORVA::NOISE_CANCELLER {

class BandNetwork {
public:
    explicit BandNetwork(std::shared_ptr<BandWeights const> weights);

    // Back to the state after construction.
    void reset();

    // One frame of F K features, not standardised, one kind after the other.
    void run(std::span<float const> features);

    // What it said of the last frame, 0..1 each.
    std::span<float const> masks() const { return {answers_.data(), shape_.bands}; }
    std::span<float const> noiseShares() const {
        return {answers_.data() + shape_.bands, shape_.bands};
    }
    float voiceScore() const { return answers_[2 * shape_.bands]; }

private:
    void see(std::span<float const> features);
    void runAcross(BandWeights::Across const& across);
    void runAlong(BandWeights::Along const& along, CONTAINERS::Rows& state);
    void decode();
    float voiceLogit();

    std::shared_ptr<BandWeights const> weights_;
    BandShape const& shape_;
    CONTAINERS::RowKernels const& kernels_;
    std::vector<CONTAINERS::Rows> states_;  // of every block

    std::vector<float> standard_;  // features of one kind, with r zeros on either side
    CONTAINERS::Rows seen_;
    CONTAINERS::Rows channels_;
    CONTAINERS::Rows normed_;  // the channels normalised; then what a recurrent layer recalls
    CONTAINERS::Rows sums_;    // of a recurrent layer's gates; at last what is decoded
    CONTAINERS::Rows across_;
    CONTAINERS::Rows output_;
    std::vector<float> scored_;
    std::vector<float> answers_;
};

}  // namespace MORVA::NOISE_CANCELLER
