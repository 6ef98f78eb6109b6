// Sample-rate conversion of one mono stream, block by block, with exact block lengths.
//
// Rates are ratios only: two block lengths of the same duration serve as well as two rates. The
// first block is shifted right by leadingZeros() samples, the filter's delay. No allocation after
// the first block of the largest size.
#pragma once

#include <cstddef>
#include <memory>
#include <vector>

#include "resampler/stream_converter.h"
#include "utils/non_copyable.h"

namespace MORVA::UTILS {

class Resampler : private NonCopyMovable {
public:
    // Throws MORVA_Exception for a rate of 0, a ratio outside 1/256 .. 256, or when the filter
    // cannot be built.
    Resampler(std::size_t inRate, std::size_t outRate);

    // Converts one block: `out` gets exactly in.size() * outRate / inRate samples, truncated.
    // Returns how many samples the filter delivered in this call (in.size() at equal rates, where
    // `out` is a copy). `in` and `out` may be the same vector.
    unsigned resample(std::vector<float> const& in, std::vector<float>& out);

    // Plain streaming conversion without padding, for callers that expect it; the engine converts
    // blocks. Returns the number of samples written.
    int resample(float* in, int inCount, float* out, int outCapacity);

    // Back to the state of a new object; always true. Throws when the filter cannot be built.
    bool reset();

    double ratio() const { return static_cast<double>(outRate_) / static_cast<double>(inRate_); }

    // Zeros that a first block of `blockLength` input samples starts with, in output samples: the
    // latency of this conversion. 0 at equal rates. Converts a block: not for the audio thread.
    std::size_t leadingZeros(std::size_t blockLength) const;

private:
    bool isIdentity() const { return inRate_ == outRate_; }
    int convert(float const* in, int inCount, float* out, int room);
    void startWithDelay(std::vector<float>& out, int produced);
    void continueStream(std::vector<float>& out, int produced);

    std::size_t inRate_;
    std::size_t outRate_;
    std::unique_ptr<StreamConverter> converter_;
    int extraRoom_ = 1024;
    int heldOver_ = 0;
    bool firstBlock_ = true;
    std::vector<float> buffer_;
};

}  // namespace MORVA::UTILS
