// Which model serves a sound: the one named on the command line, otherwise the shipped one for its
// rate.
//
// Shipped models are looked for in the folder given with --models, otherwise beside the program
// (models/, ../share/morva/models/, ../../models/). A model is registered with the engine when it
// is first needed, and once, however many purposes it serves. Thread rule: any thread.
#pragma once

#include <filesystem>
#include <map>
#include <mutex>
#include <string>
#include <tuple>

#include "engine.h"
#include "shipped_models.h"

namespace morva::cli {

// As named on the command line; anything may be empty.
struct ModelChoice {
    std::filesystem::path model;    // weight or control file
    std::filesystem::path control;  // control file laid over the model
};

// A choice whose files are there and fit together.
struct ModelFiles {
    std::filesystem::path weight;   // empty: the shipped one
    std::filesystem::path control;  // empty: none

    friend bool operator<(ModelFiles const& a, ModelFiles const& b) {
        return std::tie(a.weight, a.control) < std::tie(b.weight, b.control);
    }
};

// Throws Error.
ModelFiles modelFiles(ModelChoice const& choice);

class Models {
public:
    // `folder` of the shipped models; empty: beside the program.
    Models(Engine& engine, std::filesystem::path folder);

    // Name by which the engine knows the chosen model, or the shipped one of that kind for a sound
    // of `rateHz`. Throws Error when it is missing or bad.
    std::string name(ShippedKind kind, ModelFiles chosen, int rateHz);

private:
    std::filesystem::path shipped(ShippedKind kind, int rateHz) const;
    void add(ModelFiles const& files, std::string const& name);

    Engine& engine_;
    std::filesystem::path folder_;
    std::map<ModelFiles, std::string> names_;
    std::mutex registering_;
};

}  // namespace morva::cli
