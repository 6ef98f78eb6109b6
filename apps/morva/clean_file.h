// Cleaning of one whole sound file, one session per channel.
#pragma once

#include <cstdint>
#include <functional>
#include <string>

#include "jobs.h"
#include "workbench.h"

namespace morva::cli {

struct CleanedFile {
    std::int64_t frames = 0;
    int channels = 0;
    int rateHz = 0;
    std::string model;
    std::string damage;  // of the input, whose rest is missing; a line for the user
};

// `advance` is told of the seconds of input done since its last call. Throws Error; then no output
// exists.
CleanedFile cleanFile(Workbench& bench, Job const& job, std::function<void(double)> const& advance);

}  // namespace morva::cli
