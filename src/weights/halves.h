// Half the room for the same floats: a string named "half:NAME" holds a value NAME of type 3 to 6,
// its type code first, then the value as weight.h says but with floats of 16 bits (binary16,
// finite).
#pragma once

#include <string>
#include <string_view>

namespace MORVA::WEIGHTS {

inline constexpr std::string_view HALF_PREFIX = "half:";

// The same code and value with floats of 32 bits. What does not fit into the bytes that are there
// is left out, so that the result is cut short as well.
std::string withWholeFloats(std::string const& halves);

}  // namespace MORVA::WEIGHTS
