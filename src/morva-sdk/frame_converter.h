// Brings whole frames of one stream from one rate to another, in place.
#pragma once

#include <cstddef>
#include <vector>

#include "resampler/resampler.h"

namespace MORVA::MORVA_SDK {

class FrameConverter {
public:
    // Frame lengths of the same duration, in samples.
    FrameConverter(std::size_t inputFrame, std::size_t outputFrame)
        : inputFrame_(inputFrame), resampler_(inputFrame, outputFrame) {
        converted_.reserve(outputFrame);
    }

    // A frame from which nothing comes out stays as it is.
    void convert(std::vector<float>& frame) {
        if (ratio() == 1.0 || resampler_.resample(frame, converted_) == 0) return;
        // Not swapped: each vector keeps the memory that it has grown to.
        frame.assign(converted_.begin(), converted_.end());
    }

    void reset() { resampler_.reset(); }

    double ratio() const { return resampler_.ratio(); }
    // Of the filter, in output samples. [control thread]
    std::size_t delay() const { return resampler_.leadingZeros(inputFrame_); }

private:
    std::size_t inputFrame_;
    UTILS::Resampler resampler_;
    std::vector<float> converted_;
};

}  // namespace MORVA::MORVA_SDK
