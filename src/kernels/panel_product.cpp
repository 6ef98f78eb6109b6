#include "kernels/panel_product.h"

#include "kernels/wide_registers.h"

#define HWY_TARGET_INCLUDE "kernels/panel_product.cpp"  // compiled once for every width
#include "kernels/vector_layer.h"

HWY_BEFORE_NAMESPACE();
namespace MORVA::CONTAINERS::HWY_NAMESPACE {
namespace {

namespace hn = hwy::HWY_NAMESPACE;

constexpr hn::CappedTag<float, kPanel> kFloats;
constexpr hn::Rebind<std::uint16_t, decltype(kFloats)> kWords;
constexpr hn::Rebind<hwy::float16_t, decltype(kFloats)> kHalves;
constexpr std::size_t kLanes = hn::MaxLanes(kFloats);
#ifdef __wasm__  // runs on processors with sixteen registers, which eight sums and their factors
                 // fill
constexpr std::size_t kRegisters = 4;
#else
constexpr std::size_t kRegisters = kPanel / kLanes;
#endif
constexpr std::size_t kColumns = kRegisters * kLanes;  // at a time

using Floats = hn::Vec<decltype(kFloats)>;

Floats load(float const* values) {
    return hn::Load(kFloats, values);
}
[[maybe_unused]] Floats load(std::uint16_t const* values) {
    return hn::PromoteTo(kFloats, hn::BitCast(kHalves, hn::Load(kWords, values)));
}

template <class T>
void accumulate(Floats (&into)[kRegisters], T const* values, float x) {
    Floats const factor = hn::Set(kFloats, x);
    for (std::size_t i = 0; i < kRegisters; ++i) {
        into[i] = hn::MulAdd(factor, load(values + i * kLanes), into[i]);
    }
}

// Even and odd rows apart, so that sums do not wait for each other.
template <class T>
void columns(T const* panel, std::size_t rows, float const* x, float* sums) {
    Floats even[kRegisters];
    Floats odd[kRegisters];
    for (std::size_t i = 0; i < kRegisters; ++i) even[i] = odd[i] = hn::Zero(kFloats);
    std::size_t row = 0;
    for (; row + 2 <= rows; row += 2) {
        accumulate(even, panel + row * kPanel, x[row]);
        accumulate(odd, panel + (row + 1) * kPanel, x[row + 1]);
    }
    if (row < rows) accumulate(even, panel + row * kPanel, x[row]);
    for (std::size_t i = 0; i < kRegisters; ++i) {
        hn::Store(hn::Add(even[i], odd[i]), kFloats, sums + i * kLanes);
    }
}

template <class T>
void product(T const* panel, std::size_t rows, float const* x, float* sums) {
    for (std::size_t c = 0; c < kPanel; c += kColumns) columns(panel + c, rows, x, sums + c);
}

}  // namespace

extern PanelProduct const kProduct;
#ifdef __wasm__
PanelProduct const kProduct{product<float>, nullptr};
#else
PanelProduct const kProduct{product<float>, product<std::uint16_t>};
#endif

}  // namespace MORVA::CONTAINERS::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace MORVA::CONTAINERS {

PanelProduct const& panelProduct() {
#if HWY_TARGETS & HWY_AVX3
    if (UTILS::wideRegistersPay()) return N_AVX3::kProduct;
#endif
    return HWY_STATIC_DISPATCH(kProduct);
}

}  // namespace MORVA::CONTAINERS
#endif
