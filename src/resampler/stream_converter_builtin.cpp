#include "resampler/band_limited_interpolator.h"
#include "resampler/stream_converter.h"

namespace MORVA::UTILS {

std::unique_ptr<StreamConverter> makeStreamConverter(std::size_t inRate, std::size_t outRate) {
    return std::make_unique<BandLimitedInterpolator>(inRate, outRate);
}

}  // namespace MORVA::UTILS
