// What a command that runs the engine works with, made from the options that these commands share.
#pragma once

#include <filesystem>
#include <limits>
#include <string>

#include "engine.h"
#include "models.h"
#include "output_file.h"
#include "streams.h"

namespace morva::cli {

struct EngineOptions {
    ModelChoice model;
    std::filesystem::path models;  // folder of the shipped ones; empty: beside the program
    int frameMs = 10;
    float limitDb = std::numeric_limits<float>::infinity();
    bool verbose = false;

    // `sound` and the files that are named here.
    InputFiles inputs(std::filesystem::path const& sound) const {
        return {sound, model.model, model.control};
    }
};

struct Workbench {
    explicit Workbench(EngineOptions const& options);

    // What a session needs for a sound of `rateHz` that the user knows as `sound`. Throws Error.
    SessionSetup setup(ShippedKind kind, ModelFiles const& chosen, std::string const& sound,
                       int rateHz);

    Streams streams;
    Engine engine;
    Models models;
    ModelFiles model;  // of --model and --control
    int frameMs;
    float limitDb;
};

}  // namespace morva::cli
