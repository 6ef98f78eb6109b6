#include "jobs.h"

#include <algorithm>
#include <set>
#include <string>
#include <system_error>

#include "audio_file.h"
#include "error.h"
#include "output_file.h"

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

bool isHidden(fs::path const& path) {
    return path.filename().string().starts_with('.');
}

void addFolder(fs::path const& folder, fs::path const& output, Plan& plan) {
    std::vector<fs::path> found;
    for (auto at = fs::recursive_directory_iterator(folder); at != end(at); ++at) {
        bool const ours = isHidden(at->path()) || isInside(at->path(), output);
        if (ours && at->is_directory()) at.disable_recursion_pending();
        if (ours || !at->is_regular_file()) continue;
        (isSoundEnding(at->path()) ? found : plan.ignored).push_back(at->path());
    }
    if (found.empty()) throw Error(folder.string() + ": no sound file in this folder");
    std::ranges::sort(found);
    for (auto const& file : found)
        plan.jobs.push_back({file, placed(output, file.lexically_relative(folder))});
}

Plan intoFolder(std::vector<fs::path> const& inputs, fs::path const& output) {
    if (output == standardStream || (fs::exists(output) && !fs::is_directory(output))) {
        throw Error(output.string() + ": is no folder; several results need one");
    }
    Plan plan{.jobs = {}, .intoFolder = true, .ignored = {}};
    for (auto const& input : inputs) {
        if (fs::is_directory(input)) {
            if (isInside(input, output))
                throw Error(input.string() + ": lies in the output folder");
            addFolder(input, output, plan);
        } else {
            plan.jobs.push_back({input, placed(output, input.filename())});
        }
    }
    return plan;
}

void check(std::vector<Job> const& jobs) {
    InputFiles inputs;
    for (auto const& job : jobs) inputs.add(job.input);
    std::set<fs::path> outputs;
    for (auto const& job : jobs) {
        inputs.mustNotHold(job.output);
        if (!outputs.insert(plain(job.output)).second) {
            throw Error(job.output.string() + ": two inputs would be written to this file");
        }
    }
}

Plan planFor(std::vector<fs::path> const& inputs, std::optional<fs::path> const& output) {
    auto const isFolder = [](auto const& path) { return fs::is_directory(path); };
    if (!output) {
        if (inputs.size() != 2)
            throw Error("name one input and one output file, or the output with -o");
        auto const folder = std::ranges::find_if(inputs, isFolder);
        if (folder != inputs.end())
            throw Error(folder->string() + ": is a folder; name an output folder with -o");
        return {.jobs = {{inputs[0], inputs[1]}}, .intoFolder = false, .ignored = {}};
    }
    bool const folder = inputs.size() > 1 || isFolder(*output) || !output->has_filename() ||
                        std::ranges::any_of(inputs, isFolder);
    if (!folder) return {.jobs = {{inputs.at(0), *output}}, .intoFolder = false, .ignored = {}};
    if (std::ranges::find(inputs, standardStream) != inputs.end())
        throw Error("standard input needs an output file or \"-\"");
    return intoFolder(inputs, *output);
}

}  // namespace

Plan planJobs(std::vector<fs::path> const& inputs, std::optional<fs::path> const& output) {
    auto plan = planFor(inputs, output);
    check(plan.jobs);
    return plan;
}

std::size_t leaveOutDone(std::vector<Job>& jobs) {
    return std::erase_if(jobs, [](Job const& job) {
        return job.output != standardStream && fs::is_regular_file(job.output);
    });
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
