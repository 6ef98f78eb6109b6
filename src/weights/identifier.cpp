#include "weights/identifier.h"

#include <iostream>

namespace MORVA::WEIGHTS {

std::string weightIdentifier(Weight const& weight) {
    auto const& values = weight.values();
    auto const version = values.find<std::string>(VERSION);
    auto const rate = values.find<int>(SAMPLERATE);
    auto const length = values.find<int>(FRAMELENGHT);
    auto const model = values.find<std::string>("ModelName");
    auto const stamp = values.find<std::string>("TimeStamp");
    // A rate below 1 kHz would make the divisor 0 or negative.
    if (!version || !rate || !length || !model || !stamp || *rate < 1000) {
        std::cout << "ERROR INVALID WEIGHT" << std::endl;
        return {};
    }
    int const kilohertz = *rate / 1000;
    int const duration = *length / kilohertz;
    return *version + std::to_string(duration) + std::to_string(kilohertz) + *model + *stamp;
}

}  // namespace MORVA::WEIGHTS
