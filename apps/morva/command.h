// What the commands share: options that several have, and how a command is hooked to its name.
#pragma once

#include <CLI/CLI.hpp>
#include <functional>
#include <memory>

#include "models.h"
#include "streams.h"

namespace morva::cli {

struct EngineOptions {
    ModelChoice models;
    int frameMs = 10;
    bool verbose = false;
};

// Set by the subcommand that was named; returns the exit status and may throw Error.
using Action = std::function<int()>;

// --model, --models, --control, --frame, --verbose.
void addEngineOptions(CLI::App& command, EngineOptions& options);

void addDenoise(CLI::App& app, Action& action);
void addInspect(CLI::App& app, Action& action);
void addVad(CLI::App& app, Action& action);
void addLevel(CLI::App& app, Action& action);
void addReport(CLI::App& app, Action& action);

}  // namespace morva::cli
