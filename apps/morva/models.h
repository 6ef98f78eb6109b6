// Which model serves a file: the one named on the command line, otherwise the shipped one for its
// rate.
//
// Shipped models are looked for in the folder given with --models, otherwise beside the program
// (models/, ../share/morva/models/, ../../models/). A model is registered with the engine when it
// is first needed. Thread rule: any thread.
#pragma once

#include <filesystem>
#include <map>
#include <mutex>
#include <optional>
#include <string>

#include "engine.h"

namespace morva::cli {

struct ModelChoice {
    std::filesystem::path model;    // weight or control file; empty: by rate
    std::filesystem::path control;  // control file laid over the model; empty: none
    std::filesystem::path folder;   // where the shipped models are; empty: beside the program
};

// File name of the shipped noise-cancellation model for a file of `rateHz`; nothing above 96000.
std::optional<std::string> shippedCleaningModel(int rateHz);

// The folder against which a choice's control file names its weight.
std::filesystem::path controlFolder(ModelChoice const& choice);

class Models {
public:
    // Checks that the files named exist and fit together; throws Error.
    Models(Engine& engine, ModelChoice choice);

    // Engine names of registered models; each throws Error when the model is missing or bad.
    std::string cleaning(int rateHz);
    std::string voice();
    std::string level();

private:
    std::string chosenOr(std::string const& shippedFile);
    std::string registered(std::filesystem::path const& file);
    std::filesystem::path shipped(std::string const& file) const;

    Engine& engine_;
    ModelChoice choice_;
    std::map<std::filesystem::path, std::string> names_;
    std::mutex registering_;
};

}  // namespace morva::cli
