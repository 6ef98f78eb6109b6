// morva denoise: files and folders in, cleaned files out, as many at a time as there are cores.
#include <algorithm>
#include <atomic>
#include <chrono>
#include <string>
#include <thread>
#include <vector>

#include "audio_file.h"
#include "clean_file.h"
#include "command.h"
#include "error.h"
#include "formatted.h"
#include "jobs.h"
#include "output_file.h"
#include "progress.h"

namespace morva::cli {
namespace {

struct DenoiseOptions {
    EngineOptions engine;
    std::vector<std::filesystem::path> inputs;
    std::optional<std::filesystem::path> output;
    unsigned int jobs = 0;  // 0: one per core
    bool quiet = false;
    bool skipExisting = false;
};

// 0 when it is not known; a failure is told when the file's turn comes.
double secondsOf(Job const& job) {
    try {
        return job.input == standardStream ? 0.0 : SoundReader(job.input).seconds();
    } catch (Error const&) {
        return 0.0;
    }
}

std::string files(std::size_t count) {
    return std::to_string(count) + (count == 1 ? " file" : " files");
}

// What is not cleaned, for a line each.
std::vector<std::string> skipped(Plan const& plan, std::size_t alreadyDone) {
    std::vector<std::string> lines;
    if (alreadyDone > 0) lines.push_back(files(alreadyDone) + " skipped: cleaned already");
    if (plan.ignored.size() == 1)
        lines.push_back("1 file skipped: " + plan.ignored.front().string() + " is no sound file");
    if (plan.ignored.size() > 1)
        lines.push_back(files(plan.ignored.size()) + " skipped: no sound files by their endings");
    return lines;
}

std::string summary(Job const& job, CleanedFile const& file, double seconds) {
    double const length = static_cast<double>(file.frames) / file.rateHz;
    auto const output = job.output == standardStream ? "standard output" : job.output.string();
    return spokenInput(job.input) + " -> " + output +
           formatted(" (%.1f s, %d Hz, %d channel%s, %s, %.0f x real time)", length, file.rateHz,
                     file.channels, file.channels == 1 ? "" : "s", file.model.c_str(),
                     length / std::max(seconds, 1e-3));
}

// Runs `work(i)` for i in 0..count-1 on `threads` threads, each taking the next free index.
template <class Work>
void onThreads(std::size_t threads, std::size_t count, Work const& work) {
    std::atomic<std::size_t> next = 0;
    std::vector<std::jthread> pool;
    for (std::size_t t = 0; t < std::min(threads, count); ++t) {
        pool.emplace_back([&] {
            for (auto i = next++; i < count; i = next++) work(i);
        });
    }
}

int run(DenoiseOptions const& options) {
    auto plan = planJobs(options.inputs, options.output);
    bool const batch = plan.jobs.size() > 1;
    auto const alreadyDone = options.skipExisting ? leaveOutDone(plan.jobs) : 0;
    auto const& jobs = plan.jobs;
    if (plan.intoFolder) makeFolders(jobs);

    Workbench bench(options.engine);
    double total = 0.0;
    for (auto const& job : jobs) total += secondsOf(job);
    Progress progress(bench.streams, total, !options.quiet);

    std::atomic<std::size_t> failures = 0;
    std::atomic<std::size_t> damaged = 0;
    auto const cleanOne = [&](std::size_t index) {
        auto const& job = jobs[index];
        try {
            auto const start = std::chrono::steady_clock::now();
            auto const file =
                cleanFile(bench, job, [&](double seconds) { progress.advance(seconds); });
            std::chrono::duration<double> const taken = std::chrono::steady_clock::now() - start;
            if (!options.quiet) progress.say(summary(job, file, taken.count()));
            if (file.damage.empty()) return;
            ++damaged;
            progress.say("morva: " + file.damage);
        } catch (std::exception const& error) {
            ++failures;
            progress.say(std::string("morva: ") + error.what());
        }
    };
    auto const cores = std::max(std::thread::hardware_concurrency(), 1U);
    onThreads(options.jobs == 0 ? cores : options.jobs, jobs.size(), cleanOne);
    for (auto const& line : skipped(plan, alreadyDone)) {
        if (!options.quiet) progress.say(line);
    }
    if (failures > 0 && batch) {
        progress.say("morva: " + std::to_string(failures) + " of " + files(jobs.size()) +
                     " failed");
    }
    return failures > 0 ? failed : damaged > 0 ? incomplete : done;
}

}  // namespace

void addDenoise(CLI::App& app, Action& action) {
    auto& command = *app.add_subcommand("denoise", "Remove background noise from sound files");
    auto& options = addOptions(command, action, &run);
    command
        .add_option("files", options.inputs,
                    "Input files or folders; without -o: input, output; - is standard input")
        ->required();
    command.add_option("-o,--output", options.output,
                       "Output file, - for standard output, or folder for several inputs");
    command.add_option("-j,--jobs", options.jobs,
                       "Files cleaned at a time (default: one per core)");
    command.add_flag("--skip-existing", options.skipExisting,
                     "Leave out files whose output exists");
    command.add_flag("-q,--quiet", options.quiet, "Print nothing but errors");
    addLimit(command, options.engine);
    addEngineOptions(command, options.engine);
}

}  // namespace morva::cli
