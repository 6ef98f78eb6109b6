// Layers that many rows run through with the same weights: what the network of neighbouring bands
// is made of, whose rows are groups of bands.
//
// Rows and weights are padded with zeros to whole registers, so that the kernels (row_kernels.h)
// have no remainders; a unit that is padding stays 0 in every kernel.
#pragma once

#include <cstddef>
#include <vector>

#include "kernels/aligned_vector.h"
#include "kernels/matrix.h"

namespace MORVA::CONTAINERS {

inline constexpr std::size_t kRowUnit = 8;  // to whose multiples columns are padded
inline constexpr std::size_t kRowTile = 6;  // and rows: a product takes as many at a time

constexpr std::size_t paddedTo(std::size_t multiple, std::size_t n) {
    return (n + multiple - 1) / multiple * multiple;
}

// `count` rows of `width` values, 0 at first, with at least one row of padding behind them.
class Rows {
public:
    Rows(std::size_t count, std::size_t width)
        : count_(count),
          stride_(paddedTo(kRowUnit, width)),
          values_(paddedTo(kRowTile, count + 1) * stride_) {}

    std::size_t count() const { return count_; }
    std::size_t stride() const { return stride_; }  // the width with its padding
    float* operator[](std::size_t row) { return values_.data() + row * stride_; }
    float const* operator[](std::size_t row) const { return values_.data() + row * stride_; }
    void clear() { values_.assign(values_.size(), 0.0f); }

private:
    std::size_t count_;
    std::size_t stride_;
    AlignedVector<float> values_;
};

// Sizes of neighbouring parts of a row, each of which is padded on its own.
using Parts = std::vector<std::size_t>;

// x W + b. Inputs and outputs consist of parts: the gates of a recurrent layer are three of one
// size.
struct RowLayer {
    RowLayer(Matrix const& matrix, std::vector<float> const& biases, Parts const& inputParts,
             Parts const& outputParts);

    std::size_t inputs;  // rows of the weights, padding between the parts included
    std::size_t width;   // of a row of weights
    AlignedVector<float> weights;
    AlignedVector<float> bias;
};

// Gain and bias of a layer normalisation over `width` units.
struct RowNorm {
    RowNorm(std::vector<float> const& gains, std::vector<float> const& biases);

    std::size_t width;
    AlignedVector<float> gain;
    AlignedVector<float> bias;
};

// The matrix for inputs that consist of padded parts.
Matrix paddedInputs(Matrix const& matrix, Parts const& parts);
Matrix rowsOf(Matrix const& matrix, std::size_t first, std::size_t count);
Matrix columnsOf(Matrix const& matrix, std::size_t first, std::size_t count);
Matrix besideEachOther(Matrix const& left, Matrix const& right);

}  // namespace MORVA::CONTAINERS
