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
#include "progress.h"

namespace morva::cli {
namespace {

struct DenoiseOptions {
    EngineOptions engine;
    std::vector<std::filesystem::path> inputs;
    std::optional<std::filesystem::path> output;
    unsigned int jobs = 0;  // 0: one per core
    bool quiet = false;
};

std::int64_t framesOf(Job const& job) {
    try {
        return SoundReader(job.input).frames();
    } catch (Error const&) {
        return 0;  // told when its turn comes
    }
}

std::string summary(Job const& job, CleanedFile const& file, double seconds) {
    double const length = static_cast<double>(file.frames) / file.rateHz;
    return job.input.string() + " -> " + job.output.string() +
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
    auto const jobs = planJobs(options.inputs, options.output);
    bool const batch = jobs.size() > 1;
    if (options.output && (batch || !options.output->has_filename())) makeFolders(jobs);

    Workbench bench(options.engine);
    std::int64_t total = 0;
    for (auto const& job : jobs) total += framesOf(job);
    Progress progress(bench.streams, total, !options.quiet);

    std::atomic<std::size_t> failures = 0;
    auto const cleanOne = [&](std::size_t index) {
        auto const& job = jobs[index];
        try {
            auto const start = std::chrono::steady_clock::now();
            auto const file =
                cleanFile(bench, job, [&](std::int64_t frames) { progress.advance(frames); });
            std::chrono::duration<double> const taken = std::chrono::steady_clock::now() - start;
            if (!options.quiet) progress.say(summary(job, file, taken.count()));
        } catch (std::exception const& error) {
            ++failures;
            progress.say(std::string("morva: ") + error.what());
        }
    };
    auto const cores = std::max(std::thread::hardware_concurrency(), 1U);
    onThreads(options.jobs == 0 ? cores : options.jobs, jobs.size(), cleanOne);
    if (failures > 0 && batch) {
        progress.say("morva: " + std::to_string(failures) + " of " + std::to_string(jobs.size()) +
                     " files failed");
    }
    return failures == 0 ? 0 : 1;
}

}  // namespace

void addDenoise(CLI::App& app, Action& action) {
    auto& command = *app.add_subcommand("denoise", "Remove background noise from sound files");
    auto& options = addOptions(command, action, &run);
    command
        .add_option("files", options.inputs, "Input files or folders; without -o: input, output")
        ->required();
    command.add_option("-o,--output", options.output, "Output file, or folder for several inputs");
    command.add_option("-j,--jobs", options.jobs,
                       "Files cleaned at a time (default: one per core)");
    command.add_flag("-q,--quiet", options.quiet, "Print nothing but errors");
    addEngineOptions(command, options.engine);
}

}  // namespace morva::cli
