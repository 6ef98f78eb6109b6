#include "kernels/portable/complex_transform.h"

#include <cmath>
#include <numbers>
#include <utility>

#include "kernels/vector_layer.h"

namespace MORVA::UTILS {
namespace {

std::complex<double> root(std::size_t numerator, std::size_t denominator) {
    return std::polar(1.0, -2.0 * std::numbers::pi * static_cast<double>(numerator) /
                               static_cast<double>(denominator));
}

std::size_t nextRadix(std::size_t n) {
    for (std::size_t const radix : {4, 2, 3, 5}) {
        if (n % radix == 0) return radix;
    }
    for (std::size_t radix = 7; radix * radix <= n; radix += 2) {
        if (n % radix == 0) return radix;
    }
    return n;
}

}  // namespace

ComplexTransform::ComplexTransform(std::size_t n) {
    for (std::size_t stride = 1; stride < n; stride *= passes_.back().radix) {
        std::size_t const left = n / stride;
        std::size_t const radix = nextRadix(left);
        Pass pass{radix, left / radix, stride, {}, {}, {}};
        for (std::size_t j = 1; j < radix; ++j) {
            for (std::size_t p = 0; p < pass.groups; ++p) {
                auto const twiddle = root(j * p, left);
                pass.twiddleRe.push_back(static_cast<float>(twiddle.real()));
                pass.twiddleIm.push_back(static_cast<float>(twiddle.imag()));
            }
        }
        for (std::size_t j = 0; radix > 5 && j < radix; ++j)
            pass.roots.emplace_back(root(j, radix));
        passes_.push_back(std::move(pass));
    }
}

}  // namespace MORVA::UTILS

HWY_BEFORE_NAMESPACE();
namespace MORVA::UTILS {
namespace {

namespace hn = hwy::HWY_NAMESPACE;

using Pass = ComplexTransform::Pass;

constexpr hn::CappedTag<float, 8> kEight;
constexpr hn::CappedTag<float, 4> kFour;
constexpr hn::CappedTag<float, 1> kOne;

// Complex numbers in a pair of registers.
template <class V>
struct Value {
    V re;
    V im;
};
template <class V>
Value<V> operator+(Value<V> a, Value<V> b) {
    return {hn::Add(a.re, b.re), hn::Add(a.im, b.im)};
}
template <class V>
Value<V> operator-(Value<V> a, Value<V> b) {
    return {hn::Sub(a.re, b.re), hn::Sub(a.im, b.im)};
}
template <class V>
Value<V> operator*(Value<V> a, Value<V> b) {
    return {hn::NegMulAdd(a.im, b.im, hn::Mul(a.re, b.re)),
            hn::MulAdd(a.re, b.im, hn::Mul(a.im, b.re))};
}
// sum + factor a
template <class V>
Value<V> plusScaled(Value<V> sum, V factor, Value<V> a) {
    return {hn::MulAdd(factor, a.re, sum.re), hn::MulAdd(factor, a.im, sum.im)};
}
// (a - i b, a + i b)
template <class V>
void turn(Value<V> a, Value<V> b, Value<V>& right, Value<V>& left) {
    right = {hn::Add(a.re, b.im), hn::Sub(a.im, b.re)};
    left = {hn::Sub(a.re, b.im), hn::Add(a.im, b.re)};
}

// Transforms of 2 to 5 points, in place.
template <class D, class V>
void butterfly(D, Value<V> (&a)[2]) {
    auto const difference = a[0] - a[1];
    a[0] = a[0] + a[1];
    a[1] = difference;
}

template <class D, class V>
void butterfly(D d, Value<V> (&a)[3]) {
    V const sine = hn::Set(d, 0.866025404f);
    auto const sum = a[1] + a[2];
    auto const difference = a[1] - a[2];
    auto const middle = plusScaled(a[0], hn::Set(d, -0.5f), sum);
    a[0] = a[0] + sum;
    turn(middle, {hn::Mul(sine, difference.re), hn::Mul(sine, difference.im)}, a[1], a[2]);
}

template <class D, class V>
void butterfly(D, Value<V> (&a)[4]) {
    auto const even = a[0] + a[2];
    auto const evenDifference = a[0] - a[2];
    auto const odd = a[1] + a[3];
    auto const oddDifference = a[1] - a[3];
    a[0] = even + odd;
    a[2] = even - odd;
    turn(evenDifference, oddDifference, a[1], a[3]);
}

template <class D, class V>
void butterfly(D d, Value<V> (&a)[5]) {
    V const cosine1 = hn::Set(d, 0.309016994f);
    V const cosine2 = hn::Set(d, -0.809016994f);
    V const sine1 = hn::Set(d, 0.951056516f);
    V const sine2 = hn::Set(d, 0.587785252f);
    auto const outer = a[1] + a[4];
    auto const inner = a[2] + a[3];
    auto const outerDifference = a[1] - a[4];
    auto const innerDifference = a[2] - a[3];
    auto const first = plusScaled(plusScaled(a[0], cosine1, outer), cosine2, inner);
    auto const second = plusScaled(plusScaled(a[0], cosine2, outer), cosine1, inner);
    Value<V> const zero{hn::Zero(d), hn::Zero(d)};
    auto const firstTurn =
        plusScaled(plusScaled(zero, sine2, innerDifference), sine1, outerDifference);
    auto const secondTurn =
        plusScaled(plusScaled(zero, hn::Neg(sine1), innerDifference), sine2, outerDifference);
    a[0] = a[0] + outer + inner;
    turn(first, firstTurn, a[1], a[4]);
    turn(second, secondTurn, a[2], a[3]);
}

template <class D>
Value<hn::Vec<D>> load(D d, ComplexParts from, std::size_t at) {
    return {hn::LoadU(d, from.re + at), hn::LoadU(d, from.im + at)};
}
template <class D, class V>
void store(D d, Value<V> value, ComplexParts to, std::size_t at) {
    hn::StoreU(value.re, d, to.re + at);
    hn::StoreU(value.im, d, to.im + at);
}

// Groups from `first` on; registers run along the stride, which is a multiple of their length.
template <std::size_t radix, class D>
void alongStride(D d, Pass const& pass, std::size_t first, ComplexParts in, ComplexParts out) {
    using V = hn::Vec<D>;
    std::size_t const stride = pass.stride;
    for (std::size_t p = first; p < pass.groups; ++p) {
        Value<V> twiddle[radix];
        for (std::size_t j = 1; j < radix; ++j) {
            std::size_t const at = (j - 1) * pass.groups + p;
            twiddle[j] = {hn::Set(d, pass.twiddleRe[at]), hn::Set(d, pass.twiddleIm[at])};
        }
        for (std::size_t q = 0; q < stride; q += hn::Lanes(d)) {
            Value<V> a[radix];
            for (std::size_t k = 0; k < radix; ++k) {
                a[k] = load(d, in, q + stride * (p + pass.groups * k));
            }
            butterfly(d, a);
            store(d, a[0], out, q + stride * radix * p);
            for (std::size_t j = 1; j < radix; ++j) {
                store(d, a[j] * twiddle[j], out, q + stride * (radix * p + j));
            }
        }
    }
}

// The first pass of radix 4, stride 1: registers run along the groups. Returns how many it did.
template <class D>
std::size_t alongGroups(D d, Pass const& pass, ComplexParts in, ComplexParts out) {
    std::size_t const groups = pass.groups;
    float const* const re = pass.twiddleRe.data();
    float const* const im = pass.twiddleIm.data();
    std::size_t p = 0;
    for (; p + hn::Lanes(d) <= groups; p += hn::Lanes(d)) {
        Value<hn::Vec<D>> a[4];
        for (std::size_t k = 0; k < 4; ++k) a[k] = load(d, in, p + groups * k);
        butterfly(d, a);
        for (std::size_t j = 1; j < 4; ++j) {
            std::size_t const at = (j - 1) * groups + p;
            a[j] = a[j] * Value<hn::Vec<D>>{hn::LoadU(d, re + at), hn::LoadU(d, im + at)};
        }
        hn::StoreInterleaved4(a[0].re, a[1].re, a[2].re, a[3].re, d, out.re + 4 * p);
        hn::StoreInterleaved4(a[0].im, a[1].im, a[2].im, a[3].im, d, out.im + 4 * p);
    }
    return p;
}

template <std::size_t radix>
void runPass(Pass const& pass, ComplexParts in, ComplexParts out) {
    if (radix == 4 && pass.stride == 1) {
        alongStride<radix>(kOne, pass, alongGroups(kEight, pass, in, out), in, out);
    } else if (pass.stride % hn::Lanes(kEight) == 0) {
        alongStride<radix>(kEight, pass, 0, in, out);
    } else if (pass.stride % hn::Lanes(kFour) == 0) {
        alongStride<radix>(kFour, pass, 0, in, out);
    } else {
        alongStride<radix>(kOne, pass, 0, in, out);
    }
}

// Any radix, straight from the definition.
void runGeneralPass(Pass const& pass, ComplexParts in, ComplexParts out) {
    std::size_t const stride = pass.stride;
    for (std::size_t p = 0; p < pass.groups; ++p) {
        for (std::size_t j = 0; j < pass.radix; ++j) {
            std::size_t const at = (j - 1) * pass.groups + p;
            auto const twiddle = j == 0
                                     ? std::complex<float>(1.0f)
                                     : std::complex<float>(pass.twiddleRe[at], pass.twiddleIm[at]);
            for (std::size_t q = 0; q < stride; ++q) {
                std::complex<float> sum;
                for (std::size_t k = 0; k < pass.radix; ++k) {
                    std::size_t const from = q + stride * (p + pass.groups * k);
                    sum += std::complex(in.re[from], in.im[from]) * pass.roots[j * k % pass.radix];
                }
                std::size_t const to = q + stride * (pass.radix * p + j);
                out.re[to] = (sum * twiddle).real();
                out.im[to] = (sum * twiddle).imag();
            }
        }
    }
}

}  // namespace

ComplexParts ComplexTransform::run(ComplexParts data, ComplexParts spare) const {
    for (Pass const& pass : passes_) {
        switch (pass.radix) {
            case 2:
                runPass<2>(pass, data, spare);
                break;
            case 3:
                runPass<3>(pass, data, spare);
                break;
            case 4:
                runPass<4>(pass, data, spare);
                break;
            case 5:
                runPass<5>(pass, data, spare);
                break;
            default:
                runGeneralPass(pass, data, spare);
        }
        std::swap(data, spare);
    }
    return data;
}

}  // namespace MORVA::UTILS
HWY_AFTER_NAMESPACE();
