#include "shared_engine.h"

#include <dlfcn.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <mutex>
#include <stdexcept>
#include <string>
#include <vector>

#include "morva-sdk/morva-ext.h"
#include "shipped_models.h"

namespace morva::ladspa {
namespace fs = std::filesystem;
namespace {

// Beginning and end of the engine happen under one lock, so that no new engine meets an old one.
std::mutex changing;
int users = 0;

// Where this library was loaded from.
fs::path pluginFolder() {
    Dl_info info{};
    static char const here = 0;
    if (dladdr(&here, &info) == 0 || info.dli_fname == nullptr) return fs::current_path();
    return fs::absolute(info.dli_fname).parent_path();
}

std::vector<fs::path> modelFolders() {
    // A host that changes its environment while it loads plugins has raced with more than this.
    char const* const chosen = std::getenv("MORVA_MODELS");  // NOLINT(concurrency-mt-unsafe)
    if (chosen != nullptr) return {chosen};
    auto const plugin = pluginFolder();
    return {plugin, plugin / "../share/morva/models", plugin / "../../share/morva/models"};
}

fs::path findModel(char const* file) {
    for (auto const& folder : modelFolders()) {
        if (fs::exists(folder / file)) return folder / file;
    }
    throw std::runtime_error(std::string("the model ") + file +
                             " was not found; MORVA_MODELS can name its folder");
}

std::string lastError(std::string const& what) {
    std::string const reason = MorvaExt_LastError();
    return reason.empty() ? what : what + ": " + reason;
}

// From memory: registering a file would print its name on the host's standard output.
void registerModel(char const* name) {
    auto const path = findModel(name);
    std::ifstream stream(path, std::ios::binary);
    std::string const bytes{std::istreambuf_iterator<char>(stream), {}};
    if (Morva_SDK_SetModel_Blob(bytes.data(), static_cast<unsigned>(bytes.size()), name) != 0) {
        throw std::runtime_error(lastError(path.string() + " is not a usable model"));
    }
}

void start() {
    if (Morva_SDK_GlobalInit(nullptr, 1) != 0) {
        throw std::runtime_error(lastError("the engine cannot start"));
    }
    try {
        for (auto const& model : shippedModels) {
            if (model.kind == ShippedKind::NC) registerModel(model.file);
        }
    } catch (...) {
        Morva_SDK_GlobalDestroy();
        throw;
    }
}

}  // namespace

SharedEngine::SharedEngine() {
    std::lock_guard const lock(changing);
    if (users == 0) start();
    ++users;
}

SharedEngine::~SharedEngine() {
    std::lock_guard const lock(changing);
    if (--users == 0) Morva_SDK_GlobalDestroy();
}

char const* SharedEngine::modelFor(int rateHz) {
    auto const* const model = std::ranges::find_if(shippedModels, [&](auto const& shipped) {
        return shipped.kind == ShippedKind::NC && rateHz <= shipped.maxRateHz;
    });
    // What no model serves is refused by the engine with its own reason.
    return model != shippedModels.end() ? model->file : shippedModels.front().file;
}

}  // namespace morva::ladspa
