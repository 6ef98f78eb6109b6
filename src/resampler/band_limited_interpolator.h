// Streaming sample-rate conversion by band-limited interpolation: the built-in filter.
//
// Delivers, call by call, as many samples at the same positions as the library that it stands in
// for. A call of process() allocates nothing.
#pragma once

#include <cstddef>
#include <memory>
#include <vector>

#include "resampler/interpolation_filter.h"
#include "resampler/stream_converter.h"

namespace MORVA::UTILS {

class BandLimitedInterpolator final : public StreamConverter {
public:
    // Throws MORVA_Exception for rates whose filter would be too large.
    BandLimitedInterpolator(std::size_t inRate, std::size_t outRate);

    int process(float const* in, int inCount, int& used, float* out, int room) override;
    void reset() override;

private:
    std::size_t take(float const* in, std::size_t count);
    void forget(double passed);
    float interpolate();

    std::shared_ptr<InterpolationFilter const> filter_;
    std::size_t phaseStep_;
    double step_;         // input samples per output sample
    std::size_t margin_;  // samples kept before the clock and awaited after it
    std::size_t capacity_;
    std::vector<float> window_;  // the input around the clock
    std::size_t filled_ = 0;
    double clock_ = 0.0;  // position of the next output in window_
    double end_ = 0.0;    // outputs before this position can be computed
    std::size_t phase_ = 0;
};

}  // namespace MORVA::UTILS
