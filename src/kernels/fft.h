// Real-to-complex transform of n points and its inverse, as every model uses it.
//
// A spectrum is n / 2 + 1 bins: bin k holds the sum of x[j] * exp(-2 pi i j k / n). Forward is
// unscaled, backward is scaled by 1 / n, so backward(forward(x)) == x. Built once per model and
// shared; all compute calls are const and may run on several threads at once.
#pragma once

#include <complex>
#include <cstddef>
#include <memory>
#include <vector>

namespace MORVA::UTILS {

class FFT {
public:
    // Never fails for want of a transform: a length that the library refuses shows as false from
    // the compute calls.
    static std::shared_ptr<FFT> create(std::size_t n);

    // The vector forms size their output (n / 2 + 1 bins, n samples); the pointer forms trust the
    // caller for that room and ignore the sizes. Input and output must not overlap. All return
    // whether the library succeeded.
    virtual bool computeForward(std::vector<float> const& in,
                                std::vector<std::complex<float>>& out) const = 0;
    virtual bool computeForward(float const* in, std::size_t inSize, std::complex<float>* out,
                                std::size_t outSize) const = 0;
    virtual bool computeBackward(std::vector<std::complex<float>> const& in,
                                 std::vector<float>& out) const = 0;
    virtual bool computeBackward(std::complex<float> const* in, std::size_t inSize, float* out,
                                 std::size_t outSize) const = 0;
    virtual ~FFT() = default;
};

}  // namespace MORVA::UTILS
