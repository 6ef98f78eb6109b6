#include "shared_engine.h"

#include <dlfcn.h>

#include <array>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <mutex>
#include <stdexcept>
#include <string>
#include <vector>

#include "morva-sdk/morva-ext.h"

namespace morva::ladspa {
namespace fs = std::filesystem;
namespace {

struct Shipped {
    char const* file;
    int maxRateHz;
};
constexpr std::array kModels{Shipped{"NC_small_8k.mvw", 8000}, Shipped{"NC_small_16k.mvw", 16000},
                             Shipped{"c6.xs.f.ca03f4.mvw", 96000}};

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

struct DestroyEngine {
    void operator()(void const*) const { Morva_SDK_GlobalDestroy(); }
};

}  // namespace

std::shared_ptr<SharedEngine> SharedEngine::acquire() {
    static std::mutex mutex;
    static std::weak_ptr<SharedEngine> shared;
    std::lock_guard const lock(mutex);
    auto engine = shared.lock();
    if (!engine) {
        engine = std::make_shared<SharedEngine>();
        shared = engine;
    }
    return engine;
}

SharedEngine::SharedEngine() {
    if (Morva_SDK_GlobalInit(nullptr, 1) != 0) {
        throw std::runtime_error(lastError("the engine cannot start"));
    }
    std::unique_ptr<SharedEngine, DestroyEngine> undo(this);
    for (auto const& model : kModels) registerModel(model.file);
    static_cast<void>(undo.release());
}

SharedEngine::~SharedEngine() {
    Morva_SDK_GlobalDestroy();
}

char const* SharedEngine::modelFor(int rateHz) {
    for (auto const& model : kModels) {
        if (rateHz <= model.maxRateHz) return model.file;
    }
    return kModels.back().file;
}

}  // namespace morva::ladspa
