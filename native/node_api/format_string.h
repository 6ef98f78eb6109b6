// Joins values into one text, as they would print; numbers in decimal.
#pragma once

#include <sstream>
#include <string>

namespace quorral {

template <class... Args>
std::string FormatString(const Args&... args) {
    std::ostringstream text;
    (text << ... << args);
    return text.str();
}

}  // namespace quorral
