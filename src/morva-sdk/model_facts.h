// What a registered weight says about itself, for lists of models. Never throws for values that are
// missing.
#pragma once

#include <string>

#include "weights/weight.h"

namespace MORVA::MORVA_SDK {

struct ModelFacts {
    std::string version;           // empty when there is none
    int sampleRate = 0;            // hertz, 0 when the weight does not say
    int frameMs = 0;               // likewise
    unsigned long long bytes = 0;  // of its numbers
};

ModelFacts modelFacts(WEIGHTS::Weight const& weight);

}  // namespace MORVA::MORVA_SDK
