// Model registration: weight files, control files and blobs into the instance's registry.
#include <iostream>
#include <utility>

#include "morva-sdk/instance.h"
#include "weights/control_file.h"
#include "weights/identifier.h"

namespace MORVA::MORVA_SDK {
namespace {

// Identifiers shorter than this are not entered.
constexpr std::size_t kShortestIdentifier = 2;

std::string multibyte(UTILS::Path const& path) {
    return path.convertWString2MBString(path.str());
}

}  // namespace

UTILS::Path MorvaInstanceT::resolve(wchar_t const* path) const {
    UTILS::Path resolved(path);
    resolved.pushFront(workingPath_.str());
    resolved.normalize();
    return resolved;
}

bool MorvaInstanceT::isFreeName(char const* modelName) const {
    bool const named = modelName != nullptr && *modelName != '\0';
    if (named && !modelNames_.contains(modelName)) return true;
    std::cout << "WARNING model name exists or empty, please insert different name" << std::flush;
    return false;
}

std::string MorvaInstanceT::mvwUniqueIdGenerator(
    std::shared_ptr<WEIGHTS::Weight> const& weight) const {
    return WEIGHTS::weightIdentifier(*weight);
}

MorvaInstanceT::WeightAndIdentifier MorvaInstanceT::checkWeight(
    std::shared_ptr<WEIGHTS::Weight> weight) const {
    auto identifier = mvwUniqueIdGenerator(weight);
    if (identifier.size() < kShortestIdentifier) {
        std::cout << "ERROR WEIGHT NAME ISNT LONG ENOUGHT\n" << std::flush;
        return {std::move(weight), ""};
    }
    if (auto const known = weightIdentities_.find(identifier); known != weightIdentities_.end()) {
        return {modelEnvironments_[known->second]->first, ""};
    }
    return {std::move(weight), std::move(identifier)};
}

MorvaInstanceT::WeightAndIdentifier MorvaInstanceT::readAndCheckWeight(
    UTILS::Path const& path) const {
    auto weight = std::make_shared<WEIGHTS::Weight>();
    if (!weight->read(path)) {
        std::cout << "WARNING weight isn't loaded \n weigth file: " << multibyte(path) << std::endl;
        return {nullptr, ""};
    }
    return checkWeight(std::move(weight));
}

MorvaInstanceT::WeightAndIdentifier MorvaInstanceT::readAndCheckWeight(char const* data,
                                                                       std::size_t size) const {
    auto weight = std::make_shared<WEIGHTS::Weight>();
    if (!weight->read(data, size)) {
        std::cout << "WARNING weight isn't loaded \n" << std::flush;
        return {nullptr, ""};
    }
    return checkWeight(std::move(weight));
}

bool MorvaInstanceT::addModelEnvironment(ModelEnvironment const& environment, char const* key,
                                         char const* value) const {
    std::cout << "ENVIRONMENT KEY-\"" << key << "\" VALUE-\"" << value << "\"" << std::endl;
    auto const added =
        environment->second.insert<std::string>(key, value, CONTAINERS::InsertMode::replace);
    return added != nullptr;
}

// False when the whole registration is to be abandoned.
bool MorvaInstanceT::applyControlFile(UTILS::Path const& path, ModelEnvironment const& environment,
                                      std::string& identifier) const {
    std::vector<std::pair<std::string, std::string>> entries;
    if (!UTILS::readControlFile(entries, path)) return true;  // nothing is loaded
    for (auto const& [key, value] : entries) {
        if (key == "CONTROLFILE") {
            std::cout << "WARNING there are CONTROLFILE parameter inside of controlFile, skipped"
                      << std::endl;
        } else if (key == "WEIGHT") {
            if (environment->first) {
                std::cout << "WARNING multiple weight including, weight exists." << std::endl;
                continue;
            }
            std::cout << "WEIGHT " << value << std::endl;
            auto const weightPath = resolve(path.convertMBString2WString(value).c_str());
            std::tie(environment->first, identifier) = readAndCheckWeight(weightPath);
        } else if (!addModelEnvironment(environment, key.c_str(), value.c_str())) {
            return false;
        }
    }
    return true;
}

bool MorvaInstanceT::enterModel(ModelEnvironment const& environment, std::string const& identifier,
                                char const* modelName) {
    if (!environment->first) {
        std::cout << "Warning Weight name isn't included or weight has beeen included before \n"
                  << std::flush;
        return false;
    }
    // Nodes are made before the registry changes, so that a failed allocation leaves it as it was.
    unsigned long const index = modelEnvironments_.size();
    std::map<std::string, unsigned long> name{{modelName, index}};
    std::map<std::string, unsigned long> identity;
    if (!identifier.empty()) identity.emplace(identifier, index);
    modelEnvironments_.push_back(environment);
    modelNames_.merge(name);
    weightIdentities_.merge(identity);  // an identifier that is there keeps its index
    return true;
}

bool MorvaInstanceT::addWeightWithControlFile(wchar_t const* path, char const* modelName) {
    auto const fullPath = resolve(path);
    auto const extension = fullPath.getFileExtension();
    auto const environment = CONTAINERS::makeModelEnvironment();
    std::string identifier;
    if (!isFreeName(modelName)) return false;
    if (extension == L"cfg") {
        if (!applyControlFile(fullPath, environment, identifier)) return false;
    } else if (extension == L"mvw") {
        std::cout << "WEIGHT " << multibyte(fullPath) << std::endl;
        std::tie(environment->first, identifier) = readAndCheckWeight(fullPath);
    }
    return enterModel(environment, identifier, modelName);
}

bool MorvaInstanceT::addWeightBlob(char const* data, std::size_t size, char const* modelName) {
    auto const environment = CONTAINERS::makeModelEnvironment();
    std::string identifier;
    if (!isFreeName(modelName)) return false;
    std::tie(environment->first, identifier) = readAndCheckWeight(data, size);
    return enterModel(environment, identifier, modelName);
}

}  // namespace MORVA::MORVA_SDK
