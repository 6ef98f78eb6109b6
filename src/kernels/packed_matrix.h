// A weight matrix laid out for the one product that networks run: a row vector times the matrix,
// plus a bias. Columns are stored in panels of 32, so that a product reads memory strictly forward
// and keeps its sums in registers; a matrix whose values are all exact in half precision is stored
// in half precision where the processor converts it, which halves what the cache has to deliver and
// changes no result.
//
// The sums are single precision in a fixed order: the same bits from run to run, whatever the
// alignment of the operands. Read-only after construction; any thread.
#pragma once

#include <cstddef>
#include <cstdint>

#include "kernels/aligned_vector.h"
#include "kernels/matrix.h"
#include "kernels/panel_product.h"

namespace MORVA::CONTAINERS {

class PackedMatrix {
public:
    explicit PackedMatrix(Matrix const& matrix);

    std::size_t rows() const { return rows_; }
    std::size_t cols() const { return cols_; }
    bool isHalfPrecision() const { return !half_.empty(); }

    // out = x W + bias; x holds rows() values, bias and out cols() values.
    void affine(float const* x, float const* bias, float* out) const;

private:
    std::size_t rows_;
    std::size_t cols_;
    PanelProduct product_;
    AlignedVector<std::uint16_t> half_;
    AlignedVector<float> single_;
};

}  // namespace MORVA::CONTAINERS
