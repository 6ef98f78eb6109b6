// One stream of audio: checks the caller's frames, brings them to the model's scale and rate, hands
// them to the cleaner and brings the result back. Samples inside are floats on the 16-bit scale.
//
// One thread at a time per session; sessions on different threads share nothing but read-only
// weights. A rejected frame changes no state. After the first frames a frame call allocates
// nothing.
#pragma once

#include <cstddef>
#include <limits>
#include <memory>
#include <utility>
#include <vector>

#include "morva-sdk/bypass.h"
#include "morva-sdk/morva-sdk.h"
#include "morva-sdk/vocabulary.h"
#include "noise_canceller/mask_controls.h"
#include "noise_canceller/noise_cleaner.h"
#include "utils/non_copyable.h"
#include "utils/resampler.h"

namespace MORVA::MORVA_SDK {

class MorvaSessionT : public UTILS::NonCopyMovable {
public:
    // Throws MORVA_Exception for an unknown model, a weight that cannot run in this kind of
    // session, or a duration other than 10, 20, 30 and 40 ms.
    MorvaSessionT(MorvaSamplingRate inputRate, MorvaSamplingRate outputRate,
                  MorvaFrameDuration duration, char const* modelName, MorvaSessionType type);

    MorvaSessionType getType() const { return type_; }

    // Cleans one frame of a noise-cancellation session; false, with a line on standard error, for
    // wrong sizes or null pointers.
    bool cleanNoise(short const* input, std::size_t inputSize, short* output,
                    std::size_t outputSize);
    bool cleanNoise(float const* input, std::size_t inputSize, float* output,
                    std::size_t outputSize);

    // The model's value for one frame. A wrong size throws for short and gives -2.0 for float,
    // after a line on standard error.
    float frameVad(short const* input, std::size_t inputSize);
    float frameVad(float const* input, std::size_t inputSize);
    float frameNoiseDB(short const* input, std::size_t inputSize);
    float frameNoiseDB(float const* input, std::size_t inputSize);

    // Back to the start state; always true.
    bool resetNoiseDBSession();

    std::size_t inputFrameSize() const { return inputFrameSize_; }
    std::size_t outputFrameSize() const { return outputFrameSize_; }
    // From sound in to sound out, in samples at the output rate; 0 for sessions without sound.
    double latencySamples() const { return latency_; }

    // Of noise-cancellation sessions; null otherwise.
    NOISE_CANCELLER::MaskControls* maskControls() { return maskControls_; }
    Bypass* bypass() { return bypass_.get(); }

    // Lets a voice-activity session on that model judge every frame that this one cleans. Its
    // frames are ready at once. Throws like the constructor. [the session's thread, between frames]
    void enableVoice(char const* vadModel);
    // Its score of the last frame; NaN without one.
    float lastVoice() const { return lastVoice_; }

private:
    template <class Format, class Sample>
    bool cleanSamples(Sample const* input, std::size_t inputSize, Sample* output,
                      std::size_t outputSize);
    template <class Format, class Sample>
    bool takeFrame(Sample const* input, std::size_t inputSize);

    // Both work on frame_, which holds the caller's samples on the internal scale: it becomes the
    // cleaned output frame, or its first value the model's result.
    void cleanFrame();
    float modelValue();
    float frameValue(short const* input, std::size_t inputSize, char const* function);
    float frameValue(float const* input, std::size_t inputSize);
    void through(UTILS::Resampler& resampler);

    void prepareSoundPath(MorvaFrameDuration duration);
    void warmUp();

    // Declared so that the cleaner goes first when the session ends.
    MorvaSamplingRate inputRate_;
    MorvaFrameDuration duration_;
    std::size_t inputFrameSize_ = 0;
    std::size_t outputFrameSize_ = 0;
    std::size_t modelFrameSize_ = 0;
    double latency_ = 0.0;
    float lastVoice_ = std::numeric_limits<float>::quiet_NaN();
    MorvaSessionType type_;
    std::unique_ptr<UTILS::Resampler> outputResampler_;
    std::unique_ptr<UTILS::Resampler> inputResampler_;
    std::vector<float> frame_;
    std::vector<float> resampled_;
    std::unique_ptr<Bypass> bypass_;
    std::unique_ptr<MorvaSessionT> voice_;
    std::unique_ptr<NOISE_CANCELLER::NoiseCleaner> cleaner_;
    NOISE_CANCELLER::MaskControls* maskControls_ = nullptr;  // of cleaner_
};

}  // namespace MORVA::MORVA_SDK
