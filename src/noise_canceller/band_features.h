// What a band network sees of a frame, before standardisation: the logarithm of each band's power
// and, where the network asks for three kinds of features, how the band has turned since the frame
// before, relative to the centres of its bins, as real and imaginary part. A steady tone turns to a
// point near the unit circle, noise to anywhere within, silence to zero.
#pragma once

#include <complex>
#include <span>
#include <vector>

#include "noise_canceller/band_layout.h"

namespace MORVA::NOISE_CANCELLER {

class BandFeatures {
public:
    // `layout` must outlive this object.
    BandFeatures(BandLayout const& layout, std::size_t kinds);

    // The frame before is silence again.
    void reset();

    // Kind after kind, of a spectrum whose last bin is not looked at. `gain` brings it to the
    // level at which the network hears.
    std::span<float const> of(std::span<std::complex<float> const> spectrum, float gain);

    // The power of the last frame in parts of its bands, one share for each.
    double powerOf(std::span<float const> shares) const;

private:
    void addTurn(std::span<std::complex<float> const> spectrum, float offset);

    BandLayout const& layout_;
    std::vector<std::complex<float>> before_;
    std::vector<float> power_;  // of the bands
    std::vector<float> powerBefore_;
    std::vector<float> features_;
};

}  // namespace MORVA::NOISE_CANCELLER
