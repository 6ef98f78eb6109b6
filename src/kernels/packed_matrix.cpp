#include "kernels/packed_matrix.h"

#include <immintrin.h>

#include <algorithm>
#include <array>

#include "kernels/float_control.h"

namespace MORVA::CONTAINERS {
namespace {

constexpr std::size_t kPanel = 32;  // columns
constexpr std::size_t kLanes = 8;   // floats in a register
constexpr std::size_t kRegisters = kPanel / kLanes;

std::uint16_t toHalf(float value) {
    // The vector form: the scalar one is a macro that clang's pedantic C++ refuses.
    __m128i const half = _mm_cvtps_ph(_mm_set_ss(value), _MM_FROUND_TO_NEAREST_INT);
    return static_cast<std::uint16_t>(_mm_cvtsi128_si32(half));
}
bool isExactInHalf(float value) {
    return _cvtsh_ss(toHalf(value)) == value;
}

__m256 load(float const* values) {
    return _mm256_load_ps(values);
}
__m256 load(std::uint16_t const* values) {
    // The cast is how the instruction set names 16 bytes of anything.
    return _mm256_cvtph_ps(_mm_load_si128(reinterpret_cast<__m128i const*>(values)));
}

// Calls `store(panel-major index, value)` for every element; padding columns are left out.
template <class Store>
void forEachPacked(Matrix const& matrix, Store&& store) {
    for (std::size_t r = 0; r < matrix.rows; ++r) {
        for (std::size_t c = 0; c < matrix.cols; ++c) {
            std::size_t const panel = c / kPanel;
            store((panel * matrix.rows + r) * kPanel + c % kPanel,
                  matrix.data[r * matrix.cols + c]);
        }
    }
}

// The sums of one panel over all rows; even and odd rows apart, so that sums do not wait for each
// other.
template <class T>
void panelProduct(T const* panel, std::size_t rows, float const* x, float* sums) {
    __m256 even[kRegisters] = {};
    __m256 odd[kRegisters] = {};
    auto const accumulate = [&](__m256(&into)[kRegisters], std::size_t row) {
        __m256 const factor = _mm256_broadcast_ss(x + row);
        T const* const values = panel + row * kPanel;
        for (std::size_t i = 0; i < kRegisters; ++i) {
            into[i] = _mm256_fmadd_ps(factor, load(values + i * kLanes), into[i]);
        }
    };
    std::size_t row = 0;
    for (; row + 2 <= rows; row += 2) {
        accumulate(even, row);
        accumulate(odd, row + 1);
    }
    if (row < rows) accumulate(even, row);
    for (std::size_t i = 0; i < kRegisters; ++i) {
        _mm256_store_ps(sums + i * kLanes, _mm256_add_ps(even[i], odd[i]));
    }
}

template <class T>
void product(T const* panels, std::size_t rows, std::size_t cols, float const* x, float const* bias,
             float* out) {
    alignas(64) std::array<float, kPanel> sums;
    for (std::size_t first = 0; first < cols; first += kPanel, panels += rows * kPanel) {
        panelProduct(panels, rows, x, sums.data());
        std::size_t const count = std::min(kPanel, cols - first);
        for (std::size_t i = 0; i < count; ++i) out[first + i] = bias[first + i] + sums[i];
    }
}

}  // namespace

PackedMatrix::PackedMatrix(Matrix const& matrix) : rows_(matrix.rows), cols_(matrix.cols) {
    // What is exact is judged in the mode that frames compute in: not every processor, emulated
    // ones at least, reads the smallest halves back in it.
    UTILS::ScopedFloatControl const asInFrames(UTILS::Denormals::asZero);
    std::size_t const size = (cols_ + kPanel - 1) / kPanel * kPanel * rows_;
    if (std::ranges::all_of(matrix.data, isExactInHalf)) {
        half_.resize(size);
        forEachPacked(matrix, [&](std::size_t at, float value) { half_[at] = toHalf(value); });
    } else {
        single_.resize(size);
        forEachPacked(matrix, [&](std::size_t at, float value) { single_[at] = value; });
    }
}

void PackedMatrix::affine(float const* x, float const* bias, float* out) const {
    if (isHalfPrecision()) {
        product(half_.data(), rows_, cols_, x, bias, out);
    } else {
        product(single_.data(), rows_, cols_, x, bias, out);
    }
}

}  // namespace MORVA::CONTAINERS
