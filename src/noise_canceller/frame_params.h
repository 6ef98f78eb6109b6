// What the frames of every noise cleaner are made with, whatever network they feed: lengths and
// tunables. Read once per cleaner. [control thread]
#pragma once

#include <cstddef>
#include <span>

#include "noise_canceller/hop_pipeline.h"
#include "noise_canceller/parameter_reader.h"

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

// The value of that name, which must be at least 1.
std::size_t positiveNumber(WEIGHTS::Weight const& weight, char const* name);

struct FrameShape {
    std::size_t sampleRate;   // Hz
    std::size_t step;         // hop, samples
    std::size_t frameLength;  // samples, 2 x step
    std::size_t modelFrameMs;

    std::size_t bins() const { return frameLength / 2 + 1; }
    HopPipeline::Shape pipeline(std::size_t sessionFrameMs) const {
        return {sampleRate, step, modelFrameMs, sessionFrameMs};
    }

protected:
    // Sets modelFrameMs, which must be one of the `legal` ("20, 30 or 32 ms"), and throws
    // MORVA_Exception for lengths that the pipeline cannot run.
    void checkLengths(WEIGHTS::Weight const& weight, std::span<std::size_t const> legalMs,
                      char const* legal);
};

struct FrameTunables {
    void read(ParameterReader const& reader, LevelReference level);

    bool enableClipFix;
    float clipFixPoint;
    bool volumeUp;
    float volumeUpPercent;
    bool enableThreshCut;
    float threshCutRefEn;
    bool enableRescale;
    float rescaleRefAmpl;
    float rescaleRefEn;
};

[[noreturn]] void refuseStructure(std::string const& why);

}  // namespace MORVA::NOISE_CANCELLER
