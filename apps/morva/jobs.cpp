#include "jobs.h"

#include <algorithm>
#include <set>
#include <string>
#include <system_error>

#include "audio_file.h"
#include "error.h"

namespace morva::cli {
namespace fs = std::filesystem;
namespace {

fs::path plain(fs::path const& path) {
    std::error_code error;
    auto result = fs::weakly_canonical(path, error);
    return error ? fs::absolute(path).lexically_normal() : result;
}

bool isInside(fs::path const& path, fs::path const& folder) {
    auto const relative = plain(path).lexically_relative(plain(folder));
    return !relative.empty() && *relative.begin() != "..";
}

// Where `relative` goes in the output folder; a kind of file that cannot be written becomes WAV.
fs::path placed(fs::path const& folder, fs::path relative) {
    if (!isWritableEnding(relative)) relative.replace_extension(".wav");
    return folder / relative;
}

void addFolder(fs::path const& folder, fs::path const& output, std::vector<Job>& jobs) {
    std::vector<fs::path> found;
    for (auto const& entry : fs::recursive_directory_iterator(folder)) {
        if (entry.is_regular_file() && isWritableEnding(entry.path()) &&
            !isInside(entry.path(), output)) {
            found.push_back(entry.path());
        }
    }
    if (found.empty())
        throw Error(folder.string() + ": no .wav, .flac or .ogg file in this folder");
    std::ranges::sort(found);
    for (auto const& file : found)
        jobs.push_back({file, placed(output, file.lexically_relative(folder))});
}

std::vector<Job> intoFolder(std::vector<fs::path> const& inputs, fs::path const& output) {
    if (fs::exists(output) && !fs::is_directory(output)) {
        throw Error(output.string() + ": is a file; several results need a folder");
    }
    std::vector<Job> jobs;
    for (auto const& input : inputs) {
        if (fs::is_directory(input)) {
            if (isInside(input, output))
                throw Error(input.string() + ": lies in the output folder");
            addFolder(input, output, jobs);
        } else {
            jobs.push_back({input, placed(output, input.filename())});
        }
    }
    return jobs;
}

void check(std::vector<Job> const& jobs) {
    std::set<fs::path> inputs;
    for (auto const& job : jobs) inputs.insert(plain(job.input));
    std::set<fs::path> outputs;
    for (auto const& job : jobs) {
        auto const output = plain(job.output);
        std::error_code ignored;
        if (inputs.contains(output) || fs::equivalent(job.input, job.output, ignored)) {
            throw Error(job.output.string() + ": is an input as well; choose another output");
        }
        if (!outputs.insert(output).second) {
            throw Error(job.output.string() + ": two inputs would be written to this file");
        }
    }
}

}  // namespace

std::vector<Job> planJobs(std::vector<fs::path> inputs, std::optional<fs::path> const& output) {
    std::vector<Job> jobs;
    if (!output) {
        if (inputs.size() != 2)
            throw Error("name one input and one output file, or the output with -o");
        for (auto const& path : inputs) {
            if (fs::is_directory(path)) {
                throw Error(path.string() + ": is a folder; name an output folder with -o");
            }
        }
        jobs.push_back({inputs[0], inputs[1]});
    } else {
        bool const folder =
            inputs.size() > 1 || fs::is_directory(*output) || !output->has_filename() ||
            std::ranges::any_of(inputs, [](auto const& path) { return fs::is_directory(path); });
        jobs = folder ? intoFolder(inputs, *output) : std::vector<Job>{{inputs.at(0), *output}};
    }
    check(jobs);
    return jobs;
}

void makeFolders(std::vector<Job> const& jobs) {
    for (auto const& job : jobs) {
        std::error_code error;
        if (!job.output.has_parent_path()) continue;
        fs::create_directories(job.output.parent_path(), error);
        if (error) throw Error(job.output.parent_path().string() + ": " + error.message());
    }
}

}  // namespace morva::cli
