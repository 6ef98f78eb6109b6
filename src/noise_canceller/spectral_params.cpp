#include "noise_canceller/spectral_params.h"

#include <string>

#include "utils/diagnostics.h"
#include "utils/exception.h"
#include "weights/weight.h"

namespace MORVA::NOISE_CANCELLER {
namespace {

[[noreturn]] void refuse(std::string const& why) {
    UTILS::raise(why, "src/noise_canceller/spectral_params", "Params");
}

std::size_t positive(WEIGHTS::Weight const& weight, char const* name) {
    int const value = weight.getReference<int>(name);
    if (value < 1)
        refuse(std::string(name) + " is " + std::to_string(value) + ", must be at least 1");
    return static_cast<std::size_t>(value);
}

}  // namespace

Structure::Structure(WEIGHTS::Weight const& weight) {
    sampleRate = positive(weight, "SampleRate");
    step = positive(weight, "Step");
    int const begin = weight.getReference<int>("FiltrBegin");
    int const end = weight.getReference<int>("FiltrEnd");
    frameLength = positive(weight, "FrameLength");
    previewFrames = positive(weight, "PreviewFrames");
    coefficientNumber = positive(weight, "CoefficientNumber");

    weight.getWeightInfo();  // refuses rates that the sessions do not know
    modelFrameMs = frameLength * 1000 / sampleRate;
    bool const exact = modelFrameMs * sampleRate == frameLength * 1000;
    if (!exact || (modelFrameMs != 20 && modelFrameMs != 30 && modelFrameMs != 32)) {
        refuse("FrameLength is " + std::to_string(frameLength) + " at " +
               std::to_string(sampleRate) + " Hz, must be 20, 30 or 32 ms");
    }
    if (frameLength != 2 * step) {
        refuse("FrameLength is " + std::to_string(frameLength) + ", must be twice the Step of " +
               std::to_string(step));
    }
    if (coefficientNumber != frameLength / 2 + 1) {
        refuse("CoefficientNumber is " + std::to_string(coefficientNumber) + ", must be " +
               std::to_string(frameLength / 2 + 1));
    }
    auto const band = "the band " + std::to_string(begin) + ".." + std::to_string(end);
    if (begin == end) refuse(band + " is empty");
    if (begin < 0 || begin > end || static_cast<std::size_t>(end) > coefficientNumber) {
        refuse(band + " does not lie in the spectrum of " + std::to_string(coefficientNumber) +
               " bins");
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
    enableClipFix = reader.isOn("ENABLE_CLIP_FIX", false);
    clipFixPoint = reader.wholeNumber("CLIP_FIX_POINT", 25000.0f);
    clipFixPoint = checkedOrDefault(clipFixPoint, clipFixPoint >= 1.0f && clipFixPoint <= 32768.0f,
                                    "WARNING OF CLIP_FIX_POINT NUMBER VALUE. IT MUST BE IN "
                                    "INTERVALK (1,32768) \n DEFAULT VALUE 25000",
                                    25000.0f);
    skipFrame = reader.isOn("SKIP_FRAME", false);
    volumeUp = reader.isOn("VOLUME_UP", false);
    if (volumeUp) {
        enableClipFix = true;
        UTILS::say(UTILS::Channel::output,
                   "WARNING: Enabled Clip fix, because VolumeUp is Enabled");
    }
    enableThreshCut = reader.isOn("ENABLE_THRESH_CUT", false);
    volumeUpPercent = reader.real("VOLUME_UP_PERCENT", 0.0f);
    threshCutRefEn = reader.wholeNumber("THRESH_CUT_REF_EN", 100.0f);
    threshCutRefEn =
        checkedOrDefault(threshCutRefEn, threshCutRefEn >= 1.0f && threshCutRefEn <= 1000.0f,
                         "WARNING OF THRESH_CUT_REF VALUE. IT MUST BE iIN INTERVALK [1,1000] \n "
                         "DEFAULT VALUE 100",
                         100.0f);
    enableRmThreshold = reader.isOn("ENABLE_RM_THRESHOLD", false);
    rmThreshold = reader.real("RM_THRESHOLD", 0.5f);
    rmThreshold = checkedOrDefault(rmThreshold, rmThreshold > 0.0f && rmThreshold <= 1.0f,
                                   "WARNING OF RM_THRESHOLD VALUE. IT MUST BE iIN INTERVALK "
                                   "[0.0,1.0] \n DEFAULT VALUE 0.5",
                                   0.5f);
    bool const byEnergy = generation.level == LevelReference::MeanEnergy;
    enableRescale = byEnergy && reader.isOn("ENABLE_RESCALE", true);
    rescaleRefAmpl = reader.real("RESCALE_REF_AMPL", 2000.0f);
    rescaleRefEn = reader.real("RESCALE_REF_EN", 100.0f);
    int const depth = generation.compressesBands ? reader.integer("COMPRESS_RATE", 2) : 0;
    bands = BandLayout(filtrEnd - filtrBegin, depth);
}

}  // namespace MORVA::NOISE_CANCELLER
