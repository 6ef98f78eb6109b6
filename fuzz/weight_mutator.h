// Structure-aware mutation of weight data: takes the records apart, changes one typed value, and
// writes them back. Byte-wise mutation alone would rarely get past the shape checks of the
// cleaners.
#pragma once

#include <string>
#include <string_view>

namespace test_support {

// A changed copy of `bytes`; the change is a function of `seed`. Data without a whole record comes
// back as it was.
std::string mutateWeight(std::string_view bytes, unsigned seed);

}  // namespace test_support
