#include "kernels/fft.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <numbers>
#include <optional>

#include "kernels/portable/complex_transform.h"
#include "kernels/vector_layer.h"
#include "utils/non_copyable.h"

namespace MORVA::UTILS {
namespace {

// Two sets of complex points for the length of a call: on the stack for every frame that a model
// can have (40 ms at 96000 Hz, or 1323 samples, the longest odd one), from the heap for more.
class Workspace : private NonCopyMovable {
public:
    explicit Workspace(std::size_t points)
        : points_(points), heap_(4 * points > kStack ? 4 * points : 0) {}

    ComplexParts data() { return {part(0), part(1)}; }
    ComplexParts spare() { return {part(2), part(3)}; }

private:
    static constexpr std::size_t kStack = 8192;  // floats: 4096 real samples, 2048 of an odd number

    float* part(std::size_t index) {
        return (heap_.empty() ? stack_.data() : heap_.data()) + index * points_;
    }

    std::size_t points_;
    alignas(64) std::array<float, kStack> stack_;
    std::vector<float> heap_;
};

ComplexParts exchanged(ComplexParts parts) {
    return {parts.im, parts.re};
}

// For an even length n: even samples are the real parts, odd ones the imaginary parts of a
// transform of n / 2 points.
struct EvenTables {
    explicit EvenTables(std::size_t n)
        : half(n / 2), scale(1.0f / static_cast<float>(n)), transform(half) {
        for (std::size_t k = 0; k < half; ++k) {
            double const angle =
                -2.0 * std::numbers::pi * static_cast<double>(k) / static_cast<double>(n);
            cosine.push_back(static_cast<float>(std::cos(angle)));
            sine.push_back(static_cast<float>(std::sin(angle)));
        }
    }

    std::size_t half;
    float scale;
    ComplexTransform transform;
    std::vector<float> cosine;  // w^k with w = exp(-2 pi i / n)
    std::vector<float> sine;
};

}  // namespace
}  // namespace MORVA::UTILS

HWY_BEFORE_NAMESPACE();
namespace MORVA::UTILS {
namespace {

namespace hn = hwy::HWY_NAMESPACE;

constexpr hn::CappedTag<float, 8> kEight;
constexpr hn::CappedTag<float, 1> kOne;

// Calls body(tag, index) for registers of values and then for single ones, `first` to `last`.
template <class Body>
void forRegisters(std::size_t first, std::size_t last, Body&& body) {
    for (; first + hn::Lanes(kEight) <= last; first += hn::Lanes(kEight)) body(kEight, first);
    for (; first < last; ++first) body(kOne, first);
}

void forward(EvenTables const& tables, float const* in, float* out) {
    std::size_t const half = tables.half;
    Workspace space(half);
    auto const data = space.data();
    forRegisters(0, half, [&](auto d, std::size_t k) HWY_ATTR {
        hn::Vec<decltype(d)> re;
        hn::Vec<decltype(d)> im;
        hn::LoadInterleaved2(d, in + 2 * k, re, im);
        hn::StoreU(re, d, data.re + k);
        hn::StoreU(im, d, data.im + k);
    });
    auto const z = tables.transform.run(data, space.spare());
    // With Z = E + i O, the transforms of even and odd samples: X[k] = E[k] + w^k O[k].
    forRegisters(1, half, [&](auto d, std::size_t k) HWY_ATTR {
        std::size_t const mirrored = half - k + 1 - hn::Lanes(d);
        auto const re = hn::LoadU(d, z.re + k);
        auto const im = hn::LoadU(d, z.im + k);
        auto const otherRe = hn::Reverse(d, hn::LoadU(d, z.re + mirrored));
        auto const otherIm = hn::Reverse(d, hn::LoadU(d, z.im + mirrored));
        auto const oddRe = hn::Add(im, otherIm);
        auto const oddIm = hn::Sub(otherRe, re);
        auto const c = hn::LoadU(d, tables.cosine.data() + k);
        auto const s = hn::LoadU(d, tables.sine.data() + k);
        auto const sumRe = hn::MulAdd(c, oddRe, hn::NegMulAdd(s, oddIm, hn::Add(re, otherRe)));
        auto const sumIm = hn::MulAdd(c, oddIm, hn::MulAdd(s, oddRe, hn::Sub(im, otherIm)));
        auto const scale = hn::Set(d, 0.5f);
        hn::StoreInterleaved2(hn::Mul(scale, sumRe), hn::Mul(scale, sumIm), d, out + 2 * k);
    });
    float const re = z.re[0];
    float const im = z.im[0];
    out[0] = re + im;
    out[2 * half] = re - im;
    out[1] = out[2 * half + 1] = 0.0f;
}

// The way back.
void backward(EvenTables const& tables, float const* in, float* out) {
    std::size_t const half = tables.half;
    Workspace space(half);
    auto const data = space.data();
    data.re[0] = (in[0] + in[2 * half]) * tables.scale;
    data.im[0] = (in[0] - in[2 * half]) * tables.scale;
    forRegisters(1, half, [&](auto d, std::size_t k) HWY_ATTR {
        using V = hn::Vec<decltype(d)>;
        V re;
        V im;
        V otherRe;
        V otherIm;
        hn::LoadInterleaved2(d, in + 2 * k, re, im);
        hn::LoadInterleaved2(d, in + 2 * (half - k + 1 - hn::Lanes(d)), otherRe, otherIm);
        otherRe = hn::Reverse(d, otherRe);
        otherIm = hn::Reverse(d, otherIm);
        auto const turnedRe = hn::Sub(re, otherRe);
        auto const turnedIm = hn::Add(im, otherIm);
        auto const c = hn::LoadU(d, tables.cosine.data() + k);
        auto const s = hn::LoadU(d, tables.sine.data() + k);
        auto const oddRe = hn::MulAdd(c, turnedRe, hn::Mul(s, turnedIm));
        auto const oddIm = hn::NegMulAdd(s, turnedRe, hn::Mul(c, turnedIm));
        auto const scale = hn::Set(d, tables.scale);
        hn::StoreU(hn::Mul(scale, hn::Sub(hn::Add(re, otherRe), oddIm)), d, data.re + k);
        hn::StoreU(hn::Mul(scale, hn::Add(hn::Sub(im, otherIm), oddRe)), d, data.im + k);
    });
    auto const z = exchanged(tables.transform.run(exchanged(data), exchanged(space.spare())));
    forRegisters(0, half, [&](auto d, std::size_t k) HWY_ATTR {
        hn::StoreInterleaved2(hn::LoadU(d, z.re + k), hn::LoadU(d, z.im + k), d, out + 2 * k);
    });
}

}  // namespace
}  // namespace MORVA::UTILS
HWY_AFTER_NAMESPACE();

namespace MORVA::UTILS {
namespace {

// An odd length: the samples are the real parts.
void oddForward(ComplexTransform const& transform, std::size_t n, float const* in,
                std::complex<float>* out) {
    Workspace space(n);
    auto const data = space.data();
    std::copy_n(in, n, data.re);
    std::fill_n(data.im, n, 0.0f);
    auto const z = transform.run(data, space.spare());
    for (std::size_t k = 0; k <= n / 2; ++k) out[k] = {z.re[k], z.im[k]};
}

void oddBackward(ComplexTransform const& transform, std::size_t n, std::complex<float> const* in,
                 float* out) {
    Workspace space(n);
    auto const data = space.data();
    data.re[0] = in[0].real();
    data.im[0] = 0.0f;
    for (std::size_t k = 1; k <= n / 2; ++k) {
        data.re[k] = data.re[n - k] = in[k].real();
        data.im[k] = in[k].imag();
        data.im[n - k] = -in[k].imag();
    }
    auto const z = exchanged(transform.run(exchanged(data), exchanged(space.spare())));
    for (std::size_t j = 0; j < n; ++j) out[j] = z.re[j] / static_cast<float>(n);
}

class FFT_Portable final : public FFT, private NonCopyMovable {
public:
    explicit FFT_Portable(std::size_t n) : size_(n) {
        if (n % 2 == 0) {
            even_.emplace(n);
        } else {
            odd_.emplace(n);
        }
    }

    bool computeForward(std::vector<float> const& in,
                        std::vector<std::complex<float>>& out) const override {
        out.resize(size_ / 2 + 1);
        return computeForward(in.data(), in.size(), out.data(), out.size());
    }

    // (A complex number is two floats in a row, by the language's own promise.)
    bool computeForward(float const* in, std::size_t, std::complex<float>* out,
                        std::size_t) const override {
        if (size_ == 0) return false;
        if (even_) {
            forward(*even_, in, reinterpret_cast<float*>(out));
        } else {
            oddForward(*odd_, size_, in, out);
        }
        return true;
    }

    bool computeBackward(std::vector<std::complex<float>> const& in,
                         std::vector<float>& out) const override {
        out.resize(size_);
        return computeBackward(in.data(), in.size(), out.data(), out.size());
    }

    bool computeBackward(std::complex<float> const* in, std::size_t, float* out,
                         std::size_t) const override {
        if (size_ == 0) return false;
        if (even_) {
            backward(*even_, reinterpret_cast<float const*>(in), out);
        } else {
            oddBackward(*odd_, size_, in, out);
        }
        return true;
    }

private:
    std::size_t size_;
    std::optional<EvenTables> even_;
    std::optional<ComplexTransform> odd_;
};

}  // namespace

std::shared_ptr<FFT> FFT::create(std::size_t n) {
    return std::make_shared<FFT_Portable>(n);
}

}  // namespace MORVA::UTILS
