// What the network of neighbouring bands spends its time on. Every sum is a chain of fused products
// in the order of its inputs, so that the bits do not depend on how wide the registers are. Rows
// are described in row_layer.h; shapes are the caller's promise.
#pragma once

#include <span>

#include "kernels/row_layer.h"

namespace MORVA::CONTAINERS {

enum class Finish { none, rectified };

struct RowKernels {
    // y = onto + bias + x W for every row; `onto` is null for none, and may be y. What a row of y
    // has beyond the layer's width stays.
    void (*product)(RowLayer const& layer, Rows const& x, Rows const* onto, Rows& y, Finish finish);

    // Each row to zero mean and unit deviation, then scaled and shifted.
    void (*normalise)(RowNorm const& norm, Rows const& x, Rows& y);

    // One step of a gated recurrent layer for every row, from the sums of its three gates, in the
    // last of which the state has no part but what the first leaves of `recalled`. The new state is
    // also added to `onto`.
    void (*step)(Rows const& sums, Rows const& recalled, Rows& state, Rows& onto);

    // A gated recurrent layer from the first row to the last and one from the last to the first,
    // their states side by side in y. `fromInput` holds the six gates of both.
    void (*bothWays)(RowLayer const& forwards, RowLayer const& backwards, Rows const& fromInput,
                     Rows& y);

    // 1 / (1 + e^-v), in place, of a multiple of kRowUnit values.
    void (*sigmoid)(std::span<float> values);
};

// The fastest for this processor. [any thread]
RowKernels const& rowKernels();

}  // namespace MORVA::CONTAINERS
