// What a command throws to end the run: a line for the person at the terminal.
#pragma once

#include <stdexcept>
#include <string>

namespace morva::cli {

// The text is printed as "morva: <text>" and the process ends with status 1.
class Error : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

}  // namespace morva::cli
