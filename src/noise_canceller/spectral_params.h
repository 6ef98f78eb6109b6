// What the noise cleaners of all generations read from a weight and its environment, and which of
// their parts each generation has. Read once per cleaner. [control thread]
#pragma once

#include <cstddef>

#include "noise_canceller/band_layout.h"
#include "noise_canceller/hop_pipeline.h"
#include "noise_canceller/parameter_reader.h"
#include "weights/model_environment.h"

namespace MORVA::NOISE_CANCELLER {

// How the level of the input is kept out of the features.
enum class LevelReference {
    RunningNoiseMean,  // the mean of the last log features is subtracted
    MeanEnergy,        // the spectrum is scaled by the mean energy of active frames
};

enum class WindowPair {
    HammingTriangular,  // analysis Hamming; synthesis undoes it and applies a triangle
    Vorbis,             // the same power-complementary window on both sides
};

struct Generation {
    char const* suffix;  // of its parameter keys
    WindowPair windows;
    LevelReference level;
    bool compressesBands;
    bool structureFirst;  // read before means, deviations and network
};

// The lengths of a model, checked against each other.
struct Structure {
    // Throws MORVA_Exception for missing values and for a structure that the pipeline cannot run.
    explicit Structure(WEIGHTS::Weight const& weight);

    std::size_t sampleRate;  // Hz
    std::size_t step;        // hop, samples
    std::size_t filtrBegin;  // half-open band of bins that the model sees
    std::size_t filtrEnd;
    std::size_t frameLength;        // samples, 2 x step
    std::size_t previewFrames;      // P, frames of context
    std::size_t coefficientNumber;  // bins of the full mask
    std::size_t modelFrameMs;
};

struct SpectralParams : Structure {
    using Environment = CONTAINERS::ModelEnvironment::element_type;

    // Throws MORVA_Exception for missing values and for a structure that the pipeline cannot run.
    SpectralParams(Environment& environment, std::size_t frameMs, Generation const& generation);

    std::size_t sessionFrameMs;

    float smootCoef;
    bool smootRmModify;
    bool highFreqSmoot;
    bool enableClipFix;
    float clipFixPoint;
    bool skipFrame;
    bool volumeUp;
    bool enableThreshCut;
    float volumeUpPercent;
    float threshCutRefEn;
    bool enableRmThreshold;
    float rmThreshold;
    bool enableRescale;
    float rescaleRefAmpl;
    float rescaleRefEn;
    BandLayout bands;

    // Samples whose peak does not exceed this are digital silence.
    static constexpr float kSkipThreshold = 0.0f;

    std::size_t featureWidth() const { return previewFrames * bands.bands(); }
    HopPipeline::Shape pipelineShape() const {
        return {sampleRate, step, modelFrameMs, sessionFrameMs};
    }

private:
    void readTunables(ParameterReader const& reader, Generation const& generation);
};

}  // namespace MORVA::NOISE_CANCELLER
