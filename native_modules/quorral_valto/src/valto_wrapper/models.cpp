// Model lists, the script's choice, and set-up with a model of one's own.
#include "native_modules/quorral_valto/src/valto_wrapper/models.h"

#include <algorithm>
#include <memory>
#include <utility>

#include "morva-sdk/morva-ext.h"
#include "native_modules/quorral_valto/src/valto_wrapper/entry_points.h"
#include "native_modules/quorral_valto/src/valto_wrapper/valto_wrapper.h"

namespace quorral {

namespace {

template <class T>
T& NeverDestroyed() {
    return *std::make_unique<T>().release();
}

}  // namespace

std::vector<NcModel>& gNcModels = NeverDestroyed<std::vector<NcModel>>();
std::string& gNcModel = NeverDestroyed<std::string>();
std::vector<std::string>& gVadModels = NeverDestroyed<std::vector<std::string>>();
std::string& gVadModel = NeverDestroyed<std::string>();

namespace {

using SetupFunction = void* (*)(int, int);

bool IsNcModel(const std::string& name) {
    return std::ranges::any_of(gNcModels, [&](const NcModel& model) { return model.name == name; });
}

bool IsVadModel(const std::string& name) {
    return std::ranges::count(gVadModels, name) != 0;
}

// Puts a value in place for the length of a scope.
class Substitute {
public:
    Substitute(std::string& target, std::string value)
        : target_(target), previous_(std::exchange(target, std::move(value))) {}
    ~Substitute() { target_.swap(previous_); }
    Substitute(const Substitute&) = delete;
    Substitute& operator=(const Substitute&) = delete;

private:
    std::string& target_;
    std::string previous_;
};

OpenResult Open(SetupFunction setup, int rateHz, int frameMs, std::string& choice,
                const Optional<std::string>& model, bool (*isRegistered)(const std::string&)) {
    const std::lock_guard guard(ModelsLock());
    if (!InitializeResult()) return {.status = OpenStatus::kNotInitialized};
    if (model && !isRegistered(*model)) return {.status = OpenStatus::kUnknownModel};
    const Substitute substitute(choice, model.value_or(choice));
    void* const session = setup(rateHz, frameMs);
    return {.status = session == nullptr ? OpenStatus::kRefused : OpenStatus::kOpen,
            .session = session};
}

}  // namespace

std::recursive_mutex& ModelsLock() {
    static std::recursive_mutex lock;
    return lock;
}

std::vector<std::string> NcModelNames() {
    const std::lock_guard guard(ModelsLock());
    std::vector<std::string> names;
    names.reserve(gNcModels.size());
    for (const auto& model : gNcModels) names.push_back(model.name);
    return names;
}

std::vector<std::string> VadModelNames() {
    const std::lock_guard guard(ModelsLock());
    return gVadModels;
}

std::string NcModelFor(int rateHz) {
    const std::lock_guard guard(ModelsLock());
    if (!gNcModel.empty()) return gNcModel;
    const auto model = std::ranges::find_if(
        gNcModels, [&](const NcModel& candidate) { return candidate.maxSampleRate >= rateHz; });
    return model == gNcModels.end() ? std::string() : model->name;
}

bool ChooseNcModel(const std::string& name) {
    const std::lock_guard guard(ModelsLock());
    if (!IsNcModel(name)) return false;
    gNcModel = name;
    return true;
}

bool ChooseVadModel(const std::string& name) {
    const std::lock_guard guard(ModelsLock());
    if (!IsVadModel(name)) return false;
    gVadModel = name;
    return true;
}

void ChooseNcModelByRate() {
    const std::lock_guard guard(ModelsLock());
    gNcModel.clear();
}

OpenResult OpenNcSession(int rateHz, int frameMs, const Optional<std::string>& model) {
    if (InitializeResult() && !model && NcModelFor(rateHz).empty()) {
        return {.status = OpenStatus::kUnknownModel};
    }
    return Open(ValtoNCSetup, rateHz, frameMs, gNcModel, model, IsNcModel);
}

OpenResult OpenVadSession(int rateHz, int frameMs, const Optional<std::string>& model) {
    return Open(ValtoVADSetup, rateHz, frameMs, gVadModel, model, IsVadModel);
}

OpenStatus EnableVoice(void* ncSession, const Optional<std::string>& model) {
    const std::lock_guard guard(ModelsLock());
    if (model && !IsVadModel(*model)) return OpenStatus::kUnknownModel;
    const std::string name = model.value_or(gVadModel);
    return MorvaExt_NC_EnableVoice(ncSession, name.c_str()) == 0 ? OpenStatus::kOpen
                                                                 : OpenStatus::kRefused;
}

}  // namespace quorral
