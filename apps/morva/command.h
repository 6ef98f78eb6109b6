// What the commands share: options that several have, and how a command is hooked to its name.
#pragma once

#include <CLI/CLI.hpp>
#include <functional>
#include <memory>

#include "workbench.h"

namespace morva::cli {

// Set by the subcommand that was named; returns the exit status and may throw Error.
using Action = std::function<int()>;

// Options of `command`, with which `run` is called when it was named.
template <class Options>
Options& addOptions(CLI::App& command, Action& action, int (*run)(Options const&)) {
    auto const options = std::make_shared<Options>();
    command.callback(
        [options, &action, run] { action = [options, run] { return run(*options); }; });
    return *options;
}

// --frame and --verbose.
void addFrameOptions(CLI::App& command, int& frameMs, bool& verbose);
// These, --model, --models and --control.
void addEngineOptions(CLI::App& command, EngineOptions& options);

// --limit.
void addLimit(CLI::App& command, EngineOptions& options);

void addDenoise(CLI::App& app, Action& action);
void addInspect(CLI::App& app, Action& action);
void addVad(CLI::App& app, Action& action);
void addLevel(CLI::App& app, Action& action);
void addReport(CLI::App& app, Action& action);

}  // namespace morva::cli
