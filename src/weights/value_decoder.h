// Decodes one typed value of the weight format into a map. See weight.h and halves.h for the
// encodings.
#pragma once

#include <string>

#include "weights/any_map.h"
#include "weights/bounded_reader.h"

namespace MORVA::WEIGHTS {

// False, with the map unchanged, for an unknown code (nothing is read) and for a value that is cut
// short. True when the value was read whole, also when the name exists already and keeps its first
// value.
bool decodeValue(UTILS::BoundedReader& reader, int typeCode, std::string const& name,
                 CONTAINERS::AnyMap& values);

}  // namespace MORVA::WEIGHTS
