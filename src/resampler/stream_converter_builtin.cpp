#include "resampler/band_limited_interpolator.h"
#include "resampler/stream_converter.h"

namespace MORVA::UTILS {

std::unique_ptr<StreamConverter> makeStreamConverter(unsigned long inRate, unsigned long outRate) {
    return std::make_unique<BandLimitedInterpolator>(inRate, outRate);
}

}  // namespace MORVA::UTILS
