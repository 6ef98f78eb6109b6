// Numbers in text, read as in the "C" locale: the host's locale, with its decimal comma, has no
// say. Text that is no number counts as 0. [any thread]
#pragma once

#include <string>

namespace MORVA::UTILS {

float toReal(std::string const& text);
// What lies beyond the range of int is its end.
int toInteger(std::string const& text);

}  // namespace MORVA::UTILS
