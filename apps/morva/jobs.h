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

struct Plan {
    std::vector<Job> jobs;
    bool intoFolder = false;                     // which may have to be made
    std::vector<std::filesystem::path> ignored;  // in the folders, no sound by their endings
};

// Without `output` the second of exactly two names is the output file. With it: a file for one
// input file, otherwise (several inputs, a folder, an existing folder or a name ending in '/') the
// folder that takes the results; folders are searched through and their structure is kept, hidden
// files and folders left out. "-" is standard input or output. Throws Error for whatever would
// overwrite an input or write one file twice.
Plan planJobs(std::vector<std::filesystem::path> const& inputs,
              std::optional<std::filesystem::path> const& output);

// Takes the jobs out whose output exists; returns how many.
std::size_t leaveOutDone(std::vector<Job>& jobs);

// Creates the folders that the outputs of a batch lie in.
void makeFolders(std::vector<Job> const& jobs);

}  // namespace morva::cli
