// The weight of a band network (version NC_1.0.0): read by name, every shape checked, and laid out
// for the kernels. Read-only once built; all sessions of a model share it.
#pragma once

#include <cstddef>
#include <optional>
#include <vector>

#include "kernels/packed_matrix.h"
#include "kernels/row_layer.h"
#include "noise_canceller/band_layout.h"
#include "weights/weight.h"

namespace MORVA::NOISE_CANCELLER {

// Neighbouring bands make groups, which run through the same layers.
struct BandShape {
    std::size_t bands;       // K
    std::size_t kinds;       // F, of features: 1 or 3
    std::size_t groupBands;  // g
    std::size_t reach;       // r, bands that a group sees beyond its own, on either side
    std::size_t groups;      // K / g
    std::size_t channels;    // C, of a group
    std::size_t across;      // A, in each direction across the groups; 0 without such layers
    std::size_t decoded;     // D
    std::size_t scored;      // S
    std::size_t depth;       // blocks

    std::size_t seen() const { return kinds * (groupBands + 2 * reach); }
};

struct BandWeights {
    // A recurrent layer over the groups, both ways.
    struct Across {
        CONTAINERS::RowNorm norm;
        CONTAINERS::RowLayer input;  // of both directions
        CONTAINERS::RowLayer forwards;
        CONTAINERS::RowLayer backwards;
        CONTAINERS::RowLayer output;
    };
    // A recurrent layer over time, for every group.
    struct Along {
        CONTAINERS::RowNorm norm;
        CONTAINERS::RowLayer input;
        CONTAINERS::RowLayer stateToGates;
        CONTAINERS::RowLayer stateToNew;
    };
    struct Block {
        std::optional<Across> across;
        Along along;
    };

    BandLayout layout;
    BandShape shape;
    std::vector<float> mean;   // of the F K features
    std::vector<float> scale;  // 1 over their deviations
    CONTAINERS::RowLayer gather;
    CONTAINERS::Rows place;  // what a group adds to what it gathers
    std::vector<Block> blocks;
    CONTAINERS::RowNorm norm;
    CONTAINERS::RowLayer spread;      // of the channels
    CONTAINERS::RowLayer spreadSeen;  // of what is seen, on top of that
    CONTAINERS::RowLayer output;      // masks of a group's bands, then their shares of noise
    CONTAINERS::PackedMatrix score;   // of the channels of all groups
    std::vector<float> scoreBias;
    std::vector<float> voice;  // of the scored units
    float voiceBias;
};

// `bins` is the width of all bands together. Throws MORVA_Exception for missing values and, naming
// the value and both shapes, for what does not fit.
BandWeights readBandWeights(WEIGHTS::Weight const& weight, std::size_t bins);

}  // namespace MORVA::NOISE_CANCELLER
