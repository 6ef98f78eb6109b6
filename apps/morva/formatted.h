// printf into a string, for tables and summary lines.
#pragma once

#include <string>

namespace morva::cli {

// At most 511 characters.
[[gnu::format(printf, 1, 2)]] std::string formatted(char const* format, ...);

}  // namespace morva::cli
