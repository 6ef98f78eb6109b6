// From the files and folders on the command line to pairs of input and output file.
#pragma once

#include <filesystem>
#include <optional>
#include <vector>

namespace morva::cli {

struct Job {
    std::filesystem::path input;
    std::filesystem::path output;
};

// Without `output` the second of exactly two names is the output file. With it: a file for one
// input file, otherwise (several inputs, a folder, an existing folder or a name ending in '/') the
// folder that takes the results; folders are searched through and their structure is kept. Throws
// Error for whatever would overwrite an input or write one file twice.
std::vector<Job> planJobs(std::vector<std::filesystem::path> inputs,
                          std::optional<std::filesystem::path> const& output);

// Creates the folders that the outputs of a batch lie in.
void makeFolders(std::vector<Job> const& jobs);

}  // namespace morva::cli
