// The filter behind Resampler: an endless stream at one rate to the same stream at another.
//
// Which one is built in is a build option (MORVA_RESAMPLER): each choice comes as a source file
// that defines makeStreamConverter.
#pragma once

#include <memory>

#include "utils/non_copyable.h"

namespace MORVA::UTILS {

class StreamConverter : private NonCopyMovable {
public:
    virtual ~StreamConverter() = default;

    // Takes up to inCount samples, reports in `used` how many, and writes up to `room` samples;
    // returns how many. Call again while it returns more than 0 or input is left. Allocates
    // nothing.
    virtual int process(float const* in, int inCount, int& used, float* out, int room) = 0;

    // Back to the state of a new object. May throw like makeStreamConverter.
    virtual void reset() = 0;
};

// Throws MORVA_Exception when the filter cannot be built. [control thread]
std::unique_ptr<StreamConverter> makeStreamConverter(std::size_t inRate, std::size_t outRate);

}  // namespace MORVA::UTILS
