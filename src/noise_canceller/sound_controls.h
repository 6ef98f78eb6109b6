// What a session may change and read of a running noise cleaner, beside cleaning frames. Each noise
// cleaner has one; it is no base of the cleaner.
#pragma once

#include <cstddef>
#include <limits>

namespace MORVA::NOISE_CANCELLER {

class SoundControls {
public:
    virtual ~SoundControls() = default;

    // Lowest gain that a bin is multiplied by, 0 (no limit) to 1 (nothing is removed). Takes effect
    // with the next model frame; the overlap of the frames fades it in. [any thread]
    virtual void setMaskFloor(float floor) = 0;

    // False when the model has no background-speaker stage. Prints nothing. [any thread]
    virtual bool switchBackgroundSpeaker(bool on) = 0;

    // Level of the noise in the last hops, as noise-level sessions report it. [the session's
    // thread]
    virtual float noiseLevelDb() const = 0;

    // Voice score of the last hop; a NaN where the model has none. [the session's thread]
    virtual float voiceScore() const { return std::numeric_limits<float>::quiet_NaN(); }

    // From sound in to sound out, in samples at the model's rate. [any thread]
    virtual std::size_t delay() const = 0;
};

}  // namespace MORVA::NOISE_CANCELLER
