#include "noise_canceller/frame_params.h"

#include <algorithm>
#include <string>

#include "utils/diagnostics.h"
#include "utils/exception.h"
#include "weights/weight.h"

namespace MORVA::NOISE_CANCELLER {

void refuseStructure(std::string const& why) {
    UTILS::raise(why, "src/noise_canceller/frame_params", "Params");
}

std::size_t positiveNumber(WEIGHTS::Weight const& weight, char const* name) {
    int const value = weight.getReference<int>(name);
    if (value < 1) {
        refuseStructure(std::string(name) + " is " + std::to_string(value) +
                        ", must be at least 1");
    }
    return static_cast<std::size_t>(value);
}

void FrameShape::checkLengths(WEIGHTS::Weight const& weight, std::span<std::size_t const> legalMs,
                              char const* legal) {
    weight.getWeightInfo();  // refuses rates that the sessions do not know
    modelFrameMs = frameLength * 1000 / sampleRate;
    bool const exact = modelFrameMs * sampleRate == frameLength * 1000;
    if (!exact || std::find(legalMs.begin(), legalMs.end(), modelFrameMs) == legalMs.end()) {
        refuseStructure("FrameLength is " + std::to_string(frameLength) + " at " +
                        std::to_string(sampleRate) + " Hz, must be " + legal);
    }
    if (frameLength != 2 * step) {
        refuseStructure("FrameLength is " + std::to_string(frameLength) +
                        ", must be twice the Step of " + std::to_string(step));
    }
}

void FrameTunables::read(ParameterReader const& reader, LevelReference level) {
    enableClipFix = reader.isOn("ENABLE_CLIP_FIX", false);
    clipFixPoint = reader.wholeNumber("CLIP_FIX_POINT", 25000.0f);
    clipFixPoint = checkedOrDefault(clipFixPoint, clipFixPoint >= 1.0f && clipFixPoint <= 32768.0f,
                                    "WARNING OF CLIP_FIX_POINT NUMBER VALUE. IT MUST BE IN "
                                    "INTERVALK (1,32768) \n DEFAULT VALUE 25000",
                                    25000.0f);
    volumeUp = reader.isOn("VOLUME_UP", false);
    if (volumeUp) {
        enableClipFix = true;
        UTILS::say(UTILS::Channel::output,
                   "WARNING: Enabled Clip fix, because VolumeUp is Enabled");
    }
    volumeUpPercent = reader.real("VOLUME_UP_PERCENT", 0.0f);
    enableThreshCut = reader.isOn("ENABLE_THRESH_CUT", false);
    threshCutRefEn = reader.wholeNumber("THRESH_CUT_REF_EN", 100.0f);
    threshCutRefEn =
        checkedOrDefault(threshCutRefEn, threshCutRefEn >= 1.0f && threshCutRefEn <= 1000.0f,
                         "WARNING OF THRESH_CUT_REF VALUE. IT MUST BE iIN INTERVALK [1,1000] \n "
                         "DEFAULT VALUE 100",
                         100.0f);
    enableRescale = level == LevelReference::MeanEnergy && reader.isOn("ENABLE_RESCALE", true);
    rescaleRefAmpl = reader.real("RESCALE_REF_AMPL", 2000.0f);
    rescaleRefEn = reader.real("RESCALE_REF_EN", 100.0f);
}

}  // namespace MORVA::NOISE_CANCELLER
