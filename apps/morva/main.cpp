// Entry point of the command line: one subcommand per task.
#include <cstdio>
#include <exception>

#include "command.h"
#include "error.h"
#include "morva-sdk/vocabulary.h"
#include "platform.h"
#include "vanishing_file.h"

namespace morva::cli {

void addFrameOptions(CLI::App& command, int& frameMs, bool& verbose) {
    command.add_option("--frame", frameMs, "Length of the engine's frames in milliseconds")
        ->check(CLI::IsMember(MORVA::MORVA_SDK::kFrameDurationsMs))
        ->capture_default_str();
    command.add_flag("--verbose", verbose, "Show what the engine prints");
}

void addEngineOptions(CLI::App& command, EngineOptions& options) {
    command
        .add_option("--model", options.model.model, "Weight (.mvw) or control file (.cfg) to use")
        ->type_name("FILE");
    command.add_option("--models", options.models, "Folder of the shipped models")
        ->type_name("DIR");
    command
        .add_option("--control", options.model.control, "Control file (.cfg) with model parameters")
        ->type_name("FILE");
    addFrameOptions(command, options.frameMs, options.verbose);
}

void addLimit(CLI::App& command, EngineOptions& options) {
    command
        .add_option("--limit", options.limitDb,
                    "Lower no part of the sound by more than this, in decibels (default: no limit)")
        ->type_name("DB")
        ->check(CLI::Range(0.0, 200.0));
}

namespace {

int run(int argc, char** argv) {
    CLI::App app{
        "Real-time voice processing on sound files: noise suppression, voice activity, noise level",
        "morva"};
    app.require_subcommand(1);
    app.allow_windows_style_options(false);  // "/" begins a path everywhere
    app.set_version_flag("--version", MORVA_VERSION);
    Action action;
    addDenoise(app, action);
    addInspect(app, action);
    addVad(app, action);
    addLevel(app, action);
    addReport(app, action);
    try {
        app.parse(argc, argv);
    } catch (CLI::ParseError const& error) {
        return app.exit(error) == 0 ? done : misused;
    }
    return action();
}

}  // namespace
}  // namespace morva::cli

int main(int argc, char** argv) {
    morva::cli::prepareStreams();
    morva::cli::removeVanishingFilesOnSignals();
    try {
        return morva::cli::run(argc, argv);
    } catch (std::exception const& error) {
        std::fprintf(stderr, "morva: %s\n", error.what());
        return morva::cli::failed;
    }
}
