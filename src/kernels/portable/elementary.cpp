#include "kernels/elementary.h"

#include <algorithm>
#include <cmath>

#include "kernels/vector_layer.h"
// After the layer's settings:
#include <hwy/contrib/math/math-inl.h>

HWY_BEFORE_NAMESPACE();
namespace MORVA::UTILS {
namespace {

namespace hn = hwy::HWY_NAMESPACE;

// values <- function(values), where they are numbers. A register at a time; what is left over goes
// through the same code, so that a value does not depend on its place.
template <class T, class Function>
void transform(std::span<T> values, Function function) {
    constexpr hn::CappedTag<T, 32 / sizeof(T)> tag;
    auto const inPlace = [&](T* at) HWY_ATTR {
        auto const x = hn::LoadU(tag, at);
        hn::StoreU(hn::IfThenElse(hn::IsNaN(x), x, function(tag, x)), tag, at);
    };
    std::size_t const lanes = hn::Lanes(tag);
    std::size_t i = 0;
    for (; i + lanes <= values.size(); i += lanes) inPlace(values.data() + i);
    if (i == values.size()) return;
    HWY_ALIGN T rest[hn::MaxLanes(tag)] = {};
    std::copy(values.begin() + static_cast<std::ptrdiff_t>(i), values.end(), rest);
    inPlace(rest);
    std::copy_n(rest, values.size() - i, values.begin() + static_cast<std::ptrdiff_t>(i));
}

}  // namespace

void exponentials(std::span<double> values) {
    // Within what the layer's function takes, and short of denormals.
    constexpr double kLimit = 700.0;
#if !HWY_HAVE_FLOAT64  // WebAssembly: the layer has no registers of doubles
    for (double& value : values) {
        if (!std::isnan(value)) value = std::exp(std::clamp(value, -kLimit, kLimit));
    }
#else
    transform(values, [](auto tag, auto x) HWY_ATTR {
        auto const limited = hn::Min(hn::Max(x, hn::Set(tag, -kLimit)), hn::Set(tag, kLimit));
        return hn::Exp(tag, limited);
    });
#endif
}

void logarithms(std::span<float> values) {
    transform(values, [](auto tag, auto x) HWY_ATTR { return hn::Log(tag, x); });
}

}  // namespace MORVA::UTILS
HWY_AFTER_NAMESPACE();
