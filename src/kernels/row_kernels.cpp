#include "kernels/row_kernels.h"

#include <cmath>

#include "kernels/wide_registers.h"

#define HWY_TARGET_INCLUDE "kernels/row_kernels.cpp"  // compiled once for every width
#include "kernels/vector_layer.h"

HWY_BEFORE_NAMESPACE();
namespace MORVA::CONTAINERS::HWY_NAMESPACE {
namespace {

namespace hn = hwy::HWY_NAMESPACE;

constexpr hn::CappedTag<float, 2 * kRowUnit> kWide;
constexpr hn::CappedTag<float, kRowUnit> kUnit;
constexpr std::size_t kWideLanes = hn::MaxLanes(kWide);
constexpr std::size_t kUnitLanes = hn::MaxLanes(kUnit);

// Calls body(tag, index) for whole registers of `width` values, at the end for narrower ones.
template <class Body>
HWY_INLINE void forRegisters(std::size_t width, Body&& body) {
    std::size_t i = 0;
    for (; i + kWideLanes <= width; i += kWideLanes) body(kWide, i);
    for (; i < width; i += kUnitLanes) body(kUnit, i);
}

// ---- elementary functions ----

constexpr float kLog2e = 1.44269504f;

// 2^y, limited to 2^-120 .. 2^120. The power of the fraction is a polynomial, exact at 0 and
// elsewhere within 2e-7.
template <class D, class V>
HWY_INLINE V exp2(D d, V y) {
    constexpr hn::RebindToSigned<D> whole;
    auto const limited = hn::Min(hn::Max(y, hn::Set(d, -120.0f)), hn::Set(d, 120.0f));
    auto const rounded = hn::Round(limited);
    auto const f = hn::Sub(limited, rounded);
    auto power = hn::MulAdd(hn::Set(d, 1.32647261e-3f), f, hn::Set(d, 9.67151299e-3f));
    power = hn::MulAdd(power, f, hn::Set(d, 5.55073358e-2f));
    power = hn::MulAdd(power, f, hn::Set(d, 2.40222424e-1f));
    power = hn::MulAdd(power, f, hn::Set(d, 6.93147004e-1f));
    power = hn::MulAdd(power, f, hn::Set(d, 1.0f));
    auto const exponent = hn::ShiftLeft<23>(hn::ConvertTo(whole, rounded));
    return hn::BitCast(d, hn::Add(hn::BitCast(whole, power), exponent));
}

template <class D, class V>
HWY_INLINE V sigmoidOf(D d, V x) {
    auto const one = hn::Set(d, 1.0f);
    return hn::Div(one, hn::Add(one, exp2(d, hn::Mul(x, hn::Set(d, -kLog2e)))));
}

template <class D, class V>
HWY_INLINE V tanhOf(D d, V x) {
    auto const one = hn::Set(d, 1.0f);
    auto const power = exp2(d, hn::Mul(x, hn::Set(d, 2.0f * kLog2e)));
    return hn::Sub(one, hn::Div(hn::Set(d, 2.0f), hn::Add(one, power)));
}

void sigmoid(std::span<float> values) {
    forRegisters(values.size(), [&](auto d, std::size_t i) HWY_ATTR {
        float* const at = values.data() + i;
        hn::StoreU(sigmoidOf(d, hn::LoadU(d, at)), d, at);
    });
}

// ---- products ----

// Where the operands of a tile begin.
struct TileAt {
    float const* x;
    std::size_t xStride;
    float const* weights;  // of its first column
    float const* bias;
    float const* onto;  // or null
    std::size_t ontoStride;
    float* y;
    std::size_t yStride;
};

// kRowTile rows by `registers` of columns.
template <std::size_t registers, class D>
HWY_INLINE void tile(D d, TileAt const& at, std::size_t inputs, std::size_t width, Finish finish) {
    std::size_t const lanes = hn::Lanes(d);
    hn::Vec<D> sums[kRowTile][registers];
    for (std::size_t i = 0; i < registers; ++i) {
        auto const bias = hn::LoadU(d, at.bias + i * lanes);
        for (std::size_t row = 0; row < kRowTile; ++row) sums[row][i] = bias;
    }
    if (at.onto != nullptr) {
        for (std::size_t row = 0; row < kRowTile; ++row) {
            for (std::size_t i = 0; i < registers; ++i) {
                auto const more = hn::LoadU(d, at.onto + row * at.ontoStride + i * lanes);
                sums[row][i] = hn::Add(sums[row][i], more);
            }
        }
    }
    float const* weights = at.weights;
    for (std::size_t k = 0; k < inputs; ++k, weights += width) {
        hn::Vec<D> factors[registers];
        for (std::size_t i = 0; i < registers; ++i) factors[i] = hn::LoadU(d, weights + i * lanes);
        for (std::size_t row = 0; row < kRowTile; ++row) {
            auto const x = hn::Set(d, at.x[row * at.xStride + k]);
            for (std::size_t i = 0; i < registers; ++i) {
                sums[row][i] = hn::MulAdd(x, factors[i], sums[row][i]);
            }
        }
    }
    for (std::size_t row = 0; row < kRowTile; ++row) {
        for (std::size_t i = 0; i < registers; ++i) {
            auto value = sums[row][i];
            if (finish == Finish::rectified) value = hn::Max(value, hn::Zero(d));
            hn::StoreU(value, d, at.y + row * at.yStride + i * lanes);
        }
    }
}

// All rows of some columns, whose weights stay in the nearest cache.
template <std::size_t registers, class D>
HWY_INLINE void columns(D d, TileAt at, std::size_t rows, RowLayer const& layer, Finish finish) {
    for (std::size_t row = 0; row < rows; row += kRowTile) {
        tile<registers>(d, at, layer.inputs, layer.width, finish);
        at.x += kRowTile * at.xStride;
        at.y += kRowTile * at.yStride;
        if (at.onto != nullptr) at.onto += kRowTile * at.ontoStride;
    }
}

void product(RowLayer const& layer, Rows const& x, Rows const* onto, Rows& y, Finish finish) {
    auto const from = [&](std::size_t column) {
        return TileAt{x[0],
                      x.stride(),
                      layer.weights.data() + column,
                      layer.bias.data() + column,
                      onto != nullptr ? (*onto)[0] + column : nullptr,
                      onto != nullptr ? onto->stride() : 0,
                      y[0] + column,
                      y.stride()};
    };
    std::size_t const rows = y.count();
    std::size_t c = 0;
    for (; c + 2 * kWideLanes <= layer.width; c += 2 * kWideLanes) {
        columns<2>(kWide, from(c), rows, layer, finish);
    }
    if (c + kWideLanes <= layer.width) {
        columns<1>(kWide, from(c), rows, layer, finish);
        c += kWideLanes;
    }
    for (; c < layer.width; c += kUnitLanes) columns<1>(kUnit, from(c), rows, layer, finish);
}

// ---- normalisation ----

// Eight interleaved sums, added up in a fixed order.
class EightSums {
public:
    HWY_INLINE EightSums() {
        for (auto& part : parts_) part = hn::Zero(kUnit);
    }
    // The first `limit` of eight values.
    template <class Value>
    HWY_INLINE void add(std::size_t limit, Value&& value) {
        for (std::size_t p = 0; p < kParts; ++p) {
            std::size_t const first = p * kUnitLanes;
            auto const some = hn::FirstN(kUnit, limit > first ? limit - first : 0);
            parts_[p] = hn::Add(parts_[p], hn::IfThenElseZero(some, value(first)));
        }
    }
    HWY_INLINE float total() const {
        HWY_ALIGN float all[kRowUnit];
        for (std::size_t p = 0; p < kParts; ++p) {
            hn::Store(parts_[p], kUnit, all + p * kUnitLanes);
        }
        return ((all[0] + all[4]) + (all[2] + all[6])) + ((all[1] + all[5]) + (all[3] + all[7]));
    }

private:
    static constexpr std::size_t kParts = kRowUnit / kUnitLanes;
    hn::Vec<decltype(kUnit)> parts_[kParts];
};

// The mean of value(i) over the units of a row.
template <class Value>
HWY_INLINE float meanOver(std::size_t width, Value&& value) {
    EightSums sums;
    for (std::size_t i = 0; i < width; i += kRowUnit) {
        sums.add(width - i, [&](std::size_t first) HWY_ATTR { return value(i + first); });
    }
    return sums.total() / static_cast<float>(width);
}

void normalise(RowNorm const& norm, Rows const& x, Rows& y) {
    constexpr float kLeastVariance = 1e-5f;  // a row of one value is divided by its root
    for (std::size_t row = 0; row < y.count(); ++row) {
        float const* const in = x[row];
        float* const out = y[row];
        float const mean =
            meanOver(norm.width, [&](std::size_t i) HWY_ATTR { return hn::LoadU(kUnit, in + i); });
        auto const away = [&](auto d, std::size_t i)
                              HWY_ATTR { return hn::Sub(hn::LoadU(d, in + i), hn::Set(d, mean)); };
        float const variance = meanOver(norm.width, [&](std::size_t i) HWY_ATTR {
            auto const distance = away(kUnit, i);
            return hn::Mul(distance, distance);
        });
        float const scale = 1.0f / std::sqrt(variance + kLeastVariance);
        forRegisters(y.stride(), [&](auto d, std::size_t i) HWY_ATTR {
            auto const gain = hn::Mul(hn::Set(d, scale), hn::LoadU(d, norm.gain.data() + i));
            auto const value = hn::MulAdd(away(d, i), gain, hn::LoadU(d, norm.bias.data() + i));
            hn::StoreU(value, d, out + i);
        });
    }
}

// ---- gated recurrence ----

// Sums of the three gates of some units.
template <class V>
struct Gates {
    V reset;
    V update;
    V fresh;
};

template <class D, class V = hn::Vec<D>>
HWY_INLINE Gates<V> loadGates(D d, float const* first, std::size_t units) {
    return {hn::LoadU(d, first), hn::LoadU(d, first + units), hn::LoadU(d, first + 2 * units)};
}

// The new state of some units; `recalled` is what the state gives to the new value.
template <class D, class V>
HWY_INLINE V newState(D d, Gates<V> const& sums, V recalled, V before) {
    auto const update = sigmoidOf(d, sums.update);
    auto const fresh = tanhOf(d, hn::MulAdd(sigmoidOf(d, sums.reset), recalled, sums.fresh));
    return hn::MulAdd(update, hn::Sub(before, fresh), fresh);
}

void step(Rows const& sums, Rows const& recalled, Rows& state, Rows& onto) {
    std::size_t const units = state.stride();
    for (std::size_t row = 0; row < state.count(); ++row) {
        float* const unit = state[row];
        float* const sum = onto[row];
        forRegisters(units, [&](auto d, std::size_t i) HWY_ATTR {
            auto const after = newState(d, loadGates(d, sums[row] + i, units),
                                        hn::LoadU(d, recalled[row] + i), hn::LoadU(d, unit + i));
            hn::StoreU(after, d, unit + i);
            hn::StoreU(hn::Add(hn::LoadU(d, sum + i), after), d, sum + i);
        });
    }
}

// One direction at one row; `before` is the state that it comes from.
struct Direction {
    RowLayer const& layer;
    float const* fromInput;
    float const* before;
    float* after;
};

// Some units of one direction.
template <class D>
class Walker {
public:
    using V = hn::Vec<D>;

    HWY_INLINE Walker(D d, Direction const& direction, std::size_t units, std::size_t i)
        : at_(direction),
          units_(units),
          i_(i),
          weights_(direction.layer.weights.data() + i),
          input_(loadGates(d, direction.fromInput + i, units)) {
        auto const bias = loadGates(d, direction.layer.bias.data() + i, units);
        input_.reset = hn::Add(input_.reset, bias.reset);
        input_.update = hn::Add(input_.update, bias.update);
        recalled_ = bias.fresh;
    }
    // What unit k of the state gives.
    HWY_INLINE void recall(D d, std::size_t k) {
        auto const x = hn::Set(d, at_.before[k]);
        auto const factors = loadGates(d, weights_ + 3 * k * units_, units_);
        input_.reset = hn::MulAdd(x, factors.reset, input_.reset);
        input_.update = hn::MulAdd(x, factors.update, input_.update);
        recalled_ = hn::MulAdd(x, factors.fresh, recalled_);
    }
    HWY_INLINE void finish(D d) const {
        auto const before = hn::LoadU(d, at_.before + i_);
        hn::StoreU(newState(d, input_, recalled_, before), d, at_.after + i_);
    }

private:
    Direction const& at_;
    std::size_t units_;
    std::size_t i_;
    float const* weights_;
    Gates<V> input_;
    V recalled_;
};

// Both directions at once: neither waits for the other's sums.
void bothRows(Direction const& a, Direction const& b, std::size_t units) {
    forRegisters(units, [&](auto d, std::size_t i) HWY_ATTR {
        Walker walkerA(d, a, units, i);
        Walker walkerB(d, b, units, i);
        for (std::size_t k = 0; k < units; ++k) {
            walkerA.recall(d, k);
            walkerB.recall(d, k);
        }
        walkerA.finish(d);
        walkerB.finish(d);
    });
}

void bothWays(RowLayer const& forwards, RowLayer const& backwards, Rows const& fromInput, Rows& y) {
    std::size_t const units = y.stride() / 2;
    // Before its first row a direction comes from a row of zeros.
    float const* beforeA = y[y.count()];
    float const* beforeB = y[y.count()];
    for (std::size_t row = 0; row < y.count(); ++row) {
        std::size_t const mirrored = y.count() - 1 - row;
        Direction const a{forwards, fromInput[row], beforeA, y[row]};
        Direction const b{backwards, fromInput[mirrored] + 3 * units, beforeB, y[mirrored] + units};
        bothRows(a, b, units);
        beforeA = a.after;
        beforeB = b.after;
    }
}

}  // namespace

extern RowKernels const kKernels;
RowKernels const kKernels{product, normalise, step, bothWays, sigmoid};

}  // namespace MORVA::CONTAINERS::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace MORVA::CONTAINERS {

RowKernels const& rowKernels() {
#if HWY_TARGETS & HWY_AVX3
    if (UTILS::wideRegistersPay()) return N_AVX3::kKernels;
#endif
    return HWY_STATIC_DISPATCH(kKernels);
}

}  // namespace MORVA::CONTAINERS
#endif
