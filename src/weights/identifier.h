// Identifier by which a weight that is already loaded is recognised.
#pragma once

#include <string>

#include "weights/weight.h"

namespace MORVA::WEIGHTS {

// Version, frame duration in ms, rate in kHz, model name and time stamp, joined without separators,
// e.g. "0.0.61016nc210301". Prints a line and returns "" when one of the five values is missing, of
// another type, or the sample rate lies below 1000 Hz. [control thread]
std::string weightIdentifier(Weight const& weight);

}  // namespace MORVA::WEIGHTS
