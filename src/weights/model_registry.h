// The registered models, under the names that the host chose: read from weight files, control files
// or memory, each with its environment parameters. Weights that carry one identifier are loaded
// once and shared. Models are only added.
//
// [control thread], under the engine's lock. A failed registration says why on standard output,
// returns false and changes nothing. A registered model is not changed any more; whoever holds its
// environment keeps it alive.
#pragma once

#include <cstddef>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "utils/non_copyable.h"
#include "utils/path.h"
#include "weights/model_environment.h"

namespace MORVA::WEIGHTS {

class ModelRegistry : private UTILS::NonCopyMovable {
public:
    using ModelEnvironment = CONTAINERS::ModelEnvironment;
    using WeightAndIdentifier = std::pair<std::shared_ptr<Weight>, std::string>;
    using Positions = std::map<std::string, std::size_t>;  // in environments()

    // Relative file names are resolved against `workingPath`.
    explicit ModelRegistry(wchar_t const* workingPath);
    ~ModelRegistry();

    // The one that exists: cleaners are created by name. Throws MORVA_Exception when there is none.
    static ModelRegistry const& current();

    bool addWeightWithControlFile(wchar_t const* path, char const* modelName);
    bool addWeightBlob(char const* data, std::size_t size, char const* modelName);

    // A null weight for what cannot be read; the weight that is there already for a known
    // identifier. The identifier is empty unless it is a new one.
    WeightAndIdentifier readAndCheckWeight(UTILS::Path const& path) const;
    WeightAndIdentifier readAndCheckWeight(char const* data, std::size_t size) const;

    // Version, frame duration in ms, rate in kHz, model name and time stamp, joined without
    // separators, e.g. "0.0.61016nc210301". Prints a line and returns "" when one of the five is
    // missing, of another type, or the rate lies below 1000 Hz.
    static std::string mvwUniqueIdGenerator(std::shared_ptr<Weight> const& weight);

    // False for a key that was there; its value is replaced.
    static bool addModelEnvironment(ModelEnvironment const& environment, char const* key,
                                    char const* value);

    // In the order of registration.
    std::vector<ModelEnvironment> const& environments() const { return environments_; }
    Positions const& names() const { return names_; }

    // Forgets everything, the working path included.
    void clear();

private:
    UTILS::Path resolve(wchar_t const* path) const;
    bool isFreeName(char const* modelName) const;
    WeightAndIdentifier checkWeight(std::shared_ptr<Weight> weight) const;
    bool applyControlFile(UTILS::Path const& path, ModelEnvironment const& environment,
                          std::string& identifier) const;
    bool enterModel(ModelEnvironment const& environment, std::string const& identifier,
                    char const* modelName);

    UTILS::Path workingPath_;
    std::vector<ModelEnvironment> environments_;
    Positions names_;
    Positions identities_;  // by weight identifier; the model that first brought the weight
};

}  // namespace MORVA::WEIGHTS
