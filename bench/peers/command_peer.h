// A peer that is a program called as `COMMAND in.wav out.wav`.
#pragma once

#include <string>
#include <vector>

namespace morva_bench {

// Processor seconds (user and system) per second of sound at 48000 Hz, start-up taken off: the
// difference between a long and a short file. Negative when the command fails.
double commandCost(std::string const& command);

}  // namespace morva_bench
