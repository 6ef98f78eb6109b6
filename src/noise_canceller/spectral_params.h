// What the noise cleaners of all generations read from a weight and its environment, and which of
// their parts each generation has. Read once per cleaner. [control thread]
#pragma once

#include <cstddef>

#include "noise_canceller/band_layout.h"
#include "noise_canceller/frame_params.h"
#include "weights/model_environment.h"

namespace MORVA::NOISE_CANCELLER {

struct Generation {
    char const* suffix;  // of its parameter keys
    WindowPair windows;
    LevelReference level;
    bool compressesBands;
    bool structureFirst;  // read before means, deviations and network
};

// The lengths of a model, checked against each other.
struct Structure : FrameShape {
    // Throws MORVA_Exception for missing values and for a structure that the pipeline cannot run.
    explicit Structure(WEIGHTS::Weight const& weight);

    std::size_t filtrBegin;  // half-open band of bins that the model sees
    std::size_t filtrEnd;
    std::size_t previewFrames;      // P, frames of context
    std::size_t coefficientNumber;  // bins of the full mask
};

struct SpectralParams : Structure, FrameTunables {
    using Environment = CONTAINERS::ModelEnvironment::element_type;

    // Throws MORVA_Exception for missing values and for a structure that the pipeline cannot run.
    SpectralParams(Environment& environment, std::size_t frameMs, Generation const& generation);

    std::size_t sessionFrameMs;

    float smootCoef;
    bool smootRmModify;
    bool highFreqSmoot;
    bool skipFrame;
    bool enableRmThreshold;
    float rmThreshold;
    BandLayout bands;

    // Samples whose peak does not exceed this are digital silence.
    static constexpr float kSkipThreshold = 0.0f;

    std::size_t featureWidth() const { return previewFrames * bands.bands(); }
    HopPipeline::Shape pipelineShape() const { return pipeline(sessionFrameMs); }

private:
    void readTunables(ParameterReader const& reader, Generation const& generation);
};

}  // namespace MORVA::NOISE_CANCELLER
