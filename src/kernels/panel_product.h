// The product that networks spend their time on: a row vector times one panel of a packed matrix.
#pragma once

#include <cstddef>
#include <cstdint>

namespace MORVA::CONTAINERS {

inline constexpr std::size_t kPanel = 32;  // columns

// sums[c] = x[0] panel[0][c] + x[2] panel[2][c] .. and the odd rows, added in this order. `panel`
// holds `rows` rows of kPanel values in single or half precision; it and `sums` are aligned to 64
// bytes. The same bits whichever instructions the processor offers for it. `half` is null where
// none converts halves: WebAssembly.
struct PanelProduct {
    void (*single)(float const* panel, std::size_t rows, float const* x, float* sums);
    void (*half)(std::uint16_t const* panel, std::size_t rows, float const* x, float* sums);
};

// The fastest for this processor. [any thread]
PanelProduct const& panelProduct();

}  // namespace MORVA::CONTAINERS
