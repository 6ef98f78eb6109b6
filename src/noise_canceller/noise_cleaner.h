// The model interface that a session holds, and the choice of a model for a new session.
//
// A cleaner is bound to one registered model: it keeps the model's weight alive, reads it only, and
// owns all the state of one stream.
//
// Threads, here and in everything that a session is made of: an object is used by one thread at a
// time, different ones by different threads at the same time; what several share (weights, windows,
// transforms, filters) is only read. Functions that any thread may call meanwhile say [any thread].
#pragma once

#include <cstddef>
#include <memory>
#include <string>
#include <vector>

#include "morva-sdk/morva-sdk.h"
#include "morva-sdk/vocabulary.h"
#include "utils/non_copyable.h"
#include "weights/model_environment.h"

namespace MORVA::NOISE_CANCELLER {

using CONTAINERS::ModelEnvironment;

class NoiseCleaner : public UTILS::NonCopyMovable {
public:
    virtual ~NoiseCleaner() = default;

    // Processes one session frame at the model's rate, in place. Noise cleaners leave the cleaned
    // frame, the other models one value: their result for the frame.
    virtual bool cleanNoise(std::vector<float>& frame) = 0;

    // Back to the start state, for the models that support it; always true.
    virtual bool resetSession() { return true; }

    std::string getVersion() const;

    ModelEnvironment const& environment() const { return environment_; }

    // Builds the cleaner for a session. `rate` in hertz, `frameMs` the caller's frame length. With
    // a null name the model is chosen by rate and session type. Throws MORVA_Exception.
    static std::unique_ptr<NoiseCleaner> create(MorvaSamplingRate rate, MorvaFrameDuration frameMs,
                                                char const* modelName,
                                                MORVA_SDK::MorvaSessionType type);

    // The environment with the highest weight rate not above `rate` among those that suit the
    // session's type (the first registered on ties), or an empty pointer. For voice and noise level
    // the models of version NC_1.0.0 suit where no other does.
    static ModelEnvironment selectModel(std::vector<ModelEnvironment> const& environments,
                                        MorvaSamplingRate rate, MORVA_SDK::MorvaSessionType type);

protected:
    explicit NoiseCleaner(ModelEnvironment environment);

private:
    ModelEnvironment environment_;
};

class SoundControls;

// A noise cleaner with what its session may change and read beside its frames.
struct NoiseModel {
    std::unique_ptr<NoiseCleaner> cleaner;
    SoundControls& controls;  // of the cleaner
};

// NoiseCleaner::create for noise-cancellation sessions.
NoiseModel createNoiseModel(MorvaSamplingRate rate, MorvaFrameDuration frameMs,
                            char const* modelName);

}  // namespace MORVA::NOISE_CANCELLER
