// What a running noise cleaner lets its session change and read, beside cleaning frames.
#pragma once

namespace MORVA::NOISE_CANCELLER {

class MaskControls {
public:
    virtual ~MaskControls() = default;

    // Lowest gain that a bin is multiplied by, 0 (no limit) to 1 (nothing is removed). Takes effect
    // with the next model frame; the overlap of the frames fades it in. [any thread]
    virtual void setMaskFloor(float floor) = 0;

    // Level of what the last hops removed, as noise-level sessions report it. [the session's
    // thread]
    virtual float noiseLevelDb() const = 0;

    // False when the model has no background-speaker stage. [any thread]
    virtual bool switchBackgroundSpeaker(bool) { return false; }
};

}  // namespace MORVA::NOISE_CANCELLER
