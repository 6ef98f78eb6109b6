#include "kernels/row_layer.h"

#include <algorithm>

namespace MORVA::CONTAINERS {
namespace {

// Where each value of a row of parts stands once they are padded, and at last how long it is.
std::vector<std::size_t> places(Parts const& parts) {
    std::vector<std::size_t> all;
    std::size_t start = 0;
    for (std::size_t const part : parts) {
        for (std::size_t i = 0; i < part; ++i) all.push_back(start + i);
        start += paddedTo(kRowUnit, part);
    }
    all.push_back(start);
    return all;
}

AlignedVector<float> paddedVector(std::vector<float> const& values, Parts const& parts) {
    auto const at = places(parts);
    AlignedVector<float> all(at.back());
    for (std::size_t i = 0; i < values.size(); ++i) all[at[i]] = values[i];
    return all;
}

Matrix transposed(Matrix const& matrix) {
    Matrix other{std::vector<float>(matrix.data.size()), matrix.cols, matrix.rows};
    for (std::size_t r = 0; r < matrix.rows; ++r) {
        for (std::size_t c = 0; c < matrix.cols; ++c) {
            other.data[c * matrix.rows + r] = matrix.data[r * matrix.cols + c];
        }
    }
    return other;
}

}  // namespace

Matrix paddedInputs(Matrix const& matrix, Parts const& parts) {
    auto const at = places(parts);
    Matrix all{std::vector<float>(at.back() * matrix.cols), at.back(), matrix.cols};
    for (std::size_t r = 0; r < matrix.rows; ++r) {
        std::copy_n(matrix.data.data() + r * matrix.cols, matrix.cols,
                    all.data.data() + at[r] * matrix.cols);
    }
    return all;
}

Matrix rowsOf(Matrix const& matrix, std::size_t first, std::size_t count) {
    auto const begin = matrix.data.begin() + static_cast<std::ptrdiff_t>(first * matrix.cols);
    return {{begin, begin + static_cast<std::ptrdiff_t>(count * matrix.cols)}, count, matrix.cols};
}

Matrix columnsOf(Matrix const& matrix, std::size_t first, std::size_t count) {
    return transposed(rowsOf(transposed(matrix), first, count));
}

Matrix besideEachOther(Matrix const& left, Matrix const& right) {
    auto all = transposed(left);
    auto const more = transposed(right);
    all.data.insert(all.data.end(), more.data.begin(), more.data.end());
    all.rows += more.rows;
    return transposed(all);
}

RowLayer::RowLayer(Matrix const& matrix, std::vector<float> const& biases, Parts const& inputParts,
                   Parts const& outputParts)
    : bias(paddedVector(biases, outputParts)) {
    auto const whole =
        transposed(paddedInputs(transposed(paddedInputs(matrix, inputParts)), outputParts));
    inputs = whole.rows;
    width = whole.cols;
    weights.assign(whole.data.begin(), whole.data.end());
}

RowNorm::RowNorm(std::vector<float> const& gains, std::vector<float> const& biases)
    : width(gains.size()),
      gain(paddedVector(gains, {gains.size()})),
      bias(paddedVector(biases, {biases.size()})) {}

}  // namespace MORVA::CONTAINERS
