// The kinds of session; 0 answers a question about an unknown one.
#pragma once

namespace MORVA::MORVA_SDK {

enum class MorvaSessionType : int {
    Unknown = 0,
    NoiseCancellation = 1,
    VoiceActivity = 2,
    NoiseLevel = 3,
};

}  // namespace MORVA::MORVA_SDK
