// One stream of audio, from the caller's frames to the model and back.
//
// The way of a frame, with the file that a reader finds each step in; a rejected frame changes no
// state.
//
//   Morva_NC_CleanAmbientNoiseInt16, ...   finds the session of a handle        morva-sdk.cpp
//     MorvaSessionT::cleanNoise            size and null check; samples to      session.cpp
//                                          floats on the 16-bit scale, not a
//                                          number -> 0; and back at the end
//       SoundPath::clean                   what else a noise session hears      sound_path.cpp
//         ModelStage::run                  the caller's rate -> the model's     model_stage.cpp
//           NoiseCleaner::cleanNoise       hops, spectrum, network, mask        noise_canceller/
//                                                                               mask_model.h
//
// A voice-activity or noise-level session has no sound path: its frames go to the model stage at
// once, and the model's one value is the answer.
#pragma once

#include <cstddef>
#include <optional>
#include <span>
#include <variant>
#include <vector>

#include "morva-sdk/model_stage.h"
#include "morva-sdk/sound_path.h"
#include "morva-sdk/vocabulary.h"
#include "utils/non_copyable.h"

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

    // Of noise-cancellation sessions only.
    SoundPath& sound() { return std::get<SoundPath>(path_); }
    // Lets a voice-activity model judge every frame that is cleaned from now on. Throws like the
    // constructor. [control thread], between frames
    void enableVoice(char const* vadModel);

private:
    using Path = std::variant<ModelStage, SoundPath>;
    Path openPath(char const* modelName) const;

    template <class Format, class Sample>
    bool cleanSamples(std::span<Sample const> input, std::span<Sample> output);
    template <class Format, class Sample>
    std::optional<float> valueOf(std::span<Sample const> input);
    float frameValue(short const* input, std::size_t inputSize, char const* function);
    float frameValue(float const* input, std::size_t inputSize);

    MorvaSamplingRate inputRate_;
    MorvaFrameDuration duration_;
    MorvaSessionType type_;
    std::size_t inputFrameSize_;
    std::size_t outputFrameSize_;
    std::vector<float> frame_;  // the caller's samples on the internal scale, then what they become
    Path path_;
};

}  // namespace MORVA::MORVA_SDK
