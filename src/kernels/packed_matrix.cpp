#include "kernels/packed_matrix.h"

#include <algorithm>
#include <array>

#include "kernels/float_control.h"
#include "kernels/half_precision.h"

namespace MORVA::CONTAINERS {
namespace {

// Panel after panel, each of `rows` rows; the last one is padded with zeros.
std::vector<float> packed(Matrix const& matrix) {
    std::size_t const panels = (matrix.cols + kPanel - 1) / kPanel;
    std::vector<float> values(panels * matrix.rows * kPanel);
    for (std::size_t r = 0; r < matrix.rows; ++r) {
        for (std::size_t c = 0; c < matrix.cols; ++c) {
            values[(c / kPanel * matrix.rows + r) * kPanel + c % kPanel] =
                matrix.data[r * matrix.cols + c];
        }
    }
    return values;
}

template <class T, class Product>
void affinePanels(Product product, T const* panel, std::size_t rows, std::size_t cols,
                  float const* x, float const* bias, float* out) {
    alignas(64) std::array<float, kPanel> sums;
    for (std::size_t first = 0; first < cols; first += kPanel, panel += rows * kPanel) {
        product(panel, rows, x, sums.data());
        std::size_t const count = std::min(kPanel, cols - first);
        for (std::size_t i = 0; i < count; ++i) out[first + i] = bias[first + i] + sums[i];
    }
}

}  // namespace

PackedMatrix::PackedMatrix(Matrix const& matrix)
    : rows_(matrix.rows), cols_(matrix.cols), product_(panelProduct()) {
    // What is exact is judged in the mode that frames compute in: not every processor, emulated
    // ones at least, reads the smallest halves back in it.
    UTILS::ScopedFloatControl const asInFrames(UTILS::Denormals::asZero);
    auto const values = packed(matrix);
    if (product_.half != nullptr) {
        half_.resize(values.size());
        if (UTILS::toHalfPrecision(values, half_)) return;
        half_.clear();
        half_.shrink_to_fit();
    }
    single_.assign(values.begin(), values.end());
}

void PackedMatrix::affine(float const* x, float const* bias, float* out) const {
    if (isHalfPrecision()) {
        affinePanels(product_.half, half_.data(), rows_, cols_, x, bias, out);
    } else {
        affinePanels(product_.single, single_.data(), rows_, cols_, x, bias, out);
    }
}

}  // namespace MORVA::CONTAINERS
