// How a run ends: its exit status, and what a command throws: a line for the person at the
// terminal.
#pragma once

#include <stdexcept>
#include <string>

namespace morva::cli {

// What a command returns.
enum Status {
    done = 0,
    failed = 1,
    misused = 2,     // the command line was not understood
    incomplete = 3,  // done, but the rest of an input is missing
};

// The text is printed as "morva: <text>" and the process ends with status 1.
class Error : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

}  // namespace morva::cli
