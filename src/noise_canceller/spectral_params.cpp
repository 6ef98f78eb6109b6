#include "noise_canceller/spectral_params.h"

#include <string>

#include "weights/weight.h"

namespace MORVA::NOISE_CANCELLER {
Structure::Structure(WEIGHTS::Weight const& weight) {
    sampleRate = positiveNumber(weight, "SampleRate");
    step = positiveNumber(weight, "Step");
    int const begin = weight.getReference<int>("FiltrBegin");
    int const end = weight.getReference<int>("FiltrEnd");
    frameLength = positiveNumber(weight, "FrameLength");
    previewFrames = positiveNumber(weight, "PreviewFrames");
    coefficientNumber = positiveNumber(weight, "CoefficientNumber");

    constexpr std::size_t kFramesMs[] = {20, 30, 32};
    checkLengths(weight, kFramesMs, "20, 30 or 32 ms");
    if (coefficientNumber != frameLength / 2 + 1) {
        refuseStructure("CoefficientNumber is " + std::to_string(coefficientNumber) + ", must be " +
                        std::to_string(frameLength / 2 + 1));
    }
    auto const band = "the band " + std::to_string(begin) + ".." + std::to_string(end);
    if (begin == end) refuseStructure(band + " is empty");
    if (begin < 0 || begin > end || static_cast<std::size_t>(end) > coefficientNumber) {
        refuseStructure(band + " does not lie in the spectrum of " +
                        std::to_string(coefficientNumber) + " bins");
    }
    filtrBegin = static_cast<std::size_t>(begin);
    filtrEnd = static_cast<std::size_t>(end);
}

SpectralParams::SpectralParams(Environment& environment, std::size_t frameMs,
                               Generation const& generation)
    : Structure(*environment.first), sessionFrameMs(frameMs), bands(0, 0) {
    readTunables(ParameterReader(environment, generation.suffix), generation);
}

void SpectralParams::readTunables(ParameterReader const& reader, Generation const& generation) {
    smootCoef = reader.real("SMOOT_COEF", 1.0f);
    smootCoef = checkedOrDefault(smootCoef, smootCoef > 0.0f && smootCoef <= 1.0f,
                                 "WARNING OF SMOOTH COEF NUMBER VALUE. IT MUST BE iIN INTERVALK "
                                 "(0,1] \n DEFAULT VALUE 1.f",
                                 1.0f);
    smootRmModify = reader.isOn("SMOOT_RM_MODIFY", false);
    highFreqSmoot = reader.isOn("HIGH_FREQ_SMOOT", false);
    skipFrame = reader.isOn("SKIP_FRAME", false);
    FrameTunables::read(reader, generation.level);
    enableRmThreshold = reader.isOn("ENABLE_RM_THRESHOLD", false);
    rmThreshold = reader.real("RM_THRESHOLD", 0.5f);
    rmThreshold = checkedOrDefault(rmThreshold, rmThreshold > 0.0f && rmThreshold <= 1.0f,
                                   "WARNING OF RM_THRESHOLD VALUE. IT MUST BE iIN INTERVALK "
                                   "[0.0,1.0] \n DEFAULT VALUE 0.5",
                                   0.5f);
    int const depth = generation.compressesBands ? reader.integer("COMPRESS_RATE", 2) : 0;
    bands = BandLayout(filtrEnd - filtrBegin, depth);
}

}  // namespace MORVA::NOISE_CANCELLER
