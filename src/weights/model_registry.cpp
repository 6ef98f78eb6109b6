#include "weights/model_registry.h"

#include <tuple>

#include "utils/diagnostics.h"
#include "utils/exception.h"
#include "weights/control_file.h"

namespace MORVA::WEIGHTS {
namespace {

// Changes under the engine's lock, like the registry itself.
ModelRegistry const* existing = nullptr;

// Identifiers shorter than this are not entered.
constexpr std::size_t kShortestIdentifier = 2;

// All that is said here goes to standard output.
template <class Text>
void say(Text const& text, char const* end = "\n") {
    UTILS::say(UTILS::Channel::output, text, end);
}

std::string multibyte(UTILS::Path const& path) {
    return path.convertWString2MBString(path.str());
}

}  // namespace

ModelRegistry::ModelRegistry(wchar_t const* workingPath) : workingPath_(workingPath) {
    existing = this;
}

ModelRegistry::~ModelRegistry() {
    existing = nullptr;
}

ModelRegistry const& ModelRegistry::current() {
    if (existing == nullptr) {
        UTILS::raise("There are no models without an engine", "src/weights/model_registry",
                     "current");
    }
    return *existing;
}

void ModelRegistry::clear() {
    while (!environments_.empty()) environments_.pop_back();
    names_.clear();
    identities_.clear();
    workingPath_ = UTILS::Path(L"");
}

UTILS::Path ModelRegistry::resolve(wchar_t const* path) const {
    UTILS::Path resolved(path);
    resolved.pushFront(workingPath_.str());
    resolved.normalize();
    return resolved;
}

bool ModelRegistry::isFreeName(char const* modelName) const {
    bool const named = modelName != nullptr && *modelName != '\0';
    if (named && !names_.contains(modelName)) return true;
    say("WARNING model name exists or empty, please insert different name", "");
    return false;
}

std::string ModelRegistry::mvwUniqueIdGenerator(std::shared_ptr<Weight> const& weight) {
    auto const& values = weight->values();
    auto const version = values.find<std::string>(VERSION);
    auto const rate = values.find<int>(SAMPLERATE);
    auto const length = values.find<int>(FRAMELENGHT);
    auto const model = values.find<std::string>("ModelName");
    auto const stamp = values.find<std::string>("TimeStamp");
    // A rate below 1 kHz would make the divisor 0 or negative.
    if (!version || !rate || !length || !model || !stamp || *rate < 1000) {
        say("ERROR INVALID WEIGHT");
        return {};
    }
    int const kilohertz = *rate / 1000;
    int const duration = *length / kilohertz;
    return *version + std::to_string(duration) + std::to_string(kilohertz) + *model + *stamp;
}

ModelRegistry::WeightAndIdentifier ModelRegistry::checkWeight(
    std::shared_ptr<Weight> weight) const {
    auto identifier = mvwUniqueIdGenerator(weight);
    if (identifier.size() < kShortestIdentifier) {
        say("ERROR WEIGHT NAME ISNT LONG ENOUGHT");
        return {std::move(weight), ""};
    }
    if (auto const known = identities_.find(identifier); known != identities_.end()) {
        return {environments_[known->second]->first, ""};
    }
    return {std::move(weight), std::move(identifier)};
}

ModelRegistry::WeightAndIdentifier ModelRegistry::readAndCheckWeight(
    UTILS::Path const& path) const {
    auto weight = std::make_shared<Weight>();
    if (!weight->read(path)) {
        say("WARNING weight isn't loaded \n weigth file: " + multibyte(path));
        return {nullptr, ""};
    }
    return checkWeight(std::move(weight));
}

ModelRegistry::WeightAndIdentifier ModelRegistry::readAndCheckWeight(char const* data,
                                                                     std::size_t size) const {
    auto weight = std::make_shared<Weight>();
    if (!weight->read(data, size)) {
        say("WARNING weight isn't loaded ");
        return {nullptr, ""};
    }
    return checkWeight(std::move(weight));
}

bool ModelRegistry::addModelEnvironment(ModelEnvironment const& environment, char const* key,
                                        char const* value) {
    say(std::string("ENVIRONMENT KEY-\"") + key + "\" VALUE-\"" + value + "\"");
    auto const added =
        environment->second.insert<std::string>(key, value, CONTAINERS::InsertMode::replace);
    return added != nullptr;
}

// False when the whole registration is to be abandoned.
bool ModelRegistry::applyControlFile(UTILS::Path const& path, ModelEnvironment const& environment,
                                     std::string& identifier) const {
    std::vector<std::pair<std::string, std::string>> entries;
    if (!UTILS::readControlFile(entries, path)) return true;  // nothing is loaded
    for (auto const& [key, value] : entries) {
        if (key == "CONTROLFILE") {
            say("WARNING there are CONTROLFILE parameter inside of controlFile, skipped");
        } else if (key == "WEIGHT") {
            if (environment->first) {
                say("WARNING multiple weight including, weight exists.");
                continue;
            }
            say("WEIGHT " + value);
            auto const weightPath = resolve(path.convertMBString2WString(value).c_str());
            std::tie(environment->first, identifier) = readAndCheckWeight(weightPath);
        } else if (!addModelEnvironment(environment, key.c_str(), value.c_str())) {
            return false;
        }
    }
    return true;
}

bool ModelRegistry::enterModel(ModelEnvironment const& environment, std::string const& identifier,
                               char const* modelName) {
    if (!environment->first) {
        say("Warning Weight name isn't included or weight has beeen included before ");
        return false;
    }
    // Nodes are made before the registry changes, so that a failed allocation leaves it as it was.
    std::size_t const index = environments_.size();
    Positions name{{modelName, index}};
    Positions identity;
    if (!identifier.empty()) identity.emplace(identifier, index);
    environments_.push_back(environment);
    names_.merge(name);
    identities_.merge(identity);  // an identifier that is there keeps its index
    return true;
}

bool ModelRegistry::addWeightWithControlFile(wchar_t const* path, char const* modelName) {
    auto const fullPath = resolve(path);
    auto const extension = fullPath.getFileExtension();
    auto const environment = CONTAINERS::makeModelEnvironment();
    std::string identifier;
    if (!isFreeName(modelName)) return false;
    if (extension == L"cfg") {
        if (!applyControlFile(fullPath, environment, identifier)) return false;
    } else if (extension == L"mvw") {
        say("WEIGHT " + multibyte(fullPath));
        std::tie(environment->first, identifier) = readAndCheckWeight(fullPath);
    }
    return enterModel(environment, identifier, modelName);
}

bool ModelRegistry::addWeightBlob(char const* data, std::size_t size, char const* modelName) {
    auto const environment = CONTAINERS::makeModelEnvironment();
    std::string identifier;
    if (!isFreeName(modelName)) return false;
    std::tie(environment->first, identifier) = readAndCheckWeight(data, size);
    return enterModel(environment, identifier, modelName);
}

}  // namespace MORVA::WEIGHTS
