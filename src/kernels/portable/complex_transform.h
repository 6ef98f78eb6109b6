// Discrete Fourier transform of n complex points, real and imaginary parts apart: passes of mixed
// radix that leave the points in order (Stockham's scheme), radix 4 first. Lengths made of 2, 3 and
// 5 are fast, above all multiples of 4; any other works. Read-only once built; any thread.
#pragma once

#include <complex>
#include <cstddef>
#include <vector>

namespace MORVA::UTILS {

// Points that lie somewhere else.
struct ComplexParts {
    float* re;
    float* im;
};

class ComplexTransform {
public:
    explicit ComplexTransform(std::size_t n);

    // X[k] = sum of x[j] exp(-2 pi i j k / n), unscaled. Overwrites both `data` and `spare`, which
    // has the same room, and returns the one that holds the result. Allocates nothing. (The inverse
    // is the same with the parts exchanged.)
    ComplexParts run(ComplexParts data, ComplexParts spare) const;

    // Combines `radix` points that lie groups * stride apart.
    struct Pass {
        std::size_t radix;
        std::size_t groups;
        std::size_t stride;
        // exp(-2 pi i j p / (groups radix)) for the outputs j = 1 .. radix - 1, each for all p.
        std::vector<float> twiddleRe;
        std::vector<float> twiddleIm;
        std::vector<std::complex<float>> roots;  // of a radix without a butterfly of its own
    };

private:
    std::vector<Pass> passes_;
};

}  // namespace MORVA::UTILS
