#include "shared_engine.h"

#include <dlfcn.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <mutex>
#include <set>
#include <stdexcept>
#include <string>

#include "morva-sdk/morva-ext.h"
#include "shipped_models.h"

namespace morva::plugins {
namespace fs = std::filesystem;
namespace {

// Beginning and end of the engine happen under one lock, so that no new engine meets an old one.
std::mutex changing;
int users = 0;

// Of the engine. Never destroyed: hosts may clean up while the process exits.
std::set<std::string>& modelsInUse() {
    static auto* const models = std::make_unique<std::set<std::string>>().release();
    return *models;
}

// Where this library was loaded from.
fs::path pluginFolder() {
    Dl_info info{};
    static char const here = 0;
    if (dladdr(&here, &info) == 0 || info.dli_fname == nullptr) return fs::current_path();
    return fs::absolute(info.dli_fname).parent_path();
}

// In MORVA_MODELS, or else beside the plugin or in share/morva/models of a folder above it, which
// is where an installation puts them.
fs::path findShipped(std::string const& file) {
    // A host that changes its environment while it loads plugins has raced with more than this.
    char const* const chosen = std::getenv("MORVA_MODELS");  // NOLINT(concurrency-mt-unsafe)
    auto folder = chosen != nullptr ? fs::path(chosen) : pluginFolder();
    if (fs::exists(folder / file)) return folder / file;
    for (; chosen == nullptr && folder.has_relative_path(); folder = folder.parent_path()) {
        auto installed = folder / "share/morva/models" / file;
        if (fs::exists(installed)) return installed;
    }
    throw std::runtime_error("the model " + file +
                             " was not found; MORVA_MODELS can name its folder");
}

// The host's standard output is not ours; what matters is in the reasons of errors.
void keepQuiet(int /*stream*/, char const* /*text*/) {}

void registerModel(fs::path const& path, std::string const& name) {
    std::ifstream stream(path, std::ios::binary);
    std::string const bytes{std::istreambuf_iterator<char>(stream), {}};
    auto const size = static_cast<unsigned>(bytes.size());
    if (!stream || Morva_SDK_SetModel_Blob(bytes.data(), size, name.c_str()) != 0) {
        throw std::runtime_error(SharedEngine::reason(path.string() + " is not a usable model"));
    }
}

char const* firstFor(ShippedKind kind, int rateHz) {
    auto const* const model = std::ranges::find_if(shippedModels, [&](auto const& shipped) {
        return shipped.kind == kind && rateHz <= shipped.maxRateHz;
    });
    // What no model serves is refused by the engine with its own reason.
    return model != shippedModels.end() ? model->file : shippedModels.front().file;
}

}  // namespace

SharedEngine::SharedEngine() {
    std::lock_guard const lock(changing);
    MorvaExt_SetDiagnostics(keepQuiet);
    if (users == 0 && Morva_SDK_GlobalInit(nullptr, 1) != 0) {
        throw std::runtime_error(reason("the engine cannot start"));
    }
    ++users;
}

SharedEngine::~SharedEngine() {
    std::lock_guard const lock(changing);
    if (--users > 0) return;
    Morva_SDK_GlobalDestroy();
    modelsInUse().clear();
}

void SharedEngine::use(std::string const& model) {
    std::lock_guard const lock(changing);
    if (modelsInUse().contains(model)) return;
    bool const isPath = model.find('/') != std::string::npos;
    registerModel(isPath ? fs::path(model) : findShipped(model), model);
    modelsInUse().insert(model);
}

char const* SharedEngine::cleanerFor(int rateHz) {
    return firstFor(ShippedKind::NC, rateHz);
}

char const* SharedEngine::voiceModel() {
    return firstFor(ShippedKind::VAD, 0);
}

std::string SharedEngine::reason(std::string const& what) {
    std::string const reason = MorvaExt_LastError();
    return reason.empty() ? what : what + ": " + reason;
}

}  // namespace morva::plugins
