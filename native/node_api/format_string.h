// Joins values into one text, as they would print; numbers in decimal.
#pragma once

#include <sstream>
#include <string>

namespace quorral {

template <class... Args>
std::string FormatString(const Args&... args) {
    std::ostringstream text;
    text.exceptions(std::ios::badbit);  // out of memory is an error, not half a text
    (text << ... << args);
    return text.str();
}

}  // namespace quorral
