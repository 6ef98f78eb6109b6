#include "kernels/half_precision.h"

#include "kernels/vector_layer.h"

HWY_BEFORE_NAMESPACE();
namespace MORVA::UTILS {

namespace hn = hwy::HWY_NAMESPACE;

bool toHalfPrecision(std::span<float const> values, std::span<std::uint16_t> halves) {
    constexpr hn::CappedTag<float, 8> floats;
    constexpr hn::Rebind<std::uint16_t, decltype(floats)> words;
    constexpr hn::Rebind<hwy::float16_t, decltype(floats)> half;
    bool exact = true;
    for (std::size_t i = 0; i < values.size(); i += hn::Lanes(floats)) {
        auto const value = hn::LoadU(floats, values.data() + i);
        auto const rounded = hn::DemoteTo(half, value);
        hn::StoreU(hn::BitCast(words, rounded), words, halves.data() + i);
        exact = exact && hn::AllTrue(floats, hn::Eq(hn::PromoteTo(floats, rounded), value));
    }
    return exact;
}

}  // namespace MORVA::UTILS
HWY_AFTER_NAMESPACE();
