// Root mean square as the layer normalisation uses it. Any thread.
#pragma once

#include <vector>

namespace MORVA::UTIL_FUNCTIONS {

// sqrt(mean of the squares) + 1e-6: never 0, so that callers may divide by it. Squares are rounded
// to float and summed in double. An empty vector gives NaN.
float vectorRMS(std::vector<float> const& v);

}  // namespace MORVA::UTIL_FUNCTIONS
